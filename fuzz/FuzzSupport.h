#pragma once

// What every fuzz target does once before its first input.

#include <CoreServices/Logger.h>

#include <wx/init.h>

#include <cstdio>
#include <cstdlib>

namespace FuzzSupport
{
// The wxWidgets base library set up for the process, and the log lines that
// the readers write for odd input kept off the console.
inline void Initialize()
{
    static wxInitializer initializer;
    Logging::SetStderrEnabled(false);
}

// Ends the run with a report when an invariant does not hold.
[[noreturn]] inline void Fail(const char* what)
{
    std::fprintf(stderr, "invariant broken: %s\n", what);
    std::abort();
}
} // namespace FuzzSupport
