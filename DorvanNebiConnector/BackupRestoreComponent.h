#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiResource.h>

#include <boost/signals2/connection.hpp>
#include <boost/signals2/signal.hpp>
#include <wx/datetime.h>
#include <wx/string.h>

#include <map>
#include <string>
#include <vector>

namespace boost::asio
{
class thread_pool;
}

// Backs the host's settings archives up to the cloud (private or public
// space), restores them, lists and deletes them, and keeps the time of the
// last private backup. Every operation returns a request id at once (empty
// when a required argument is empty) and reports through the signals below,
// raised on the host's GUI thread.
class DORVANNEBICONNECTOR_EXPORT BackupRestoreComponent : public DorvanNebiConnectorComponent
{
public:
    enum OperationState
    {
        Started = 0,
        Finished = 1
    };

    enum OperationError
    {
        NoError = 0,
        Failed = 1
    };

    struct BackupStatus
    {
        wxString requestId;
        OperationState state = Started;
        OperationError error = NoError;
    };

    struct RestoreStatus
    {
        wxString requestId;
        OperationState state = Started;
        OperationError error = NoError;
        wxString filePath; // the downloaded archive, on success; it belongs to the host
    };

    // Each request raises (Started, NoError) when its job begins, then exactly
    // one of (Finished, NoError) or (Finished, Failed).
    boost::signals2::signal<void(BackupStatus)> m_sigBackupStatus;
    boost::signals2::signal<void(RestoreStatus)> m_sigRestoreStatus;
    // The time of the last private backup changed: the new time, or an
    // invalid wxDateTime after a logout.
    boost::signals2::signal<void(wxDateTime)> m_sigLastPrivateBackupTimestampChanged;
    // Request id and the stored backups; an empty vector also on failure.
    boost::signals2::signal<void(wxString, std::vector<DorvanNebiResource>)> m_sigListOfBackup;
    // Request id, resource id and whether the cloud deleted the resource.
    boost::signals2::signal<void(wxString, wxString, bool)> m_sigDeleteResult;

    explicit BackupRestoreComponent(boost::asio::thread_pool* pool);
    ~BackupRestoreComponent() override;

    BackupRestoreComponent(BackupRestoreComponent&& other) noexcept;
    BackupRestoreComponent& operator=(BackupRestoreComponent&& other) noexcept;
    BackupRestoreComponent(const BackupRestoreComponent&) = delete;
    BackupRestoreComponent& operator=(const BackupRestoreComponent&) = delete;

    // The time of the last successful private backup; invalid when there is
    // none. Call on the GUI thread.
    wxDateTime GetLastPrivateBackupTimestamp();

    // Uploads the archive at filePath; removeFile deletes it afterwards,
    // whatever the outcome.
    wxString BackupToPrivateSpace(const wxString& filePath, bool removeFile);
    wxString BackupToPublicSpace(const wxString& filePath, const wxString& resourceName,
                                 const wxString& description, bool removeFile);
    wxString Backup(const wxString& filePath, const wxString& access, const wxString& resourceName,
                    const wxString& description, bool removeFile);

    // Downloads an archive into a new file of the user data sub-directory
    // "Backup"; its path arrives with the Finished status.
    wxString RestoreFromPrivateSpace();
    wxString RestoreFromPublicSpace(const wxString& resourceId);
    wxString Restore(const DorvanNebiResource& resource);
    wxString Restore(const wxString& access, const wxString& resourceId);

    wxString GetListOfBackup();
    wxString Delete(const DorvanNebiResource& resource);
    wxString Delete(const wxString& access, const wxString& resourceId);

private:
    void Initialize() override;
    void Uninitialize() override;

    void OnLoginStateChanged(LoginState state);
    std::map<std::string, std::string> MakeRequestHeaders();

    void DoBackup(const wxString& requestId, const wxString& filePath, const wxString& access,
                  const wxString& resourceName, const wxString& description, bool removeFile);
    void DoRestore(const wxString& requestId, const wxString& access, const wxString& resourceId);
    void DoGetListOfBackup(const wxString& requestId);
    void DoDelete(const wxString& requestId, const wxString& access, const wxString& resourceId);

    wxDateTime m_lastPrivateBackupTimestamp;
    boost::asio::thread_pool* m_pThreadPool;
    boost::signals2::connection m_loginStateConnection;
};
