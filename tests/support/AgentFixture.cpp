#include "AgentFixture.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>

namespace TestSupport
{
std::string SignedInRecord(const std::string& name, const std::string& email, const std::string& role,
                           const std::string& apiKey, const std::string& apiSecret)
{
    return "{\"isLoginSuccess\":\"yes\",\"signintime\":\"2026-03-04T05:06:07\",\"sessionid\":\"session-42\","
           "\"name\":\"" + name + "\",\"email\":\"" + email + "\",\"userrole\":\"" + role +
           "\",\"apiKey\":\"" + apiKey + "\",\"apiSceret\":\"" + apiSecret + "\"}";
}

std::string SignedOutRecord()
{
    return "{\"isLoginSuccess\":\"no\"}";
}

AgentFixture::AgentFixture()
{
    m_agent.Route("/api/v1/nebilogin", Reply::Json(SignedOutRecord()));
}

void AgentFixture::StartConnector(const std::string& extraMembers)
{
    std::string config = "{\"quarlport\": \"" + std::to_string(m_agent.Port()) + "\"";
    if (!extraMembers.empty())
    {
        config += ", " + extraMembers;
    }
    config += "}";
    WriteCloudConfig(config);
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
}

void AgentFixture::WaitForStartupQuery()
{
    // The attempt's closures are queued before its log line is written, so
    // once the line is there one more turn of the loop delivers them.
    ASSERT_TRUE(RunEventLoopUntil([] { return CountLogLines("Initial login Retry attempt: 1") > 0; }));
    RunEventLoopUntil([] { return true; });
}
} // namespace TestSupport
