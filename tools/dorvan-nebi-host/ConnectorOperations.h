#pragma once

// The connector's operations as a host uses them: each call starts one
// request of a component and, once the component's signal reports the
// outcome of that very request (matched by its request id), calls done with
// the outcome on a later turn of the event loop. One operation at a time.

#include "GuiTimer.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiResource.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <boost/signals2/connection.hpp>
#include <wx/string.h>

#include <chrono>
#include <functional>
#include <memory>
#include <vector>

class ConnectorOperations
{
public:
    using Done = std::function<void(bool ok)>;

    // Takes the components of the connector, which must exist.
    ConnectorOperations();

    ConnectorOperations(const ConnectorOperations&) = delete;
    ConnectorOperations& operator=(const ConnectorOperations&) = delete;

    std::shared_ptr<DorvanNebiLoginComponent> Login() const { return m_login; }
    std::shared_ptr<BackupRestoreComponent> Backup() const { return m_backup; }
    bool IsSignedIn() const { return m_login->GetLoginState() == LoggedIn; }

    // "Name <e-mail> (role)" of the signed-in user.
    wxString SignedInUser() const;
    // The time of the last private backup, or "none".
    wxString LastPrivateBackup() const;

    // Signing in and out. The login component says nothing when nobody is
    // signed in or a page fails: WaitForSignIn reports false after patience,
    // the pages report only a sign-in (the script's timeout ends the wait).
    void WaitForSignIn(std::chrono::milliseconds patience, Done done);
    void OpenLoginPage(Done done);
    void OpenSignUpPage(Done done);
    // The connector reports nothing for the invite-user page: this gives
    // the request a moment to reach the agent and reports true.
    void OpenInviteUserPage(Done done);
    void LogOut(Done done);

    void GetServices(std::function<void(std::vector<DorvanNebiServiceInfo>)> done);

    // Backup and restore. An empty publicName backs up to the private space.
    void BackupFile(const wxString& file, const wxString& publicName, const wxString& description, bool removeFile,
                    Done done);
    // An empty resourceId restores the private backup; done gets the file.
    void Restore(const wxString& resourceId, std::function<void(bool ok, wxString file)> done);
    void GetListOfBackup(std::function<void(std::vector<DorvanNebiResource>)> done);
    void Delete(const DorvanNebiResource& resource, Done done);

private:
    void WaitForLoggedIn(Done done);
    void WaitUntilRemoved(const wxString& file, std::function<void()> result);
    // Forgets the slot and the timer of the current operation and runs
    // result on the next turn of the event loop, after the signal is over.
    void Finish(std::function<void()> result);
    void After(std::chrono::milliseconds delay, std::function<void()> action);

    std::shared_ptr<DorvanNebiLoginComponent> m_login;
    std::shared_ptr<DorvanNebiServicesComponent> m_services;
    std::shared_ptr<BackupRestoreComponent> m_backup;
    boost::signals2::scoped_connection m_pending; // the slot waiting for the current result
    GuiTimer m_timer;
    std::function<void()> m_timerAction;
};
