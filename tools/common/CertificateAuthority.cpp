#include "CertificateAuthority.h"

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <openssl/x509v3.h>

#include <fstream>
#include <memory>
#include <sstream>
#include <stdexcept>

namespace DorvanNebiPki
{
namespace
{
constexpr char kCurveName[] = "P-256";
constexpr int kSerialBits = 128;
// Certificates start an hour in the past, so that a client whose clock is a
// little behind accepts them at once.
constexpr long kBackdateSeconds = 3600;
constexpr long kSecondsPerDay = 24L * 60 * 60;

template <typename T, void (*Free)(T*)>
struct Deleter
{
    void operator()(T* p) const { Free(p); }
};
using KeyPtr = std::unique_ptr<EVP_PKEY, Deleter<EVP_PKEY, EVP_PKEY_free>>;
using CertPtr = std::unique_ptr<X509, Deleter<X509, X509_free>>;
using BioPtr = std::unique_ptr<BIO, Deleter<BIO, BIO_free_all>>;
using BigNumPtr = std::unique_ptr<BIGNUM, Deleter<BIGNUM, BN_free>>;
using ExtensionPtr = std::unique_ptr<X509_EXTENSION, Deleter<X509_EXTENSION, X509_EXTENSION_free>>;
using NamesPtr = std::unique_ptr<GENERAL_NAMES, Deleter<GENERAL_NAMES, GENERAL_NAMES_free>>;

// Throws with what OpenSSL has to say about the failure of what.
[[noreturn]] void Fail(const std::string& what)
{
    std::string reason;
    for (unsigned long code = ERR_get_error(); code != 0; code = ERR_get_error())
    {
        char text[256];
        ERR_error_string_n(code, text, sizeof(text));
        reason += reason.empty() ? ": " : "; ";
        reason += text;
    }
    throw std::runtime_error("certificate authority: " + what + reason);
}

void Check(int result, const std::string& what)
{
    if (result <= 0)
    {
        Fail(what);
    }
}

template <typename T>
T* Check(T* result, const std::string& what)
{
    if (!result)
    {
        Fail(what);
    }
    return result;
}

KeyPtr NewKey()
{
    return KeyPtr(Check(EVP_EC_gen(kCurveName), "generating an EC key"));
}

std::string ToPem(const X509* certificate)
{
    BioPtr bio(Check(BIO_new(BIO_s_mem()), "allocating a buffer"));
    Check(PEM_write_bio_X509(bio.get(), certificate), "writing a certificate");
    char* data = nullptr;
    const long length = BIO_get_mem_data(bio.get(), &data);
    return std::string(data, static_cast<std::size_t>(length));
}

std::string ToPem(const EVP_PKEY* key)
{
    BioPtr bio(Check(BIO_new(BIO_s_mem()), "allocating a buffer"));
    Check(PEM_write_bio_PrivateKey(bio.get(), key, nullptr, nullptr, 0, nullptr, nullptr), "writing a private key");
    char* data = nullptr;
    const long length = BIO_get_mem_data(bio.get(), &data);
    return std::string(data, static_cast<std::size_t>(length));
}

BioPtr ReadOnlyBio(const std::string& text)
{
    return BioPtr(Check(BIO_new_mem_buf(text.data(), static_cast<int>(text.size())), "allocating a buffer"));
}

CertPtr CertificateFromPem(const std::string& pem)
{
    BioPtr bio = ReadOnlyBio(pem);
    return CertPtr(Check(PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr), "reading a certificate"));
}

KeyPtr KeyFromPem(const std::string& pem)
{
    BioPtr bio = ReadOnlyBio(pem);
    return KeyPtr(Check(PEM_read_bio_PrivateKey(bio.get(), nullptr, nullptr, nullptr), "reading a private key"));
}

void SetRandomSerial(X509* certificate)
{
    BigNumPtr serial(Check(BN_new(), "allocating a serial number"));
    // Positive and of full length: the top bit is 0 and the next one 1.
    Check(BN_rand(serial.get(), kSerialBits - 1, BN_RAND_TOP_ONE, BN_RAND_BOTTOM_ANY), "making a serial number");
    Check(BN_to_ASN1_INTEGER(serial.get(), X509_get_serialNumber(certificate)) ? 1 : 0, "setting the serial number");
}

void SetCommonName(X509_NAME* name, const std::string& commonName)
{
    Check(X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_UTF8,
                                     reinterpret_cast<const unsigned char*>(commonName.c_str()), -1, -1, 0),
          "setting the common name");
}

// A certificate for key with the given subject, valid from an hour ago for
// validDays; issuer and extensions are up to the caller.
CertPtr NewCertificate(EVP_PKEY* key, const std::string& commonName, int validDays)
{
    if (validDays <= 0)
    {
        throw std::runtime_error("certificate authority: a certificate must be valid for at least one day");
    }
    CertPtr certificate(Check(X509_new(), "allocating a certificate"));
    Check(X509_set_version(certificate.get(), X509_VERSION_3), "setting the version");
    SetRandomSerial(certificate.get());
    Check(X509_gmtime_adj(X509_getm_notBefore(certificate.get()), -kBackdateSeconds) ? 1 : 0, "setting notBefore");
    Check(X509_gmtime_adj(X509_getm_notAfter(certificate.get()), validDays * kSecondsPerDay) ? 1 : 0,
          "setting notAfter");
    SetCommonName(X509_get_subject_name(certificate.get()), commonName);
    Check(X509_set_pubkey(certificate.get(), key), "setting the public key");
    return certificate;
}

// One extension in OpenSSL's configuration syntax ("critical,CA:TRUE").
void AddExtension(X509* certificate, X509* issuer, int nid, const char* value)
{
    X509V3_CTX context;
    X509V3_set_ctx_nodb(&context);
    X509V3_set_ctx(&context, issuer, certificate, nullptr, nullptr, 0);
    ExtensionPtr extension(Check(X509V3_EXT_conf_nid(nullptr, &context, nid, value), "making an extension"));
    Check(X509_add_ext(certificate, extension.get(), -1), "adding an extension");
}

void AddGeneralName(GENERAL_NAMES* names, int type, ASN1_STRING* value)
{
    GENERAL_NAME* name = Check(GENERAL_NAME_new(), "allocating a subject name");
    GENERAL_NAME_set0_value(name, type, value);
    if (!sk_GENERAL_NAME_push(names, name))
    {
        GENERAL_NAME_free(name);
        Fail("adding a subject name");
    }
}

// The names go in as ASN.1 values, not through the configuration syntax, so
// that no name can smuggle in further entries.
void AddSubjectAltNames(X509* certificate, const ServerIdentity& identity)
{
    NamesPtr names(Check(GENERAL_NAMES_new(), "allocating subject names"));
    for (const std::string& dnsName : identity.dnsNames)
    {
        ASN1_IA5STRING* value = Check(ASN1_IA5STRING_new(), "allocating a DNS name");
        if (!ASN1_STRING_set(value, dnsName.data(), static_cast<int>(dnsName.size())))
        {
            ASN1_IA5STRING_free(value);
            Fail("setting the DNS name " + dnsName);
        }
        AddGeneralName(names.get(), GEN_DNS, value);
    }
    for (const std::string& address : identity.ipAddresses)
    {
        ASN1_OCTET_STRING* value = a2i_IPADDRESS(address.c_str());
        if (!value)
        {
            throw std::runtime_error("certificate authority: not an IP address: " + address);
        }
        AddGeneralName(names.get(), GEN_IPADD, value);
    }
    Check(X509_add1_ext_i2d(certificate, NID_subject_alt_name, names.get(), 0, X509V3_ADD_DEFAULT),
          "adding the subject names");
}

void AddServerExtensions(X509* certificate, X509* issuer, const ServerIdentity& identity)
{
    AddExtension(certificate, issuer, NID_basic_constraints, "critical,CA:FALSE");
    AddExtension(certificate, issuer, NID_key_usage, "critical,digitalSignature");
    AddExtension(certificate, issuer, NID_ext_key_usage, "serverAuth");
    AddExtension(certificate, issuer, NID_subject_key_identifier, "hash");
    AddExtension(certificate, issuer, NID_authority_key_identifier, "keyid:always");
    AddSubjectAltNames(certificate, identity);
}

void Sign(X509* certificate, EVP_PKEY* signingKey)
{
    Check(X509_sign(certificate, signingKey, EVP_sha256()), "signing a certificate");
}

std::string CommonNameOf(const ServerIdentity& identity)
{
    if (!identity.dnsNames.empty())
    {
        return identity.dnsNames.front();
    }
    if (!identity.ipAddresses.empty())
    {
        return identity.ipAddresses.front();
    }
    throw std::runtime_error("certificate authority: a server certificate needs a DNS name or an IP address");
}

// A server certificate for identity, issued by issuer (whose key signs it),
// or self-signed when issuer is null.
Credentials MakeServerCertificate(const ServerIdentity& identity, int validDays, X509* issuer, EVP_PKEY* issuerKey)
{
    const std::string commonName = CommonNameOf(identity);
    KeyPtr key = NewKey();
    CertPtr certificate = NewCertificate(key.get(), commonName, validDays);
    X509* const signer = issuer ? issuer : certificate.get();
    Check(X509_set_issuer_name(certificate.get(), X509_get_subject_name(signer)), "setting the issuer");
    AddServerExtensions(certificate.get(), signer, identity);
    Sign(certificate.get(), issuer ? issuerKey : key.get());
    return Credentials{ToPem(certificate.get()), ToPem(key.get())};
}
} // namespace

CertificateAuthority::CertificateAuthority(Credentials credentials) : m_credentials(std::move(credentials))
{
}

CertificateAuthority CertificateAuthority::Create(const std::string& commonName, int validDays)
{
    KeyPtr key = NewKey();
    CertPtr certificate = NewCertificate(key.get(), commonName, validDays);
    Check(X509_set_issuer_name(certificate.get(), X509_get_subject_name(certificate.get())), "setting the issuer");
    AddExtension(certificate.get(), certificate.get(), NID_basic_constraints, "critical,CA:TRUE,pathlen:0");
    AddExtension(certificate.get(), certificate.get(), NID_key_usage, "critical,keyCertSign,cRLSign");
    AddExtension(certificate.get(), certificate.get(), NID_subject_key_identifier, "hash");
    Sign(certificate.get(), key.get());
    return CertificateAuthority(Credentials{ToPem(certificate.get()), ToPem(key.get())});
}

CertificateAuthority CertificateAuthority::Load(const Credentials& credentials)
{
    CertPtr certificate = CertificateFromPem(credentials.certificatePem);
    KeyPtr key = KeyFromPem(credentials.privateKeyPem);
    if (X509_check_private_key(certificate.get(), key.get()) != 1)
    {
        Fail("the private key does not belong to the authority's certificate");
    }
    if (X509_check_ca(certificate.get()) == 0)
    {
        throw std::runtime_error("certificate authority: the certificate is no CA certificate");
    }
    return CertificateAuthority(credentials);
}

Credentials CertificateAuthority::IssueServerCertificate(const ServerIdentity& identity, int validDays) const
{
    CertPtr issuer = CertificateFromPem(m_credentials.certificatePem);
    KeyPtr issuerKey = KeyFromPem(m_credentials.privateKeyPem);
    return MakeServerCertificate(identity, validDays, issuer.get(), issuerKey.get());
}

Credentials MakeSelfSignedServerCertificate(const ServerIdentity& identity, int validDays)
{
    return MakeServerCertificate(identity, validDays, nullptr, nullptr);
}

void WritePemFile(const std::filesystem::path& path, const std::string& pem, bool isPrivateKey)
{
    std::error_code ignored;
    std::filesystem::remove(path, ignored);
    if (isPrivateKey)
    {
        // Created empty and closed to the others first; only then the key goes in.
        std::ofstream(path, std::ios::binary).close();
        std::filesystem::permissions(path, std::filesystem::perms::owner_read | std::filesystem::perms::owner_write,
                                     std::filesystem::perm_options::replace);
    }
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file.write(pem.data(), static_cast<std::streamsize>(pem.size()));
    file.close();
    if (!file)
    {
        throw std::runtime_error("certificate authority: cannot write " + path.u8string());
    }
}

std::string ReadPemFile(const std::filesystem::path& path)
{
    std::ifstream file(path, std::ios::binary);
    if (!file)
    {
        throw std::runtime_error("certificate authority: cannot read " + path.u8string());
    }
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}
} // namespace DorvanNebiPki
