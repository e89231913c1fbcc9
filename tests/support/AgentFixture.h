#pragma once

// A test with a local agent stand-in and a connector configured to reach it.

#include "LoopbackServer.h"
#include "TestHost.h"

#include <gtest/gtest.h>

#include <string>

namespace TestSupport
{
// The agent's login data record for a signed-in user.
std::string SignedInRecord(const std::string& name = "Ada Lovelace", const std::string& email = "ada@example.com",
                           const std::string& role = "admin", const std::string& apiKey = "KEY-1234",
                           const std::string& apiSecret = "SECRET-5678");
std::string SignedOutRecord();

class AgentFixture : public ::testing::Test
{
protected:
    AgentFixture();

    // Writes "quarlconfig.json" pointing at the agent (plus extraMembers, a
    // JSON fragment such as "\"nebiport\": 8443"), then initializes the
    // connector. Route the agent's answers before calling it: the login
    // component asks "/api/v1/nebilogin" at once. Without a route the agent
    // answers that nobody is signed in.
    void StartConnector(const std::string& extraMembers = std::string());

    // Waits until the start-up query's first attempt has ended and what it
    // delivered has reached the GUI thread.
    void WaitForStartupQuery();

    LoopbackServer m_agent;
};
} // namespace TestSupport
