#include "SignInState.h"

#include <Poco/DateTimeFormatter.h>
#include <Poco/LocalDateTime.h>
#include <Poco/UUIDGenerator.h>

#include <utility>

SignInState::SignInState(AgentUser user, bool signedIn) : m_user(std::move(user))
{
    if (signedIn)
    {
        StartSession();
    }
}

Json::Value SignInState::LoginRecord() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return RecordLocked();
}

Json::Value SignInState::SignIn()
{
    std::lock_guard<std::mutex> lock(m_mutex);
    StartSession();
    return RecordLocked();
}

bool SignInState::SignOut()
{
    std::lock_guard<std::mutex> lock(m_mutex);
    const bool wasSignedIn = m_signedIn;
    m_signedIn = false;
    m_sessionId.clear();
    return wasSignedIn;
}

bool SignInState::IsSignedIn() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return m_signedIn;
}

std::string SignInState::UserName() const
{
    return m_user.name;
}

void SignInState::StartSession()
{
    m_signedIn = true;
    m_signinTime = Poco::DateTimeFormatter::format(Poco::LocalDateTime(), "%Y-%m-%dT%H:%M:%S");
    m_sessionId = Poco::UUIDGenerator::defaultGenerator().createRandom().toString();
}

Json::Value SignInState::RecordLocked() const
{
    Json::Value record(Json::objectValue);
    if (!m_signedIn)
    {
        record["isLoginSuccess"] = "no";
        return record;
    }
    record["isLoginSuccess"] = "yes";
    record["signintime"] = m_signinTime;
    record["sessionid"] = m_sessionId;
    record["name"] = m_user.name;
    record["email"] = m_user.email;
    record["userrole"] = m_user.role;
    record["apiKey"] = m_user.apiKey;
    record["apiSceret"] = m_user.apiSecret; // sic: the agent's own spelling
    return record;
}
