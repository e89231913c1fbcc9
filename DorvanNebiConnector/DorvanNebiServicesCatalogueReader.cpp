#include <DorvanNebiConnector/DorvanNebiServicesCatalogueReader.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

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

bool DorvanNebiServicesCatalogueReader::Read(const std::string& body, std::vector<DorvanNebiServiceInfo>& services)
{
    services.clear();
    Json::Value root;
    if (!JsonUtil::ParseJson(body, root))
    {
        return false;
    }
    services = ReadCatalogue(root);
    return true;
}
