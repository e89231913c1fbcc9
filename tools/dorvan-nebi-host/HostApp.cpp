#include "HostApp.h"

#include "ClientTls.h"
#include "Console.h"

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>

#include <wx/filename.h>
#include <wx/utils.h>

#include <iostream>

bool HostApp::OnInit()
{
    if (!ReadCommandLine())
    {
        return false;
    }
    wxString error;
    if (!ClientTls::TrustCertificates(m_command.caFile, error))
    {
        Console::Error(error);
        return false;
    }
    UseLogFile();
    // The connector delivers its results through the event loop, which
    // wxWidgets makes only once OnRun runs and which the connector's threads
    // look up without a lock: started from the loop's first event, the
    // connector never meets a loop that is still being made.
    CallAfter([this] {
        StartConnector();
        LineUpSteps();
    });
    return true;
}

int HostApp::OnRun()
{
    wxAppConsole::OnRun(); // the event loop, until the script ends it
    return m_exitStatus;
}

int HostApp::OnExit()
{
    DorvanNebiConnectorContext::UninitializeDorvanNebiConnector();
    return wxAppConsole::OnExit();
}

bool HostApp::ReadCommandLine()
{
    std::vector<wxString> arguments;
    for (int i = 1; i < argc; ++i)
    {
        arguments.push_back(argv[i]);
    }
    wxString error;
    if (!ParseCommandLine(arguments, m_command, error))
    {
        Console::Error(error + " (see --help)");
        return false;
    }
    if (m_command.helpRequested)
    {
        std::cout << Usage().utf8_string();
        m_exitStatus = kExitDone;
        return false;
    }
    if (m_command.name == "backup" && !wxFileName::FileExists(m_command.file))
    {
        Console::Error("no such file: " + m_command.file);
        return false;
    }
    return true;
}

void HostApp::UseLogFile()
{
    // The connector logs every exchange; the transcript shows the signals.
    wxString path;
    if (!wxGetEnv("DORVAN_LOG_FILE", &path) || path.empty())
    {
        wxFileName file(GlobalUtils::GetUserDataSubDir("dorvan-nebi-host"), wxEmptyString);
        file.SetFullName("dorvan-nebi-host.log");
        path = file.GetFullPath();
    }
    if (Logging::SetLogFile(path))
    {
        Logging::SetStderrEnabled(false);
        Console::Line("connector log: " + path);
    }
    else
    {
        Console::Error("cannot write the log file " + path + "; the connector logs to stderr");
    }
}

void HostApp::StartConnector()
{
    // The first use constructs the connector: it reads "quarlconfig.json"
    // beside this program and starts asking the agent who is signed in.
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    // Results reach this thread only through the event loop, which runs them
    // after the event that runs this: connected now, the slots miss nothing.
    m_printer = std::make_unique<SignalPrinter>();
    m_operations = std::make_unique<ConnectorOperations>();
}

void HostApp::LineUpSteps()
{
    m_script = std::make_unique<Script>(std::chrono::seconds(m_command.timeoutSeconds), [this](int status) {
        m_exitStatus = status;
        ExitMainLoop();
    });
    CommandSteps::AddStartup(*m_script, *m_operations);
    if (m_command.name == "session")
    {
        m_sessionSteps = std::make_unique<SessionSteps>(*m_operations);
        m_sessionSteps->AddTo(*m_script);
    }
    else
    {
        m_commandSteps = std::make_unique<CommandSteps>(*m_operations, m_command);
        m_commandSteps->AddTo(*m_script);
    }
    // The first step starts once the event loop runs.
    CallAfter([this] { m_script->Start(); });
}
