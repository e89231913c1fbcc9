#include "CommandSteps.h"

#include "AgentCheck.h"
#include "Console.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>
#include <DorvanServices/GenericConfig.h>

namespace
{
// The connector's start-up query answers within moments once the agent is
// known to answer; with nobody signed in it raises no signal at all.
constexpr std::chrono::milliseconds kStartupPatience(3000);

wxString ConfigPath()
{
    return DorvanNebiConnector::GetInstance()->GetCloudConfig()->GetPath();
}

wxString AgentAddress()
{
    return wxString::FromUTF8(DorvanNebiConnectorUtil::MakeLocalhostURI("").toString());
}

wxString CloudAddress()
{
    return wxString::FromUTF8(DorvanNebiConnectorUtil::MakeCloudURI("").toString());
}
} // namespace

CommandSteps::CommandSteps(ConnectorOperations& operations, const HostCommand& command)
    : m_operations(operations), m_command(command)
{
}

void CommandSteps::AddStartup(Script& script, ConnectorOperations& operations)
{
    script.Add("Start-up: the connector asks the local agent at " + AgentAddress() + " who is signed in",
               [&operations](Script::Done done) { StartUp(operations, done); });
}

void CommandSteps::StartUp(ConnectorOperations& operations, Script::Done done)
{
    // A connector that cannot reach the agent just reports nobody signed in:
    // to tell the two apart, the host asks the agent once itself.
    AgentCheck::Start([&operations, done](bool answered) {
        if (!answered)
        {
            Console::Detail("the agent does not answer: is it running? Its port is \"quarlport\" in " + ConfigPath());
            done(false);
            return;
        }
        operations.WaitForSignIn(kStartupPatience, [&operations, done](bool signedIn) {
            Console::Detail(signedIn ? "signed in as " + operations.SignedInUser() : wxString("nobody is signed in"));
            done(true);
        });
    });
}

void CommandSteps::AddTo(Script& script)
{
    const wxString& name = m_command.name;
    auto add = [this, &script](const wxString& title, void (CommandSteps::*step)(Script::Done)) {
        script.Add(title, [this, step](Script::Done done) { (this->*step)(done); });
    };
    const wxString space = m_command.publicSpace ? "public" : "private";
    const wxString backupToRestore =
        m_command.resourceId.empty() ? wxString("the private backup") : "the backup " + m_command.resourceId;
    if (name == "status")
    {
        add("Status", &CommandSteps::Status);
    }
    else if (name == "login")
    {
        add("Open the agent's login page", &CommandSteps::Login);
    }
    else if (name == "signup")
    {
        add("Open the agent's sign-up page", &CommandSteps::SignUp);
    }
    else if (name == "invite")
    {
        add("Open the agent's invite-user page", &CommandSteps::Invite);
    }
    else if (name == "logout")
    {
        add("Log out", &CommandSteps::LogOut);
    }
    else if (name == "services")
    {
        add("Get the services catalogue", &CommandSteps::Services);
    }
    else if (name == "backup")
    {
        add("Back up " + m_command.file + " to the " + space + " space", &CommandSteps::Backup);
    }
    else if (name == "restore")
    {
        add("Restore " + backupToRestore, &CommandSteps::Restore);
    }
    else if (name == "list")
    {
        add("List the backups", &CommandSteps::List);
    }
    else if (name == "delete")
    {
        add("Find the backup " + m_command.resourceId + " in the list", &CommandSteps::FindForDelete);
        add("Delete it", &CommandSteps::Delete);
    }
}

void CommandSteps::Status(Script::Done done)
{
    Console::Detail("configuration: " + ConfigPath());
    Console::Detail("local agent:   " + AgentAddress());
    Console::Detail("cloud:         " + CloudAddress());
    if (m_operations.IsSignedIn())
    {
        const auto login = m_operations.Login();
        Console::Detail("signed in as " + m_operations.SignedInUser() + " since " +
                        login->GetSigninTime().FormatISOCombined(' ') + ", session " + login->GetLoginSession());
    }
    else
    {
        Console::Detail("nobody is signed in");
    }
    Console::Detail("last private backup: " + m_operations.LastPrivateBackup());
    done(true);
}

void CommandSteps::Login(Script::Done done)
{
    if (m_operations.IsSignedIn())
    {
        Console::Detail("already signed in as " + m_operations.SignedInUser() +
                        ": the login page opens only while nobody is signed in");
        done(true);
        return;
    }
    Console::Detail("waiting for the user to sign in on the agent's page");
    m_operations.OpenLoginPage([this, done](bool ok) {
        Console::Detail("signed in as " + m_operations.SignedInUser());
        done(ok);
    });
}

void CommandSteps::SignUp(Script::Done done)
{
    if (m_operations.IsSignedIn())
    {
        Console::Detail("already signed in as " + m_operations.SignedInUser() +
                        ": the sign-up page opens only while nobody is signed in");
        done(true);
        return;
    }
    Console::Detail("waiting for the user to complete the agent's sign-up page");
    m_operations.OpenSignUpPage([this, done](bool ok) {
        Console::Detail("signed up and signed in as " + m_operations.SignedInUser());
        done(ok);
    });
}

void CommandSteps::Invite(Script::Done done)
{
    if (!m_operations.IsSignedIn())
    {
        Console::Detail("nobody is signed in: only a signed-in user can invite others");
        done(false);
        return;
    }
    m_operations.OpenInviteUserPage([done](bool ok) {
        Console::Detail("the agent was asked for its invite-user page (the connector reports no result for it)");
        done(ok);
    });
}

void CommandSteps::LogOut(Script::Done done)
{
    if (!m_operations.IsSignedIn())
    {
        Console::Detail("nobody is signed in");
        done(true);
        return;
    }
    m_operations.LogOut([this, done](bool ok) {
        Console::Detail(ok ? "signed out; last private backup: " + m_operations.LastPrivateBackup()
                           : wxString("the agent did not confirm the logout"));
        done(ok);
    });
}

void CommandSteps::Services(Script::Done done)
{
    m_operations.GetServices([done](std::vector<DorvanNebiServiceInfo> services) {
        if (services.empty())
        {
            Console::Detail("no services: the catalogue is empty or could not be read (see the log)");
        }
        done(!services.empty());
    });
}

void CommandSteps::Backup(Script::Done done)
{
    if (!RequireSignIn())
    {
        done(false);
        return;
    }
    m_operations.BackupFile(m_command.file, m_command.publicName, m_command.description, m_command.removeFile,
                            [this, done](bool ok) {
                                Console::Detail(BackupOutcome(ok));
                                done(ok);
                            });
}

void CommandSteps::Restore(Script::Done done)
{
    if (!RequireSignIn())
    {
        done(false);
        return;
    }
    m_operations.Restore(m_command.resourceId, [done](bool ok, wxString file) {
        Console::Detail(ok ? "restored to " + file : wxString("the cloud did not send the archive (see the log)"));
        done(ok);
    });
}

void CommandSteps::List(Script::Done done)
{
    if (!RequireSignIn())
    {
        done(false);
        return;
    }
    m_operations.GetListOfBackup([done](std::vector<DorvanNebiResource> resources) {
        // The connector delivers an empty list for a failed request too, so
        // an empty list counts as nothing found (exit status 1, as grep's).
        Console::Detail(resources.empty()
                            ? wxString("no backups listed (none stored, or the request failed: see the log)")
                            : Console::Number(resources.size()) + " listed");
        done(!resources.empty());
    });
}

void CommandSteps::FindForDelete(Script::Done done)
{
    if (!RequireSignIn())
    {
        done(false);
        return;
    }
    m_operations.GetListOfBackup([this, done](std::vector<DorvanNebiResource> resources) {
        for (const DorvanNebiResource& resource : resources)
        {
            if (wxString::FromUTF8(resource.GetResourceId()) == m_command.resourceId)
            {
                m_toDelete = resource;
                Console::Detail("found " + Console::Quoted(resource.GetResourceName()));
                done(true);
                return;
            }
        }
        Console::Detail("there is no backup " + m_command.resourceId);
        done(false);
    });
}

void CommandSteps::Delete(Script::Done done)
{
    m_operations.Delete(m_toDelete, [done](bool ok) {
        Console::Detail(ok ? wxString("deleted") : wxString("the cloud did not delete it (see the log)"));
        done(ok);
    });
}

wxString CommandSteps::BackupOutcome(bool ok) const
{
    if (!ok)
    {
        return "the cloud did not take the archive (see the log)";
    }
    if (m_command.publicSpace)
    {
        return "stored in the public space as " + Console::Quoted(m_command.publicName);
    }
    return "stored; last private backup: " + m_operations.LastPrivateBackup();
}

bool CommandSteps::RequireSignIn()
{
    if (!m_operations.IsSignedIn())
    {
        Console::Detail("nobody is signed in: sign in first (dorvan-nebi-host login)");
        return false;
    }
    return true;
}
