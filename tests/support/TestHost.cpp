#include "TestHost.h"

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>

#include <wx/app.h>
#include <wx/apptrait.h>
#include <wx/evtloop.h>
#include <wx/filename.h>
#include <wx/init.h>
#include <wx/stdpaths.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <stdexcept>

namespace TestSupport
{
namespace
{
wxString g_sandbox;
// One event loop for the whole process, active from start to end: workers
// wake it up from their threads, so it must never go away under them.
wxEventLoopBase* g_loop = nullptr;

wxString Join(const wxString& directory, const wxString& name)
{
    return directory + wxFileName::GetPathSeparator() + name;
}

// The host's standard paths, moved into the sandbox.
class SandboxPaths : public wxStandardPaths
{
public:
    wxString GetExecutablePath() const override
    {
        return Join(ExecutableDir(), wxFileName(wxStandardPaths::GetExecutablePath()).GetFullName());
    }
    wxString GetUserDataDir() const override { return UserDataDir(); }
};

class SandboxTraits : public wxConsoleAppTraits
{
public:
    wxStandardPaths& GetStandardPaths() override { return m_paths; }

private:
    SandboxPaths m_paths;
};

class TestHostApp : public wxAppConsole
{
public:
    bool OnInit() override { return true; }

protected:
    wxAppTraits* CreateTraits() override { return new SandboxTraits(); }
};

void MakeSandbox()
{
    const std::filesystem::path root = std::filesystem::temp_directory_path() /
                                       ("dorvan-nebi-test-" + GlobalUtils::GetUUID().ToStdString());
    std::filesystem::create_directories(root / "bin");
    std::filesystem::create_directories(root / "userdata");
    g_sandbox = wxString(root.u8string().c_str(), wxConvUTF8);
}
} // namespace

void StartTestHost(int argc, char** argv)
{
    MakeSandbox();
    wxApp::SetInstance(new TestHostApp());
    if (!wxEntryStart(argc, argv) || !wxTheApp->CallOnInit())
    {
        throw std::runtime_error("the test host's application object did not start");
    }
    Logging::SetLogFile(Join(g_sandbox, "test.log"));
    g_loop = wxTheApp->GetTraits()->CreateEventLoop();
    wxEventLoopBase::SetActive(g_loop);
}

void StopTestHost()
{
    Logging::SetLogFile(wxString());
    std::error_code ignored;
    std::filesystem::remove_all(GlobalUtils::ToFileSystemPath(g_sandbox), ignored);
}

wxString SandboxDir()
{
    return g_sandbox;
}

wxString ExecutableDir()
{
    return Join(g_sandbox, "bin");
}

wxString UserDataDir()
{
    return Join(g_sandbox, "userdata");
}

wxString ProgramDir()
{
    // The standard paths' own answer, not the sandbox's.
    return wxFileName(wxStandardPaths::Get().wxStandardPaths::GetExecutablePath()).GetPath();
}

wxString HelperProgram(const wxString& name)
{
#ifdef _WIN32
    return Join(ProgramDir(), name + ".exe");
#else
    return Join(ProgramDir(), name);
#endif
}

void WriteCloudConfig(const std::string& json)
{
    WriteFile(Join(ExecutableDir(), "quarlconfig.json"), json);
}

bool RunEventLoopUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout)
{
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    for (;;)
    {
        wxTheApp->ProcessPendingEvents();
        if (condition())
        {
            return true;
        }
        const auto now = std::chrono::steady_clock::now();
        if (now >= deadline)
        {
            return false;
        }
        // Sleeps until a worker queues an event (which wakes the loop up) or
        // a short while has passed.
        const auto wait = std::min(std::chrono::duration_cast<std::chrono::milliseconds>(deadline - now), 20ms);
        g_loop->DispatchTimeout(static_cast<unsigned long>(wait.count()));
    }
}

void RunEventLoopFor(std::chrono::milliseconds duration)
{
    RunEventLoopUntil([] { return false; }, duration);
}

std::string LogText()
{
    return ReadFile(Join(g_sandbox, "test.log"));
}

std::size_t CountLogLines(const std::string& text)
{
    std::istringstream lines(LogText());
    std::size_t count = 0;
    for (std::string line; std::getline(lines, line);)
    {
        if (line.find(text) != std::string::npos)
        {
            ++count;
        }
    }
    return count;
}

std::string ReadFile(const wxString& path)
{
    std::ifstream file(GlobalUtils::ToFileSystemPath(path), std::ios::binary);
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}

void WriteFile(const wxString& path, const std::string& content)
{
    std::ofstream file(GlobalUtils::ToFileSystemPath(path), std::ios::binary | std::ios::trunc);
    file.write(content.data(), static_cast<std::streamsize>(content.size()));
    if (!file)
    {
        throw std::runtime_error("cannot write " + path.ToStdString());
    }
}
} // namespace TestSupport
