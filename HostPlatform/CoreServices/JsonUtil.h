#pragma once

#include <CoreServices/CoreServicesExport.h>

#include <json/value.h>
#include <wx/string.h>

#include <map>
#include <string>

namespace JsonUtil
{
enum Result
{
    Success = 0,
    InvalidJson = 1, // the text is not one well-formed JSON document
    NotAnObject = 2  // well-formed, but the document is not a JSON object
};

// Parses a JSON object and puts each of its top-level members into members:
// a string as its text, any other value in its compact JSON form (42, true,
// null, {"a":1}). The map is left as it was unless the result is Success.
CORESERVICES_EXPORT Result ParseJson(const wxString& text, std::map<wxString, wxString>& members);

// Parses any JSON document (UTF-8 text) into root. On failure root is null.
CORESERVICES_EXPORT bool ParseJson(const std::string& text, Json::Value& root);
} // namespace JsonUtil
