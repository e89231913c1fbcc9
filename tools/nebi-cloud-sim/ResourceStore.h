#pragma once

// The cloud stand-in's archives and their metadata, kept in a directory so
// that they survive a restart:
//
//   DIR/resources/<id>.data   the archive, as uploaded
//   DIR/resources/<id>.json   its metadata
//   DIR/incoming/             uploads in progress (emptied at start)
//
// Archives only ever pass through files: the store hands out a file for an
// upload to be streamed into and the path of a stored archive to stream out.
// Safe to use from the server's threads at once.

#include <Poco/Logger.h>
#include <Poco/Types.h>

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

struct StoredResource
{
    std::string id;
    std::string name;
    std::string description;
    std::string accessibility; // "private" or "public"
    std::string type;
    std::string appName;
    std::string keywords;
    std::string fileName; // as the uploader named the file part
    Poco::UInt64 size = 0;
    std::string created; // ISO 8601, UTC, with microseconds: sorts in time order
};

class ResourceStore
{
public:
    // The user's one private backup: a new upload of it replaces the old one,
    // and it can be fetched and deleted by this name as well as by its id.
    static constexpr const char* kPrivateBackupName = "dorvannebiuserpersonalsetting";

    // Opens (creating it if need be) the store in directory and loads the
    // metadata of every archive; unreadable entries are skipped with a warning.
    ResourceStore(const std::string& directory, Poco::Logger& logger);

    // A fresh path in the incoming directory for an upload to be written to.
    std::string NewIncomingPath() const;

    // Takes the finished upload at incomingPath in as a new resource (the file
    // is moved, not copied) and returns its record with id, size and time set.
    StoredResource Add(StoredResource resource, const std::string& incomingPath);

    // The resource with this id, or the private backup by its name.
    std::optional<StoredResource> Find(const std::string& idOrName) const;
    // Removes it; false when there is none.
    bool Remove(const std::string& idOrName);
    // Every resource of this type, oldest first.
    std::vector<StoredResource> OfType(const std::string& type) const;

    std::string DataPath(const std::string& id) const;
    std::size_t Count() const;

private:
    std::string MetadataPath(const std::string& id) const;
    void Load();
    void LoadEntry(const std::string& metadataPath);
    std::string NewIdLocked() const;
    const StoredResource* FindLocked(const std::string& idOrName) const;
    void RemoveFilesOf(const std::string& id) const;

    Poco::Logger& m_logger;
    std::string m_resourcesDir;
    std::string m_incomingDir;
    mutable std::mutex m_mutex;
    std::map<std::string, StoredResource> m_resources; // by id
};
