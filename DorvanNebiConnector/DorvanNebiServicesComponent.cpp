#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>
#include <DorvanNebiConnector/DorvanNebiServicesCatalogueReader.h>

#include <CoreServices/Logger.h>

using namespace DorvanNebiConstants;

namespace
{
void LogServices(int line, const std::string& message)
{
    SetLevelAndGetLogger(SeverityError, kLogSourceServices, "DorvanNebiServicesComponent::DoGetServices", line)
        << message;
}
} // namespace

DorvanNebiServicesComponent::DorvanNebiServicesComponent(boost::asio::thread_pool* pool) : m_pThreadPool(pool)
{
}

DorvanNebiServicesComponent::~DorvanNebiServicesComponent() = default;

DorvanNebiServicesComponent::DorvanNebiServicesComponent(DorvanNebiServicesComponent&& other) noexcept
    : DorvanNebiConnectorComponent(other),
      m_sigServicesReceived(std::move(other.m_sigServicesReceived)),
      m_pThreadPool(other.m_pThreadPool)
{
}

DorvanNebiServicesComponent& DorvanNebiServicesComponent::operator=(DorvanNebiServicesComponent&& other) noexcept
{
    DorvanNebiConnectorComponent::operator=(other);
    m_sigServicesReceived = std::move(other.m_sigServicesReceived);
    m_pThreadPool = other.m_pThreadPool;
    return *this;
}

bool DorvanNebiServicesComponent::GetServices()
{
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this] { DoGetServices(); });
    return true;
}

bool DorvanNebiServicesComponent::DoGetServices()
{
    std::string response = "{}";
    std::vector<DorvanNebiServiceInfo> services;
    bool read = false;
    if (DorvanNebiConnectorUtil::SendHTTPRequest(DorvanNebiConnectorUtil::MakeLocalhostURI(kAgentServicesPath),
                                                 response))
    {
        read = DorvanNebiServicesCatalogueReader::Read(response, services);
        if (!read)
        {
            LogServices(__LINE__, "nebiservices response parsing failed, HTTP response " +
                                      DorvanNebiConnectorUtil::MaskSecrets(response));
        }
    }
    // Every call ends in exactly one signal: the catalogue, or nothing on failure.
    DorvanNebiConnectorUtil::PostToGuiThread([this, services] { m_sigServicesReceived(services); });
    return read;
}
