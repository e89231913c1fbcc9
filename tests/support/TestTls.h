#pragma once

// TLS for the loopback servers that play the cloud. The first use makes, for
// this process, a certificate authority and three server certificates in the
// sandbox: one for "localhost" and 127.0.0.1 issued by the authority, one
// self-signed for the same names, and one issued by the authority for another
// host name. No key is ever stored with the sources.

#include <Poco/Net/Context.h>
#include <wx/string.h>

namespace TestSupport
{
enum class ServerCertificate
{
    Localhost,  // issued by the test authority for "localhost" and 127.0.0.1
    SelfSigned, // the same names, but no authority vouches for it
    OtherHost   // issued by the test authority, for "other.invalid" only
};

// A server context for LoopbackServer's TLS constructor.
Poco::Net::Context::Ptr ServerTlsContext(ServerCertificate certificate = ServerCertificate::Localhost);

// Makes this process trust the test authority the way a host sets up its TLS:
// the default client context of POCO's SSLManager verifies the server's
// certificate chain against the authority and its name against the host
// asked for, and an invalid certificate is refused. Call before the first
// HTTPS request; later calls do nothing.
void TrustTestAuthority();

// The authority's certificate (PEM file), for other TLS clients.
wxString TestAuthorityFile();
} // namespace TestSupport
