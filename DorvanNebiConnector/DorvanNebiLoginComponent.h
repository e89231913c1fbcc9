#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <boost/signals2/signal.hpp>
#include <wx/datetime.h>
#include <wx/string.h>

#include <atomic>
#include <map>
#include <mutex>
#include <string>
#include <utility>

namespace boost::asio
{
class thread_pool;
}

// Whether a user is signed in. The numbers cross the interface.
enum LoginState
{
    LoggedIn = 2,
    LoggedOut = 4
};

// The login state and the signed-in user's data, as the local agent reports
// them, and the agent's interactive flows (login, sign-up, invite user,
// logout). Every signal is raised on the host's GUI thread.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiLoginComponent : public DorvanNebiConnectorComponent
{
public:
    // Raised when the login state changes, with the new state.
    boost::signals2::signal<void(LoginState)> m_sigLoginStateChanged;
    // Raised with the user name and e-mail address whenever the agent reports
    // a signed-in user (also when they did not change).
    boost::signals2::signal<void(wxString, wxString)> m_sigUserInfoChanged;
    // Raised with the user's role whenever the agent reports a signed-in user.
    boost::signals2::signal<void(NebiUserRole)> m_sigUserRoleChanged;
    // Raised with the id that RequestLogOut returned and whether the agent
    // confirmed the logout.
    boost::signals2::signal<void(wxString, bool)> m_sigLogOutResult;

    // Stores the pool and queues the start-up query: up to four attempts, one
    // second apart, to learn from the agent whether a user is signed in.
    explicit DorvanNebiLoginComponent(boost::asio::thread_pool* pool);
    ~DorvanNebiLoginComponent() override;

    DorvanNebiLoginComponent(const DorvanNebiLoginComponent&) = delete;
    DorvanNebiLoginComponent& operator=(const DorvanNebiLoginComponent&) = delete;

    // The state as last applied on the GUI thread.
    LoginState GetLoginState();
    // The last signed-in user's data; kept after a logout until the next login.
    wxDateTime GetSigninTime();
    wxString GetLoginSession();
    const std::pair<wxString, wxString> GetUserInfo(); // user name, e-mail address
    NebiUserRole GetUserRole() const;

    // Asks the agent again whether a user is signed in.
    void RefreshLoginState();

    // Open the agent's login, sign-up and invite-user pages. Login and sign-up
    // start only while logged out, invite user only while logged in. Return true.
    bool RequestLogin();
    bool RequestSignUp();
    bool RequestInviteUser();
    // Asks the agent to log the user out, while logged in. Returns the request
    // id that m_sigLogOutResult will carry, or an empty string when not logged in.
    wxString RequestLogOut();

    // Asks the agent, synchronously on the calling thread, for the signed-in
    // user's API key (first) and API secret (second); empty strings when the
    // agent cannot be reached or sends none.
    const std::pair<std::string, std::string> GetLoginToken();

private:
    using LoginRecord = std::map<wxString, wxString>; // as DorvanNebiLoginRecord::Members

    void QueryLoginState();
    bool DoRefreshLoginState();
    bool DoRequestLogin();
    bool DoRequestSignUp();
    bool DoRequestInviteUser();
    bool DoRequestLogOut(const wxString& requestId);
    LoginRecord DoRequestLoginDataFromLocalhost();

    // Shared by the login and sign-up jobs, which differ only in the page.
    bool DoRequestInteractiveLogin(const char* path, const char* function);
    // Asks the agent for path and parses its answer as a login data record.
    // False when the exchange failed; parsed tells whether the body parsed.
    bool RequestRecord(const char* path, LoginRecord& record, bool& parsed, std::string& body);
    void OnLogin(LoginRecord& data);
    void PostIfAdmitted(LoginState admitted, bool (DorvanNebiLoginComponent::*job)());

    void SetLoginState(LoginState state);
    void SetUserInfo(const wxString& name, const wxString& email);
    void SetUserRole(const wxString& role);

    std::mutex m_mutex;
    std::atomic<LoginState> m_loginState{LoggedOut}; // written only on the GUI thread
    std::pair<wxString, wxString> m_userInfo;
    wxDateTime m_signinTime;
    wxString m_loginSession;
    NebiUserRole m_userRole = UserRoleUnknown;
    boost::asio::thread_pool* m_pThreadPool;
    // Guards the user's data above (not the login state, which only the GUI
    // thread touches): held for the copy in and the copy out, never across an
    // exchange with the agent.
    mutable std::mutex m_userDataMutex;
};
