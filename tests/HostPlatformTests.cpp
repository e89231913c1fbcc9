// The host platform's service libraries: logging, the JSON utility and the
// global utilities.

#include "TestHost.h"

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/JsonUtil.h>
#include <CoreServices/Logger.h>

#include <gtest/gtest.h>
#include <wx/filename.h>
#include <wx/utils.h>

#include <regex>
#include <set>
#include <sstream>
#include <thread>
#include <vector>

using namespace TestSupport;

namespace
{
std::vector<std::string> LogLines()
{
    std::vector<std::string> lines;
    std::istringstream text(LogText());
    for (std::string line; std::getline(text, line);)
    {
        lines.push_back(line);
    }
    return lines;
}
} // namespace

TEST(Logger, WritesOneLineWithTimeSeverityPlaceAndMessage)
{
    const int count = 42;
    SetLevelAndGetLogger(SeverityError, "Dir/Source", "Class::Method", 123) << "pieces " << std::string("in order ")
                                                                           << count;
    SetLevelAndGetLogger(static_cast<SeverityLevel>(2), "Dir/Source", "Class::Other", 7) << "first\nsecond";

    const std::vector<std::string> lines = LogLines();
    ASSERT_EQ(lines.size(), 2u);
    const std::regex form(R"(\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3} error Dir/Source Class::Method:123 pieces in order 42)");
    EXPECT_TRUE(std::regex_match(lines[0], form)) << lines[0];
    // A message never spans lines.
    EXPECT_NE(lines[1].find(" info Dir/Source Class::Other:7 first\\nsecond"), std::string::npos) << lines[1];
}

TEST(Logger, LinesFromSeveralThreadsNeverInterleave)
{
    const std::string longPiece(300, 'p');
    std::vector<std::thread> threads;
    for (int t = 0; t < 3; ++t)
    {
        threads.emplace_back([t, &longPiece] {
            for (int i = 0; i < 200; ++i)
            {
                SetLevelAndGetLogger(SeverityInfo, "T", "Thread::Run", t) << "begin " << longPiece << " end " << i;
            }
        });
    }
    for (std::thread& thread : threads)
    {
        thread.join();
    }

    const std::vector<std::string> lines = LogLines();
    ASSERT_EQ(lines.size(), 600u);
    const std::regex whole(R"(.* info T Thread::Run:[0-2] begin p{300} end \d+)");
    for (const std::string& line : lines)
    {
        ASSERT_TRUE(std::regex_match(line, whole)) << line;
    }
}

TEST(JsonUtil, MapHoldsEveryTopLevelMemberAsText)
{
    std::map<wxString, wxString> members;
    ASSERT_EQ(JsonUtil::ParseJson(wxString::FromUTF8(R"({"name":"Zoë Ørsted","n":42,"ok":true,"none":null,)"
                                                     R"("obj":{"a":[1,"x"]},"empty":""})"),
                                  members),
              JsonUtil::Success);
    EXPECT_EQ(members["name"], wxString::FromUTF8("Zoë Ørsted"));
    EXPECT_EQ(members["n"], "42");
    EXPECT_EQ(members["ok"], "true");
    EXPECT_EQ(members["none"], "null");
    EXPECT_EQ(members["obj"], R"({"a":[1,"x"]})");
    EXPECT_EQ(members["empty"], "");
    EXPECT_EQ(members.size(), 6u);
}

TEST(JsonUtil, MapRefusesEverythingButOneObject)
{
    const char* const refused[] = {"", "   ", "[1,2]", "\"text\"", "42", "{\"a\":1", "{\"a\":1} trailing",
                                   "{\"a\":1}{\"b\":2}", "{'a':1}"};
    for (const char* text : refused)
    {
        std::map<wxString, wxString> members{{"kept", "as it was"}};
        EXPECT_NE(JsonUtil::ParseJson(wxString(text), members), JsonUtil::Success) << text;
        EXPECT_EQ(members.size(), 1u) << text;
        EXPECT_EQ(members["kept"], "as it was") << text;
    }
}

TEST(JsonUtil, DocumentOverloadTakesAnyDocumentAndNullsOnFailure)
{
    Json::Value root;
    ASSERT_TRUE(JsonUtil::ParseJson(std::string("[{\"a\":1},2]"), root));
    EXPECT_TRUE(root.isArray());
    EXPECT_EQ(root.size(), 2u);

    EXPECT_FALSE(JsonUtil::ParseJson(std::string("[1,"), root));
    EXPECT_TRUE(root.isNull());

    // Nesting deep enough to exhaust a recursive parser's stack is refused.
    const std::string deep = std::string(100000, '[') + std::string(100000, ']');
    EXPECT_FALSE(JsonUtil::ParseJson(deep, root));
}

TEST(GlobalUtils, UuidsAreCanonicalAndUnique)
{
    const std::regex canonical("[0-9a-f]{8}-[0-9a-f]{4}-4[0-9a-f]{3}-[89ab][0-9a-f]{3}-[0-9a-f]{12}");
    std::set<wxString> seen;
    for (int i = 0; i < 1000; ++i)
    {
        const wxString uuid = GlobalUtils::GetUUID();
        ASSERT_TRUE(std::regex_match(uuid.ToStdString(), canonical)) << uuid;
        seen.insert(uuid);
    }
    EXPECT_EQ(seen.size(), 1000u);
}

TEST(GlobalUtils, UserDataSubDirIsCreatedBelowTheHostsDirectory)
{
    const wxString& backup = GlobalUtils::GetUserDataSubDir("Backup");
    EXPECT_EQ(wxFileName::DirName(backup).GetFullPath(), wxFileName::DirName(UserDataDir() + "/Backup").GetFullPath());
    EXPECT_TRUE(wxFileName::DirExists(backup));
    // The reference stays valid and names the same directory on later calls.
    const wxString copy = backup;
    GlobalUtils::GetUserDataSubDir("Other");
    EXPECT_EQ(backup, copy);
    EXPECT_EQ(&GlobalUtils::GetUserDataSubDir("Backup"), &backup);
}

TEST(GlobalUtils, UserDataDirCanBeRelocatedByTheEnvironment)
{
    const wxString relocated = SandboxDir() + "/relocated home é";
    ASSERT_TRUE(wxSetEnv("DORVAN_USER_DATA_DIR", relocated));
    const wxString directory = GlobalUtils::GetUserDataSubDir("dorvannebiconnector");
    wxUnsetEnv("DORVAN_USER_DATA_DIR");

    EXPECT_EQ(wxFileName::DirName(directory).GetFullPath(),
              wxFileName::DirName(relocated + "/dorvannebiconnector").GetFullPath());
    EXPECT_TRUE(wxFileName::DirExists(directory));
}

// Windows' file APIs take these names only as wide characters, never through
// an ANSI code page.
TEST(Logger, LogFileMayBeNamedOutsideAscii)
{
    const wxString path = SandboxDir() + wxString::FromUTF8("/Journal Ωmega ✓ 設定 für Zoë.log");
    ASSERT_TRUE(Logging::SetLogFile(path));
    SetLevelAndGetLogger(SeverityInfo, "Dir/Source", "Class::Method", 1) << "into the renamed file";
    ASSERT_TRUE(Logging::SetLogFile(SandboxDir() + "/test.log"));
    EXPECT_NE(ReadFile(path).find("into the renamed file"), std::string::npos);
    EXPECT_EQ(CountLogLines("into the renamed file"), 0u);
}
