#pragma once

// TLS for the cloud is the host's business: the connector's HTTPS requests
// use the process's default client context of POCO's SSLManager, which the
// host sets up before the first request.

#include <wx/string.h>

namespace ClientTls
{
// Makes every HTTPS connection of this process verify the server's
// certificate chain and name, and refuse an invalid certificate. The chain
// must lead to the certificate authority in caFile (PEM), or, when caFile is
// empty, to one of the system's. Returns false, with the reason in error,
// when caFile cannot be used.
bool TrustCertificates(const wxString& caFile, wxString& error);
} // namespace ClientTls
