// The login component against a local agent stand-in: the start-up query,
// refreshes, the interactive flows, logout and the API token.

#include "AgentFixture.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>

#include <gtest/gtest.h>

#include <atomic>
#include <set>
#include <thread>

using namespace TestSupport;

namespace
{
const char kLoginPath[] = "/api/v1/nebilogin";

// Every signal of the login component, in the order the host saw them.
class LoginSignals
{
public:
    explicit LoginSignals(DorvanNebiLoginComponent& login)
    {
        login.m_sigUserInfoChanged.connect([this](wxString name, wxString email) {
            Add("userinfo " + name.utf8_string() + " <" + email.utf8_string() + ">");
        });
        login.m_sigUserRoleChanged.connect([this](NebiUserRole role) { Add("role " + std::to_string(role)); });
        login.m_sigLoginStateChanged.connect([this](LoginState state) { Add("state " + std::to_string(state)); });
        login.m_sigLogOutResult.connect([this](wxString id, bool ok) {
            Add("logout " + id.utf8_string() + (ok ? " true" : " false"));
        });
    }

    std::vector<std::string> events;
    std::thread::id onThread;

private:
    void Add(const std::string& event)
    {
        events.push_back(event);
        EXPECT_EQ(std::this_thread::get_id(), onThread) << "signal raised off the GUI thread: " << event;
    }
};

class Login : public AgentFixture
{
protected:
    void Start()
    {
        StartConnector();
        m_login = DorvanNebiConnector::GetInstance()->GetLoginComponent();
        m_signals = std::make_unique<LoginSignals>(*m_login);
        m_signals->onThread = std::this_thread::get_id();
    }

    // Starts with a user signed in and the start-up signals already seen.
    void StartSignedIn()
    {
        m_agent.Route(kLoginPath, Reply::Json(SignedInRecord()));
        Start();
        ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));
        m_signals->events.clear();
    }

    const std::vector<std::string>& Events() const { return m_signals->events; }

    std::shared_ptr<DorvanNebiLoginComponent> m_login;
    std::unique_ptr<LoginSignals> m_signals;
};

// The port of a server that is gone: connections are refused.
unsigned short ClosedPort()
{
    LoopbackServer gone;
    const unsigned short port = gone.Port();
    gone.Stop();
    return port;
}
} // namespace

TEST_F(Login, StartupFindsSignedInUserAndAnnouncesInfoRoleThenState)
{
    m_agent.Route(kLoginPath, Reply::Json(SignedInRecord("Ada Lovelace", "ada@example.com", "operator")));
    Start();
    ASSERT_TRUE(RunEventLoopUntil([this] { return Events().size() == 3; }));
    WaitForStartupQuery();

    EXPECT_EQ(Events(), (std::vector<std::string>{"userinfo Ada Lovelace <ada@example.com>", "role 2", "state 2"}));
    EXPECT_EQ(m_login->GetLoginState(), LoggedIn);
    EXPECT_EQ(m_login->GetUserInfo(), std::make_pair(wxString("Ada Lovelace"), wxString("ada@example.com")));
    EXPECT_EQ(m_login->GetUserRole(), UserRoleOperator);
    EXPECT_EQ(m_login->GetLoginSession(), "session-42");
    EXPECT_EQ(m_login->GetSigninTime().FormatISOCombined('T'), "2026-03-04T05:06:07");
    EXPECT_EQ(CountLogLines(" Initial login Retry attempt: 1"), 1u);
    EXPECT_EQ(CountLogLines(" Initial login Retry attempt: "), 1u);
}

TEST_F(Login, StartupWithNobodySignedInIsSilent)
{
    Start();
    EXPECT_EQ(m_login->GetLoginState(), LoggedOut);
    EXPECT_EQ(m_login->GetUserInfo(), std::make_pair(wxString(), wxString()));
    EXPECT_EQ(m_login->GetUserRole(), UserRoleUnknown);
    EXPECT_EQ(m_login->GetLoginSession(), "");
    EXPECT_FALSE(m_login->GetSigninTime().IsValid());
    WaitForStartupQuery();
    RunEventLoopFor(std::chrono::milliseconds(200));
    EXPECT_TRUE(Events().empty());
    EXPECT_EQ(m_agent.RequestCount(kLoginPath), 1u);
    EXPECT_EQ(CountLogLines(" Initial login Retry attempt: "), 1u);
}

TEST_F(Login, StartupRetriesUntilTheAgentAnswers)
{
    std::atomic<int> calls{0};
    m_agent.Route(kLoginPath, [&calls](const RecordedRequest&) {
        return ++calls <= 2 ? Reply::Failing(Reply::Fault::CloseWithoutAnswer) : Reply::Json(SignedInRecord());
    });
    const auto started = std::chrono::steady_clock::now();
    Start();
    // The attempt's log line follows the delivery of its result.
    ASSERT_TRUE(RunEventLoopUntil(
        [this] { return m_login->GetLoginState() == LoggedIn && CountLogLines("Retry attempt: 3") == 1; },
        std::chrono::seconds(20)));

    EXPECT_GE(std::chrono::steady_clock::now() - started, std::chrono::milliseconds(1900)); // two one-second pauses
    EXPECT_EQ(calls.load(), 3);
    for (int attempt = 1; attempt <= 3; ++attempt)
    {
        EXPECT_EQ(CountLogLines(" Initial login Retry attempt: " + std::to_string(attempt)), 1u) << attempt;
    }
    EXPECT_EQ(CountLogLines(" Initial login Retry attempt: "), 3u);
    EXPECT_EQ(Events(), (std::vector<std::string>{"userinfo Ada Lovelace <ada@example.com>", "role 1", "state 2"}));
}

TEST(LoginWithoutAgent, StartupGivesUpAfterFourAttempts)
{
    WriteCloudConfig("{\"quarlport\": \"" + std::to_string(ClosedPort()) + "\"}");
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    auto login = DorvanNebiConnector::GetInstance()->GetLoginComponent();
    int signals = 0;
    login->m_sigLoginStateChanged.connect([&](LoginState) { ++signals; });

    ASSERT_TRUE(RunEventLoopUntil([] { return CountLogLines(" Initial login Retry attempt: 4") == 1; },
                                  std::chrono::seconds(20)));
    RunEventLoopFor(std::chrono::milliseconds(1200)); // the last pause, and then nothing more
    EXPECT_EQ(CountLogLines(" Initial login Retry attempt: "), 4u);
    EXPECT_EQ(CountLogLines("HTTPRequest /api/v1/nebilogin exception, message "), 4u);
    EXPECT_EQ(signals, 0);
    EXPECT_EQ(login->GetLoginState(), LoggedOut);

    // The token needs the agent too: two empty strings, no signal.
    EXPECT_EQ(login->GetLoginToken(), std::make_pair(std::string(), std::string()));
}

TEST_F(Login, RefreshChangesStateOnlyOnARealChangeAndKeepsUserData)
{
    StartSignedIn();

    // The same user again: info and role again, no state change.
    m_login->RefreshLoginState();
    ASSERT_TRUE(RunEventLoopUntil([this] { return Events().size() == 2; }));
    RunEventLoopFor(std::chrono::milliseconds(200));
    EXPECT_EQ(Events(), (std::vector<std::string>{"userinfo Ada Lovelace <ada@example.com>", "role 1"}));

    // "YES" is not "yes": nobody is signed in any more; the data stay.
    m_signals->events.clear();
    m_agent.Route(kLoginPath, Reply::Json("{\"isLoginSuccess\":\"YES\",\"name\":\"Somebody Else\"}"));
    m_login->RefreshLoginState();
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedOut; }));
    EXPECT_EQ(Events(), (std::vector<std::string>{"state 4"}));
    EXPECT_EQ(m_login->GetUserInfo().first, "Ada Lovelace");
    EXPECT_EQ(m_login->GetUserRole(), UserRoleAdmin);
    EXPECT_EQ(m_login->GetLoginSession(), "session-42");

    // Confirming the logged-out state is silent.
    m_login->RefreshLoginState();
    ASSERT_TRUE(m_agent.WaitForRequests(kLoginPath, 3));
    RunEventLoopFor(std::chrono::milliseconds(300));
    EXPECT_EQ(Events(), (std::vector<std::string>{"state 4"}));
}

TEST_F(Login, AnswersThatAreNoLoginRecordSignTheUserOut)
{
    const Reply answers[] = {
        Reply::Status(500, SignedInRecord()),                         // not 200: the body is not read
        Reply::Json(""),                                              // empty
        Reply::Json("<html>agent error</html>"),                      // not JSON
        Reply::Json("[\"isLoginSuccess\", \"yes\"]"),                 // JSON, but no object
        Reply::Failing(Reply::Fault::CutBodyShort, SignedInRecord(), 40), // connection lost mid-body
        Reply::Failing(Reply::Fault::NotHttp),                        // not HTTP at all
        Reply::Json("{\"isLoginSuccess\":\"yes\",\"name\":\"\xff\xfe\"}"), // not UTF-8
    };
    StartSignedIn();
    for (const Reply& answer : answers)
    {
        m_agent.Route(kLoginPath, Reply::Json(SignedInRecord()));
        m_login->RefreshLoginState();
        ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));

        m_agent.Route(kLoginPath, answer);
        m_login->RefreshLoginState();
        ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedOut; }))
            << "answer: " << answer.body;
    }
    EXPECT_EQ(m_login->GetUserInfo().first, "Ada Lovelace");
    EXPECT_GE(CountLogLines("nebilogin response parsing failed, HTTP response "), 4u);
}

TEST_F(Login, NonAsciiUserDataArriveIntact)
{
    m_agent.Route(kLoginPath, Reply::Json(SignedInRecord("Zoë Ørsted-Ünal 山田", "zoë@exämple.com", "")));
    Start();
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));
    EXPECT_EQ(m_login->GetUserInfo().first, wxString::FromUTF8("Zoë Ørsted-Ünal 山田"));
    EXPECT_EQ(m_login->GetUserInfo().second, wxString::FromUTF8("zoë@exämple.com"));
    EXPECT_EQ(Events().front(), "userinfo Zoë Ørsted-Ünal 山田 <zoë@exämple.com>");
    EXPECT_EQ(m_login->GetUserRole(), UserRoleUnknown); // empty role
}

TEST_F(Login, InteractiveLoginAndSignUpAreAdmittedOnlyWhileLoggedOut)
{
    m_agent.Route("/api/v1/nebiloginui", Reply::Json("{\"isLoginSuccess\":\"no\"}"));
    m_agent.Route("/api/v1/nebisignupui", Reply::Json(SignedInRecord("New User", "new@example.com", "Admin")));
    Start();
    WaitForStartupQuery();

    // A declined login changes nothing.
    EXPECT_TRUE(m_login->RequestLogin());
    ASSERT_TRUE(m_agent.WaitForRequests("/api/v1/nebiloginui", 1));
    RunEventLoopFor(std::chrono::milliseconds(200));
    EXPECT_TRUE(Events().empty());
    EXPECT_EQ(m_login->GetLoginState(), LoggedOut);

    // A completed sign-up signs the new user in, like a login.
    EXPECT_TRUE(m_login->RequestSignUp());
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));
    EXPECT_EQ(Events(), (std::vector<std::string>{"userinfo New User <new@example.com>", "role 0", "state 2"}));

    // Logged in now: neither starts a request.
    EXPECT_TRUE(m_login->RequestLogin());
    EXPECT_TRUE(m_login->RequestSignUp());
    RunEventLoopFor(std::chrono::milliseconds(300));
    EXPECT_EQ(m_agent.RequestCount("/api/v1/nebiloginui"), 1u);
    EXPECT_EQ(m_agent.RequestCount("/api/v1/nebisignupui"), 1u);
}

TEST_F(Login, InviteUserOnlyWhileLoggedInAndSilentWhateverTheAnswer)
{
    m_agent.Route("/api/v1/nebiinviteuserui", Reply::Status(500, "not json"));
    Start();
    WaitForStartupQuery();
    EXPECT_TRUE(m_login->RequestInviteUser()); // logged out: nothing is sent
    EXPECT_EQ(m_login->RequestLogOut(), "");   // logged out: no id, no signal

    m_agent.Route(kLoginPath, Reply::Json(SignedInRecord()));
    m_login->RefreshLoginState();
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));
    m_signals->events.clear();

    EXPECT_TRUE(m_login->RequestInviteUser());
    ASSERT_TRUE(m_agent.WaitForRequests("/api/v1/nebiinviteuserui", 1));
    RunEventLoopFor(std::chrono::milliseconds(300));
    EXPECT_EQ(m_agent.RequestCount("/api/v1/nebiinviteuserui"), 1u);
    EXPECT_TRUE(Events().empty());
}

TEST_F(Login, LogoutAnnouncesTheStateBeforeItsResult)
{
    StartSignedIn();
    m_agent.Route("/api/v1/nebilogout", Reply::Json("{\"isLogoutSuccess\":\"yes\"}"));

    const wxString id = m_login->RequestLogOut();
    ASSERT_FALSE(id.empty());
    ASSERT_TRUE(RunEventLoopUntil([this] { return Events().size() == 2; }));
    EXPECT_EQ(Events(), (std::vector<std::string>{"state 4", "logout " + id.utf8_string() + " true"}));
    // A logout clears none of the user's data.
    EXPECT_EQ(m_login->GetUserInfo().second, "ada@example.com");
    EXPECT_EQ(m_login->GetUserRole(), UserRoleAdmin);
}

TEST_F(Login, RefusedOrFailedLogoutKeepsTheUserSignedIn)
{
    const Reply answers[] = {Reply::Json("{\"isLogoutSuccess\":\"no\"}"), Reply::Json("{}"),
                             Reply::Json("not json"), Reply::Status(404),
                             Reply::Failing(Reply::Fault::CloseWithoutAnswer)};
    StartSignedIn();
    std::set<wxString> ids;
    for (const Reply& answer : answers)
    {
        m_signals->events.clear();
        m_agent.Route("/api/v1/nebilogout", answer);
        const wxString id = m_login->RequestLogOut();
        ASSERT_FALSE(id.empty());
        ids.insert(id);
        ASSERT_TRUE(RunEventLoopUntil([this] { return !Events().empty(); }));
        RunEventLoopFor(std::chrono::milliseconds(100));
        EXPECT_EQ(Events(), (std::vector<std::string>{"logout " + id.utf8_string() + " false"})) << answer.body;
        EXPECT_EQ(m_login->GetLoginState(), LoggedIn);
    }
    EXPECT_EQ(ids.size(), 5u);
    EXPECT_EQ(CountLogLines("nebilogout response parsing failed, HTTP response "), 2u); // "not json", 404's empty body
}

TEST_F(Login, TokenIsAskedOfTheAgentOnEveryCall)
{
    m_agent.Route(kLoginPath, Reply::Json("{\"isLoginSuccess\":\"no\",\"apiKey\":\"K1\"}"));
    Start();
    WaitForStartupQuery();
    // Logged out, and no secret sent: the key alone.
    EXPECT_EQ(m_login->GetLoginToken(), std::make_pair(std::string("K1"), std::string()));

    m_agent.Route(kLoginPath, Reply::Json(SignedInRecord("A", "a@b.c", "admin", "K2-ключ", "S2-секрет")));
    EXPECT_EQ(m_login->GetLoginToken(), std::make_pair(std::string("K2-ключ"), std::string("S2-секрет")));
    EXPECT_EQ(m_agent.RequestCount(kLoginPath), 3u);
    // A token fetch changes neither the state nor the user data.
    RunEventLoopFor(std::chrono::milliseconds(200));
    EXPECT_TRUE(Events().empty());
    EXPECT_EQ(m_login->GetLoginState(), LoggedOut);
}

TEST_F(Login, CredentialsNeverReachTheLog)
{
    const std::string key = "KEY-visible-nowhere";
    const std::string secret = "SECRET-visible-nowhere";
    m_agent.Route(kLoginPath, Reply::Json(SignedInRecord("A", "a@b.c", "admin", key, secret)));
    Start();
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedIn; }));
    m_login->GetLoginToken();

    // Broken answers that still carry credentials, under names in any case.
    m_agent.Route(kLoginPath, Reply::Json("{\"APIKEY\": \"" + key + "\", \"session_Token\": \"" + secret + "\", oops"));
    m_login->RefreshLoginState();
    ASSERT_TRUE(RunEventLoopUntil([this] { return m_login->GetLoginState() == LoggedOut; }));
    m_agent.Route("/api/v1/nebiloginui", Reply::Json("{\"apiSceret\":{\"nested\":\"" + secret + "\"}, \"x\": [1,"));
    m_login->RequestLogin();
    ASSERT_TRUE(RunEventLoopUntil([] { return CountLogLines("nebiloginui response parsing failed") == 1; }));

    const std::string log = LogText();
    EXPECT_NE(log.find("HTTPRequest /api/v1/nebilogin success , response {"), std::string::npos);
    EXPECT_NE(log.find("\"apiSceret\":\"***\""), std::string::npos);
    EXPECT_EQ(log.find(key), std::string::npos);
    EXPECT_EQ(log.find(secret), std::string::npos);
    EXPECT_EQ(log.find("KEY-"), std::string::npos);
}
