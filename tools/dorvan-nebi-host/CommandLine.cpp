#include "CommandLine.h"

#include <set>

namespace
{
constexpr long kMaxTimeoutSeconds = 24 * 60 * 60;

const std::set<wxString> kPlainCommands = {"status", "login",    "signup", "invite",
                                           "logout", "services", "list",   "session"};

bool IsOption(const wxString& argument)
{
    return argument.StartsWith("-");
}

// backup FILE [--public NAME [DESCRIPTION]] [--remove]
bool ParseBackup(const std::vector<wxString>& args, HostCommand& command, wxString& error)
{
    if (args.empty() || IsOption(args[0]))
    {
        error = "backup needs the FILE to back up first";
        return false;
    }
    command.file = args[0];
    for (std::size_t i = 1; i < args.size(); ++i)
    {
        if (args[i] == "--remove")
        {
            command.removeFile = true;
        }
        else if (args[i] == "--public" && !command.publicSpace)
        {
            if (i + 1 >= args.size() || IsOption(args[i + 1]) || args[i + 1].empty())
            {
                error = "--public needs a NAME";
                return false;
            }
            command.publicSpace = true;
            command.publicName = args[++i];
            if (i + 1 < args.size() && !IsOption(args[i + 1]))
            {
                command.description = args[++i];
            }
        }
        else
        {
            error = "unexpected argument " + args[i] + " after backup FILE";
            return false;
        }
    }
    return true;
}

bool ParseCommand(const std::vector<wxString>& args, HostCommand& command, wxString& error)
{
    if (command.name == "backup")
    {
        return ParseBackup(args, command, error);
    }
    const bool takesId = command.name == "restore" || command.name == "delete";
    if (!takesId && kPlainCommands.count(command.name) == 0)
    {
        error = "unknown command " + command.name;
        return false;
    }
    const std::size_t most = takesId ? 1 : 0;
    const std::size_t least = command.name == "delete" ? 1 : 0;
    if (args.size() < least)
    {
        error = command.name + " needs the ID of a backup (see the list command)";
        return false;
    }
    if (args.size() > most)
    {
        error = "unexpected argument " + args[most] + " after " + command.name;
        return false;
    }
    if (!args.empty())
    {
        command.resourceId = args[0];
    }
    return true;
}
} // namespace

bool ParseCommandLine(const std::vector<wxString>& arguments, HostCommand& command, wxString& error)
{
    std::size_t i = 0;
    for (; i < arguments.size() && IsOption(arguments[i]); ++i)
    {
        const wxString& option = arguments[i];
        if (option == "--help" || option == "-h")
        {
            command.helpRequested = true;
            return true;
        }
        if (option != "--ca" && option != "--timeout")
        {
            error = "unknown option " + option;
            return false;
        }
        if (i + 1 >= arguments.size())
        {
            error = option + " needs a value";
            return false;
        }
        const wxString& value = arguments[++i];
        if (option == "--ca")
        {
            command.caFile = value;
        }
        else if (!value.ToLong(&command.timeoutSeconds) || command.timeoutSeconds < 1 ||
                 command.timeoutSeconds > kMaxTimeoutSeconds)
        {
            error = "--timeout takes a number of seconds from 1 to " + wxString::Format("%ld", kMaxTimeoutSeconds);
            return false;
        }
    }
    if (i == arguments.size())
    {
        error = "no command given";
        return false;
    }
    command.name = arguments[i];
    return ParseCommand(std::vector<wxString>(arguments.begin() + static_cast<long>(i) + 1, arguments.end()), command,
                        error);
}

wxString Usage()
{
    return "usage: dorvan-nebi-host [--ca FILE] [--timeout SECONDS] COMMAND [ARGUMENTS]\n"
           "\n"
           "A small host of the Dorvan Nebi connector: it starts the connector, prints every\n"
           "signal of its components as it arrives and runs one command.\n"
           "\n"
           "Commands:\n"
           "  status                 who is signed in at the local agent, and where the agent\n"
           "                         and the cloud are reached\n"
           "  login | signup         open the agent's login or sign-up page (while signed out)\n"
           "  invite                 open the agent's invite-user page (while signed in)\n"
           "  logout                 sign the user out\n"
           "  services               the catalogue of cloud services (exit status 1 when empty)\n"
           "  backup FILE [--public NAME [DESCRIPTION]] [--remove]\n"
           "                         upload a settings archive to the private space, or to the\n"
           "                         public space under NAME; --remove deletes FILE afterwards\n"
           "  restore [ID]           download the private backup, or the backup ID\n"
           "  list                   the stored backups with their IDs (exit status 1 when none\n"
           "                         is listed: a failed request gives an empty list too)\n"
           "  delete ID              delete the backup ID\n"
           "  session                the whole story: sign-in, private backup, list, restore and\n"
           "                         comparison, public backup, list, delete and logout (it\n"
           "                         replaces the user's private backup: meant for stand-ins\n"
           "                         and test accounts)\n"
           "\n"
           "Options:\n"
           "  --ca FILE              trust the certificate authority in FILE (PEM) for the\n"
           "                         cloud; without it the system's CA store is used\n"
           "  --timeout SECONDS      longest wait for one result (default 60)\n"
           "\n"
           "The agent's port and the cloud's address come from \"quarlconfig.json\" beside\n"
           "this program. DORVAN_USER_DATA_DIR moves the user data directory, DORVAN_LOG_FILE\n"
           "names the connector's log file (default: dorvan-nebi-host.log in the user data\n"
           "sub-directory \"dorvan-nebi-host\"). Exit status: 0 done, 1 failed, 2 bad command line.\n";
}
