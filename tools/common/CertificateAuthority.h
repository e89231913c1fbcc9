#pragma once

// A small certificate authority for servers that stand in for the cloud on
// this machine (the test suite's loopback servers, the cloud stand-in). It
// makes EC P-256 keys, which are quick to generate, and certificates signed
// with SHA-256. Everything is handed out as PEM text; WritePemFile puts it on
// disk for TLS libraries that want files.
//
//     auto ca = DorvanNebiPki::CertificateAuthority::Create("Test authority");
//     auto server = ca.IssueServerCertificate({{"localhost"}, {"127.0.0.1"}});
//     DorvanNebiPki::WritePemFile(dir / "ca.pem", ca.GetCredentials().certificatePem, false);
//     DorvanNebiPki::WritePemFile(dir / "server-key.pem", server.privateKeyPem, true);
//
// Every function throws std::runtime_error, with OpenSSL's reason, when
// something cannot be made, read or written.

#include <filesystem>
#include <string>
#include <vector>

namespace DorvanNebiPki
{
inline constexpr int kDefaultAuthorityValidDays = 3650;
// Below the 825 days that TLS clients accept for a server certificate.
inline constexpr int kDefaultServerValidDays = 800;

// A certificate and its private key (PKCS #8), both PEM text.
struct Credentials
{
    std::string certificatePem;
    std::string privateKeyPem;
};

// The names a server certificate is valid for: its subjectAltName entries.
// The first DNS name (or else the first address) is also its common name.
struct ServerIdentity
{
    std::vector<std::string> dnsNames;    // "localhost", "cloud.example"
    std::vector<std::string> ipAddresses; // "127.0.0.1", "::1"
};

class CertificateAuthority
{
public:
    // A new authority: a fresh key and a self-signed CA certificate that may
    // sign server certificates (and no further authorities).
    static CertificateAuthority Create(const std::string& commonName, int validDays = kDefaultAuthorityValidDays);

    // An authority made earlier, from its certificate and key. Throws when the
    // texts do not parse, the key does not belong to the certificate, or the
    // certificate is no CA certificate.
    static CertificateAuthority Load(const Credentials& credentials);

    const Credentials& GetCredentials() const { return m_credentials; }

    // A certificate for a TLS server with the given names, signed by this
    // authority, with a key of its own. Needs at least one name or address.
    Credentials IssueServerCertificate(const ServerIdentity& identity,
                                       int validDays = kDefaultServerValidDays) const;

private:
    explicit CertificateAuthority(Credentials credentials);

    Credentials m_credentials;
};

// A server certificate signed with its own key: no authority vouches for it,
// so a client that verifies certificates refuses it.
Credentials MakeSelfSignedServerCertificate(const ServerIdentity& identity,
                                            int validDays = kDefaultServerValidDays);

// Writes the PEM text to path, replacing what was there. A private key's file
// is made readable and writable by its owner only, before the key goes in.
void WritePemFile(const std::filesystem::path& path, const std::string& pem, bool isPrivateKey);

// The whole content of a PEM file.
std::string ReadPemFile(const std::filesystem::path& path);
} // namespace DorvanNebiPki
