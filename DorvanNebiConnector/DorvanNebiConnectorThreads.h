#pragma once

// Where the connector's work runs: jobs on the worker pool, results on the
// host's GUI thread, and what becomes of both when the process exits.
// Internal: not installed with the public headers.

#include <boost/asio/thread_pool.hpp>

#include <chrono>
#include <functional>

namespace Poco::Net
{
class HTTPSession;
}

namespace DorvanNebiConnectorUtil
{
// Queues job on the pool and returns at once; the job never runs inside this
// call, not even when the caller is itself a worker. An exception that escapes
// the job is logged and goes no further, so a worker never dies of one. Once
// the process has begun to exit, queued jobs no longer start.
void PostJob(boost::asio::thread_pool* pool, std::function<void()> job);

// Hands closure to the host's GUI thread through the application object; the
// host's event loop runs it later, and closures queued from one thread run in
// the order they were queued. The caller does not wait. Whatever the closure
// captures must be its own copy (each wxString a deep copy). Without an
// application object the closure is dropped with an error line in the log;
// once the process has begun to exit it is dropped silently.
void PostToGuiThread(std::function<void()> closure);

// Waits for duration, unless the process begins to exit meanwhile. Returns
// false when it is exiting: the caller then stops.
bool PauseUnlessExiting(std::chrono::milliseconds duration);

// Held by a job for as long as it exchanges with a peer over session: when
// the process begins to exit, the session's connection is cut (the TCP
// connection shut down, without a TLS goodbye), so that a job waiting for a
// peer that does not answer ends at once with a failed exchange instead of
// outliving the libraries it uses. Throws Poco::IllegalStateException when
// the process is already exiting: no exchange begins then.
class ConnectionCutAtExit
{
public:
    explicit ConnectionCutAtExit(Poco::Net::HTTPSession& session);
    ~ConnectionCutAtExit();

    ConnectionCutAtExit(const ConnectionCutAtExit&) = delete;
    ConnectionCutAtExit& operator=(const ConnectionCutAtExit&) = delete;

private:
    Poco::Net::HTTPSession& m_session;
};

// Called once the process begins to exit (registered with std::atexit when the
// connector is constructed, after OpenSSL has been initialised, so that it
// runs before OpenSSL and the other libraries the jobs use are torn down): no
// queued job starts any more, pauses end, nothing more is delivered, the
// connections of running jobs are cut, and those jobs get a short while to
// end. Only a job still connecting to a peer that does not answer may outlast
// that while; it is left to the end of the process.
void OnProcessExit();
} // namespace DorvanNebiConnectorUtil
