#pragma once

// How a stand-in learns that it is to stop: Ctrl+C or SIGTERM and, on
// Windows, which has no SIGTERM, also POCO's termination request
// (Poco::Process::requestTermination, which sets a named event of the
// process). Construct it before announcing that the stand-in is ready, so
// that no request made after that announcement is missed.

#include <memory>

class StopRequest
{
public:
    StopRequest();
    ~StopRequest();

    StopRequest(const StopRequest&) = delete;
    StopRequest& operator=(const StopRequest&) = delete;

    // Returns once a stop has been asked for.
    void Wait();

private:
    struct State;
    std::shared_ptr<State> m_state;
};
