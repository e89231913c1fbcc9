#include "CloudTls.h"

#include <CertificateAuthority.h>

#include <filesystem>

namespace
{
const char kAuthorityName[] = "Nebi cloud stand-in authority";
const DorvanNebiPki::ServerIdentity kIdentity{{"localhost"}, {"127.0.0.1"}};

bool Exists(const std::string& path)
{
    return std::filesystem::exists(std::filesystem::path(path));
}

// The authority of an earlier start, or a new one written to its files.
DorvanNebiPki::CertificateAuthority Authority(const std::string& certificate, const std::string& key)
{
    if (Exists(certificate) && Exists(key))
    {
        return DorvanNebiPki::CertificateAuthority::Load(
            {DorvanNebiPki::ReadPemFile(certificate), DorvanNebiPki::ReadPemFile(key)});
    }
    auto authority = DorvanNebiPki::CertificateAuthority::Create(kAuthorityName);
    DorvanNebiPki::WritePemFile(key, authority.GetCredentials().privateKeyPem, true);
    DorvanNebiPki::WritePemFile(certificate, authority.GetCredentials().certificatePem, false);
    return authority;
}
} // namespace

namespace CloudTls
{
CloudTlsFiles Prepare(const std::string& directory)
{
    const std::filesystem::path dir = std::filesystem::absolute(std::filesystem::path(directory));
    std::filesystem::create_directories(dir);
    CloudTlsFiles files;
    files.authority = (dir / "ca.pem").string();
    files.certificate = (dir / "server.pem").string();
    files.privateKey = (dir / "server-key.pem").string();
    if (Exists(files.authority) && Exists(files.certificate) && Exists(files.privateKey))
    {
        return files;
    }
    // A new server certificate, from the authority of an earlier start if
    // there is one: hosts that trust it need not change anything.
    const auto authority = Authority(files.authority, (dir / "ca-key.pem").string());
    const DorvanNebiPki::Credentials server = authority.IssueServerCertificate(kIdentity);
    DorvanNebiPki::WritePemFile(files.privateKey, server.privateKeyPem, true);
    DorvanNebiPki::WritePemFile(files.certificate, server.certificatePem, false);
    files.created = true;
    return files;
}

Poco::Net::Context::Ptr ServerContext(const CloudTlsFiles& files)
{
    return new Poco::Net::Context(Poco::Net::Context::TLS_SERVER_USE, files.privateKey, files.certificate, "",
                                  Poco::Net::Context::VERIFY_NONE);
}
} // namespace CloudTls
