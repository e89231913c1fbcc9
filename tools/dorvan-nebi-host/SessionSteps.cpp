#include "SessionSteps.h"

#include "Console.h"
#include "SettingsArchive.h"

#include <CoreServices/GlobalUtils.h>

#include <wx/datetime.h>
#include <wx/filefn.h>
#include <wx/filename.h>

namespace
{
// A public backup under a name and description in several scripts: they
// travel as UTF-8 and must come back from the cloud unchanged.
const wxString kPublicName = wxString::FromUTF8("Atelier-Einstellungen für Zoë – ✓ 設定");
const wxString kPublicDescription = wxString::FromUTF8("Vorlage de l’équipe, Ωmega");

// The host's own files live in a sub-directory of the user data directory.
wxString NewArchivePath()
{
    wxFileName path(GlobalUtils::GetUserDataSubDir("dorvan-nebi-host"), wxEmptyString);
    path.SetFullName("settings-" + wxDateTime::Now().Format("%Y%m%d-%H%M%S") + ".zip");
    return path.GetFullPath();
}
} // namespace

SessionSteps::SessionSteps(ConnectorOperations& operations) : m_operations(operations) {}

void SessionSteps::AddTo(Script& script)
{
    auto add = [this, &script](const wxString& title, void (SessionSteps::*step)(Script::Done)) {
        script.Add(title, [this, step](Script::Done done) { (this->*step)(done); });
    };
    add("Sign in", &SessionSteps::SignIn);
    add("Make a settings archive", &SessionSteps::MakeArchive);
    add("Back the archive up to the private space", &SessionSteps::BackUpPrivately);
    add("List the backups: the private backup is there", &SessionSteps::FindPrivateBackup);
    add("Restore the private backup", &SessionSteps::Restore);
    add("Compare the restored archive with the original, byte for byte", &SessionSteps::Compare);
    add("Back the archive up to the public space as " + Console::Quoted(kPublicName), &SessionSteps::BackUpPublicly);
    add("List the backups again: the public backup is there under its name", &SessionSteps::FindPublicBackup);
    add("Delete the public backup", &SessionSteps::DeletePublicBackup);
    add("List once more: the public backup is gone", &SessionSteps::CheckPublicBackupGone);
    add("Log out: the time of the last private backup is cleared", &SessionSteps::LogOut);
}

void SessionSteps::SignIn(Script::Done done)
{
    if (m_operations.IsSignedIn())
    {
        Console::Detail("signed in at start-up as " + m_operations.SignedInUser());
        done(true);
        return;
    }
    Console::Detail("nobody was signed in at start-up: opening the agent's login page");
    m_operations.OpenLoginPage([this, done](bool ok) {
        Console::Detail("signed in as " + m_operations.SignedInUser());
        done(ok);
    });
}

void SessionSteps::MakeArchive(Script::Done done)
{
    m_archive = NewArchivePath();
    wxString error;
    const bool made = SettingsArchive::Create(m_archive, error);
    Console::Detail(made ? m_archive + " (" + Console::Number(wxFileName::GetSize(m_archive).GetValue()) + " bytes)"
                         : error);
    done(made);
}

void SessionSteps::BackUpPrivately(Script::Done done)
{
    m_operations.BackupFile(m_archive, wxEmptyString, wxEmptyString, false, [this, done](bool ok) {
        // A private backup also sets the time of the last private backup.
        const bool timed = m_operations.Backup()->GetLastPrivateBackupTimestamp().IsValid();
        Console::Detail(ok ? "stored; last private backup: " + m_operations.LastPrivateBackup()
                           : wxString("the cloud did not take the archive (see the log)"));
        if (ok && !timed)
        {
            Console::Detail("but the connector did not set the time of the last private backup");
        }
        done(ok && timed);
    });
}

void SessionSteps::FindPrivateBackup(Script::Done done)
{
    FindBackup([](const DorvanNebiResource& resource) { return resource.GetAccess() == DorvanNebiResource::Private; },
               done);
}

void SessionSteps::Restore(Script::Done done)
{
    m_operations.Restore(wxEmptyString, [this, done](bool ok, wxString file) {
        m_restored = file;
        Console::Detail(ok ? "downloaded to " + file : wxString("the cloud did not send the archive (see the log)"));
        done(ok);
    });
}

void SessionSteps::Compare(Script::Done done)
{
    unsigned long long size = 0;
    wxString error;
    const bool same = SettingsArchive::SameBytes(m_archive, m_restored, size, error);
    Console::Detail(same ? "identical: " + Console::Number(size) + " bytes" : error);
    // The downloaded copy belongs to the host, which has no more use for it.
    wxRemoveFile(m_restored);
    done(same);
}

void SessionSteps::BackUpPublicly(Script::Done done)
{
    // With removeFile the connector deletes the archive once it is uploaded.
    m_operations.BackupFile(m_archive, kPublicName, kPublicDescription, true, [done](bool ok) {
        Console::Detail(ok ? wxString("stored; the connector has removed the local archive")
                           : wxString("the cloud did not take the archive (see the log)"));
        done(ok);
    });
}

void SessionSteps::FindPublicBackup(Script::Done done)
{
    FindBackup(
        [this](const DorvanNebiResource& resource) {
            if (resource.GetAccess() != DorvanNebiResource::Public || resource.GetResourceName() != kPublicName ||
                resource.GetResourceDescription() != kPublicDescription)
            {
                return false;
            }
            m_publicBackup = resource;
            return true;
        },
        done);
}

void SessionSteps::DeletePublicBackup(Script::Done done)
{
    m_operations.Delete(m_publicBackup, [done](bool ok) {
        Console::Detail(ok ? wxString("deleted") : wxString("the cloud did not delete it (see the log)"));
        done(ok);
    });
}

void SessionSteps::CheckPublicBackupGone(Script::Done done)
{
    const std::string deletedId = m_publicBackup.GetResourceId();
    FindBackup([deletedId](const DorvanNebiResource& resource) { return resource.GetResourceId() == deletedId; },
               [done](bool found) { done(!found); });
}

void SessionSteps::LogOut(Script::Done done)
{
    m_operations.LogOut([this, done](bool ok) {
        const bool cleared = !m_operations.Backup()->GetLastPrivateBackupTimestamp().IsValid();
        Console::Detail(ok ? "signed out; last private backup: " + m_operations.LastPrivateBackup()
                           : wxString("the agent did not confirm the logout"));
        if (ok && !cleared)
        {
            Console::Detail("but the connector kept the time of the last private backup");
        }
        done(ok && cleared);
    });
}

void SessionSteps::FindBackup(std::function<bool(const DorvanNebiResource&)> matches,
                              std::function<void(bool found)> done)
{
    m_operations.GetListOfBackup([matches, done](std::vector<DorvanNebiResource> resources) {
        for (const DorvanNebiResource& resource : resources)
        {
            if (matches(resource))
            {
                Console::Detail("found " + wxString::FromUTF8(resource.GetResourceId()) + " " +
                                Console::Quoted(resource.GetResourceName()));
                done(true);
                return;
            }
        }
        Console::Detail("not among the " + Console::Number(resources.size()) + " listed");
        done(false);
    });
}
