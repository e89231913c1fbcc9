#pragma once

// The host's command line:
//
//   dorvan-nebi-host [--ca FILE] [--timeout SECONDS] COMMAND [ARGUMENTS]
//
// See Usage() for the commands.

#include <wx/string.h>

#include <vector>

struct HostCommand
{
    wxString caFile;          // the CA certificate to trust; empty: the system's
    long timeoutSeconds = 60; // longest wait for one result
    bool helpRequested = false;

    wxString name; // status, login, signup, invite, logout, services,
                   // backup, restore, list, delete or session
    wxString file; // backup: the archive
    bool publicSpace = false;
    wxString publicName; // backup --public NAME [DESCRIPTION]
    wxString description;
    bool removeFile = false; // backup --remove
    wxString resourceId;     // restore [ID], delete ID
};

// Reads the arguments (without the program name). Returns false, with the
// reason in error, when they do not make a command.
bool ParseCommandLine(const std::vector<wxString>& arguments, HostCommand& command, wxString& error);

wxString Usage();
