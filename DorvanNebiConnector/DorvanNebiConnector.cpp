#include <DorvanNebiConnector/DorvanNebiConnector.h>

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <CoreServices/GlobalUtils.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/Net/NetSSL.h>
#include <boost/asio/thread_pool.hpp>
#include <wx/filename.h>
#include <wx/stdpaths.h>

#include <cstdlib>
#include <mutex>

namespace
{
// Serialises the first construction of the connector. Never destroyed, so
// that a late call during process exit still finds it.
std::mutex& ConstructionMutex()
{
    static std::mutex* mutex = new std::mutex();
    return *mutex;
}

wxString ConnectorConfigPath()
{
    const wxString directory = GlobalUtils::GetUserDataSubDir(DorvanNebiConstants::kConnectorConfigDirName);
    wxFileName path(directory, wxEmptyString);
    path.SetFullName(DorvanNebiConstants::kConnectorConfigFileName);
    return path.GetFullPath();
}

wxString CloudConfigPath()
{
    wxFileName path(wxStandardPaths::Get().GetExecutablePath());
    path.SetFullName(DorvanNebiConstants::kCloudConfigFileName);
    return path.GetFullPath();
}
} // namespace

std::atomic<DorvanNebiConnector*> DorvanNebiConnector::m_pInstance{nullptr};

// The entry functions' access to the connector's private Initialize() and
// Uninitialize(); the library's own, never exported.
struct DorvanNebiConnectorEntry
{
    static bool Initialize(DorvanNebiConnector* connector) { return connector->Initialize(); }
    static bool Uninitialize(DorvanNebiConnector* connector) { return connector->Uninitialize(); }
};

namespace DorvanNebiConnectorContext
{
bool InitializeDorvanNebiConnector()
{
    return DorvanNebiConnectorEntry::Initialize(DorvanNebiConnector::GetInstance());
}

bool UninitializeDorvanNebiConnector()
{
    return DorvanNebiConnectorEntry::Uninitialize(DorvanNebiConnector::GetInstance());
}
} // namespace DorvanNebiConnectorContext

DorvanNebiConnector* DorvanNebiConnector::GetInstance()
{
    DorvanNebiConnector* instance = m_pInstance.load(std::memory_order_acquire);
    if (instance)
    {
        return instance;
    }
    std::lock_guard<std::mutex> lock(ConstructionMutex());
    instance = m_pInstance.load(std::memory_order_acquire);
    if (!instance)
    {
        instance = new DorvanNebiConnector();
        m_pInstance.store(instance, std::memory_order_release);
        // Exit handlers run last registered first. OpenSSL registers its own
        // clean-up when it is first initialised, which a host may well do
        // only after this (when it sets up TLS): initialised here, before the
        // connector's handler is registered, it is torn down only after that
        // handler has stopped the jobs that use it.
        Poco::Net::initializeSSL();
        std::atexit(&DorvanNebiConnectorUtil::OnProcessExit);
    }
    return instance;
}

DorvanNebiConnector::DorvanNebiConnector()
{
    m_pThreadPool = new boost::asio::thread_pool(DorvanNebiConstants::kWorkerThreadCount);
    try
    {
        m_components.reserve(3); // the push_backs below cannot throw then
        m_pConfig = std::make_shared<GenericConfig>(ConnectorConfigPath());
        m_pCloudConfig = std::make_shared<GenericConfig>(CloudConfigPath());

        m_pServicesComponent = std::make_shared<DorvanNebiServicesComponent>(m_pThreadPool);
        m_components.push_back(m_pServicesComponent);
        m_pBackupRestoreComponent = std::make_shared<BackupRestoreComponent>(m_pThreadPool);
        m_components.push_back(m_pBackupRestoreComponent);
        // Its constructor posts the start-up query, which may reach
        // GetInstance() on a worker before this constructor has returned;
        // GetInstance() makes that call wait for the instance.
        m_pLoginComponent = std::make_shared<DorvanNebiLoginComponent>(m_pThreadPool);
        m_components.push_back(m_pLoginComponent);
    }
    catch (...)
    {
        // Nothing was posted yet (the login component is the last step), so
        // the pool stops at once; the members release themselves.
        m_pThreadPool->join();
        delete m_pThreadPool;
        throw;
    }
}

DorvanNebiConnector::~DorvanNebiConnector()
{
    // Let every queued job run, jobs posted by jobs included, then stop.
    m_pThreadPool->join();
    delete m_pThreadPool;
    m_pThreadPool = nullptr;
    m_components.clear();
    m_pBackupRestoreComponent.reset();
    m_pServicesComponent.reset();
    m_pLoginComponent.reset();
    m_pCloudConfig.reset();
    m_pConfig.reset();
}

bool DorvanNebiConnector::Initialize()
{
    for (const std::shared_ptr<DorvanNebiConnectorComponent>& component : m_components)
    {
        std::shared_ptr<DorvanNebiConnectorComponent> hold = component;
        hold->Initialize();
    }
    return true;
}

bool DorvanNebiConnector::Uninitialize()
{
    for (const std::shared_ptr<DorvanNebiConnectorComponent>& component : m_components)
    {
        std::shared_ptr<DorvanNebiConnectorComponent> hold = component;
        hold->Uninitialize();
    }
    return true;
}

std::shared_ptr<GenericConfig> DorvanNebiConnector::GetConfig()
{
    return m_pConfig;
}

std::shared_ptr<GenericConfig> DorvanNebiConnector::GetCloudConfig()
{
    return m_pCloudConfig;
}

std::shared_ptr<DorvanNebiLoginComponent> DorvanNebiConnector::GetLoginComponent()
{
    return m_pLoginComponent;
}

std::shared_ptr<DorvanNebiServicesComponent> DorvanNebiConnector::GetServicesComponent()
{
    return m_pServicesComponent;
}

std::shared_ptr<BackupRestoreComponent> DorvanNebiConnector::GetBackupRestoreComponent()
{
    return m_pBackupRestoreComponent;
}
