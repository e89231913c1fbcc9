#pragma once

// The programs of the end-to-end tests as real processes: the stand-ins of
// the local agent and the cloud on free loopback ports, and runs of the
// demonstration host against them. Everything lives in the test's sandbox.

#include <Poco/Pipe.h>
#include <Poco/Process.h>

#include <chrono>
#include <condition_variable>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace EndToEnd
{
using namespace std::chrono_literals;

// The stand-ins' programs, beside the test program.
std::string AgentProgram();
std::string CloudProgram();

// A program started by a test, with its stdout and stderr collected. Ended,
// if it still runs, when the object goes.
class ChildProcess
{
public:
    ChildProcess(const std::string& program, const std::vector<std::string>& arguments,
                 const std::map<std::string, std::string>& environment = {});
    ~ChildProcess();

    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // Waits until the output holds text; returns the output up to the end
    // of that line, or an empty string when it did not come (or the process
    // ended first).
    std::string WaitForOutput(const std::string& text, std::chrono::milliseconds timeout = 20s);
    // Waits until the process ends (killing it after timeout); its exit code.
    int WaitForExit(std::chrono::milliseconds timeout = 90s);
    // Asks it to stop as Ctrl+C would, and waits; its exit code.
    int Stop();

    // Whether it still runs: a process that ended, crashed or not, has
    // closed its output.
    bool IsRunning() const;
    std::string Output() const;

private:
    void Collect();
    void Kill();

    Poco::Pipe m_pipe; // stdout and stderr of the process
    std::unique_ptr<Poco::ProcessHandle> m_handle;
    std::thread m_reader;
    mutable std::mutex m_mutex;
    std::condition_variable m_changed;
    std::string m_output;
    bool m_outputEnded = false; // the process has ended (or closed its output)
    int m_exitCode = -1;
    bool m_reaped = false;
};

// The agent stand-in on a free port, with extra options.
class Agent
{
public:
    explicit Agent(const std::vector<std::string>& options = {});
    unsigned short Port() const { return m_port; }
    ChildProcess& Process() { return *m_process; }

private:
    std::unique_ptr<ChildProcess> m_process;
    unsigned short m_port = 0;
};

// The cloud stand-in on a free port, keeping its data in dataDir.
class Cloud
{
public:
    explicit Cloud(const std::string& dataDir, const std::vector<std::string>& options = {});
    unsigned short Port() const { return m_port; }
    const std::string& CaFile() const { return m_caFile; }
    ChildProcess& Process() { return *m_process; }

private:
    std::unique_ptr<ChildProcess> m_process;
    unsigned short m_port = 0;
    std::string m_caFile;
};

struct HostResult
{
    int status = -1;
    std::string output;
};

// A copy of the demonstration host in its own directory of the sandbox, with
// its own "quarlconfig.json", user data directory and log file.
class Host
{
public:
    Host();

    // Points the host at the agent and the cloud.
    void Configure(unsigned short agentPort, unsigned short cloudPort);
    // Runs the host once with the arguments and waits for it to end.
    HostResult Run(const std::vector<std::string>& arguments) const;

    const std::string& Directory() const { return m_directory; }
    const std::string& UserDataDir() const { return m_userData; }

private:
    // The copy's path within the sandbox.
    static std::string HostProgramName();

    std::string m_directory;
    std::string m_program;
    std::string m_userData;
};

// The path of name in the sandbox directory of the running test.
std::string SandboxPath(const std::string& name);
std::string ReadWholeFile(const std::string& path);
void WriteWholeFile(const std::string& path, const std::string& content);
std::string RandomBytes(std::size_t size);
bool FileExists(const std::string& path);
// The files in directory whose names end in suffix.
std::vector<std::string> FilesEndingIn(const std::string& directory, const std::string& suffix);
} // namespace EndToEnd
