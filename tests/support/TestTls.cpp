#include "TestTls.h"

#include "TestHost.h"

#include <CertificateAuthority.h>
#include <CoreServices/GlobalUtils.h>

#include <Poco/Net/RejectCertificateHandler.h>
#include <Poco/Net/SSLManager.h>

#include <filesystem>
#include <mutex>

namespace TestSupport
{
namespace
{
struct CertificateFiles
{
    std::string certificate;
    std::string privateKey;
};

struct TestPki
{
    std::string authorityFile;
    CertificateFiles localhost;
    CertificateFiles selfSigned;
    CertificateFiles otherHost;
};

CertificateFiles Store(const std::filesystem::path& directory, const std::string& name,
                       const DorvanNebiPki::Credentials& credentials)
{
    const std::filesystem::path certificate = directory / (name + ".pem");
    const std::filesystem::path key = directory / (name + "-key.pem");
    DorvanNebiPki::WritePemFile(certificate, credentials.certificatePem, false);
    DorvanNebiPki::WritePemFile(key, credentials.privateKeyPem, true);
    return CertificateFiles{certificate.u8string(), key.u8string()};
}

TestPki MakeTestPki()
{
    Poco::Net::initializeSSL();
    const std::filesystem::path directory = GlobalUtils::ToFileSystemPath(SandboxDir()) / "pki";
    std::filesystem::create_directories(directory);

    const auto authority = DorvanNebiPki::CertificateAuthority::Create("Dorvan Nebi test authority");
    const DorvanNebiPki::ServerIdentity localhost{{"localhost"}, {"127.0.0.1"}};
    TestPki pki;
    pki.authorityFile = (directory / "authority.pem").u8string();
    DorvanNebiPki::WritePemFile(pki.authorityFile, authority.GetCredentials().certificatePem, false);
    pki.localhost = Store(directory, "localhost", authority.IssueServerCertificate(localhost));
    pki.selfSigned = Store(directory, "self-signed", DorvanNebiPki::MakeSelfSignedServerCertificate(localhost));
    pki.otherHost = Store(directory, "other-host", authority.IssueServerCertificate({{"other.invalid"}, {}}));
    return pki;
}

const TestPki& Pki()
{
    static const TestPki pki = MakeTestPki();
    return pki;
}

const CertificateFiles& FilesOf(ServerCertificate certificate)
{
    switch (certificate)
    {
    case ServerCertificate::SelfSigned:
        return Pki().selfSigned;
    case ServerCertificate::OtherHost:
        return Pki().otherHost;
    case ServerCertificate::Localhost:
        break;
    }
    return Pki().localhost;
}
} // namespace

Poco::Net::Context::Ptr ServerTlsContext(ServerCertificate certificate)
{
    const CertificateFiles& files = FilesOf(certificate);
    return new Poco::Net::Context(Poco::Net::Context::TLS_SERVER_USE, files.privateKey, files.certificate, "",
                                  Poco::Net::Context::VERIFY_NONE);
}

void TrustTestAuthority()
{
    static std::once_flag once;
    std::call_once(once, [] {
        // Strict verification with the authority as the only trusted root;
        // the name check against the host is POCO's extended verification,
        // which a client context has on by default.
        Poco::Net::Context::Ptr context =
            new Poco::Net::Context(Poco::Net::Context::TLS_CLIENT_USE, "", "", Pki().authorityFile,
                                   Poco::Net::Context::VERIFY_STRICT, 9, false);
        Poco::Net::SSLManager::instance().initializeClient(
            nullptr, new Poco::Net::RejectCertificateHandler(false), context);
    });
}

wxString TestAuthorityFile()
{
    return wxString::FromUTF8(Pki().authorityFile);
}
} // namespace TestSupport
