#include "ConnectorOperations.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>

#include <wx/app.h>
#include <wx/filename.h>

#include <utility>

namespace
{
// How long the invite-user request is given to reach the agent.
constexpr std::chrono::milliseconds kInviteGrace(1500);
// How often the host looks whether the connector has removed an uploaded file.
constexpr std::chrono::milliseconds kRemovalPoll(20);
} // namespace

ConnectorOperations::ConnectorOperations()
    : m_login(DorvanNebiConnector::GetInstance()->GetLoginComponent()),
      m_services(DorvanNebiConnector::GetInstance()->GetServicesComponent()),
      m_backup(DorvanNebiConnector::GetInstance()->GetBackupRestoreComponent())
{
    m_timer.SetAction([this] {
        std::function<void()> action = std::move(m_timerAction);
        m_timerAction = nullptr;
        if (action)
        {
            action();
        }
    });
}

wxString ConnectorOperations::SignedInUser() const
{
    const std::pair<wxString, wxString> user = m_login->GetUserInfo();
    return user.first + " <" + user.second + "> (" + DorvanNebiConnectorTypes::ToString(m_login->GetUserRole()) + ")";
}

wxString ConnectorOperations::LastPrivateBackup() const
{
    const wxDateTime time = m_backup->GetLastPrivateBackupTimestamp();
    return time.IsValid() ? time.FormatISOCombined(' ') : wxString("none");
}

void ConnectorOperations::WaitForSignIn(std::chrono::milliseconds patience, Done done)
{
    if (IsSignedIn())
    {
        Finish([done] { done(true); });
        return;
    }
    WaitForLoggedIn(done);
    After(patience, [this, done] { Finish([done] { done(false); }); });
}

void ConnectorOperations::OpenLoginPage(Done done)
{
    // Admitted only while nobody is signed in; success shows as LoggedIn.
    m_login->RequestLogin();
    WaitForLoggedIn(done);
}

void ConnectorOperations::OpenSignUpPage(Done done)
{
    // A completed sign-up signs the new user in.
    m_login->RequestSignUp();
    WaitForLoggedIn(done);
}

void ConnectorOperations::OpenInviteUserPage(Done done)
{
    m_login->RequestInviteUser();
    After(kInviteGrace, [this, done] { Finish([done] { done(true); }); });
}

void ConnectorOperations::LogOut(Done done)
{
    const wxString requestId = m_login->RequestLogOut(); // empty when nobody is signed in
    if (requestId.empty())
    {
        Finish([done] { done(false); });
        return;
    }
    m_pending = m_login->m_sigLogOutResult.connect([this, requestId, done](wxString id, bool confirmed) {
        if (id == requestId)
        {
            Finish([done, confirmed] { done(confirmed); });
        }
    });
}

void ConnectorOperations::GetServices(std::function<void(std::vector<DorvanNebiServiceInfo>)> done)
{
    // Every GetServices call ends in exactly one delivery.
    m_services->GetServices();
    m_pending = m_services->m_sigServicesReceived.connect(
        [this, done](std::vector<DorvanNebiServiceInfo> services) { Finish([done, services] { done(services); }); });
}

void ConnectorOperations::BackupFile(const wxString& file, const wxString& publicName, const wxString& description,
                                     bool removeFile, Done done)
{
    const wxString requestId = publicName.empty()
                                   ? m_backup->BackupToPrivateSpace(file, removeFile)
                                   : m_backup->BackupToPublicSpace(file, publicName, description, removeFile);
    if (requestId.empty())
    {
        Finish([done] { done(false); });
        return;
    }
    // Results arrive on this thread, so connecting after the call misses nothing.
    m_pending = m_backup->m_sigBackupStatus.connect(
        [this, requestId, file, removeFile, done](BackupRestoreComponent::BackupStatus status) {
            if (status.requestId != requestId || status.state != BackupRestoreComponent::Finished)
            {
                return;
            }
            const bool ok = status.error == BackupRestoreComponent::NoError;
            // The connector removes the file on its worker after reporting the
            // result: a host that is about to exit waits for that.
            m_pending.disconnect();
            if (removeFile)
            {
                WaitUntilRemoved(file, [done, ok] { done(ok); });
            }
            else
            {
                Finish([done, ok] { done(ok); });
            }
        });
}

void ConnectorOperations::Restore(const wxString& resourceId, std::function<void(bool ok, wxString file)> done)
{
    const wxString requestId =
        resourceId.empty() ? m_backup->RestoreFromPrivateSpace() : m_backup->RestoreFromPublicSpace(resourceId);
    if (requestId.empty())
    {
        Finish([done] { done(false, wxString()); });
        return;
    }
    m_pending =
        m_backup->m_sigRestoreStatus.connect([this, requestId, done](BackupRestoreComponent::RestoreStatus status) {
            if (status.requestId == requestId && status.state == BackupRestoreComponent::Finished)
            {
                const bool ok = status.error == BackupRestoreComponent::NoError;
                Finish([done, ok, status] { done(ok, status.filePath); });
            }
        });
}

void ConnectorOperations::GetListOfBackup(std::function<void(std::vector<DorvanNebiResource>)> done)
{
    const wxString requestId = m_backup->GetListOfBackup();
    m_pending = m_backup->m_sigListOfBackup.connect(
        [this, requestId, done](wxString id, std::vector<DorvanNebiResource> resources) {
            if (id == requestId)
            {
                Finish([done, resources] { done(resources); });
            }
        });
}

void ConnectorOperations::Delete(const DorvanNebiResource& resource, Done done)
{
    const wxString requestId = m_backup->Delete(resource);
    if (requestId.empty())
    {
        Finish([done] { done(false); });
        return;
    }
    m_pending = m_backup->m_sigDeleteResult.connect([this, requestId, done](wxString id, wxString, bool deleted) {
        if (id == requestId)
        {
            Finish([done, deleted] { done(deleted); });
        }
    });
}

void ConnectorOperations::WaitForLoggedIn(Done done)
{
    m_pending = m_login->m_sigLoginStateChanged.connect([this, done](LoginState state) {
        if (state == LoggedIn)
        {
            Finish([done] { done(true); });
        }
    });
}

void ConnectorOperations::WaitUntilRemoved(const wxString& file, std::function<void()> result)
{
    if (!wxFileName::FileExists(file))
    {
        Finish(result);
        return;
    }
    After(kRemovalPoll, [this, file, result] { WaitUntilRemoved(file, result); });
}

void ConnectorOperations::Finish(std::function<void()> result)
{
    m_pending.disconnect();
    m_timer.Stop();
    m_timerAction = nullptr;
    wxTheApp->CallAfter(std::move(result));
}

void ConnectorOperations::After(std::chrono::milliseconds delay, std::function<void()> action)
{
    m_timerAction = std::move(action);
    m_timer.StartOnce(static_cast<int>(delay.count()));
}
