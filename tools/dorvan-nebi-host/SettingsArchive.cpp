#include "SettingsArchive.h"

#include <CoreServices/GlobalUtils.h>

#include <wx/datetime.h>
#include <wx/wfstream.h>
#include <wx/zipstrm.h>

#include <algorithm>
#include <fstream>
#include <random>
#include <string>
#include <vector>

namespace
{
// A device history of this size makes the archive a few hundred kilobytes:
// large enough to travel in many pieces.
constexpr std::size_t kHistoryBytes = 384 * 1024;
constexpr std::size_t kCompareBlock = 64 * 1024;

std::string Preferences()
{
    return "{\n  \"language\": \"fr\",\n  \"units\": \"metric\",\n  \"theme\": \"dark\",\n"
           "  \"savedAt\": \"" +
           wxDateTime::Now().FormatISOCombined('T').utf8_string() + "\"\n}\n";
}

std::string Layout()
{
    return "<layout>\n  <panel name=\"devices\" dock=\"left\" width=\"320\"/>\n"
           "  <panel name=\"log\" dock=\"bottom\" height=\"180\"/>\n</layout>\n";
}

// Bytes that do not compress, different in every archive.
std::string History()
{
    std::mt19937 random(std::random_device{}());
    std::string bytes(kHistoryBytes, '\0');
    for (char& byte : bytes)
    {
        byte = static_cast<char>(random() & 0xFF);
    }
    return bytes;
}

bool AddEntry(wxZipOutputStream& zip, const wxString& name, const std::string& content)
{
    return zip.PutNextEntry(name) && zip.Write(content.data(), content.size()).IsOk();
}
} // namespace

namespace SettingsArchive
{
bool Create(const wxString& path, wxString& error)
{
    wxFFileOutputStream file(path);
    if (!file.IsOk())
    {
        error = "cannot create " + path;
        return false;
    }
    wxZipOutputStream zip(file);
    const bool written = AddEntry(zip, "settings/preferences.json", Preferences()) &&
                         AddEntry(zip, "settings/layout.xml", Layout()) &&
                         AddEntry(zip, "settings/device-history.bin", History()) && zip.Close() && file.Close();
    if (!written)
    {
        error = "cannot write " + path;
    }
    return written;
}

bool SameBytes(const wxString& first, const wxString& second, unsigned long long& size, wxString& error)
{
    std::ifstream a(GlobalUtils::ToFileSystemPath(first), std::ios::binary);
    std::ifstream b(GlobalUtils::ToFileSystemPath(second), std::ios::binary);
    if (!a || !b)
    {
        error = "cannot open " + (a ? second : first);
        return false;
    }
    std::vector<char> blockA(kCompareBlock);
    std::vector<char> blockB(kCompareBlock);
    size = 0;
    for (;;)
    {
        a.read(blockA.data(), static_cast<std::streamsize>(blockA.size()));
        b.read(blockB.data(), static_cast<std::streamsize>(blockB.size()));
        const std::streamsize gotA = a.gcount();
        if (gotA != b.gcount() || !std::equal(blockA.begin(), blockA.begin() + gotA, blockB.begin()))
        {
            error = "the files differ within bytes " + wxString::FromUTF8(std::to_string(size)) + " to " +
                    wxString::FromUTF8(std::to_string(size + static_cast<unsigned long long>(gotA)));
            return false;
        }
        size += static_cast<unsigned long long>(gotA);
        if (gotA == 0)
        {
            return true;
        }
    }
}
} // namespace SettingsArchive
