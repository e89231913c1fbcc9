#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <CoreServices/Logger.h>

#include <boost/asio/post.hpp>
#include <wx/app.h>

#include <exception>
#include <utility>

namespace DorvanNebiConnectorUtil
{
void PostJob(boost::asio::thread_pool* pool, std::function<void()> job)
{
    boost::asio::post(*pool, [job = std::move(job)]() {
        try
        {
            job();
        }
        catch (const std::exception& e)
        {
            SetLevelAndGetLogger(SeverityError, DorvanNebiConstants::kLogSourceConnector,
                                 "DorvanNebiConnectorUtil::PostJob", __LINE__)
                << "a job ended with an exception, message " << e.what();
        }
        catch (...)
        {
            SetLevelAndGetLogger(SeverityError, DorvanNebiConstants::kLogSourceConnector,
                                 "DorvanNebiConnectorUtil::PostJob", __LINE__)
                << "a job ended with an unknown exception";
        }
    });
}

void PostToGuiThread(std::function<void()> closure)
{
    wxAppConsole* const app = wxTheApp;
    if (!app)
    {
        SetLevelAndGetLogger(SeverityError, DorvanNebiConstants::kLogSourceConnector,
                             "DorvanNebiConnectorUtil::PostToGuiThread", __LINE__)
            << "no application object: a result for the host was dropped";
        return;
    }
    // CallAfter queues the closure with the application's thread-safe
    // QueueEvent; the host's event loop runs it on the GUI thread.
    app->CallAfter(std::move(closure));
}
} // namespace DorvanNebiConnectorUtil
