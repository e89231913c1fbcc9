// The small certificate authority that makes the test servers' certificates
// (and a cloud stand-in's): what it issues, and what it refuses to load.

#include "TestHost.h"

#include <CertificateAuthority.h>
#include <CoreServices/GlobalUtils.h>

#include <Poco/Crypto/X509Certificate.h>
#include <Poco/Net/X509Certificate.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>
#include <stdexcept>

namespace
{
Poco::Crypto::X509Certificate Certificate(const std::string& pem)
{
    std::istringstream text(pem);
    return Poco::Crypto::X509Certificate(text);
}
} // namespace

TEST(CertificateAuthority, ReloadedAuthorityIssuesCertificatesForExactlyTheGivenNames)
{
    using namespace DorvanNebiPki;
    const CertificateAuthority created = CertificateAuthority::Create("Stand-in authority");
    const std::filesystem::path directory = GlobalUtils::ToFileSystemPath(TestSupport::SandboxDir());
    WritePemFile(directory / "ca.pem", created.GetCredentials().certificatePem, false);
    WritePemFile(directory / "ca-key.pem", created.GetCredentials().privateKeyPem, true);
#ifndef _WIN32
    // POSIX permission bits. Windows has none to check: std::filesystem
    // there mirrors the read-only flag into every class, and who may read a
    // file is the business of its folder's access control list.
    const auto keyPermissions = std::filesystem::status(directory / "ca-key.pem").permissions();
    EXPECT_EQ(keyPermissions & (std::filesystem::perms::group_all | std::filesystem::perms::others_all),
              std::filesystem::perms::none);
#endif

    // As a stand-in does at its second start: the authority from its files.
    const CertificateAuthority loaded = CertificateAuthority::Load(
        Credentials{ReadPemFile(directory / "ca.pem"), ReadPemFile(directory / "ca-key.pem")});
    const Credentials server = loaded.IssueServerCertificate({{"localhost", "cloud.test"}, {"127.0.0.1", "::1"}});

    const Poco::Crypto::X509Certificate authority = Certificate(created.GetCredentials().certificatePem);
    const Poco::Crypto::X509Certificate issued = Certificate(server.certificatePem);
    EXPECT_TRUE(issued.issuedBy(authority));
    EXPECT_EQ(issued.commonName(), "localhost");
    for (const char* name : {"localhost", "cloud.test", "127.0.0.1"})
    {
        EXPECT_TRUE(Poco::Net::X509Certificate::verify(issued, name)) << name;
    }
    EXPECT_FALSE(Poco::Net::X509Certificate::verify(issued, "other.test"));

    const Credentials selfSigned = MakeSelfSignedServerCertificate({{"localhost"}, {}});
    EXPECT_FALSE(Certificate(selfSigned.certificatePem).issuedBy(authority));
    EXPECT_TRUE(Certificate(selfSigned.certificatePem).issuedBy(Certificate(selfSigned.certificatePem)));
}

TEST(CertificateAuthority, RefusesWhatCannotServe)
{
    using namespace DorvanNebiPki;
    const CertificateAuthority authority = CertificateAuthority::Create("A");
    const Credentials server = authority.IssueServerCertificate({{"localhost"}, {}});
    // A server certificate is no authority; a key must belong to its certificate.
    EXPECT_THROW(CertificateAuthority::Load(server), std::runtime_error);
    EXPECT_THROW(CertificateAuthority::Load({authority.GetCredentials().certificatePem, server.privateKeyPem}),
                 std::runtime_error);
    EXPECT_THROW(CertificateAuthority::Load({"no PEM", "at all"}), std::runtime_error);
    EXPECT_THROW(authority.IssueServerCertificate({{}, {}}), std::runtime_error);
    EXPECT_THROW(authority.IssueServerCertificate({{}, {"not-an-address"}}), std::runtime_error);
}
