#include "ServicesCatalogue.h"

#include <json/reader.h>

#include <fstream>
#include <stdexcept>

namespace
{
Json::Value Service(const std::string& id, const std::string& name, const std::string& description,
                    const std::string& url)
{
    Json::Value service(Json::objectValue);
    service["serviceid"] = id;
    service["servicename"] = name;
    service["description"] = description;
    service["url"] = url;
    return service;
}

// Why element is no service object, or an empty text when it is one.
std::string FaultOf(const Json::Value& element)
{
    if (!element.isObject())
    {
        return "is not an object";
    }
    if (!element["servicename"].isString())
    {
        return "has no string \"servicename\"";
    }
    const Json::Value& id = element["serviceid"];
    if (!id.isString() && !id.isNumeric())
    {
        return "has no string or number \"serviceid\"";
    }
    for (const char* optional : {"description", "url"})
    {
        if (element.isMember(optional) && !element[optional].isString())
        {
            return std::string("has a \"") + optional + "\" that is not a string";
        }
    }
    return std::string();
}
} // namespace

namespace ServicesCatalogue
{
Json::Value Default()
{
    Json::Value catalogue(Json::arrayValue);
    catalogue.append(Service("settings-backup", "Settings backup", "Keeps the client's settings archives in the cloud",
                             "https://nebi.example/services/settings-backup"));
    catalogue.append(Service("fleet-overview", "Fleet overview", "Status of every registered device",
                             "https://nebi.example/services/fleet-overview"));
    catalogue.append(Service("licences", "Licences", "Licences of the organisation and their seats",
                             "https://nebi.example/services/licences"));
    return catalogue;
}

Json::Value Load(const std::string& path)
{
    std::ifstream file(path, std::ios::binary);
    if (!file)
    {
        throw std::runtime_error("cannot open the services file " + path);
    }
    Json::Value catalogue;
    Json::CharReaderBuilder builder;
    std::string errors;
    if (!Json::parseFromStream(builder, file, &catalogue, &errors))
    {
        throw std::runtime_error("the services file " + path + " is not JSON: " + errors);
    }
    if (!catalogue.isArray())
    {
        throw std::runtime_error("the services file " + path + " does not hold a JSON array");
    }
    for (Json::ArrayIndex i = 0; i < catalogue.size(); ++i)
    {
        const std::string fault = FaultOf(catalogue[i]);
        if (!fault.empty())
        {
            throw std::runtime_error("the services file " + path + ": element " + std::to_string(i) + " " + fault);
        }
    }
    return catalogue;
}
} // namespace ServicesCatalogue
