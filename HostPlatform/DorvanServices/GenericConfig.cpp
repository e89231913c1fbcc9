#include <DorvanServices/GenericConfig.h>

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>

#include <boost/property_tree/json_parser.hpp>
#include <wx/datetime.h>
#include <wx/file.h>
#include <wx/filefn.h>
#include <wx/log.h>

#include <filesystem>
#include <fstream>
#include <sstream>

namespace
{
const char* const kSource = "HostPlatform/DorvanServices/GenericConfig";

// A configuration holds a handful of keys; a file far larger than that is
// not one, and is not read into memory.
constexpr std::uintmax_t kMaxConfigFileSize = 4 * 1024 * 1024;
// Nor does a configuration nest objects and arrays deeper than this. The JSON
// reader of the property tree descends once per level on the stack of the
// calling thread (the host's GUI thread at start-up), so a file of a few
// hundred kilobytes of "[[[[..." would overflow it and end the host.
constexpr int kMaxConfigNesting = 64;

enum class FileRead
{
    Missing,
    TooLarge,
    Read
};

FileRead ReadWholeFile(const wxString& path, std::string& content)
{
    const std::filesystem::path fsPath = GlobalUtils::ToFileSystemPath(path);
    std::error_code error;
    const std::uintmax_t size = std::filesystem::file_size(fsPath, error);
    if (!error && size > kMaxConfigFileSize)
    {
        return FileRead::TooLarge;
    }
    std::ifstream file(fsPath, std::ios::in | std::ios::binary);
    if (!file.is_open())
    {
        return FileRead::Missing;
    }
    std::ostringstream buffer;
    buffer << file.rdbuf();
    content = buffer.str();
    return FileRead::Read;
}

bool IsBlank(const std::string& text)
{
    return text.find_first_not_of(" \t\r\n") == std::string::npos;
}

// A configuration file holds one JSON object. The JSON reader also accepts an
// array or a bare value, which would come back as children without names or
// as data on the root; neither is a configuration.
bool IsObject(const boost::property_tree::ptree& root)
{
    if (!root.data().empty())
    {
        return false;
    }
    for (const auto& child : root)
    {
        if (child.first.empty())
        {
            return false;
        }
    }
    return true;
}

// Whether objects and arrays in the JSON text nest deeper than the limit;
// brackets inside strings do not count.
bool NestsTooDeeply(const std::string& content)
{
    int depth = 0;
    bool inString = false;
    for (std::size_t i = 0; i < content.size(); ++i)
    {
        const char c = content[i];
        if (inString)
        {
            if (c == '\\')
            {
                ++i;
            }
            else if (c == '"')
            {
                inString = false;
            }
        }
        else if (c == '"')
        {
            inString = true;
        }
        else if (c == '{' || c == '[')
        {
            if (++depth > kMaxConfigNesting)
            {
                return true;
            }
        }
        else if (c == '}' || c == ']')
        {
            --depth;
        }
    }
    return false;
}

bool ParseObject(const std::string& content, boost::property_tree::ptree& tree)
{
    try
    {
        std::istringstream stream(content);
        boost::property_tree::ptree parsed;
        boost::property_tree::read_json(stream, parsed);
        if (IsObject(parsed))
        {
            tree.swap(parsed);
            return true;
        }
    }
    catch (const std::exception&)
    {
    }
    return false;
}

// Writes content to a new file beside path and then renames it over path, so
// that the file at path always holds either its old or its new content in
// whole, whatever happens in between. The rename replaces an existing file.
bool ReplaceFileAtomically(const wxString& path, const std::string& content)
{
    wxLogNull quiet;
    const wxString temporaryPath = path + ".tmp-" + GlobalUtils::GetUUID().Left(8);
    wxFile file;
    if (!file.Create(temporaryPath, false, wxS_DEFAULT))
    {
        return false;
    }
    const bool written = file.Write(content.data(), content.size()) == content.size() && file.Flush();
    const bool closed = file.Close();
    std::error_code error;
    if (written && closed)
    {
        std::filesystem::rename(GlobalUtils::ToFileSystemPath(temporaryPath), GlobalUtils::ToFileSystemPath(path),
                                error);
        if (!error)
        {
            return true;
        }
    }
    std::filesystem::remove(GlobalUtils::ToFileSystemPath(temporaryPath), error);
    return false;
}
} // namespace

GenericConfig::GenericConfig(const wxString& path) : m_path(path)
{
    LoadConfig();
}

GenericConfig::~GenericConfig() = default;

void GenericConfig::LoadConfig()
{
    std::string content;
    switch (ReadWholeFile(m_path, content))
    {
    case FileRead::Missing:
        return; // every read gives its default
    case FileRead::TooLarge:
        MarkUnreadable("is too large to be a configuration");
        return;
    case FileRead::Read:
        break;
    }
    if (IsBlank(content))
    {
        return;
    }
    if (NestsTooDeeply(content))
    {
        MarkUnreadable("nests too deeply to be a configuration");
        return;
    }
    if (!ParseObject(content, m_tree))
    {
        MarkUnreadable("is not a JSON object");
    }
}

void GenericConfig::MarkUnreadable(const char* reason)
{
    m_unreadableFileToKeep = true;
    SetLevelAndGetLogger(SeverityError, kSource, "GenericConfig::GenericConfig", __LINE__)
        << "the configuration file " << m_path.utf8_string() << " " << reason
        << "; defaults apply and the file is kept aside before it is next written";
}

bool GenericConfig::KeepUnreadableFile()
{
    const wxString copyPath = m_path + ".unreadable-" + wxDateTime::Now().Format("%Y%m%dT%H%M%S");
    wxLogNull quiet;
    if (!wxCopyFile(m_path, copyPath, false))
    {
        SetLevelAndGetLogger(SeverityError, kSource, "GenericConfig::SaveConfig", __LINE__)
            << "cannot keep a copy of the unreadable configuration file " << m_path.utf8_string()
            << "; it is left as it is and the new values are not saved";
        return false;
    }
    SetLevelAndGetLogger(SeverityError, kSource, "GenericConfig::SaveConfig", __LINE__)
        << "the unreadable configuration file " << m_path.utf8_string() << " was kept as "
        << copyPath.utf8_string();
    m_unreadableFileToKeep = false;
    return true;
}

void GenericConfig::SaveConfig(const wxString& path)
{
    if (m_unreadableFileToKeep && path == m_path && !KeepUnreadableFile())
    {
        return;
    }
    std::ostringstream text;
    try
    {
        boost::property_tree::write_json(text, m_tree);
    }
    catch (const std::exception& e)
    {
        SetLevelAndGetLogger(SeverityError, kSource, "GenericConfig::SaveConfig", __LINE__)
            << "cannot write the configuration " << path.utf8_string() << ", message " << e.what();
        return;
    }
    if (!ReplaceFileAtomically(path, text.str()))
    {
        SetLevelAndGetLogger(SeverityError, kSource, "GenericConfig::SaveConfig", __LINE__)
            << "cannot save the configuration file " << path.utf8_string() << "; it keeps its old content";
    }
}
