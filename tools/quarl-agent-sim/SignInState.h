#pragma once

// Who the agent stand-in has signed in. It knows one user, given on its
// command line; the login and sign-up pages sign that user in, the logout
// page signs them out. Safe to use from the server's threads at once.

#include <json/value.h>

#include <mutex>
#include <string>

struct AgentUser
{
    std::string name;
    std::string email;
    std::string role;
    std::string apiKey;
    std::string apiSecret;
};

class SignInState
{
public:
    SignInState(AgentUser user, bool signedIn);

    // The login data record the connector reads: the user's data and API
    // credentials while signed in, {"isLoginSuccess": "no"} otherwise.
    Json::Value LoginRecord() const;

    // Signs the user in with a new session (also when already signed in) and
    // returns the new login data record.
    Json::Value SignIn();

    // Signs the user out; false when nobody was signed in.
    bool SignOut();

    bool IsSignedIn() const;
    std::string UserName() const;

private:
    void StartSession();
    Json::Value RecordLocked() const;

    mutable std::mutex m_mutex;
    const AgentUser m_user;
    bool m_signedIn = false;
    std::string m_signinTime; // local time, YYYY-MM-DDTHH:MM:SS
    std::string m_sessionId;
};
