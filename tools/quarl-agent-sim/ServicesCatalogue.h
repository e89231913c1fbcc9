#pragma once

// The catalogue of cloud services that the agent stand-in hands out: a JSON
// array of service objects, each with "serviceid" (string or number),
// "servicename" (string) and optionally "description" and "url" (strings).

#include <json/value.h>

#include <string>

namespace ServicesCatalogue
{
// A small built-in catalogue.
Json::Value Default();

// The catalogue in the JSON file at path. Throws std::runtime_error, naming
// the file and the fault, when it cannot be read or is not of the form above.
Json::Value Load(const std::string& path);
} // namespace ServicesCatalogue
