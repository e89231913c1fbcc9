#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <CoreServices/Logger.h>

#include <Poco/Exception.h>
#include <Poco/Net/HTTPSession.h>
#include <Poco/Net/SecureStreamSocketImpl.h>
#include <boost/asio/post.hpp>
#include <wx/app.h>

#include <atomic>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <set>
#include <utility>

namespace
{
#ifndef _WIN32
// How long an exiting process waits for jobs that are running.
constexpr std::chrono::seconds kExitGracePeriod(2);
#endif

// The jobs running now, and whether the process is exiting. Never destroyed:
// workers may still look at it while the process ends.
struct WorkState
{
    std::mutex mutex;
    std::condition_variable changed;
    int running = 0;
    // Written under the mutex, except on Windows at exit (see OnProcessExit).
    std::atomic<bool> exiting{false};
    // The sessions over which running jobs exchange with a peer now.
    std::set<Poco::Net::HTTPSession*> sessions;
};

WorkState& State()
{
    static WorkState* state = new WorkState();
    return *state;
}

bool BeginJob()
{
    WorkState& state = State();
    std::lock_guard<std::mutex> lock(state.mutex);
    if (state.exiting)
    {
        return false;
    }
    ++state.running;
    return true;
}

void EndJob()
{
    WorkState& state = State();
    {
        std::lock_guard<std::mutex> lock(state.mutex);
        --state.running;
    }
    state.changed.notify_all();
}

bool IsExiting()
{
    WorkState& state = State();
    std::lock_guard<std::mutex> lock(state.mutex);
    return state.exiting.load();
}

#ifndef _WIN32
// Shuts the session's TCP connection down, which wakes its owner from any
// wait on the peer; the owner's thread alone closes the socket and frees it.
// For TLS only the TCP connection is shut down: the TLS state belongs to the
// owner's thread.
void CutConnection(Poco::Net::HTTPSession& session)
{
    try
    {
        Poco::Net::SocketImpl* const socket = session.socket().impl();
        if (auto* secure = dynamic_cast<Poco::Net::SecureStreamSocketImpl*>(socket))
        {
            secure->abort();
        }
        else if (socket->initialized())
        {
            socket->shutdown();
        }
    }
    catch (...)
    {
        // Not connected (yet, or any more): nothing to cut.
    }
}
#endif

void RunGuarded(const std::function<void()>& job)
{
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
}
} // namespace

namespace DorvanNebiConnectorUtil
{
void PostJob(boost::asio::thread_pool* pool, std::function<void()> job)
{
    boost::asio::post(*pool, [job = std::move(job)]() {
        if (!BeginJob())
        {
            return;
        }
        RunGuarded(job);
        EndJob();
    });
}

void PostToGuiThread(std::function<void()> closure)
{
    if (IsExiting())
    {
        return;
    }
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

bool PauseUnlessExiting(std::chrono::milliseconds duration)
{
    WorkState& state = State();
    std::unique_lock<std::mutex> lock(state.mutex);
    return !state.changed.wait_for(lock, duration, [&state] { return state.exiting.load(); });
}

ConnectionCutAtExit::ConnectionCutAtExit(Poco::Net::HTTPSession& session) : m_session(session)
{
    WorkState& state = State();
    std::lock_guard<std::mutex> lock(state.mutex);
    if (state.exiting)
    {
        throw Poco::IllegalStateException("the process is exiting");
    }
    state.sessions.insert(&m_session);
}

ConnectionCutAtExit::~ConnectionCutAtExit()
{
    // Under the lock: the session is not cut while it goes away.
    WorkState& state = State();
    std::lock_guard<std::mutex> lock(state.mutex);
    state.sessions.erase(&m_session);
}

void OnProcessExit()
{
    WorkState& state = State();
#ifdef _WIN32
    // A DLL's exit handlers run when ExitProcess has already ended every
    // other thread, wherever it was: a worker may have died holding the
    // mutex, or waiting on the condition variable, whose broadcast would then
    // wait for that dead waiter for ever. Touch neither; no job runs any more
    // anyway, and the connections die with the process.
    state.exiting.store(true);
#else
    std::unique_lock<std::mutex> lock(state.mutex);
    state.exiting.store(true);
    state.changed.notify_all();
    // The workers are still running and about to lose the libraries under
    // their feet: whatever they wait for is cut short, and they get a little
    // while to end.
    for (Poco::Net::HTTPSession* session : state.sessions)
    {
        CutConnection(*session);
    }
    state.changed.wait_for(lock, kExitGracePeriod, [&state] { return state.running == 0; });
#endif
}
} // namespace DorvanNebiConnectorUtil
