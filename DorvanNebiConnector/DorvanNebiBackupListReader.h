#pragma once

// Reads the cloud's list of backups. Internal: not installed with the public
// headers.

#include <DorvanNebiConnector/DorvanNebiResource.h>

#include <string>
#include <vector>

// The list answer is a JSON object whose "response" is an array of resource
// objects, or an object whose member values (taken in name order) are; any
// other "response", or none, holds no resource. A resource object has a
// string "resourcename" and "description", a "resourceid" that is no array
// or object, and an "accessibility" of exactly "public" for the public space
// (anything else is private).
class DorvanNebiBackupListReader
{
public:
    enum class Result
    {
        Read,     // resources holds every resource of the answer
        NotJson,  // the body is no JSON document
        Unusable  // JSON, but no object, or with an element that is no resource
    };

    // Parses body (UTF-8 JSON) and reads its resources. On anything but
    // Read, resources is empty (a list is never delivered in part) and
    // reason says what was wrong.
    static Result Read(const std::string& body, std::vector<DorvanNebiResource>& resources, std::string& reason);
};
