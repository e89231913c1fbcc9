// The agent's services catalogue, as the services component reads it.
//
// Invariants: a body that is no JSON document gives no service; every
// service read has the name its element gave, so never an element without a
// string "servicename" (an empty name only from an empty string).

#include "FuzzSupport.h"

#include <DorvanNebiConnector/DorvanNebiServicesCatalogueReader.h>

#include <CoreServices/JsonUtil.h>

#include <json/value.h>

#include <cstddef>
#include <cstdint>
#include <string>

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    FuzzSupport::Initialize();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    const std::string body(reinterpret_cast<const char*>(data), size);
    std::vector<DorvanNebiServiceInfo> services;
    const bool read = DorvanNebiServicesCatalogueReader::Read(body, services);

    Json::Value root;
    const bool isJson = JsonUtil::ParseJson(body, root);
    if (read != isJson)
    {
        FuzzSupport::Fail("the reader and the parser disagree about the body");
    }
    if (!read && !services.empty())
    {
        FuzzSupport::Fail("services from a body that is no JSON");
    }
    std::size_t named = 0;
    if (root.isArray() || root.isObject())
    {
        for (const Json::Value& element : root)
        {
            named += element.isObject() && element["servicename"].isString() ? 1 : 0;
        }
    }
    if (services.size() != named)
    {
        FuzzSupport::Fail("a service for every element with a string name, and no other");
    }
    return 0;
}
