#pragma once

#include <CoreServices/CoreServicesExport.h>

#include <cstddef>

namespace Poco::Net
{
class Context;
}

namespace SystemCertificates
{
// Makes a POCO client context trust the certificate authorities that the
// operating system trusts, for verifying the servers it connects to:
//
// - Windows: OpenSSL knows no certificate store there, so every certificate
//   of the system store "ROOT" (the current user's view of it: the machine's
//   trusted roots and the user's own) is copied into the context's OpenSSL
//   certificate store. Returns how many were copied; 0 when the store cannot
//   be opened (logged) or is empty. Certificates OpenSSL cannot read are
//   skipped.
// - Elsewhere: OpenSSL's default locations (the system's CA bundle, or the
//   file and folder that SSL_CERT_FILE and SSL_CERT_DIR name) are added to
//   the context. Returns 0: OpenSSL reads those locations when it verifies.
//
// Adds to what the context already trusts and never throws. Call it once per
// context, before the context's first connection.
CORESERVICES_EXPORT std::size_t TrustSystemRoots(Poco::Net::Context& context);

#ifdef _WIN32
// Windows: copies every certificate of the current user's system store
// storeName ("ROOT", "CA", or a store of the host's own) into the context's
// certificate store, as trusted authorities. Returns how many were copied;
// 0 when the store cannot be opened (logged) or is empty.
CORESERVICES_EXPORT std::size_t TrustWindowsStore(Poco::Net::Context& context, const wchar_t* storeName);
#endif
} // namespace SystemCertificates
