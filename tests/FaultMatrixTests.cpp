// The fault matrix: every operation of the connector against every way its
// peer (the local agent, or the cloud) can fail. Each row runs in a process of
// its own with real servers on the loopback address and asserts the outcome
// the design gives for that failure: exactly one final signal (or, for the
// operations that report failure by silence, an unchanged state and no signal
// at all), no file left behind, and no credential in the log.

#include "AgentFixture.h"
#include "TestTls.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <CoreServices/GlobalUtils.h>

#include <gtest/gtest.h>
#include <wx/filename.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <set>
#include <thread>

using namespace TestSupport;

namespace
{
// Credentials that must never reach the log.
const char kApiKey[] = "KEY-fault-matrix-7f3a";
const char kApiSecret[] = "SECRET-fault-matrix-9c1e";

const char kLoginPath[] = "/api/v1/nebilogin";
const char kResourcePath[] = "/api/clientapp/v1/resource/r-1/";

// A slow answer: well within every time-out, but long enough for the
// operation to be waiting on it.
constexpr std::chrono::milliseconds kSlowAnswer(300);
// After the final signal: long enough for a second one to show up.
constexpr std::chrono::milliseconds kLinger(200);

enum class Peer
{
    Agent,
    Cloud
};

enum class Operation
{
    StartupQuery,
    Refresh,
    Login,
    SignUp,
    InviteUser,
    Logout,
    Token,
    Services,
    PrivateBackup,
    PublicBackup,
    Restore,
    List,
    Delete
};

enum class Fault
{
    NothingListening,
    ClosedWithoutAnswer,
    NotHttp,
    Status500,
    BodyCutShort,
    SlowAnswer,
    UntrustedCertificate, // cloud only
    OtherHostCertificate  // cloud only
};

enum class Outcome
{
    Success,
    Failure
};

// What the design gives for a body cut short: the transport of the agent and
// of the GET, DELETE and POST clients takes the part received as the body, so
// an operation that reads no body (upload, delete, invite) succeeds on the
// status alone; a JSON answer cut short never parses; a download checks the
// body's framing and fails.
struct OperationRow
{
    Operation operation;
    const char* name;
    Peer peer;
    const char* path; // the one path whose answer the fault replaces
    Outcome bodyCutShort;
};

const OperationRow kOperations[] = {
    {Operation::StartupQuery, "StartupQuery", Peer::Agent, kLoginPath, Outcome::Failure},
    {Operation::Refresh, "Refresh", Peer::Agent, kLoginPath, Outcome::Failure},
    {Operation::Login, "Login", Peer::Agent, "/api/v1/nebiloginui", Outcome::Failure},
    {Operation::SignUp, "SignUp", Peer::Agent, "/api/v1/nebisignupui", Outcome::Failure},
    {Operation::InviteUser, "InviteUser", Peer::Agent, "/api/v1/nebiinviteuserui", Outcome::Success},
    {Operation::Logout, "Logout", Peer::Agent, "/api/v1/nebilogout", Outcome::Failure},
    {Operation::Token, "Token", Peer::Agent, kLoginPath, Outcome::Failure},
    {Operation::Services, "Services", Peer::Agent, "/api/v1/nebiservices", Outcome::Failure},
    {Operation::PrivateBackup, "PrivateBackup", Peer::Cloud, "/api/clientapp/v1/resource", Outcome::Success},
    {Operation::PublicBackup, "PublicBackup", Peer::Cloud, "/api/clientapp/v1/resource", Outcome::Success},
    {Operation::Restore, "Restore", Peer::Cloud, kResourcePath, Outcome::Failure},
    {Operation::List, "List", Peer::Cloud, "/api/clientapp/v1/resources/dorvannebiusersettingresource",
     Outcome::Failure},
    {Operation::Delete, "Delete", Peer::Cloud, kResourcePath, Outcome::Success},
};

struct FaultRow
{
    Fault fault;
    const char* name;
    bool cloudOnly;
};

const FaultRow kFaults[] = {
    {Fault::NothingListening, "NothingListening", false},
    {Fault::ClosedWithoutAnswer, "ClosedWithoutAnswer", false},
    {Fault::NotHttp, "NotHttp", false},
    {Fault::Status500, "Status500", false},
    {Fault::BodyCutShort, "BodyCutShort", false},
    {Fault::SlowAnswer, "SlowAnswer", false},
    {Fault::UntrustedCertificate, "UntrustedCertificate", true},
    {Fault::OtherHostCertificate, "OtherHostCertificate", true},
};

struct Case
{
    OperationRow operation;
    FaultRow fault;
    Outcome expected;
};

// Every operation against every fault of its peer. Only a slow answer, which
// is a proper answer in the end, and a body cut short that the operation does
// not read, succeed.
std::vector<Case> AllCases()
{
    std::vector<Case> cases;
    for (const OperationRow& operation : kOperations)
    {
        for (const FaultRow& fault : kFaults)
        {
            if (fault.cloudOnly && operation.peer != Peer::Cloud)
            {
                continue;
            }
            Outcome expected = Outcome::Failure;
            if (fault.fault == Fault::SlowAnswer)
            {
                expected = Outcome::Success;
            }
            else if (fault.fault == Fault::BodyCutShort)
            {
                expected = operation.bodyCutShort;
            }
            cases.push_back(Case{operation, fault, expected});
        }
    }
    return cases;
}

// Shown instead of the bytes of the row.
void PrintTo(const Case& row, std::ostream* out)
{
    *out << row.operation.name << " with " << row.fault.name;
}

std::string CaseName(const testing::TestParamInfo<Case>& info)
{
    return std::string(info.param.operation.name) + "_" + info.param.fault.name;
}

const std::string kArchive = [] {
    std::string bytes(5000, '\0');
    for (std::size_t i = 0; i < bytes.size(); ++i)
    {
        bytes[i] = static_cast<char>((i * 37 + 11) & 0xFF);
    }
    return bytes;
}();

// The proper answer of the path each operation asks.
Reply GoodAnswer(Operation operation)
{
    switch (operation)
    {
    case Operation::StartupQuery:
    case Operation::Refresh:
    case Operation::Token:
    case Operation::Login:
    case Operation::SignUp:
        return Reply::Json(SignedInRecord("Ada", "ada@example.com", "admin", kApiKey, kApiSecret));
    case Operation::InviteUser:
        return Reply::Json("{}");
    case Operation::Logout:
        return Reply::Json("{\"isLogoutSuccess\":\"yes\"}");
    case Operation::Services:
        return Reply::Json("[{\"serviceid\":\"s-1\",\"servicename\":\"Backup\"}]");
    case Operation::PrivateBackup:
    case Operation::PublicBackup:
        return Reply::Json("{\"resourceid\":\"r-1\",\"status\":\"stored\"}");
    case Operation::Restore:
        return Reply::Status(200, kArchive);
    case Operation::List:
        return Reply::Json("{\"response\":[{\"resourceid\":\"r-1\",\"resourcename\":\"Mine\","
                           "\"description\":\"d\",\"accessibility\":\"public\"}]}");
    case Operation::Delete:
        return Reply::Json("{\"deleted\":true}");
    }
    return Reply::Status(404);
}

Reply FaultyAnswer(Fault fault, const Reply& good)
{
    switch (fault)
    {
    case Fault::ClosedWithoutAnswer:
        return Reply::Failing(Reply::Fault::CloseWithoutAnswer);
    case Fault::NotHttp:
        return Reply::Failing(Reply::Fault::NotHttp, good.body);
    case Fault::Status500:
    {
        // A body that would do, were it read.
        Reply reply = good;
        reply.status = 500;
        return reply;
    }
    case Fault::BodyCutShort:
    {
        Reply reply = good;
        reply.fault = Reply::Fault::CutBodyShort;
        reply.cutAfter = good.body.size() / 2;
        return reply;
    }
    case Fault::SlowAnswer:
    {
        Reply reply = good;
        reply.delay = kSlowAnswer;
        return reply;
    }
    case Fault::NothingListening:
    case Fault::UntrustedCertificate:
    case Fault::OtherHostCertificate:
        break;
    }
    return good;
}

ServerCertificate CloudCertificate(Fault fault)
{
    switch (fault)
    {
    case Fault::UntrustedCertificate:
        return ServerCertificate::SelfSigned;
    case Fault::OtherHostCertificate:
        return ServerCertificate::OtherHost;
    default:
        return ServerCertificate::Localhost;
    }
}

// Every file below the user data directory, relative to it.
std::set<std::string> UserDataFiles()
{
    std::set<std::string> files;
    const std::filesystem::path root = GlobalUtils::ToFileSystemPath(UserDataDir());
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root))
    {
        if (!entry.is_directory())
        {
            files.insert(std::filesystem::relative(entry.path(), root).generic_u8string());
        }
    }
    return files;
}

class FaultMatrix : public AgentFixture, public testing::WithParamInterface<Case>
{
protected:
    FaultMatrix() : m_case(GetParam()), m_cloud(ServerTlsContext(CloudCertificate(GetParam().fault.fault)))
    {
        TrustTestAuthority();
        m_guiThread = std::this_thread::get_id();
    }

    bool Succeeds() const { return m_case.expected == Outcome::Success; }
    Operation Op() const { return m_case.operation.operation; }

    // Agent and cloud answer properly, as a signed-in user's would, except
    // that the agent says signedIn or not.
    void RouteProperAnswers(bool signedIn)
    {
        const std::string record = SignedInRecord("Ada", "ada@example.com", "admin", kApiKey, kApiSecret);
        m_agent.Route(kLoginPath, Reply::Json(signedIn ? record : SignedOutRecord()));
        for (const Operation operation : {Operation::PrivateBackup, Operation::List, Operation::Restore})
        {
            m_cloud.Route(RowOf(operation).path, GoodAnswer(operation));
        }
        // DELETE shares its path with the restore's GET.
        m_cloud.Route(kResourcePath, [](const RecordedRequest& request) {
            return GoodAnswer(request.method == "DELETE" ? Operation::Delete : Operation::Restore);
        });
        for (const Operation operation : {Operation::Login, Operation::SignUp, Operation::InviteUser,
                                          Operation::Logout, Operation::Services})
        {
            m_agent.Route(RowOf(operation).path, GoodAnswer(operation));
        }
    }

    static const OperationRow& RowOf(Operation operation)
    {
        return *std::find_if(std::begin(kOperations), std::end(kOperations),
                             [&](const OperationRow& row) { return row.operation == operation; });
    }

    // Puts the fault in place: the faulty answer on the operation's path, or
    // the peer stopped.
    void InjectFault()
    {
        LoopbackServer& peer = m_case.operation.peer == Peer::Agent ? m_agent : m_cloud;
        if (m_case.fault.fault == Fault::NothingListening)
        {
            peer.Stop();
            return;
        }
        const Reply faulty = FaultyAnswer(m_case.fault.fault, GoodAnswer(Op()));
        if (Op() == Operation::Delete || Op() == Operation::Restore)
        {
            // Only the operation's own method meets the fault.
            const char* method = Op() == Operation::Delete ? "DELETE" : "GET";
            const Operation other = Op() == Operation::Delete ? Operation::Restore : Operation::Delete;
            peer.Route(kResourcePath, [faulty, method, other](const RecordedRequest& request) {
                return request.method == method ? faulty : GoodAnswer(other);
            });
            return;
        }
        peer.Route(m_case.operation.path, faulty);
    }

    void Start(bool signedIn)
    {
        RouteProperAnswers(signedIn);
        if (Op() == Operation::StartupQuery)
        {
            InjectFault();
        }
        StartConnector("\"nebidomain\": \"localhost\", \"nebiport\": \"" + std::to_string(m_cloud.Port()) + "\"");
        ConnectSignals();
        if (Op() == Operation::StartupQuery)
        {
            return;
        }
        const LoginState expected = signedIn ? LoggedIn : LoggedOut;
        ASSERT_TRUE(RunEventLoopUntil([&] { return m_login->GetLoginState() == expected; }));
        WaitForStartupQuery();
        m_events.clear();
        InjectFault();
    }

    void ConnectSignals()
    {
        DorvanNebiConnector* connector = DorvanNebiConnector::GetInstance();
        m_login = connector->GetLoginComponent();
        m_services = connector->GetServicesComponent();
        m_backup = connector->GetBackupRestoreComponent();
        m_login->m_sigLoginStateChanged.connect(
            [this](LoginState state) { Record("state " + std::to_string(state)); });
        m_login->m_sigUserInfoChanged.connect([this](wxString name, wxString) { Record("userinfo " + name.utf8_string()); });
        m_login->m_sigUserRoleChanged.connect([this](NebiUserRole role) { Record("role " + std::to_string(role)); });
        m_login->m_sigLogOutResult.connect([this](wxString id, bool confirmed) {
            RecordFinal(id, confirmed ? "logout true" : "logout false");
        });
        m_services->m_sigServicesReceived.connect([this](std::vector<DorvanNebiServiceInfo> services) {
            Record("services " + std::to_string(services.size()));
            ++m_finals;
        });
        m_backup->m_sigBackupStatus.connect([this](BackupRestoreComponent::BackupStatus status) {
            if (status.state == BackupRestoreComponent::Started)
            {
                RecordStart(status.requestId, "backup started");
                return;
            }
            RecordFinal(status.requestId,
                        status.error == BackupRestoreComponent::NoError ? "backup finished" : "backup failed");
        });
        m_backup->m_sigRestoreStatus.connect([this](BackupRestoreComponent::RestoreStatus status) {
            if (status.state == BackupRestoreComponent::Started)
            {
                EXPECT_TRUE(status.filePath.empty());
                RecordStart(status.requestId, "restore started");
                return;
            }
            m_restoredPath = status.filePath;
            EXPECT_EQ(status.error == BackupRestoreComponent::NoError, !status.filePath.empty());
            RecordFinal(status.requestId,
                        status.error == BackupRestoreComponent::NoError ? "restore finished" : "restore failed");
        });
        m_backup->m_sigLastPrivateBackupTimestampChanged.connect(
            [this](wxDateTime time) { Record(time.IsValid() ? "timestamp" : "timestamp cleared"); });
        m_backup->m_sigListOfBackup.connect([this](wxString id, std::vector<DorvanNebiResource> resources) {
            RecordFinal(id, "list " + std::to_string(resources.size()));
        });
        m_backup->m_sigDeleteResult.connect([this](wxString id, wxString resourceId, bool deleted) {
            EXPECT_EQ(resourceId, "r-1");
            RecordFinal(id, deleted ? "delete true" : "delete false");
        });
    }

    void Record(const std::string& event)
    {
        EXPECT_EQ(std::this_thread::get_id(), m_guiThread) << "signal off the GUI thread: " << event;
        m_events.push_back(event);
    }

    void RecordStart(const wxString& id, const std::string& event)
    {
        EXPECT_FALSE(id.empty()) << event;
        EXPECT_EQ(id, m_requestId) << event;
        Record(event);
    }

    void RecordFinal(const wxString& id, const std::string& event)
    {
        RecordStart(id, event);
        ++m_finals;
    }

    // Runs the event loop until the operation's final signal has arrived,
    // then a little longer, so that a second one would be seen.
    void WaitForFinalSignal()
    {
        EXPECT_TRUE(RunEventLoopUntil([this] { return m_finals > 0; }, std::chrono::seconds(20)));
        RunEventLoopFor(kLinger);
        EXPECT_EQ(m_finals, 1) << "exactly one final signal per request";
    }

    // For the operations that report nothing when they fail: runs the event
    // loop until the transport has logged the end of the exchange with path,
    // then a little longer for whatever the job delivers after it.
    void WaitForSilentEnd(const std::string& path)
    {
        EXPECT_TRUE(RunEventLoopUntil([&] { return CountLogLines("HTTPRequest " + path) > 0; }));
        RunEventLoopFor(kLinger);
    }

    wxString Archive()
    {
        const wxString path = SandboxDir() + "/settings.zip";
        WriteFile(path, kArchive);
        return path;
    }

    void RunOperation();

    Case m_case;
    LoopbackServer m_cloud;
    std::thread::id m_guiThread;
    std::shared_ptr<DorvanNebiLoginComponent> m_login;
    std::shared_ptr<DorvanNebiServicesComponent> m_services;
    std::shared_ptr<BackupRestoreComponent> m_backup;
    std::vector<std::string> m_events;
    wxString m_requestId;
    int m_finals = 0;
    wxString m_restoredPath;
};

void FaultMatrix::RunOperation()
{
    using Events = std::vector<std::string>;
    const bool succeeds = Succeeds();
    switch (Op())
    {
    case Operation::StartupQuery:
    {
        Start(true);
        // An attempt that got an answer is the last; one that did not is
        // followed by three more.
        const bool answered = m_case.fault.fault != Fault::NothingListening &&
                              m_case.fault.fault != Fault::ClosedWithoutAnswer &&
                              m_case.fault.fault != Fault::NotHttp;
        const std::string lastAttempt = "Initial login Retry attempt: " + std::string(answered ? "1" : "4");
        ASSERT_TRUE(RunEventLoopUntil([&] { return CountLogLines(lastAttempt) == 1; }, std::chrono::seconds(20)));
        RunEventLoopFor(kLinger);
        EXPECT_EQ(CountLogLines("Initial login Retry attempt: "), answered ? 1u : 4u);
        EXPECT_EQ(m_events, succeeds ? (Events{"userinfo Ada", "role 1", "state 2"}) : Events{});
        EXPECT_EQ(m_login->GetLoginState(), succeeds ? LoggedIn : LoggedOut);
        break;
    }
    case Operation::Refresh:
        Start(true);
        m_login->RefreshLoginState();
        if (succeeds)
        {
            // The same user again: info and role, and no change of state.
            ASSERT_TRUE(RunEventLoopUntil([&] { return m_events.size() == 2; }));
            RunEventLoopFor(kLinger);
            EXPECT_EQ(m_events, (Events{"userinfo Ada", "role 1"}));
        }
        else
        {
            // A refresh that learns nothing signs the user out, once; the
            // data stay, and the backup time is cleared.
            ASSERT_TRUE(RunEventLoopUntil([&] { return m_login->GetLoginState() == LoggedOut; }));
            RunEventLoopFor(kLinger);
            EXPECT_EQ(m_events, (Events{"timestamp cleared", "state 4"}));
            EXPECT_EQ(m_login->GetUserInfo().first, "Ada");
        }
        break;
    case Operation::Login:
    case Operation::SignUp:
        Start(false);
        EXPECT_TRUE(Op() == Operation::Login ? m_login->RequestLogin() : m_login->RequestSignUp());
        if (succeeds)
        {
            ASSERT_TRUE(RunEventLoopUntil([&] { return m_login->GetLoginState() == LoggedIn; }));
            RunEventLoopFor(kLinger);
            EXPECT_EQ(m_events, (Events{"userinfo Ada", "role 1", "state 2"}));
        }
        else
        {
            WaitForSilentEnd(m_case.operation.path);
            EXPECT_EQ(m_events, Events{});
            EXPECT_EQ(m_login->GetLoginState(), LoggedOut);
        }
        break;
    case Operation::InviteUser:
        // Reports nothing, whatever happens.
        Start(true);
        EXPECT_TRUE(m_login->RequestInviteUser());
        WaitForSilentEnd(m_case.operation.path);
        EXPECT_EQ(m_events, Events{});
        EXPECT_EQ(m_login->GetLoginState(), LoggedIn);
        break;
    case Operation::Logout:
        Start(true);
        m_requestId = m_login->RequestLogOut();
        ASSERT_FALSE(m_requestId.empty());
        WaitForFinalSignal();
        EXPECT_EQ(m_events, succeeds ? (Events{"timestamp cleared", "state 4", "logout true"}) :
                                       Events{"logout false"});
        EXPECT_EQ(m_login->GetLoginState(), succeeds ? LoggedOut : LoggedIn);
        break;
    case Operation::Token:
    {
        Start(true);
        const std::pair<std::string, std::string> token = m_login->GetLoginToken();
        EXPECT_EQ(token, succeeds ? std::make_pair(std::string(kApiKey), std::string(kApiSecret)) :
                                    std::make_pair(std::string(), std::string()));
        RunEventLoopFor(kLinger);
        EXPECT_EQ(m_events, Events{});
        EXPECT_EQ(m_login->GetLoginState(), LoggedIn);
        break;
    }
    case Operation::Services:
        Start(true);
        EXPECT_TRUE(m_services->GetServices());
        WaitForFinalSignal();
        EXPECT_EQ(m_events, Events{succeeds ? "services 1" : "services 0"});
        break;
    case Operation::PrivateBackup:
    case Operation::PublicBackup:
    {
        Start(true);
        const wxString archive = Archive();
        // The private backup asks for the file's removal, the public one not.
        const bool isPrivate = Op() == Operation::PrivateBackup;
        m_requestId = isPrivate ? m_backup->BackupToPrivateSpace(archive, true) :
                                  m_backup->BackupToPublicSpace(archive, "Team", "For everyone", false);
        ASSERT_FALSE(m_requestId.empty());
        WaitForFinalSignal();
        if (isPrivate && succeeds)
        {
            EXPECT_EQ(m_events, (Events{"backup started", "timestamp", "backup finished"}));
        }
        else
        {
            EXPECT_EQ(m_events, (Events{"backup started", succeeds ? "backup finished" : "backup failed"}));
        }
        EXPECT_EQ(m_backup->GetLastPrivateBackupTimestamp().IsValid(), isPrivate && succeeds);
        // The file goes only when asked, whatever the outcome; the removal
        // follows the result on the worker.
        if (isPrivate)
        {
            EXPECT_TRUE(RunEventLoopUntil([&] { return !wxFileName::FileExists(archive); }));
        }
        else
        {
            EXPECT_TRUE(wxFileName::FileExists(archive));
        }
        break;
    }
    case Operation::Restore:
        Start(true);
        m_requestId = m_backup->RestoreFromPublicSpace("r-1");
        ASSERT_FALSE(m_requestId.empty());
        WaitForFinalSignal();
        EXPECT_EQ(m_events, (Events{"restore started", succeeds ? "restore finished" : "restore failed"}));
        if (succeeds)
        {
            EXPECT_TRUE(ReadFile(m_restoredPath) == kArchive);
        }
        break;
    case Operation::List:
        Start(true);
        m_requestId = m_backup->GetListOfBackup();
        ASSERT_FALSE(m_requestId.empty());
        WaitForFinalSignal();
        EXPECT_EQ(m_events, Events{succeeds ? "list 1" : "list 0"});
        break;
    case Operation::Delete:
        Start(true);
        m_requestId = m_backup->Delete("public", "r-1");
        ASSERT_FALSE(m_requestId.empty());
        WaitForFinalSignal();
        EXPECT_EQ(m_events, Events{succeeds ? "delete true" : "delete false"});
        break;
    }
}
} // namespace

TEST_P(FaultMatrix, OneOutcomeNoLeftoversNoSecrets)
{
    RunOperation();
    if (HasFatalFailure())
    {
        return;
    }

    // Files: the connector's own configuration (written when the backup time
    // changes) and a restored archive the host was told about; nothing else,
    // no partial download, no temporary file.
    std::set<std::string> expected;
    if (!m_restoredPath.empty())
    {
        expected.insert("Backup/" + wxFileName(m_restoredPath).GetFullName().utf8_string());
    }
    std::set<std::string> files = UserDataFiles();
    files.erase("dorvannebiconnector/dorvannebiconnector.json");
    EXPECT_EQ(files, expected);

    // Credentials never reach the log, whatever went wrong.
    const std::string log = LogText();
    EXPECT_EQ(log.find(kApiKey), std::string::npos);
    EXPECT_EQ(log.find(kApiSecret), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(EveryOperationEveryFault, FaultMatrix, testing::ValuesIn(AllCases()), CaseName);
