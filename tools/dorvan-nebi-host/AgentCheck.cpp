#include "AgentCheck.h"

#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>

#include <wx/app.h>

#include <string>
#include <thread>

namespace AgentCheck
{
void Start(std::function<void(bool answered)> done)
{
    // The URI is built here, on the GUI thread; the exchange runs on the thread.
    const Poco::URI uri = DorvanNebiConnectorUtil::MakeLocalhostURI("/nebilogin");
    std::thread([uri, done] {
        std::string body;
        const bool answered = DorvanNebiConnectorUtil::SendHTTPRequest(uri, body);
        wxTheApp->CallAfter([done, answered] { done(answered); });
    }).detach();
}
} // namespace AgentCheck
