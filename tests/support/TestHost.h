#pragma once

// The host that the tests run in: a wxAppConsole whose standard paths point
// into a sandbox directory of this process, and the means to run its event
// loop until something has happened.
//
// Every test runs in a process of its own (CTest starts one per test), so
// each has its own connector, its own "quarlconfig.json" and its own user
// data directory, and tests may run in parallel.

#include <wx/string.h>

#include <chrono>
#include <functional>
#include <string>

namespace TestSupport
{
using namespace std::chrono_literals;

// Creates the application object and the sandbox; called once by main().
void StartTestHost(int argc, char** argv);
// Removes the sandbox. The application object and whatever the connector
// started stay until the process ends.
void StopTestHost();

// This process's directories: the one the host's executable seems to live in
// (where "quarlconfig.json" belongs) and the user data directory.
wxString SandboxDir();
wxString ExecutableDir();
wxString UserDataDir();

// Where the test program itself and the helper programs built with it lie
// (the build tree's bin/), and the path of the helper program called name
// there, with ".exe" on Windows.
wxString ProgramDir();
wxString HelperProgram(const wxString& name);

// Writes "quarlconfig.json" beside the executable. Do it before the first
// use of the connector, which reads the file once.
void WriteCloudConfig(const std::string& json);

// Runs the host's event loop until condition() is true or timeout passed;
// returns whether the condition held. The condition is checked on the GUI
// thread between events.
bool RunEventLoopUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout = 10s);

// Runs the host's event loop for the whole duration: for checking that
// nothing (more) arrives.
void RunEventLoopFor(std::chrono::milliseconds duration);

// Everything logged by this process so far (the log file of the sandbox).
std::string LogText();
// How many log lines contain text.
std::size_t CountLogLines(const std::string& text);

// Reads and writes whole files (binary).
std::string ReadFile(const wxString& path);
void WriteFile(const wxString& path, const std::string& content);
} // namespace TestSupport
