#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <wx/object.h>

#include <atomic>
#include <memory>
#include <vector>

namespace boost::asio
{
class thread_pool;
}

class GenericConfig;
class DorvanNebiConnectorComponent;
class DorvanNebiLoginComponent;
class DorvanNebiServicesComponent;
class BackupRestoreComponent;
class DorvanNebiConnector;
struct DorvanNebiConnectorEntry;

namespace DorvanNebiConnectorContext
{
// Call once at start-up from the GUI thread, after the host's wxWidgets
// application object exists. Constructs the connector on first use (its
// worker pool, configurations and components; the login component starts
// asking the local agent whether a user is signed in) and initializes every
// component. Returns true.
DORVANNEBICONNECTOR_EXPORT bool InitializeDorvanNebiConnector();

// Call at shutdown. Uninitializes every component; the connector and its
// components stay alive, and jobs already queued still run and deliver.
// Returns true.
DORVANNEBICONNECTOR_EXPORT bool UninitializeDorvanNebiConnector();
} // namespace DorvanNebiConnectorContext

// The process-wide connector: owns the worker pool, the two configurations
// and the three components, and lives until the process ends.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiConnector : public wxObject
{
public:
    // The one instance, constructed on first use. Safe to call from any
    // thread: a call that arrives while the first construction runs waits for
    // it and gets the same instance.
    static DorvanNebiConnector* GetInstance();

    // The connector's own configuration ("dorvannebiconnector.json" in the
    // user data sub-directory "dorvannebiconnector").
    std::shared_ptr<GenericConfig> GetConfig();
    // Where the local agent and the cloud are reached ("quarlconfig.json"
    // beside the host's executable).
    std::shared_ptr<GenericConfig> GetCloudConfig();
    std::shared_ptr<DorvanNebiLoginComponent> GetLoginComponent();
    std::shared_ptr<DorvanNebiServicesComponent> GetServicesComponent();
    std::shared_ptr<BackupRestoreComponent> GetBackupRestoreComponent();

    DorvanNebiConnector(const DorvanNebiConnector&) = delete;
    DorvanNebiConnector& operator=(const DorvanNebiConnector&) = delete;

private:
    // The entry functions reach Initialize() and Uninitialize() through it. (A
    // friend function declaration would drop the entry functions' dllimport
    // in a Windows host.)
    friend struct DorvanNebiConnectorEntry;

    DorvanNebiConnector();
    ~DorvanNebiConnector() override;

    bool Initialize();
    bool Uninitialize();

    std::shared_ptr<GenericConfig> m_pConfig;
    std::shared_ptr<GenericConfig> m_pCloudConfig;
    std::shared_ptr<DorvanNebiLoginComponent> m_pLoginComponent;
    std::shared_ptr<DorvanNebiServicesComponent> m_pServicesComponent;
    std::shared_ptr<BackupRestoreComponent> m_pBackupRestoreComponent;
    boost::asio::thread_pool* m_pThreadPool = nullptr;
    std::vector<std::shared_ptr<DorvanNebiConnectorComponent>> m_components;

    // Published only once construction is complete; read without a lock.
    static std::atomic<DorvanNebiConnector*> m_pInstance;
};
