#include <DorvanNebiConnector/DorvanNebiBackupListReader.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <CoreServices/JsonUtil.h>

#include <json/value.h>

#include <exception>
#include <stdexcept>

using namespace DorvanNebiConstants;

namespace
{
using Resources = std::vector<DorvanNebiResource>;

// A text member that must be a JSON string, decoded from UTF-8.
wxString RequiredText(const Json::Value& element, const char* key)
{
    const Json::Value& value = element[key];
    if (!value.isString())
    {
        throw std::runtime_error(std::string("\"") + key + "\" is missing or no string");
    }
    return wxString::FromUTF8(value.asString());
}

// One record from one element of "response". Throws (JsonCpp's
// Json::LogicError among others) for an element that is no object, an id that
// is an array or object, or a name or description that is no string.
DorvanNebiResource MakeResource(const Json::Value& element)
{
    DorvanNebiResource resource;
    resource.SetResourceId(element[kKeyResourceId].asString());
    resource.SetResourceName(RequiredText(element, kKeyResourceName));
    resource.SetResourceDescription(RequiredText(element, kKeyResourceDescription));
    const bool isPublic = element[kKeyAccessibility].asString() == kAccessPublic;
    resource.SetAccess(isPublic ? DorvanNebiResource::Public : DorvanNebiResource::Private);
    return resource;
}

// Every element of "response" (an array, or an object whose member values are
// taken in name order), or nothing when "response" is anything else. Throws
// for an unusable element or a document that is no object.
Resources ReadResources(const Json::Value& root)
{
    const Json::Value& response = root[kKeyListResponse];
    Resources resources;
    if (!response.isArray() && !response.isObject())
    {
        return resources;
    }
    for (const Json::Value& element : response)
    {
        resources.push_back(MakeResource(element));
    }
    return resources;
}
} // namespace

DorvanNebiBackupListReader::Result DorvanNebiBackupListReader::Read(const std::string& body, Resources& resources,
                                                                    std::string& reason)
{
    resources.clear();
    Json::Value root;
    if (!JsonUtil::ParseJson(body, root))
    {
        reason = "the answer is no JSON";
        return Result::NotJson;
    }
    try
    {
        resources = ReadResources(root);
        return Result::Read;
    }
    catch (const std::exception& e)
    {
        reason = e.what();
    }
    resources.clear();
    return Result::Unusable;
}
