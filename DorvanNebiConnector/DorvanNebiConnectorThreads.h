#pragma once

// Where the connector's work runs: jobs on the worker pool, results on the
// host's GUI thread. Internal: not installed with the public headers.

#include <boost/asio/thread_pool.hpp>

#include <functional>

namespace DorvanNebiConnectorUtil
{
// Queues job on the pool and returns at once; the job never runs inside this
// call, not even when the caller is itself a worker. An exception that escapes
// the job is logged and goes no further, so a worker never dies of one.
void PostJob(boost::asio::thread_pool* pool, std::function<void()> job);

// Hands closure to the host's GUI thread through the application object; the
// host's event loop runs it later, and closures queued from one thread run in
// the order they were queued. The caller does not wait. Whatever the closure
// captures must be its own copy (each wxString a deep copy). Without an
// application object the closure is dropped with an error line in the log.
void PostToGuiThread(std::function<void()> closure);
} // namespace DorvanNebiConnectorUtil
