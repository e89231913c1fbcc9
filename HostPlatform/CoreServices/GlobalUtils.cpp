#include <CoreServices/GlobalUtils.h>

#include <CoreServices/Logger.h>

#include <Poco/UUIDGenerator.h>
#include <wx/filename.h>
#include <wx/log.h>
#include <wx/stdpaths.h>
#include <wx/utils.h>

#include <mutex>
#include <set>

namespace
{
const char* const kSource = "HostPlatform/CoreServices/GlobalUtils";

wxString UserDataDir()
{
    wxString relocated;
    if (wxGetEnv("DORVAN_USER_DATA_DIR", &relocated) && !relocated.empty())
    {
        return relocated;
    }
    return wxStandardPaths::Get().GetUserDataDir();
}

// Paths handed out so far. A std::set never moves its elements, so the
// references given to callers stay valid; the set itself is never destroyed.
const wxString& Remember(const wxString& path)
{
    static std::mutex* mutex = new std::mutex();
    static std::set<wxString>* paths = new std::set<wxString>();
    std::lock_guard<std::mutex> lock(*mutex);
    return *paths->insert(path).first;
}
} // namespace

namespace GlobalUtils
{
const wxString& GetUserDataSubDir(const wxString& name)
{
    const wxString directory = wxFileName(UserDataDir(), wxEmptyString).GetPath() + wxFileName::GetPathSeparator() + name;
    if (!wxFileName::DirExists(directory))
    {
        wxLogNull quiet;
        if (!wxFileName::Mkdir(directory, wxS_DIR_DEFAULT, wxPATH_MKDIR_FULL))
        {
            SetLevelAndGetLogger(SeverityError, kSource, "GlobalUtils::GetUserDataSubDir", __LINE__)
                << "cannot create the directory " << directory.utf8_string();
        }
    }
    return Remember(directory);
}

wxString GetUUID()
{
    return wxString::FromUTF8(Poco::UUIDGenerator::defaultGenerator().createRandom().toString());
}

std::filesystem::path ToFileSystemPath(const wxString& path)
{
#ifdef _WIN32
    return std::filesystem::path(path.ToStdWstring());
#else
    return std::filesystem::path(std::string(path.fn_str()));
#endif
}
} // namespace GlobalUtils
