#pragma once

// Reads the agent's services catalogue. Internal: not installed with the
// public headers.

#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <string>
#include <vector>

// The catalogue is a JSON array of service objects, or an object whose member
// values are service objects; a service object has a string "servicename",
// and may have "serviceid" (string or number), "description" and "url"
// (strings). Elements of any other shape are skipped, each with a log line.
class DorvanNebiServicesCatalogueReader
{
public:
    // Parses body (UTF-8 JSON) and reads the catalogue from it into services.
    // False, with services empty, when body is no JSON document.
    static bool Read(const std::string& body, std::vector<DorvanNebiServiceInfo>& services);
};
