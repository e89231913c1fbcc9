#include "SettingsArchive.h"

#include <CoreServices/GlobalUtils.h>

#include <wx/datetime.h>
#include <wx/wfstream.h>
#if wxUSE_ZIPSTREAM
#include <wx/zipstrm.h>
#else
#include <Poco/Checksum.h>
#endif

#include <algorithm>
#include <cstdint>
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

#if wxUSE_ZIPSTREAM
bool AddEntry(wxZipOutputStream& zip, const wxString& name, const std::string& content)
{
    return zip.PutNextEntry(name) && zip.Write(content.data(), content.size()).IsOk();
}
#else
// A wxWidgets base library built without zlib (the Windows build's) has no
// zip streams: the archive is then a zip file whose entries are stored, not
// compressed, written here. Its history does not compress anyway.
class StoredZip
{
public:
    explicit StoredZip(wxOutputStream& out) : m_out(out) {}

    bool Add(const std::string& name, const std::string& content)
    {
        Poco::Checksum crc(Poco::Checksum::TYPE_CRC32);
        crc.update(content);
        Entry entry{name, crc.checksum(), static_cast<std::uint32_t>(content.size()), m_offset};
        std::string header;
        Put32(header, 0x04034b50); // local file header
        PutCommon(header, entry);
        header += name;
        m_entries.push_back(entry);
        return Write(header) && Write(content);
    }

    bool Close()
    {
        const std::uint32_t directoryOffset = m_offset;
        std::string directory;
        for (const Entry& entry : m_entries)
        {
            Put32(directory, 0x02014b50); // central directory header
            Put16(directory, 20);         // made by: version 2.0
            PutCommon(directory, entry);
            Put16(directory, 0);          // comment length
            Put16(directory, 0);          // disk number
            Put16(directory, 0);          // internal attributes
            Put32(directory, 0);          // external attributes
            Put32(directory, entry.offset);
            directory += entry.name;
        }
        const std::uint32_t directorySize = static_cast<std::uint32_t>(directory.size());
        Put32(directory, 0x06054b50); // end of central directory
        Put16(directory, 0);
        Put16(directory, 0);
        Put16(directory, static_cast<std::uint16_t>(m_entries.size()));
        Put16(directory, static_cast<std::uint16_t>(m_entries.size()));
        Put32(directory, directorySize);
        Put32(directory, directoryOffset);
        Put16(directory, 0);
        return Write(directory);
    }

private:
    struct Entry
    {
        std::string name;
        std::uint32_t crc;
        std::uint32_t size;
        std::uint32_t offset;
    };

    static void Put16(std::string& out, std::uint16_t value)
    {
        out += static_cast<char>(value & 0xFF);
        out += static_cast<char>(value >> 8);
    }
    static void Put32(std::string& out, std::uint32_t value)
    {
        Put16(out, static_cast<std::uint16_t>(value & 0xFFFF));
        Put16(out, static_cast<std::uint16_t>(value >> 16));
    }
    // The fields from "version needed" to "extra field length", alike in
    // both headers.
    static void PutCommon(std::string& out, const Entry& entry)
    {
        Put16(out, 10);     // version needed: 1.0
        Put16(out, 0x0800); // flags: the name is UTF-8
        Put16(out, 0);      // method: stored
        Put16(out, 0);      // time
        Put16(out, 0x21);   // date: 1980-01-01
        Put32(out, entry.crc);
        Put32(out, entry.size); // compressed size
        Put32(out, entry.size);
        Put16(out, static_cast<std::uint16_t>(entry.name.size()));
        Put16(out, 0); // extra field length
    }
    bool Write(const std::string& bytes)
    {
        m_offset += static_cast<std::uint32_t>(bytes.size());
        return m_out.Write(bytes.data(), bytes.size()).IsOk();
    }

    wxOutputStream& m_out;
    std::vector<Entry> m_entries;
    std::uint32_t m_offset = 0;
};
#endif
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
#if wxUSE_ZIPSTREAM
    wxZipOutputStream zip(file);
    const bool written = AddEntry(zip, "settings/preferences.json", Preferences()) &&
                         AddEntry(zip, "settings/layout.xml", Layout()) &&
                         AddEntry(zip, "settings/device-history.bin", History()) && zip.Close() && file.Close();
#else
    StoredZip zip(file);
    const bool written = zip.Add("settings/preferences.json", Preferences()) &&
                         zip.Add("settings/layout.xml", Layout()) &&
                         zip.Add("settings/device-history.bin", History()) && zip.Close() && file.Close();
#endif
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
