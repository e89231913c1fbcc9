#include <DorvanNebiConnector/BackupRestoreComponent.h>

BackupRestoreComponent::BackupRestoreComponent(boost::asio::thread_pool* pool) : m_pThreadPool(pool)
{
}

BackupRestoreComponent::~BackupRestoreComponent() = default;

BackupRestoreComponent::BackupRestoreComponent(BackupRestoreComponent&& other) noexcept
    : DorvanNebiConnectorComponent(other),
      m_sigBackupStatus(std::move(other.m_sigBackupStatus)),
      m_sigRestoreStatus(std::move(other.m_sigRestoreStatus)),
      m_sigLastPrivateBackupTimestampChanged(std::move(other.m_sigLastPrivateBackupTimestampChanged)),
      m_sigListOfBackup(std::move(other.m_sigListOfBackup)),
      m_sigDeleteResult(std::move(other.m_sigDeleteResult)),
      m_lastPrivateBackupTimestamp(other.m_lastPrivateBackupTimestamp),
      m_pThreadPool(other.m_pThreadPool),
      m_loginStateConnection(std::move(other.m_loginStateConnection))
{
}

BackupRestoreComponent& BackupRestoreComponent::operator=(BackupRestoreComponent&& other) noexcept
{
    DorvanNebiConnectorComponent::operator=(other);
    m_sigBackupStatus = std::move(other.m_sigBackupStatus);
    m_sigRestoreStatus = std::move(other.m_sigRestoreStatus);
    m_sigLastPrivateBackupTimestampChanged = std::move(other.m_sigLastPrivateBackupTimestampChanged);
    m_sigListOfBackup = std::move(other.m_sigListOfBackup);
    m_sigDeleteResult = std::move(other.m_sigDeleteResult);
    m_lastPrivateBackupTimestamp = other.m_lastPrivateBackupTimestamp;
    m_pThreadPool = other.m_pThreadPool;
    m_loginStateConnection = std::move(other.m_loginStateConnection);
    return *this;
}

void BackupRestoreComponent::Initialize()
{
}

void BackupRestoreComponent::Uninitialize()
{
}
