// The system's certificate authorities in a POCO client context
// (SystemCertificates), against a loopback HTTPS server whose certificate the
// test authority issued.
//
// The test makes the system trust that authority as the system's own means
// allow. Elsewhere than on Windows it names the authority's file in
// SSL_CERT_FILE, which OpenSSL reads as its default location. On Windows it
// adds the authority to a certificate store of the current user's that the
// test makes (and removes) and has the store's certificates trusted: the
// same code as for the store "ROOT", whose content a test cannot choose
// (under Wine it is the host's CA bundle, read-only; on Windows adding to it
// asks the user).

#include "LoopbackServer.h"
#include "TestHost.h"
#include "TestTls.h"

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/SystemCertificates.h>

#include <Poco/Net/Context.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <Poco/Net/HTTPSClientSession.h>
#include <Poco/NullStream.h>
#include <Poco/StreamCopier.h>
#include <gtest/gtest.h>
#include <openssl/pem.h>
#include <openssl/x509.h>

#include <memory>
#include <string>
#include <vector>

#ifdef _WIN32
#include <windows.h>
#include <wincrypt.h>
#else
#include <cstdlib>
#endif

using namespace TestSupport;

namespace
{
// A client context that verifies the server's chain and name and trusts no
// authority yet.
Poco::Net::Context::Ptr VerifyingContext()
{
    return new Poco::Net::Context(Poco::Net::Context::TLS_CLIENT_USE, "", "", "", Poco::Net::Context::VERIFY_RELAXED,
                                  9, false);
}

// Whether one HTTPS exchange with the server went through: false when the
// server's certificate was refused.
bool Exchange(const Poco::Net::Context::Ptr& context, unsigned short port)
{
    try
    {
        Poco::Net::HTTPSClientSession session("localhost", port, context);
        Poco::Net::HTTPRequest request(Poco::Net::HTTPRequest::HTTP_GET, "/ping", Poco::Net::HTTPMessage::HTTP_1_1);
        session.sendRequest(request);
        Poco::Net::HTTPResponse response;
        std::istream& body = session.receiveResponse(response);
        Poco::NullOutputStream ignored;
        Poco::StreamCopier::copyStream(body, ignored);
        return response.getStatus() == Poco::Net::HTTPResponse::HTTP_OK;
    }
    catch (const Poco::Exception&)
    {
        return false;
    }
}

// The test authority's certificate, DER encoded.
std::vector<unsigned char> AuthorityDer()
{
    const std::string pem = ReadFile(TestAuthorityFile());
    std::unique_ptr<BIO, decltype(&BIO_free)> bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())),
                                                  &BIO_free);
    std::unique_ptr<X509, decltype(&X509_free)> certificate(PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr),
                                                            &X509_free);
    if (!certificate)
    {
        return {};
    }
    const int size = i2d_X509(certificate.get(), nullptr);
    std::vector<unsigned char> der(static_cast<std::size_t>(size > 0 ? size : 0));
    unsigned char* out = der.data();
    i2d_X509(certificate.get(), &out);
    return der;
}

// While it lives, the system trusts the test authority: Trust() then gives a
// context the system's authorities, the test authority among them.
class SystemTrustsTestAuthority
{
public:
    SystemTrustsTestAuthority()
    {
#ifdef _WIN32
        const std::vector<unsigned char> der = AuthorityDer();
        m_storeName = L"DorvanNebiTest-" + GlobalUtils::GetUUID().ToStdWstring();
        HCERTSTORE store =
            CertOpenStore(CERT_STORE_PROV_SYSTEM_W, 0, 0, CERT_SYSTEM_STORE_CURRENT_USER, m_storeName.c_str());
        m_added = store && !der.empty() &&
                  CertAddEncodedCertificateToStore(store, X509_ASN_ENCODING, der.data(), static_cast<DWORD>(der.size()),
                                                   CERT_STORE_ADD_REPLACE_EXISTING, nullptr);
        if (store)
        {
            CertCloseStore(store, 0); // saves what was added
        }
#else
        m_added = !AuthorityDer().empty() &&
                  setenv("SSL_CERT_FILE", TestAuthorityFile().utf8_string().c_str(), 1) == 0;
#endif
    }

    ~SystemTrustsTestAuthority()
    {
#ifdef _WIN32
        CertUnregisterSystemStore(m_storeName.c_str(), CERT_SYSTEM_STORE_CURRENT_USER | CERT_STORE_DELETE_FLAG);
#else
        unsetenv("SSL_CERT_FILE");
#endif
    }

    SystemTrustsTestAuthority(const SystemTrustsTestAuthority&) = delete;
    SystemTrustsTestAuthority& operator=(const SystemTrustsTestAuthority&) = delete;

    bool Added() const { return m_added; }

    // The number of certificates copied into context.
    std::size_t Trust(Poco::Net::Context& context) const
    {
#ifdef _WIN32
        return SystemCertificates::TrustWindowsStore(context, m_storeName.c_str());
#else
        return SystemCertificates::TrustSystemRoots(context);
#endif
    }

private:
    bool m_added = false;
#ifdef _WIN32
    std::wstring m_storeName;
#endif
};

class SystemCertificatesTest : public ::testing::Test
{
protected:
    SystemCertificatesTest()
    {
        // Also installs the handler that refuses certificates failing
        // verification, for every context of this process.
        TrustTestAuthority();
    }
};
} // namespace

TEST_F(SystemCertificatesTest, AServerIsTrustedOnceTheSystemTrustsItsAuthority)
{
    LoopbackServer server(ServerTlsContext(ServerCertificate::Localhost));
    server.Route("/ping", Reply::Status(200, "pong"));

    // The system's roots do not include the test authority.
    Poco::Net::Context::Ptr before = VerifyingContext();
    SystemCertificates::TrustSystemRoots(*before);
    EXPECT_FALSE(Exchange(before, server.Port()));

    SystemTrustsTestAuthority trust;
    ASSERT_TRUE(trust.Added());
    Poco::Net::Context::Ptr after = VerifyingContext();
    const std::size_t copied = trust.Trust(*after);
    EXPECT_TRUE(Exchange(after, server.Port()));
#ifdef _WIN32
    EXPECT_EQ(copied, 1u); // the store holds the test authority alone
#else
    EXPECT_EQ(copied, 0u);
#endif
    // A context not given the system's authorities still refuses the server.
    EXPECT_FALSE(Exchange(VerifyingContext(), server.Port()));
    EXPECT_EQ(server.RequestCount("/ping"), 1u);
}

TEST_F(SystemCertificatesTest, AServerNoTrustedAuthorityVouchesForIsRefused)
{
    SystemTrustsTestAuthority trust;
    ASSERT_TRUE(trust.Added());
    Poco::Net::Context::Ptr context = VerifyingContext();
    trust.Trust(*context);
    SystemCertificates::TrustSystemRoots(*context);

    LoopbackServer selfSigned(ServerTlsContext(ServerCertificate::SelfSigned));
    selfSigned.Route("/ping", Reply::Status(200, "pong"));
    EXPECT_FALSE(Exchange(context, selfSigned.Port()));

    EXPECT_EQ(selfSigned.RequestCount("/ping"), 0u);
}

#ifdef _WIN32
// The store holds the machine's roots (under Wine: the host system's CA
// bundle, which Wine presents as the "ROOT" store) before the test adds any.
TEST_F(SystemCertificatesTest, TheWindowsRootStoreHoldsTheMachinesAuthorities)
{
    Poco::Net::Context::Ptr context = VerifyingContext();
    EXPECT_GT(SystemCertificates::TrustSystemRoots(*context), 0u);
}
#endif
