// The backup and restore component through the connector, with a local agent
// stand-in and an HTTPS cloud stand-in on the loopback address.

#include "AgentFixture.h"
#include "ReceivedForm.h"
#include "TestTls.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>

#include <CoreServices/GlobalUtils.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/String.h>
#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>
#include <wx/filename.h>

#include <regex>
#include <sstream>

using namespace TestSupport;

namespace
{
const char kUploadPath[] = "/api/clientapp/v1/resource";
const char kPrivateBackupPath[] = "/api/clientapp/v1/resource/dorvannebiuserpersonalsetting/";
const char kListPath[] = "/api/clientapp/v1/resources/dorvannebiusersettingresource";
const char kLoginPath[] = "/api/v1/nebilogin";

wxString ConnectorConfigPath()
{
    return UserDataDir() + "/dorvannebiconnector/dorvannebiconnector.json";
}

void WriteConnectorConfig(const std::string& json)
{
    wxFileName::Mkdir(UserDataDir() + "/dorvannebiconnector", wxS_DIR_DEFAULT, wxPATH_MKDIR_FULL);
    WriteFile(ConnectorConfigPath(), json);
}

// The stored time of the last private backup, or "(none)" without the key.
std::string StoredBackupTime()
{
    Json::Value root;
    std::istringstream text(ReadFile(ConnectorConfigPath()));
    Json::CharReaderBuilder builder;
    std::string errors;
    if (!Json::parseFromStream(builder, text, &root, &errors) || !root.isMember("dorvannebilastprivatebackuptime"))
    {
        return "(none)";
    }
    return root["dorvannebilastprivatebackuptime"].asString();
}

wxString DownloadDir()
{
    return GlobalUtils::GetUserDataSubDir("Backup");
}

std::string ListBody(const std::string& elements)
{
    return "{\"response\":" + elements + ",\"count\":2}";
}

class Backups : public AgentFixture
{
protected:
    Backups() : m_cloud(ServerTlsContext()) { TrustTestAuthority(); }

    // Starts the connector with the cloud stand-in as its cloud; the agent
    // answers with record, by default a signed-in user with key KEY-1234 and
    // secret SECRET-5678.
    void Start(const std::string& record = SignedInRecord(), const std::string& extraConfig = std::string())
    {
        m_agent.Route(kLoginPath, Reply::Json(record));
        StartConnector("\"nebidomain\": \"localhost\", \"nebiport\": \"" + std::to_string(m_cloud.Port()) + "\"" +
                       extraConfig);
        m_backup = DorvanNebiConnector::GetInstance()->GetBackupRestoreComponent();
        m_backup->m_sigBackupStatus.connect([this](BackupRestoreComponent::BackupStatus status) {
            m_backupStatuses.push_back(status);
            m_events.push_back(std::string(status.state == BackupRestoreComponent::Started ? "backup started" :
                                           status.error == BackupRestoreComponent::NoError ? "backup finished" :
                                                                                               "backup failed"));
        });
        m_backup->m_sigRestoreStatus.connect([this](BackupRestoreComponent::RestoreStatus status) {
            m_restoreStatuses.push_back(status);
        });
        m_backup->m_sigLastPrivateBackupTimestampChanged.connect([this](wxDateTime time) {
            m_timestamps.push_back(time);
            m_events.push_back(time.IsValid() ? "timestamp" : "timestamp cleared");
        });
        m_backup->m_sigListOfBackup.connect([this](wxString id, std::vector<DorvanNebiResource> resources) {
            m_lists.emplace_back(id, resources);
        });
        m_backup->m_sigDeleteResult.connect([this](wxString id, wxString resourceId, bool deleted) {
            m_deletes.push_back(id + " " + resourceId + (deleted ? " true" : " false"));
        });
        WaitForStartupQuery();
    }

    bool WaitForBackupEnd(std::size_t count = 1)
    {
        return RunEventLoopUntil([&] {
            return std::count_if(m_backupStatuses.begin(), m_backupStatuses.end(), [](const auto& s) {
                       return s.state == BackupRestoreComponent::Finished;
                   }) >= static_cast<long>(count);
        });
    }

    // The last restore's final status.
    BackupRestoreComponent::RestoreStatus Restored(const wxString& requestId)
    {
        EXPECT_FALSE(requestId.empty());
        auto finished = [&] {
            return std::find_if(m_restoreStatuses.begin(), m_restoreStatuses.end(), [&](const auto& s) {
                return s.requestId == requestId && s.state == BackupRestoreComponent::Finished;
            });
        };
        EXPECT_TRUE(RunEventLoopUntil([&] { return finished() != m_restoreStatuses.end(); }));
        return finished() == m_restoreStatuses.end() ? BackupRestoreComponent::RestoreStatus() : *finished();
    }

    std::vector<DorvanNebiResource> Listed()
    {
        const wxString requestId = m_backup->GetListOfBackup();
        EXPECT_FALSE(requestId.empty());
        EXPECT_TRUE(RunEventLoopUntil([&] { return !m_lists.empty() && m_lists.back().first == requestId; }));
        return m_lists.empty() ? std::vector<DorvanNebiResource>() : m_lists.back().second;
    }

    std::string Deleted(const wxString& requestId)
    {
        EXPECT_FALSE(requestId.empty());
        EXPECT_TRUE(RunEventLoopUntil([&] { return !m_deletes.empty(); }));
        const std::string result = m_deletes.empty() ? std::string() : m_deletes.back().utf8_string();
        m_deletes.clear();
        return result.substr(result.find(' ') + 1); // without the request id
    }

    // A backup, a restore, a list and a delete, each of which must end in its
    // failure signal.
    void ExpectEveryOperationToFail()
    {
        m_backup->BackupToPrivateSpace(Archive(), false);
        const wxString restoreId = m_backup->RestoreFromPrivateSpace();
        EXPECT_TRUE(Listed().empty());
        EXPECT_EQ(Deleted(m_backup->Delete("public", "r-1")), "r-1 false");
        ASSERT_TRUE(WaitForBackupEnd());
        EXPECT_EQ(m_backupStatuses.back().error, BackupRestoreComponent::Failed);
        EXPECT_EQ(Restored(restoreId).error, BackupRestoreComponent::Failed);
    }

    wxString Archive(const std::string& content = "PK\x03\x04 settings")
    {
        const wxString path = SandboxDir() + "/settings-" + GlobalUtils::GetUUID().Left(4) + ".zip";
        WriteFile(path, content);
        return path;
    }

    LoopbackServer m_cloud;
    std::shared_ptr<BackupRestoreComponent> m_backup;
    std::vector<BackupRestoreComponent::BackupStatus> m_backupStatuses;
    std::vector<BackupRestoreComponent::RestoreStatus> m_restoreStatuses;
    std::vector<wxDateTime> m_timestamps;
    std::vector<std::pair<wxString, std::vector<DorvanNebiResource>>> m_lists;
    std::vector<wxString> m_deletes;
    std::vector<std::string> m_events;
};
} // namespace

TEST_F(Backups, PrivateBackupSendsTheFormRecordsItsTimeAndRemovesTheFile)
{
    m_cloud.Route(kUploadPath, Reply::Json("{\"resourceid\":\"r-1\"}"));
    Start();
    const std::string content("PK\x03\x04\0\x01\xFF settings", 16);
    const wxString archive = Archive(content);

    const wxString requestId = m_backup->BackupToPrivateSpace(archive, true);
    ASSERT_FALSE(requestId.empty());
    ASSERT_TRUE(WaitForBackupEnd());

    EXPECT_EQ(m_events, (std::vector<std::string>{"backup started", "timestamp", "backup finished"}));
    for (const auto& status : m_backupStatuses)
    {
        EXPECT_EQ(status.requestId, requestId);
    }
    const RecordedRequest request = m_cloud.Requests().at(0);
    EXPECT_EQ(request.method, "POST");
    EXPECT_EQ(request.HeaderValues("Authorization"), std::vector<std::string>{"Bearer SECRET-5678"});
    EXPECT_EQ(request.HeaderValues("apikey"), std::vector<std::string>{"KEY-1234"});
    const ReceivedForm upload = ParseForm(request);
    EXPECT_EQ(upload.fields, (std::vector<std::pair<std::string, std::string>>{{"accessibility", "private"},
                                     {"appname", "dorvan"},
                                     {"description", ""},
                                     {"keywords", "dorvan"},
                                     {"resourcename", "dorvannebiuserpersonalsetting"},
                                     {"type", "dorvannebiusersettingresource"}}));
    ASSERT_EQ(upload.files.size(), 1u);
    EXPECT_EQ(upload.files[0].name, "file");
    EXPECT_EQ(upload.files[0].fileName, wxFileName(archive).GetFullName().utf8_string());
    EXPECT_TRUE(upload.files[0].content == content);

    // The time: signalled, cached and stored, and the same everywhere.
    ASSERT_EQ(m_timestamps.size(), 1u);
    EXPECT_TRUE(m_timestamps[0].IsValid());
    EXPECT_EQ(m_backup->GetLastPrivateBackupTimestamp(), m_timestamps[0]);
    EXPECT_EQ(StoredBackupTime(), m_timestamps[0].FormatISOCombined('T').utf8_string());
    EXPECT_LE((wxDateTime::Now() - m_timestamps[0]).GetSeconds().ToLong(), 10);

    EXPECT_TRUE(RunEventLoopUntil([&] { return !wxFileName::FileExists(archive); }));
    RunEventLoopFor(std::chrono::milliseconds(200));
    EXPECT_EQ(m_backupStatuses.size(), 2u) << "one final status per request";
}

TEST_F(Backups, OnlyAnAcceptedPrivateBackupChangesTheTimestamp)
{
    m_cloud.Route(kUploadPath, Reply::Json("{}"));
    Start();
    const wxString kept = Archive();

    // Public, with a name and description beyond ASCII, sent as UTF-8.
    EXPECT_FALSE(m_backup->BackupToPublicSpace(kept, wxString::FromUTF8("R\xC3\xA9glages \xE2\x9C\x93"), "", false)
                     .empty());
    ASSERT_TRUE(WaitForBackupEnd(1));
    // Any other access text goes out unchanged, and only "private" counts as private.
    EXPECT_FALSE(m_backup->Backup(kept, "Private", "mine", wxString::FromUTF8("caf\xC3\xA9"), false).empty());
    ASSERT_TRUE(WaitForBackupEnd(2));
    // A private upload that the cloud answers with anything but 200 failed;
    // the file goes all the same when asked.
    m_cloud.Route(kUploadPath, Reply::Json("{}", 201));
    const wxString removed = Archive();
    EXPECT_FALSE(m_backup->BackupToPrivateSpace(removed, true).empty());
    ASSERT_TRUE(WaitForBackupEnd(3));

    EXPECT_EQ(m_events, (std::vector<std::string>{"backup started", "backup finished", "backup started",
                                                  "backup finished", "backup started", "backup failed"}));
    EXPECT_TRUE(m_timestamps.empty());
    EXPECT_FALSE(m_backup->GetLastPrivateBackupTimestamp().IsValid());
    EXPECT_EQ(StoredBackupTime(), "(none)");

    const std::vector<RecordedRequest> requests = m_cloud.Requests();
    ASSERT_EQ(requests.size(), 3u);
    const ReceivedForm publicUpload = ParseForm(requests[0]);
    EXPECT_EQ(publicUpload.fields[0], (std::pair<std::string, std::string>{"accessibility", "public"}));
    EXPECT_EQ(publicUpload.fields[2], (std::pair<std::string, std::string>{"description", ""}));
    EXPECT_EQ(publicUpload.fields[4],
              (std::pair<std::string, std::string>{"resourcename", "R\xC3\xA9glages \xE2\x9C\x93"}));
    const ReceivedForm otherUpload = ParseForm(requests[1]);
    EXPECT_EQ(otherUpload.fields[0], (std::pair<std::string, std::string>{"accessibility", "Private"}));
    EXPECT_EQ(otherUpload.fields[2], (std::pair<std::string, std::string>{"description", "caf\xC3\xA9"}));

    EXPECT_TRUE(wxFileName::FileExists(kept));
    EXPECT_TRUE(RunEventLoopUntil([&] { return !wxFileName::FileExists(removed); }));
    EXPECT_EQ(CountLogLines("refused, status 201"), 1u);
}

TEST_F(Backups, MissingOrUnusableArgumentsStartNothing)
{
    Start();
    const wxString archive = Archive();
    DorvanNebiResource withoutId;
    withoutId.SetAccess(DorvanNebiResource::Public);
    DorvanNebiResource dotDot;
    dotDot.SetResourceId("..");

    EXPECT_TRUE(m_backup->BackupToPrivateSpace("", true).empty());
    EXPECT_TRUE(m_backup->BackupToPublicSpace(archive, "", "description", true).empty());
    EXPECT_TRUE(m_backup->Backup(archive, "", "name", "description", true).empty());
    EXPECT_TRUE(m_backup->RestoreFromPublicSpace("").empty());
    EXPECT_TRUE(m_backup->Restore(withoutId).empty());
    EXPECT_TRUE(m_backup->Restore("", "r-1").empty());
    EXPECT_TRUE(m_backup->Delete(withoutId).empty());
    EXPECT_TRUE(m_backup->Delete("", "r-1").empty());
    // Ids that would reach another path than their own resource's.
    for (const char* id : {".", "..", "a/b", "../resources/x"})
    {
        EXPECT_TRUE(m_backup->RestoreFromPublicSpace(id).empty()) << id;
        EXPECT_TRUE(m_backup->Delete("public", id).empty()) << id;
    }
    EXPECT_TRUE(m_backup->Delete(dotDot).empty());

    RunEventLoopFor(std::chrono::milliseconds(300));
    EXPECT_TRUE(m_cloud.Requests().empty());
    EXPECT_TRUE(m_backupStatuses.empty());
    EXPECT_TRUE(m_restoreStatuses.empty());
    EXPECT_TRUE(m_deletes.empty());
    EXPECT_TRUE(wxFileName::FileExists(archive));
}

TEST_F(Backups, RestoreDownloadsIntoANewArchiveInTheBackupDirectory)
{
    const std::string content(70000, 'z');
    m_cloud.Route(kPrivateBackupPath, Reply::Status(200, content));
    Start();

    const wxString requestId = m_backup->RestoreFromPrivateSpace();
    const BackupRestoreComponent::RestoreStatus status = Restored(requestId);
    EXPECT_EQ(status.error, BackupRestoreComponent::NoError);
    const wxFileName path(status.filePath);
    EXPECT_EQ(path.GetPath(), wxFileName(DownloadDir(), wxEmptyString).GetPath());
    EXPECT_TRUE(std::regex_match(path.GetFullName().utf8_string(), std::regex("[0-9a-f]{8}\\.zip")));
    EXPECT_TRUE(ReadFile(status.filePath) == content);
    // Started (with no path) came first.
    ASSERT_EQ(m_restoreStatuses.size(), 2u);
    EXPECT_EQ(m_restoreStatuses[0].state, BackupRestoreComponent::Started);
    EXPECT_TRUE(m_restoreStatuses[0].filePath.empty());
    EXPECT_EQ(m_restoreStatuses[0].requestId, requestId);

    const RecordedRequest request = m_cloud.Requests().at(0);
    EXPECT_EQ(request.method, "GET");
    EXPECT_EQ(request.target, kPrivateBackupPath);
    EXPECT_EQ(request.HeaderValues("Authorization"), std::vector<std::string>{"Bearer SECRET-5678"});
    EXPECT_EQ(request.HeaderValues("apikey"), std::vector<std::string>{"KEY-1234"});
}

TEST_F(Backups, BothSpacesAreRestoredAlikeAndIdsTravelAsOneSegment)
{
    Start();
    DorvanNebiResource record;
    record.SetResourceId("42");
    record.SetAccess(DorvanNebiResource::Public);
    // A reserved character, a blank, a query and a fragment mark and a
    // letter beyond ASCII: all stay inside the one segment.
    const wxString oddId = wxString::FromUTF8("50% off?\xC3\xA9#");

    Restored(m_backup->Restore(record));
    Restored(m_backup->Restore("private", "42"));
    Restored(m_backup->RestoreFromPublicSpace(oddId));

    const std::vector<RecordedRequest> requests = m_cloud.Requests();
    ASSERT_EQ(requests.size(), 3u);
    EXPECT_EQ(requests[0].target, "/api/clientapp/v1/resource/42/");
    EXPECT_EQ(requests[1].target, requests[0].target);
    EXPECT_EQ(requests[2].target, "/api/clientapp/v1/resource/50%25%20off%3F%C3%A9%23/");
    // The stand-in answered 404 for all three: failures, without a path.
    for (const auto& status : m_restoreStatuses)
    {
        if (status.state == BackupRestoreComponent::Finished)
        {
            EXPECT_EQ(status.error, BackupRestoreComponent::Failed);
            EXPECT_TRUE(status.filePath.empty());
        }
    }
    EXPECT_TRUE(FilesIn(DownloadDir()).empty());
}

TEST_F(Backups, ACutOffDownloadFailsAndLeavesNoFile)
{
    m_cloud.Route(kPrivateBackupPath, Reply::Failing(Reply::Fault::CutBodyShort, std::string(50000, 'x'), 20000));
    Start();
    const BackupRestoreComponent::RestoreStatus status = Restored(m_backup->RestoreFromPrivateSpace());
    EXPECT_EQ(status.error, BackupRestoreComponent::Failed);
    EXPECT_TRUE(status.filePath.empty());
    EXPECT_TRUE(FilesIn(DownloadDir()).empty());
    EXPECT_EQ(CountLogLines(std::string("HTTP_DOWNLOAD ") + kPrivateBackupPath + " failed"), 1u);
}

TEST_F(Backups, ListDeliversEveryRecordInOrder)
{
    m_cloud.Route(kListPath,
                  Reply::Json(ListBody(R"([{"resourceid":"r-1","resourcename":"Mine","description":"",
                                            "accessibility":"public"},
                                           {"resourceid":42,"resourcename":"R\u00e9glages",
                                            "description":"d\u00e9j\u00e0","extra":true}])")));
    Start();
    const std::vector<DorvanNebiResource> resources = Listed();
    ASSERT_EQ(resources.size(), 2u);
    EXPECT_EQ(resources[0].GetResourceId(), "r-1");
    EXPECT_EQ(resources[0].GetResourceName(), "Mine");
    EXPECT_TRUE(resources[0].GetResourceDescription().empty());
    EXPECT_EQ(resources[0].GetAccess(), DorvanNebiResource::Public);
    EXPECT_EQ(resources[1].GetResourceId(), "42");
    EXPECT_EQ(resources[1].GetResourceName(), wxString::FromUTF8("R\xC3\xA9glages"));
    EXPECT_EQ(resources[1].GetResourceDescription(), wxString::FromUTF8("d\xC3\xA9j\xC3\xA0"));
    EXPECT_EQ(resources[1].GetAccess(), DorvanNebiResource::Private);

    const RecordedRequest request = m_cloud.Requests().at(0);
    EXPECT_EQ(request.method, "GET");
    EXPECT_EQ(request.target, kListPath);
    EXPECT_EQ(request.HeaderValues("apikey"), std::vector<std::string>{"KEY-1234"});

    // An object's members come in name order; only exactly "public" is public;
    // true as an id is its text.
    m_cloud.Route(kListPath,
                  Reply::Json(ListBody(R"({"b":{"resourceid":"B","resourcename":"b","description":"",
                                                "accessibility":"public"},
                                           "a":{"resourceid":true,"resourcename":"a","description":"",
                                                "accessibility":"Public"}})")));
    const std::vector<DorvanNebiResource> fromObject = Listed();
    ASSERT_EQ(fromObject.size(), 2u);
    EXPECT_EQ(fromObject[0].GetResourceId(), "true");
    EXPECT_EQ(fromObject[0].GetAccess(), DorvanNebiResource::Private);
    EXPECT_EQ(fromObject[1].GetResourceId(), "B");
    EXPECT_EQ(fromObject[1].GetAccess(), DorvanNebiResource::Public);
}

TEST_F(Backups, AnyUnusableListAnswerDeliversAnEmptyList)
{
    Start();
    const std::vector<Reply> answers{
        Reply::Json(ListBody("[]")),
        Reply::Json("{\"count\":0}"),
        Reply::Json("{\"response\":null}"),
        Reply::Json("[{\"resourceid\":\"r\",\"resourcename\":\"n\",\"description\":\"\"}]"),
        Reply::Json("{\"response\":[{\"resourceid\":\"r\",\"resourcename\":\"n\",\"description\":\"\"},"),
        Reply::Json("this is no JSON"),
        Reply::Json(ListBody("[{\"resourceid\":\"r\",\"resourcename\":\"n\",\"description\":\"\"},"
                             "{\"resourceid\":\"s\",\"description\":\"\"}]")),
        Reply::Json(ListBody("[{\"resourceid\":\"r\",\"resourcename\":7,\"description\":\"\"}]")),
        Reply::Json(ListBody("[{\"resourceid\":[1],\"resourcename\":\"n\",\"description\":\"\"}]")),
        Reply::Json(ListBody("[\"r\"]")),
        Reply::Json(ListBody("[{\"resourceid\":\"r\",\"resourcename\":\"n\",\"description\":\"\"}]"), 401),
        Reply::Failing(Reply::Fault::CloseWithoutAnswer),
    };
    for (const Reply& answer : answers)
    {
        m_cloud.Route(kListPath, answer);
        EXPECT_TRUE(Listed().empty()) << answer.body;
    }
    EXPECT_EQ(m_lists.size(), answers.size()) << "one delivery per request";
}

TEST_F(Backups, DeleteSucceedsOnlyWith200)
{
    m_cloud.Route("/api/clientapp/v1/resource/r-1/", Reply::Json("{}"));
    m_cloud.Route("/api/clientapp/v1/resource/r-2/", Reply::Status(204));
    Start();
    DorvanNebiResource record;
    record.SetResourceId("r-1");

    EXPECT_EQ(Deleted(m_backup->Delete(record)), "r-1 true");
    EXPECT_EQ(Deleted(m_backup->Delete("public", "r-2")), "r-2 false");
    EXPECT_EQ(Deleted(m_backup->Delete("private", "r-3")), "r-3 false"); // 404

    const std::vector<RecordedRequest> requests = m_cloud.Requests();
    ASSERT_EQ(requests.size(), 3u);
    EXPECT_EQ(requests[0].method, "DELETE");
    EXPECT_EQ(requests[0].target, "/api/clientapp/v1/resource/r-1/");
    EXPECT_EQ(requests[0].HeaderValues("Authorization"), std::vector<std::string>{"Bearer SECRET-5678"});
}

// Without credentials from the agent the requests still go out; the cloud's
// answer decides.
TEST_F(Backups, RequestsWithoutCredentialsStillGoOut)
{
    m_cloud.Route(kListPath, Reply::Json("{\"error\":\"unauthorized\"}", 401));
    Start(SignedOutRecord());
    EXPECT_TRUE(Listed().empty());
    const RecordedRequest request = m_cloud.Requests().at(0);
    ASSERT_EQ(request.HeaderValues("Authorization").size(), 1u);
    EXPECT_EQ(Poco::trim(request.HeaderValues("Authorization")[0]), "Bearer");
    EXPECT_EQ(request.HeaderValues("apikey"), std::vector<std::string>{""});
}

// Whatever breaks inside a job, the host hears the end of its request.
TEST_F(Backups, BrokenSettingsOrCredentialsEndInFailureSignals)
{
    Start(SignedInRecord("Ada", "ada@example.com", "admin", "KEY", "S\\r\\nX-Injected: yes"));
    ExpectEveryOperationToFail();
    EXPECT_TRUE(m_cloud.Requests().empty()) << "a header with a line break in a credential went out";
}

TEST_F(Backups, ABasePathThatIsNoUriPathEndsInFailureSignals)
{
    Start(SignedInRecord(), ", \"nebiclientappapiversion\": \"/api%zz\"");
    ExpectEveryOperationToFail();
}

TEST_F(Backups, StoredTimeIsReadUntilCachedAndClearedByALogout)
{
    WriteConnectorConfig("{\"dorvannebilastprivatebackuptime\": \"2023-05-04T10:11:12\"}");
    Start();
    ASSERT_TRUE(RunEventLoopUntil(
        [] { return DorvanNebiConnector::GetInstance()->GetLoginComponent()->GetLoginState() == LoggedIn; }));
    // Signing in raised nothing here.
    EXPECT_TRUE(m_timestamps.empty());
    const wxDateTime stored = m_backup->GetLastPrivateBackupTimestamp();
    wxDateTime expected(4, wxDateTime::May, 2023, 10, 11, 12);
    EXPECT_EQ(stored, expected);

    m_agent.Route(kLoginPath, Reply::Json(SignedOutRecord()));
    DorvanNebiConnector::GetInstance()->GetLoginComponent()->RefreshLoginState();
    ASSERT_TRUE(RunEventLoopUntil([&] { return !m_timestamps.empty(); }));
    EXPECT_FALSE(m_timestamps[0].IsValid());
    EXPECT_FALSE(m_backup->GetLastPrivateBackupTimestamp().IsValid());
    EXPECT_EQ(StoredBackupTime(), "");
}

TEST_F(Backups, CouplingToTheLoginStateFollowsInitializeAndUninitialize)
{
    Start();
    auto login = DorvanNebiConnector::GetInstance()->GetLoginComponent();
    auto cycle = [&] {
        // Signed out, then in again: only the change to signed out counts.
        m_timestamps.clear();
        m_agent.Route(kLoginPath, Reply::Json(SignedOutRecord()));
        login->RefreshLoginState();
        EXPECT_TRUE(RunEventLoopUntil([&] { return login->GetLoginState() == LoggedOut; }));
        m_agent.Route(kLoginPath, Reply::Json(SignedInRecord()));
        login->RefreshLoginState();
        EXPECT_TRUE(RunEventLoopUntil([&] { return login->GetLoginState() == LoggedIn; }));
        RunEventLoopFor(std::chrono::milliseconds(100));
        return m_timestamps.size();
    };
    ASSERT_TRUE(RunEventLoopUntil([&] { return login->GetLoginState() == LoggedIn; }));

    EXPECT_EQ(cycle(), 1u);
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    EXPECT_EQ(cycle(), 2u);
    // Uninitialize ends the later connection only.
    DorvanNebiConnectorContext::UninitializeDorvanNebiConnector();
    EXPECT_EQ(cycle(), 1u);
}

TEST_F(Backups, StoredTextThatIsNoTimeReadsAsNoneAndIsReadAgainNextTime)
{
    WriteConnectorConfig("{\"dorvannebilastprivatebackuptime\": \"yesterday\"}");
    Start(SignedOutRecord());
    EXPECT_FALSE(m_backup->GetLastPrivateBackupTimestamp().IsValid());
    // Nobody signed in at start-up: no change of state, so the stored text stays.
    EXPECT_EQ(StoredBackupTime(), "yesterday");

    auto config = DorvanNebiConnector::GetInstance()->GetConfig();
    for (const char* text : {"", "2023-02-30T10:11:12", "2023-05-04 10:11:12", "2023-05-04T25:00:00",
                             "2023-05-04T10:11:12 and more"})
    {
        config->SetValue<wxString>("dorvannebilastprivatebackuptime", text);
        EXPECT_FALSE(m_backup->GetLastPrivateBackupTimestamp().IsValid()) << text;
    }
    config->SetValue<wxString>("dorvannebilastprivatebackuptime", "2024-01-02T03:04:05");
    EXPECT_EQ(m_backup->GetLastPrivateBackupTimestamp(), wxDateTime(2, wxDateTime::Jan, 2024, 3, 4, 5));
    // Cached from now on.
    config->SetValue<wxString>("dorvannebilastprivatebackuptime", "2025-01-01T00:00:00");
    EXPECT_EQ(m_backup->GetLastPrivateBackupTimestamp(), wxDateTime(2, wxDateTime::Jan, 2024, 3, 4, 5));
}
