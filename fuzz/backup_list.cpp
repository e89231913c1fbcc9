// The cloud's list of backups, as the backup component reads it.
//
// Invariants: a list is whole or empty, never in part (on any failure no
// record is left); every record read has the access its element gave.

#include "FuzzSupport.h"

#include <DorvanNebiConnector/DorvanNebiBackupListReader.h>

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
    std::vector<DorvanNebiResource> resources;
    std::string reason;
    const DorvanNebiBackupListReader::Result result = DorvanNebiBackupListReader::Read(body, resources, reason);
    if (result != DorvanNebiBackupListReader::Result::Read)
    {
        if (!resources.empty())
        {
            FuzzSupport::Fail("a failed list delivered records");
        }
        if (reason.empty())
        {
            FuzzSupport::Fail("a failed list without a reason");
        }
        return 0;
    }
    for (const DorvanNebiResource& resource : resources)
    {
        if (resource.GetAccess() != DorvanNebiResource::Public && resource.GetAccess() != DorvanNebiResource::Private)
        {
            FuzzSupport::Fail("a record with an access outside the enum");
        }
    }
    return 0;
}
