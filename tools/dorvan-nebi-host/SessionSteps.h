#pragma once

// The session: one whole story of the connector, step by step. Sign in, back
// a fresh settings archive up to the private space, list, restore it and
// compare it byte for byte with the original, back it up to the public space
// under a name in several scripts, list, delete that backup, list again and
// log out, which clears the time of the last private backup.

#include "ConnectorOperations.h"
#include "Script.h"

#include <DorvanNebiConnector/DorvanNebiResource.h>

#include <wx/string.h>

class SessionSteps
{
public:
    explicit SessionSteps(ConnectorOperations& operations);

    void AddTo(Script& script);

private:
    void SignIn(Script::Done done);
    void MakeArchive(Script::Done done);
    void BackUpPrivately(Script::Done done);
    void FindPrivateBackup(Script::Done done);
    void Restore(Script::Done done);
    void Compare(Script::Done done);
    void BackUpPublicly(Script::Done done);
    void FindPublicBackup(Script::Done done);
    void DeletePublicBackup(Script::Done done);
    void CheckPublicBackupGone(Script::Done done);
    void LogOut(Script::Done done);

    // Lists the backups and hands done whether one matches.
    void FindBackup(std::function<bool(const DorvanNebiResource&)> matches, std::function<void(bool found)> done);

    ConnectorOperations& m_operations;
    wxString m_archive;  // the settings archive made for the session
    wxString m_restored; // its copy from the cloud
    DorvanNebiResource m_publicBackup;
};
