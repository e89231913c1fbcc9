#pragma once

// The steps of every command but the session (see SessionSteps.h).

#include "CommandLine.h"
#include "ConnectorOperations.h"
#include "Script.h"

class CommandSteps
{
public:
    CommandSteps(ConnectorOperations& operations, const HostCommand& command);

    // The step every command starts with: learn from the connector's
    // start-up query who is signed in (and whether the agent answers at all).
    static void AddStartup(Script& script, ConnectorOperations& operations);

    // The command's own steps.
    void AddTo(Script& script);

private:
    static void StartUp(ConnectorOperations& operations, Script::Done done);
    void Status(Script::Done done);
    void Login(Script::Done done);
    void SignUp(Script::Done done);
    void Invite(Script::Done done);
    void LogOut(Script::Done done);
    void Services(Script::Done done);
    void Backup(Script::Done done);
    void Restore(Script::Done done);
    void List(Script::Done done);
    void FindForDelete(Script::Done done);
    void Delete(Script::Done done);

    wxString BackupOutcome(bool ok) const;
    // The cloud is asked with the signed-in user's credentials.
    bool RequireSignIn();

    ConnectorOperations& m_operations;
    const HostCommand& m_command;
    DorvanNebiResource m_toDelete;
};
