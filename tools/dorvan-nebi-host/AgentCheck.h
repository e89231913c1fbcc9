#pragma once

// Whether the local agent answers at all. The login component treats an
// agent it cannot reach like one that reports nobody signed in, so a host
// that wants to tell the two apart asks the agent once itself.

#include <functional>

namespace AgentCheck
{
// Sends one request to the agent on a thread of its own, so that the event
// loop keeps running, and calls done with the outcome on the GUI thread.
void Start(std::function<void(bool answered)> done);
} // namespace AgentCheck
