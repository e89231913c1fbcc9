#include "Processes.h"

#include "TestHost.h"

#include <CoreServices/GlobalUtils.h>

#include <Poco/Environment.h>
#include <Poco/Exception.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <sstream>
#include <stdexcept>

namespace EndToEnd
{
namespace
{
unsigned short PortIn(const std::string& line, const std::string& scheme)
{
    const std::string prefix = scheme + "://127.0.0.1:";
    const std::size_t at = line.find(prefix);
    if (at == std::string::npos)
    {
        throw std::runtime_error("no " + scheme + " address in: " + line);
    }
    return static_cast<unsigned short>(std::stoul(line.substr(at + prefix.size())));
}

std::string LastLine(const std::string& text)
{
    const std::size_t end = text.find_last_not_of('\n');
    const std::size_t begin = text.find_last_of('\n', end);
    return text.substr(begin == std::string::npos ? 0 : begin + 1,
                       end - (begin == std::string::npos ? 0 : begin + 1) + 1);
}
} // namespace

std::string AgentProgram()
{
    return TestSupport::HelperProgram("quarl-agent-sim").utf8_string();
}

std::string CloudProgram()
{
    return TestSupport::HelperProgram("nebi-cloud-sim").utf8_string();
}

ChildProcess::ChildProcess(const std::string& program, const std::vector<std::string>& arguments,
                           const std::map<std::string, std::string>& environment)
{
    Poco::Process::Env env(environment.begin(), environment.end());
    m_handle = std::make_unique<Poco::ProcessHandle>(
        Poco::Process::launch(program, arguments, std::string(), nullptr, &m_pipe, &m_pipe, env));
    m_reader = std::thread([this] { Collect(); });
}

ChildProcess::~ChildProcess()
{
    if (IsRunning())
    {
        Kill();
    }
    WaitForExit(10s);
    if (m_reader.joinable())
    {
        m_reader.join();
    }
}

void ChildProcess::Kill()
{
    try
    {
        // By process id: killing by handle would close the handle on
        // Windows, after which the process could no longer be waited for.
        Poco::Process::kill(m_handle->id());
    }
    catch (const Poco::Exception&)
    {
        // It ended meanwhile (Windows refuses to end a process that has).
    }
}

void ChildProcess::Collect()
{
    char buffer[4096];
    for (;;)
    {
        const int got = m_pipe.readBytes(buffer, sizeof(buffer));
        std::lock_guard<std::mutex> lock(m_mutex);
        if (got <= 0)
        {
            m_outputEnded = true;
            m_changed.notify_all();
            return;
        }
        // Text: Windows ends the lines of a program's console output with
        // CR LF; keep the LF alone, as elsewhere.
        for (int i = 0; i < got; ++i)
        {
            if (buffer[i] != '\r')
            {
                m_output += buffer[i];
            }
        }
        m_changed.notify_all();
    }
}

std::string ChildProcess::WaitForOutput(const std::string& text, std::chrono::milliseconds timeout)
{
    std::unique_lock<std::mutex> lock(m_mutex);
    std::size_t at = std::string::npos;
    m_changed.wait_for(lock, timeout, [&] {
        at = m_output.find(text);
        return at != std::string::npos || m_outputEnded;
    });
    if (at == std::string::npos)
    {
        return std::string();
    }
    const std::size_t end = m_output.find('\n', at);
    return m_output.substr(0, end == std::string::npos ? std::string::npos : end);
}

int ChildProcess::WaitForExit(std::chrono::milliseconds timeout)
{
    {
        std::unique_lock<std::mutex> lock(m_mutex);
        if (!m_changed.wait_for(lock, timeout, [this] { return m_outputEnded; }))
        {
            lock.unlock();
            Kill();
        }
    }
    if (!m_reaped)
    {
        m_exitCode = m_handle->wait();
        m_reaped = true;
    }
    return m_exitCode;
}

int ChildProcess::Stop()
{
    if (IsRunning())
    {
        Poco::Process::requestTermination(m_handle->id());
    }
    return WaitForExit(20s);
}

bool ChildProcess::IsRunning() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return !m_outputEnded;
}

std::string ChildProcess::Output() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return m_output;
}

Agent::Agent(const std::vector<std::string>& options)
{
    std::vector<std::string> arguments{"--port", "0"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    m_process = std::make_unique<ChildProcess>(AgentProgram(), arguments);
    const std::string started = m_process->WaitForOutput("listening on");
    if (started.empty())
    {
        throw std::runtime_error("the agent stand-in did not start: " + m_process->Output());
    }
    m_port = PortIn(LastLine(started), "http");
}

Cloud::Cloud(const std::string& dataDir, const std::vector<std::string>& options)
{
    std::vector<std::string> arguments{"--port", "0", "--data", dataDir};
    arguments.insert(arguments.end(), options.begin(), options.end());
    m_process = std::make_unique<ChildProcess>(CloudProgram(), arguments);
    const std::string started = m_process->WaitForOutput("CA certificate");
    if (started.empty())
    {
        throw std::runtime_error("the cloud stand-in did not start: " + m_process->Output());
    }
    m_port = PortIn(m_process->WaitForOutput("listening on"), "https");
    const std::string caLine = LastLine(started);
    m_caFile = caLine.substr(caLine.find(": ") + 2);
}

Host::Host()
    : m_directory(SandboxPath("host")), m_program(SandboxPath(HostProgramName())),
      m_userData(SandboxPath("host-userdata"))
{
    std::filesystem::create_directories(std::filesystem::u8path(m_directory));
    std::filesystem::create_directories(std::filesystem::u8path(m_userData));
    // The host reads "quarlconfig.json" beside itself: a copy of its own.
    std::filesystem::copy_file(GlobalUtils::ToFileSystemPath(TestSupport::HelperProgram("dorvan-nebi-host")),
                               std::filesystem::u8path(m_program));
}

std::string Host::HostProgramName()
{
#ifdef _WIN32
    return "host/dorvan-nebi-host.exe";
#else
    return "host/dorvan-nebi-host";
#endif
}

void Host::Configure(unsigned short agentPort, unsigned short cloudPort)
{
    WriteWholeFile(m_directory + "/quarlconfig.json", "{\"quarlport\": \"" + std::to_string(agentPort) +
                                                          "\", \"nebidomain\": \"127.0.0.1\", "
                                                          "\"nebiport\": \"" +
                                                          std::to_string(cloudPort) + "\"}");
}

HostResult Host::Run(const std::vector<std::string>& arguments) const
{
    std::map<std::string, std::string> environment{
        {"DORVAN_USER_DATA_DIR", m_userData}, {"DORVAN_LOG_FILE", SandboxPath("host.log")}, {"LC_ALL", "C.UTF-8"}};
#ifdef _WIN32
    // The copy has no DLLs beside it: Windows finds them on the PATH, here
    // the build tree's folder of programs and DLLs.
    const std::string path = Poco::Environment::get("PATH", "");
    environment["PATH"] = TestSupport::ProgramDir().utf8_string() + (path.empty() ? "" : ";" + path);
#endif
    ChildProcess host(m_program, arguments, environment);
    HostResult result;
    result.status = host.WaitForExit();
    result.output = host.Output();
    return result;
}

std::string SandboxPath(const std::string& name)
{
    // A directory per test, so that tests run in one process do not meet.
    const ::testing::TestInfo* test = ::testing::UnitTest::GetInstance()->current_test_info();
    const std::string directory = TestSupport::SandboxDir().utf8_string() + "/" +
                                  (test ? std::string(test->test_suite_name()) + "." + test->name() : "shared");
    std::filesystem::create_directories(std::filesystem::u8path(directory));
    return directory + "/" + name;
}

std::string ReadWholeFile(const std::string& path)
{
    std::ifstream file(std::filesystem::u8path(path), std::ios::binary);
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}

void WriteWholeFile(const std::string& path, const std::string& content)
{
    std::ofstream file(std::filesystem::u8path(path), std::ios::binary | std::ios::trunc);
    file << content;
    if (!file)
    {
        throw std::runtime_error("cannot write " + path);
    }
}

std::string RandomBytes(std::size_t size)
{
    std::mt19937 random(std::random_device{}());
    std::string bytes(size, '\0');
    for (char& byte : bytes)
    {
        byte = static_cast<char>(random() & 0xFF);
    }
    return bytes;
}

bool FileExists(const std::string& path)
{
    return std::filesystem::exists(std::filesystem::u8path(path));
}

std::vector<std::string> FilesEndingIn(const std::string& directory, const std::string& suffix)
{
    std::vector<std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator(std::filesystem::u8path(directory)))
    {
        const std::string name = entry.path().filename().u8string();
        if (name.size() >= suffix.size() && name.compare(name.size() - suffix.size(), suffix.size(), suffix) == 0)
        {
            found.push_back(entry.path().u8string());
        }
    }
    return found;
}
} // namespace EndToEnd
