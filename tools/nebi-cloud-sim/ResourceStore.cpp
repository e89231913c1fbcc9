#include "ResourceStore.h"

#include <Poco/DateTimeFormatter.h>
#include <Poco/DirectoryIterator.h>
#include <Poco/File.h>
#include <Poco/FileStream.h>
#include <Poco/Path.h>
#include <Poco/Timestamp.h>
#include <Poco/UUIDGenerator.h>
#include <json/reader.h>
#include <json/writer.h>

#include <algorithm>
#include <stdexcept>

namespace
{
constexpr std::size_t kIdLength = 12;

std::string RandomHex(std::size_t length)
{
    std::string hex = Poco::UUIDGenerator::defaultGenerator().createRandom().toString();
    hex.erase(std::remove(hex.begin(), hex.end(), '-'), hex.end());
    return hex.substr(0, length);
}

Json::Value ToJson(const StoredResource& resource)
{
    Json::Value json(Json::objectValue);
    json["resourceid"] = resource.id;
    json["resourcename"] = resource.name;
    json["description"] = resource.description;
    json["accessibility"] = resource.accessibility;
    json["type"] = resource.type;
    json["appname"] = resource.appName;
    json["keywords"] = resource.keywords;
    json["filename"] = resource.fileName;
    json["size"] = static_cast<Json::UInt64>(resource.size);
    json["created"] = resource.created;
    return json;
}

// The record in json; throws std::runtime_error when a required member is
// missing or not a string.
StoredResource FromJson(const Json::Value& json)
{
    auto text = [&json](const char* key, bool required) {
        const Json::Value& value = json[key];
        if (value.isString())
        {
            return value.asString();
        }
        if (required || !value.isNull())
        {
            throw std::runtime_error(std::string("\"") + key + "\" is missing or not a string");
        }
        return std::string();
    };
    StoredResource resource;
    resource.id = text("resourceid", true);
    resource.name = text("resourcename", true);
    resource.description = text("description", false);
    resource.accessibility = text("accessibility", true);
    resource.type = text("type", true);
    resource.appName = text("appname", false);
    resource.keywords = text("keywords", false);
    resource.fileName = text("filename", false);
    resource.created = text("created", false);
    return resource;
}

// Writes the file beside its final place first, so that a crash never leaves
// half a metadata file behind.
void WriteJsonFile(const std::string& path, const Json::Value& json)
{
    Json::StreamWriterBuilder writer;
    writer["emitUTF8"] = true;
    const std::string partial = path + ".partial";
    {
        Poco::FileOutputStream file(partial);
        file << Json::writeString(writer, json) << '\n';
        file.close();
        if (!file.good())
        {
            throw std::runtime_error("cannot write " + partial);
        }
    }
    Poco::File(partial).renameTo(path);
}
} // namespace

ResourceStore::ResourceStore(const std::string& directory, Poco::Logger& logger)
    : m_logger(logger), m_resourcesDir(Poco::Path(directory).makeDirectory().append("resources").toString()),
      m_incomingDir(Poco::Path(directory).makeDirectory().append("incoming").toString())
{
    Poco::File(m_resourcesDir).createDirectories();
    // Uploads that were cut off by a stop never became resources.
    Poco::File incoming(m_incomingDir);
    if (incoming.exists())
    {
        incoming.remove(true);
    }
    incoming.createDirectories();
    Load();
}

std::string ResourceStore::NewIncomingPath() const
{
    return Poco::Path(m_incomingDir).append(RandomHex(32) + ".upload").toString();
}

StoredResource ResourceStore::Add(StoredResource resource, const std::string& incomingPath)
{
    std::lock_guard<std::mutex> lock(m_mutex);
    resource.id = NewIdLocked();
    resource.size = static_cast<Poco::UInt64>(Poco::File(incomingPath).getSize());
    resource.created = Poco::DateTimeFormatter::format(Poco::Timestamp(), "%Y-%m-%dT%H:%M:%S.%FZ");
    Poco::File(incomingPath).renameTo(DataPath(resource.id));
    WriteJsonFile(MetadataPath(resource.id), ToJson(resource));

    if (resource.accessibility == "private" && resource.name == kPrivateBackupName)
    {
        // There is one private backup: the new one replaces the one before.
        if (const StoredResource* previous = FindLocked(kPrivateBackupName))
        {
            const std::string previousId = previous->id;
            RemoveFilesOf(previousId);
            m_resources.erase(previousId);
        }
    }
    m_resources[resource.id] = resource;
    return resource;
}

std::optional<StoredResource> ResourceStore::Find(const std::string& idOrName) const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    const StoredResource* resource = FindLocked(idOrName);
    return resource ? std::optional<StoredResource>(*resource) : std::nullopt;
}

bool ResourceStore::Remove(const std::string& idOrName)
{
    std::lock_guard<std::mutex> lock(m_mutex);
    const StoredResource* resource = FindLocked(idOrName);
    if (!resource)
    {
        return false;
    }
    const std::string id = resource->id;
    RemoveFilesOf(id);
    m_resources.erase(id);
    return true;
}

std::vector<StoredResource> ResourceStore::OfType(const std::string& type) const
{
    std::vector<StoredResource> found;
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        for (const auto& entry : m_resources)
        {
            if (entry.second.type == type)
            {
                found.push_back(entry.second);
            }
        }
    }
    std::sort(found.begin(), found.end(),
              [](const StoredResource& a, const StoredResource& b) { return a.created < b.created; });
    return found;
}

std::string ResourceStore::DataPath(const std::string& id) const
{
    return Poco::Path(m_resourcesDir).append(id + ".data").toString();
}

std::size_t ResourceStore::Count() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return m_resources.size();
}

std::string ResourceStore::MetadataPath(const std::string& id) const
{
    return Poco::Path(m_resourcesDir).append(id + ".json").toString();
}

void ResourceStore::Load()
{
    for (Poco::DirectoryIterator it(m_resourcesDir), end; it != end; ++it)
    {
        if (Poco::Path(it->path()).getExtension() == "json")
        {
            LoadEntry(it->path());
        }
    }
}

void ResourceStore::LoadEntry(const std::string& metadataPath)
{
    try
    {
        Poco::FileInputStream file(metadataPath);
        Json::Value json;
        std::string errors;
        if (!Json::parseFromStream(Json::CharReaderBuilder(), file, &json, &errors))
        {
            throw std::runtime_error("not JSON: " + errors);
        }
        StoredResource resource = FromJson(json);
        if (resource.id != Poco::Path(metadataPath).getBaseName())
        {
            throw std::runtime_error("its id does not match its file name");
        }
        const Poco::File data(DataPath(resource.id));
        if (!data.exists())
        {
            throw std::runtime_error("its archive is missing");
        }
        resource.size = static_cast<Poco::UInt64>(data.getSize());
        m_resources[resource.id] = resource;
    }
    catch (const std::exception& e)
    {
        m_logger.warning("skipped " + metadataPath + ": " + e.what());
    }
}

std::string ResourceStore::NewIdLocked() const
{
    std::string id;
    do
    {
        id = RandomHex(kIdLength);
    } while (m_resources.count(id) != 0);
    return id;
}

const StoredResource* ResourceStore::FindLocked(const std::string& idOrName) const
{
    const auto byId = m_resources.find(idOrName);
    if (byId != m_resources.end())
    {
        return &byId->second;
    }
    if (idOrName != kPrivateBackupName)
    {
        return nullptr;
    }
    for (const auto& entry : m_resources)
    {
        if (entry.second.accessibility == "private" && entry.second.name == kPrivateBackupName)
        {
            return &entry.second;
        }
    }
    return nullptr;
}

void ResourceStore::RemoveFilesOf(const std::string& id) const
{
    // The metadata first: an archive without metadata is never loaded again.
    Poco::File(MetadataPath(id)).remove();
    Poco::File(DataPath(id)).remove();
}
