#pragma once

// The agent stand-in as a POCO server application: reads its options, serves
// the agent's endpoints on 127.0.0.1 until it is asked to stop (Ctrl+C or
// SIGTERM), and writes one console line per request.

#include "SignInState.h"
#include "StandInApplication.h"

class AgentApplication : public StandInApplication
{
public:
    AgentApplication();

protected:
    void defineOptions(Poco::Util::OptionSet& options) override;
    void handleOption(const std::string& name, const std::string& value) override;
    int Serve() override;

private:
    unsigned short m_port = 7285;
    bool m_signedIn = true;
    std::string m_servicesFile;
    AgentUser m_user{"Mira Solberg", "mira.solberg@example.com", "admin", "demo-api-key", "demo-api-secret"};
};
