#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>
#include <DorvanNebiConnector/DorvanNebiLoginRecord.h>

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>

#include <chrono>

using namespace DorvanNebiConstants;

namespace
{
// The start-up query gives the agent, which may still be starting, this many
// chances, one second apart.
constexpr int kStartupAttempts = 4;
constexpr std::chrono::milliseconds kStartupRetryDelay(1000);

// "nebilogin response parsing failed, HTTP response {...}", with any
// credentials in the body masked.
void LogParseFailure(const char* function, const char* path, const std::string& body)
{
    SetLevelAndGetLogger(SeverityError, kLogSourceLogin, function, __LINE__)
        << (path + 1) << " response parsing failed, HTTP response " << DorvanNebiConnectorUtil::MaskSecrets(body);
}
} // namespace

DorvanNebiLoginComponent::DorvanNebiLoginComponent(boost::asio::thread_pool* pool) : m_pThreadPool(pool)
{
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this] { QueryLoginState(); });
}

DorvanNebiLoginComponent::~DorvanNebiLoginComponent() = default;

LoginState DorvanNebiLoginComponent::GetLoginState()
{
    return m_loginState.load();
}

wxDateTime DorvanNebiLoginComponent::GetSigninTime()
{
    std::lock_guard<std::mutex> lock(m_userDataMutex);
    return m_signinTime;
}

wxString DorvanNebiLoginComponent::GetLoginSession()
{
    std::lock_guard<std::mutex> lock(m_userDataMutex);
    return m_loginSession;
}

const std::pair<wxString, wxString> DorvanNebiLoginComponent::GetUserInfo()
{
    std::lock_guard<std::mutex> lock(m_userDataMutex);
    return m_userInfo;
}

NebiUserRole DorvanNebiLoginComponent::GetUserRole() const
{
    std::lock_guard<std::mutex> lock(m_userDataMutex);
    return m_userRole;
}

void DorvanNebiLoginComponent::RefreshLoginState()
{
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this] { DoRefreshLoginState(); });
}

bool DorvanNebiLoginComponent::RequestLogin()
{
    PostIfAdmitted(LoggedOut, &DorvanNebiLoginComponent::DoRequestLogin);
    return true;
}

bool DorvanNebiLoginComponent::RequestSignUp()
{
    PostIfAdmitted(LoggedOut, &DorvanNebiLoginComponent::DoRequestSignUp);
    return true;
}

bool DorvanNebiLoginComponent::RequestInviteUser()
{
    PostIfAdmitted(LoggedIn, &DorvanNebiLoginComponent::DoRequestInviteUser);
    return true;
}

wxString DorvanNebiLoginComponent::RequestLogOut()
{
    std::lock_guard<std::mutex> lock(m_mutex);
    if (m_loginState != LoggedIn)
    {
        return wxString();
    }
    const wxString requestId = GlobalUtils::GetUUID();
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, requestId] { DoRequestLogOut(requestId); });
    return requestId;
}

const std::pair<std::string, std::string> DorvanNebiLoginComponent::GetLoginToken()
{
    LoginRecord record = DoRequestLoginDataFromLocalhost();
    const std::string secret = DorvanNebiConnectorUtil::ToUtf8(record[kKeyApiSecret]);
    const std::string key = DorvanNebiConnectorUtil::ToUtf8(record[kKeyApiKey]);
    return {key, secret};
}

void DorvanNebiLoginComponent::PostIfAdmitted(LoginState admitted, bool (DorvanNebiLoginComponent::*job)())
{
    std::lock_guard<std::mutex> lock(m_mutex);
    if (m_loginState == admitted)
    {
        DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, job] { (this->*job)(); });
    }
}

void DorvanNebiLoginComponent::QueryLoginState()
{
    for (int attempt = 1; attempt <= kStartupAttempts; ++attempt)
    {
        const bool answered = DoRefreshLoginState();
        SetLevelAndGetLogger(SeverityInfo, kLogSourceLogin, "DorvanNebiLoginComponent::QueryLoginState", __LINE__)
            << " Initial login Retry attempt: " << attempt;
        if (answered || !DorvanNebiConnectorUtil::PauseUnlessExiting(kStartupRetryDelay))
        {
            return;
        }
    }
}

bool DorvanNebiLoginComponent::DoRefreshLoginState()
{
    LoginRecord record;
    bool parsed = false;
    std::string body;
    if (!RequestRecord(kAgentLoginPath, record, parsed, body))
    {
        SetLoginState(LoggedOut);
        return false;
    }
    if (!parsed)
    {
        LogParseFailure("DorvanNebiLoginComponent::DoRefreshLoginState", kAgentLoginPath, body);
        SetLoginState(LoggedOut);
        return true;
    }
    if (record[kKeyIsLoginSuccess] == kYes)
    {
        OnLogin(record);
        SetLoginState(LoggedIn);
    }
    else
    {
        SetLoginState(LoggedOut);
    }
    return true;
}

bool DorvanNebiLoginComponent::DoRequestLogin()
{
    return DoRequestInteractiveLogin(kAgentLoginUiPath, "DorvanNebiLoginComponent::DoRequestLogin");
}

bool DorvanNebiLoginComponent::DoRequestSignUp()
{
    // A completed sign-up signs the new user in: the answer is a login record.
    return DoRequestInteractiveLogin(kAgentSignUpUiPath, "DorvanNebiLoginComponent::DoRequestSignUp");
}

bool DorvanNebiLoginComponent::DoRequestInteractiveLogin(const char* path, const char* function)
{
    LoginRecord record;
    bool parsed = false;
    std::string body;
    if (!RequestRecord(path, record, parsed, body))
    {
        return false;
    }
    if (!parsed)
    {
        LogParseFailure(function, path, body);
        return false;
    }
    if (record[kKeyIsLoginSuccess] != kYes)
    {
        return false;
    }
    OnLogin(record);
    SetLoginState(LoggedIn);
    return true;
}

bool DorvanNebiLoginComponent::DoRequestInviteUser()
{
    std::string body;
    return DorvanNebiConnectorUtil::SendHTTPRequest(DorvanNebiConnectorUtil::MakeLocalhostURI(kAgentInviteUserUiPath),
                                                    body);
}

bool DorvanNebiLoginComponent::DoRequestLogOut(const wxString& requestId)
{
    LoginRecord record;
    bool parsed = false;
    std::string body;
    bool confirmed = false;
    if (RequestRecord(kAgentLogoutPath, record, parsed, body))
    {
        if (parsed)
        {
            confirmed = record[kKeyIsLogoutSuccess] == kYes;
        }
        else
        {
            LogParseFailure("DorvanNebiLoginComponent::DoRequestLogOut", kAgentLogoutPath, body);
        }
    }
    if (confirmed)
    {
        // Queued first, so that the state signal reaches the host before the result.
        SetLoginState(LoggedOut);
    }
    DorvanNebiConnectorUtil::PostToGuiThread([this, requestId, confirmed] { m_sigLogOutResult(requestId, confirmed); });
    return confirmed;
}

DorvanNebiLoginComponent::LoginRecord DorvanNebiLoginComponent::DoRequestLoginDataFromLocalhost()
{
    LoginRecord record;
    bool parsed = false;
    std::string body;
    RequestRecord(kAgentLoginPath, record, parsed, body);
    return record;
}

bool DorvanNebiLoginComponent::RequestRecord(const char* path, LoginRecord& record, bool& parsed, std::string& body)
{
    if (!DorvanNebiConnectorUtil::SendHTTPRequest(DorvanNebiConnectorUtil::MakeLocalhostURI(path), body))
    {
        return false;
    }
    parsed = DorvanNebiLoginRecord::Parse(body, record);
    return true;
}

void DorvanNebiLoginComponent::OnLogin(LoginRecord& data)
{
    {
        std::lock_guard<std::mutex> lock(m_userDataMutex);
        // A sign-in time that does not parse leaves the earlier one.
        DorvanNebiLoginRecord::ReadSigninTime(data, m_signinTime);
        m_loginSession = data[kKeySessionId];
    }
    const wxString email = data[kKeyEmail];
    const wxString name = data[kKeyUserName];
    SetUserInfo(name, email);
    SetUserRole(data[kKeyUserRole]);
}

void DorvanNebiLoginComponent::SetLoginState(LoginState state)
{
    // The state changes only on the GUI thread, and its signal fires only on
    // a real change.
    DorvanNebiConnectorUtil::PostToGuiThread([this, state] {
        if (m_loginState == state)
        {
            return;
        }
        m_loginState = state;
        m_sigLoginStateChanged(state);
    });
}

void DorvanNebiLoginComponent::SetUserInfo(const wxString& name, const wxString& email)
{
    {
        std::lock_guard<std::mutex> lock(m_userDataMutex);
        m_userInfo = std::make_pair(name, email);
    }
    DorvanNebiConnectorUtil::PostToGuiThread([this, name, email] { m_sigUserInfoChanged(name, email); });
}

void DorvanNebiLoginComponent::SetUserRole(const wxString& role)
{
    {
        std::lock_guard<std::mutex> lock(m_userDataMutex);
        m_userRole = DorvanNebiConnectorTypes::FromString(role);
    }
    // The signal carries the role stored when the GUI thread runs this.
    DorvanNebiConnectorUtil::PostToGuiThread([this] { m_sigUserRoleChanged(GetUserRole()); });
}
