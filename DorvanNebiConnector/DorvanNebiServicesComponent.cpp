#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>

#include <CoreServices/JsonUtil.h>
#include <CoreServices/Logger.h>

#include <json/value.h>

using namespace DorvanNebiConstants;

namespace
{
void LogServices(int line, const std::string& message)
{
    SetLevelAndGetLogger(SeverityError, kLogSourceServices, "DorvanNebiServicesComponent::DoGetServices", line)
        << message;
}

std::string TextOf(const Json::Value& value)
{
    return value.isString() || value.isNumeric() ? value.asString() : std::string();
}

wxString WideTextOf(const Json::Value& value)
{
    return value.isString() ? wxString::FromUTF8(value.asString()) : wxString();
}

// One catalogue entry from an object with a string "servicename"; the other
// members are optional.
DorvanNebiServiceInfo MakeServiceInfo(const Json::Value& element)
{
    DorvanNebiServiceInfo service;
    service.SetServiceId(TextOf(element[kKeyServiceId]));
    service.SetServiceName(WideTextOf(element[kKeyServiceName]));
    service.SetDescription(WideTextOf(element[kKeyServiceDescription]));
    service.SetUrl(element[kKeyServiceUrl].isString() ? element[kKeyServiceUrl].asString() : std::string());
    return service;
}

bool IsServiceObject(const Json::Value& element)
{
    return element.isObject() && element[kKeyServiceName].isString();
}

// The catalogue is an array of service objects, or an object whose member
// values are service objects. Elements of any other shape are skipped.
std::vector<DorvanNebiServiceInfo> ReadCatalogue(const Json::Value& root)
{
    std::vector<DorvanNebiServiceInfo> services;
    if (!root.isArray() && !root.isObject())
    {
        LogServices(__LINE__, "nebiservices response is neither an array nor an object");
        return services;
    }
    for (auto it = root.begin(); it != root.end(); ++it)
    {
        if (IsServiceObject(*it))
        {
            services.push_back(MakeServiceInfo(*it));
        }
        else
        {
            const std::string where = root.isArray() ? std::to_string(it.index()) : it.name();
            LogServices(__LINE__, "nebiservices element " + where + " skipped: not an object with a string \"" +
                                      kKeyServiceName + "\"");
        }
    }
    return services;
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
        Json::Value root;
        read = JsonUtil::ParseJson(response, root);
        if (read)
        {
            services = ReadCatalogue(root);
        }
        else
        {
            LogServices(__LINE__, "nebiservices response parsing failed, HTTP response " +
                                      DorvanNebiConnectorUtil::MaskSecrets(response));
        }
    }
    // Every call ends in exactly one signal: the catalogue, or nothing on failure.
    DorvanNebiConnectorUtil::PostToGuiThread([this, services] { m_sigServicesReceived(services); });
    return read;
}
