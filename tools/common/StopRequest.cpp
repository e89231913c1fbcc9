#include "StopRequest.h"

#include <boost/asio/io_context.hpp>
#include <boost/asio/signal_set.hpp>

#include <csignal>

#ifdef _WIN32
#include <Poco/NamedEvent.h>
#include <Poco/Process.h>

#include <thread>
#endif

struct StopRequest::State
{
    boost::asio::io_context context;
    boost::asio::signal_set signals{context, SIGINT, SIGTERM};
};

StopRequest::StopRequest() : m_state(std::make_shared<State>())
{
    // Ends run() in Wait(), whichever thread receives the signal.
    m_state->signals.async_wait([](const boost::system::error_code&, int) {});
#ifdef _WIN32
    // Created now, so that a request made from now on is kept until waited
    // for. The thread outlives Wait() when a signal came first; it holds
    // the state it uses.
    auto request = std::make_shared<Poco::NamedEvent>(Poco::ProcessImpl::terminationEventName(Poco::Process::id()));
    std::thread([request, state = m_state] {
        request->wait();
        state->context.stop();
    }).detach();
#endif
}

StopRequest::~StopRequest() = default;

void StopRequest::Wait()
{
    m_state->context.run();
}
