#pragma once

// The host application: a wxAppConsole whose event loop runs the connector's
// results. OnInit reads the command line, sets up TLS, starts the connector,
// connects to its signals and lines up the command's steps; OnRun runs the
// event loop until the steps are done; OnExit stops the connector.

#include "CommandLine.h"
#include "CommandSteps.h"
#include "ConnectorOperations.h"
#include "Script.h"
#include "SessionSteps.h"
#include "SignalPrinter.h"

#include <wx/app.h>

#include <memory>

class HostApp : public wxAppConsole
{
public:
    static constexpr int kExitDone = 0;
    static constexpr int kExitFailed = 1;
    static constexpr int kExitUsage = 2;

    bool OnInit() override;
    int OnRun() override;
    int OnExit() override;

    // The process's exit status so far.
    int ExitStatus() const { return m_exitStatus; }

private:
    bool ReadCommandLine();
    void UseLogFile();
    void StartConnector();
    void LineUpSteps();

    HostCommand m_command;
    std::unique_ptr<SignalPrinter> m_printer;
    std::unique_ptr<ConnectorOperations> m_operations;
    std::unique_ptr<CommandSteps> m_commandSteps;
    std::unique_ptr<SessionSteps> m_sessionSteps;
    std::unique_ptr<Script> m_script;
    int m_exitStatus = kExitUsage;
};
