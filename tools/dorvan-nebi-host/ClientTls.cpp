#include "ClientTls.h"

#include <CoreServices/SystemCertificates.h>

#include <Poco/Net/Context.h>
#include <Poco/Net/NetSSL.h>
#include <Poco/Net/RejectCertificateHandler.h>
#include <Poco/Net/SSLManager.h>
#include <wx/filename.h>

namespace ClientTls
{
bool TrustCertificates(const wxString& caFile, wxString& error)
{
    if (!caFile.empty() && !wxFileName::FileExists(caFile))
    {
        error = "the CA certificate file " + caFile + " does not exist";
        return false;
    }
    Poco::Net::initializeSSL();
    try
    {
        // With a CA file, that authority alone is trusted; without one, the
        // system's authorities are.
        Poco::Net::Context::Ptr context =
            new Poco::Net::Context(Poco::Net::Context::CLIENT_USE, "", "", caFile.utf8_string(),
                                   Poco::Net::Context::VERIFY_RELAXED, 9, false);
        if (caFile.empty())
        {
            // The system's authorities: on Windows those of its "ROOT"
            // certificate store, which OpenSSL alone would not find.
            SystemCertificates::TrustSystemRoots(*context);
        }
        // A certificate that fails verification is refused, never accepted.
        Poco::Net::SSLManager::instance().initializeClient(nullptr, new Poco::Net::RejectCertificateHandler(false),
                                                           context);
    }
    catch (const Poco::Exception& e)
    {
        error = "cannot use " + (caFile.empty() ? wxString("the system's CA store") : caFile) + ": " +
                wxString::FromUTF8(e.displayText());
        return false;
    }
    return true;
}
} // namespace ClientTls
