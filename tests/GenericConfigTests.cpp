// The file-backed configuration object.

#include "TestHost.h"

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/JsonUtil.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/Process.h>
#include <gtest/gtest.h>
#include <wx/dir.h>
#include <wx/filename.h>

#include <algorithm>
#include <chrono>
#include <fstream>
#include <random>
#include <thread>

using namespace TestSupport;

namespace
{
// A directory of its own, so that the files beside a configuration can be counted.
wxString ConfigPath(const char* name = "config.json")
{
    const wxString directory = SandboxDir() + "/configs";
    wxFileName::Mkdir(directory, wxS_DIR_DEFAULT, wxPATH_MKDIR_FULL);
    return directory + "/" + name;
}

unsigned short PortFrom(const std::string& storedText)
{
    WriteFile(ConfigPath(), "{\"quarlport\": \"" + storedText + "\"}");
    return GenericConfig(ConfigPath()).GetValue<unsigned short>("quarlport", 7285);
}

std::vector<wxString> FilesBeside(const wxString& path)
{
    std::vector<wxString> names;
    wxDir directory(wxFileName(path).GetPath());
    wxString name;
    for (bool found = directory.GetFirst(&name); found; found = directory.GetNext(&name))
    {
        names.push_back(name);
    }
    return names;
}
} // namespace

TEST(GenericConfig, MissingEmptyOrUnreadableFilesGiveDefaults)
{
    const std::string contents[] = {"", "  \n", "{not json", "[1,2,3]", "42", "\"text\"", "{\"quarlport\": 9"};
    for (const std::string& content : contents)
    {
        WriteFile(ConfigPath(), content);
        GenericConfig config(ConfigPath());
        EXPECT_EQ(config.GetValue<unsigned short>("quarlport", 7285), 7285) << content;
        EXPECT_EQ(config.GetValue<std::string>("nebiprotocol", "https"), "https") << content;
        EXPECT_EQ(config.GetValue<wxString>("time", ""), "") << content;
    }
    // Valid JSON, but far too large for a configuration: not even read.
    WriteFile(ConfigPath(), "{\"quarlport\": \"9000\", \"pad\": \"" + std::string(5 * 1024 * 1024, 'x') + "\"}");
    EXPECT_EQ(GenericConfig(ConfigPath()).GetValue<unsigned short>("quarlport", 7285), 7285);
    EXPECT_EQ(CountLogLines("is too large to be a configuration"), 1u);

    GenericConfig missing(ConfigPath("missing.json"));
    EXPECT_EQ(missing.GetValue<std::string>("nebidomain", "default.example"), "default.example");
    // Reading writes nothing.
    EXPECT_FALSE(wxFileName::FileExists(ConfigPath("missing.json")));
}

// The JSON reader descends once per level on the caller's stack: nesting
// beyond what a configuration needs is refused before it is parsed.
TEST(GenericConfig, FilesNestingTooDeeplyGiveDefaults)
{
    auto nested = [](int depth) {
        return "{\"quarlport\": \"9000\", \"a\": " + std::string(depth - 1, '[') + "\"[{\"" +
               std::string(depth - 1, ']') + "}";
    };
    WriteFile(ConfigPath(), nested(64));
    EXPECT_EQ(GenericConfig(ConfigPath()).GetValue<unsigned short>("quarlport", 7285), 9000);
    WriteFile(ConfigPath(), nested(65));
    EXPECT_EQ(GenericConfig(ConfigPath()).GetValue<unsigned short>("quarlport", 7285), 7285);
    WriteFile(ConfigPath(), nested(1000000));
    EXPECT_EQ(GenericConfig(ConfigPath()).GetValue<unsigned short>("quarlport", 7285), 7285);
    EXPECT_EQ(CountLogLines("nests too deeply to be a configuration"), 2u);
}

TEST(GenericConfig, PortsAreSixteenBitDecimalNumbers)
{
    EXPECT_EQ(PortFrom("0"), 0);
    EXPECT_EQ(PortFrom("8080"), 8080);
    EXPECT_EQ(PortFrom("65535"), 65535);
    EXPECT_EQ(PortFrom("  4711\\t"), 4711); // JSON text "  4711\t"
    EXPECT_EQ(PortFrom("65536"), 7285);
    EXPECT_EQ(PortFrom("99999999999999999999999"), 7285);
    EXPECT_EQ(PortFrom("-1"), 7285);
    EXPECT_EQ(PortFrom("80a"), 7285);
    EXPECT_EQ(PortFrom("0x50"), 7285);
    EXPECT_EQ(PortFrom("8 0"), 7285);
    EXPECT_EQ(PortFrom(""), 7285);

    // A JSON number is stored as its text and converts the same way.
    WriteFile(ConfigPath(), "{\"quarlport\": 9001, \"nested\": {\"quarlport\": 1}, \"list\": [1]}");
    GenericConfig config(ConfigPath());
    EXPECT_EQ(config.GetValue<unsigned short>("quarlport", 7285), 9001);
    // A key that holds an object or an array has no text: the default.
    EXPECT_EQ(config.GetValue<std::string>("nested", "default"), "default");
    EXPECT_EQ(config.GetValue<unsigned short>("list", 7), 7);
}

TEST(GenericConfig, WritesSaveAtOnceAndSurviveAReload)
{
    {
        GenericConfig config(ConfigPath());
        config.SetValue<wxString>("dorvannebilastprivatebackuptime", "2023-05-01T14:03:59");
        config.SetValue<wxString>("name", wxString::FromUTF8("Zoë Ørsted ✓"));
        config.SetValue<const wchar_t*>("cleared", L"");
    }
    GenericConfig reloaded(ConfigPath());
    EXPECT_EQ(reloaded.GetValue<wxString>("dorvannebilastprivatebackuptime", "none"), "2023-05-01T14:03:59");
    EXPECT_EQ(reloaded.GetValue<wxString>("name", ""), wxString::FromUTF8("Zoë Ørsted ✓"));
    EXPECT_EQ(reloaded.GetValue<wxString>("cleared", "none"), "");

    // The file is plain JSON that other tools can read.
    std::map<wxString, wxString> members;
    ASSERT_EQ(JsonUtil::ParseJson(wxString::FromUTF8(ReadFile(ConfigPath())), members), JsonUtil::Success);
    EXPECT_EQ(members["name"], wxString::FromUTF8("Zoë Ørsted ✓"));
    // No temporary file is left behind.
    EXPECT_EQ(FilesBeside(ConfigPath()).size(), 1u);
}

TEST(GenericConfig, UnreadableFileIsKeptAsideBeforeTheFirstWrite)
{
    const std::string broken = "{\"quarlport\": 80, oops";
    WriteFile(ConfigPath(), broken);
    GenericConfig config(ConfigPath());
    EXPECT_EQ(CountLogLines(" error HostPlatform/DorvanServices/GenericConfig "), 1u);

    config.SetValue<wxString>("key", "value");

    wxString copy;
    for (const wxString& name : FilesBeside(ConfigPath()))
    {
        if (name.StartsWith("config.json.unreadable-"))
        {
            copy = wxFileName(ConfigPath()).GetPath() + "/" + name;
        }
    }
    ASSERT_FALSE(copy.empty());
    EXPECT_EQ(ReadFile(copy), broken);
    EXPECT_EQ(GenericConfig(ConfigPath()).GetValue<wxString>("key", ""), "value");
}

TEST(GenericConfig, FailedSaveKeepsTheOldContent)
{
    const wxString directory = SandboxDir() + "/vanishing";
    ASSERT_TRUE(wxFileName::Mkdir(directory));
    const wxString path = directory + "/config.json";
    GenericConfig config(path);
    ASSERT_TRUE(wxFileName::Rmdir(directory));

    config.SetValue<wxString>("key", "value"); // nowhere to write: logged, no crash
    EXPECT_EQ(CountLogLines("cannot save the configuration file"), 1u);
    EXPECT_EQ(config.GetValue<wxString>("key", ""), "value");
}

// A process killed in the middle of its saves leaves a file that holds one
// whole save: never a truncated or mixed one. Each round starts without the
// file and kills the writer a random while after its first save, so that the
// later saves replace an existing file.
TEST(GenericConfig, KilledWriterNeverLeavesATruncatedFile)
{
    const wxString path = ConfigPath("killed.json");
    std::mt19937 random(12345);
    std::uniform_int_distribution<int> lifetime(0, 150);
    long highestCounter = -1;
    for (int round = 0; round < 8; ++round)
    {
        if (wxFileName::FileExists(path))
        {
            ASSERT_TRUE(wxRemoveFile(path));
        }
        Poco::ProcessHandle writer =
            Poco::Process::launch(HelperProgram("config_writer").utf8_string(), {path.utf8_string()});
        for (int i = 0; i < 3000 && !wxFileName::FileExists(path); ++i)
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        const bool saved = wxFileName::FileExists(path);
        std::this_thread::sleep_for(std::chrono::milliseconds(lifetime(random)));
        // By process id: killing by handle would close the handle on
        // Windows, after which the writer could no longer be waited for.
        Poco::Process::kill(writer.id());
        writer.wait();
        ASSERT_TRUE(saved) << "round " << round << ": the writer never saved";

        GenericConfig config(path);
        EXPECT_EQ(config.GetValue<wxString>("padding", "").length(), 256u * 1024u) << "round " << round;
        highestCounter = std::max(highestCounter, config.GetValue<long>("counter", -1));
    }
    // Every file read back was a whole JSON object.
    EXPECT_EQ(CountLogLines(" error "), 0u);
    // Some saves replaced a file saved before (the first save holds no counter).
    EXPECT_GE(highestCounter, 0);
}

// The save's final rename cannot replace a file that another handle holds
// open without sharing deletion, as Windows' C library opens files. The file
// then keeps its old content whole, no temporary file is left, and the failure
// is logged. Elsewhere an open file does not stop the rename.
TEST(GenericConfig, SaveOverAFileHeldOpenKeepsItWhole)
{
    const wxString path = ConfigPath();
    const std::string old = "{\"key\": \"old\"}";
    WriteFile(path, old);
    GenericConfig config(path);
    {
        std::ifstream reader(GlobalUtils::ToFileSystemPath(path), std::ios::binary);
        ASSERT_TRUE(reader.is_open());
        config.SetValue<wxString>("key", "new");
    }
    EXPECT_EQ(config.GetValue<wxString>("key", ""), "new");
    EXPECT_EQ(FilesBeside(path).size(), 1u);
#ifdef _WIN32
    EXPECT_EQ(ReadFile(path), old);
    EXPECT_EQ(CountLogLines("cannot save the configuration file"), 1u);
#else
    EXPECT_EQ(GenericConfig(path).GetValue<wxString>("key", ""), "new");
    EXPECT_EQ(CountLogLines("cannot save the configuration file"), 0u);
#endif
    // Once the file is free again, the next save goes through.
    config.SetValue<wxString>("other", "value");
    EXPECT_EQ(GenericConfig(path).GetValue<wxString>("key", ""), "new");
    EXPECT_EQ(GenericConfig(path).GetValue<wxString>("other", ""), "value");
}

TEST(GenericConfig, FileMayLieInAFolderNamedOutsideAscii)
{
    const wxString directory = SandboxDir() + wxString::FromUTF8("/Einstellungen für Zoë ✓ 設定");
    ASSERT_TRUE(wxFileName::Mkdir(directory));
    const wxString path = directory + wxString::FromUTF8("/Ωmega.json");
    {
        GenericConfig config(path);
        config.SetValue<wxString>("first", "1");
        config.SetValue<wxString>("second", "2"); // replaces the file saved by the first
    }
    GenericConfig reloaded(path);
    EXPECT_EQ(reloaded.GetValue<wxString>("first", ""), "1");
    EXPECT_EQ(reloaded.GetValue<wxString>("second", ""), "2");
    EXPECT_EQ(FilesBeside(path).size(), 1u);
}
