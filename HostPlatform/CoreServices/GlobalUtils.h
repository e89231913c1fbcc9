#pragma once

#include <CoreServices/CoreServicesExport.h>

#include <wx/string.h>

#include <filesystem>

namespace GlobalUtils
{
// The directory called name inside the user's data directory, created if
// missing. The user's data directory is the one wxStandardPaths gives for the
// running application, or the directory named by the environment variable
// DORVAN_USER_DATA_DIR when that is set (hosts and tests relocate it so).
// The returned reference stays valid until the process ends.
CORESERVICES_EXPORT const wxString& GetUserDataSubDir(const wxString& name);

// A new random (version 4) UUID in its canonical text form, lower case,
// 36 characters: xxxxxxxx-xxxx-4xxx-yxxx-xxxxxxxxxxxx.
CORESERVICES_EXPORT wxString GetUUID();

// The path as the file system APIs want it: wide characters on Windows,
// the file name encoding elsewhere. Never passes through an ANSI code page.
CORESERVICES_EXPORT std::filesystem::path ToFileSystemPath(const wxString& path);
} // namespace GlobalUtils
