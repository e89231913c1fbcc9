#include <CoreServices/SystemCertificates.h>

#include <CoreServices/Logger.h>

#include <Poco/Net/Context.h>
#include <wx/string.h>

#include <openssl/err.h>
#include <openssl/ssl.h>
#include <openssl/x509.h>

#ifdef _WIN32
#include <windows.h>
#include <wincrypt.h>
#endif

namespace
{
const char* const kSource = "HostPlatform/CoreServices/SystemCertificates";
}

namespace SystemCertificates
{
std::size_t TrustSystemRoots(Poco::Net::Context& context)
{
#ifdef _WIN32
    return TrustWindowsStore(context, L"ROOT");
#else
    if (SSL_CTX_set_default_verify_paths(context.sslContext()) != 1)
    {
        SetLevelAndGetLogger(SeverityError, kSource, "SystemCertificates::TrustSystemRoots", __LINE__)
            << "OpenSSL's default certificate locations cannot be used";
        ERR_clear_error();
    }
    return 0;
#endif
}

#ifdef _WIN32
std::size_t TrustWindowsStore(Poco::Net::Context& context, const wchar_t* storeName)
{
    // The current user's view of the system store. (Opened as
    // CertOpenSystemStore opens it: a read-only open of the user's part
    // fails where that part was never made, as in a new Wine prefix.)
    HCERTSTORE store = CertOpenSystemStoreW(0, storeName);
    if (!store)
    {
        SetLevelAndGetLogger(SeverityError, kSource, "SystemCertificates::TrustWindowsStore", __LINE__)
            << "cannot open the system certificate store " << wxString(storeName).utf8_string() << ", error "
            << static_cast<int>(GetLastError());
        return 0;
    }
    X509_STORE* const trusted = SSL_CTX_get_cert_store(context.sslContext());
    std::size_t copied = 0;
    for (PCCERT_CONTEXT certificate = CertEnumCertificatesInStore(store, nullptr); certificate;
         certificate = CertEnumCertificatesInStore(store, certificate))
    {
        const unsigned char* der = certificate->pbCertEncoded;
        X509* const x509 = d2i_X509(nullptr, &der, static_cast<long>(certificate->cbCertEncoded));
        if (!x509)
        {
            continue;
        }
        if (X509_STORE_add_cert(trusted, x509) == 1)
        {
            ++copied;
        }
        X509_free(x509); // the store holds its own reference
    }
    CertCloseStore(store, 0);
    // Unreadable certificates leave their errors queued on this thread:
    // they must not be taken for a later TLS operation's.
    ERR_clear_error();
    return copied;
}
#endif
} // namespace SystemCertificates
