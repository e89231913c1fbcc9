#pragma once

// The agent stand-in as a POCO server application: reads its options, serves
// the agent's endpoints on 127.0.0.1 until it is asked to stop (Ctrl+C or
// SIGTERM), and writes one console line per request.

#include "SignInState.h"

#include <Poco/Util/Application.h>

class AgentApplication : public Poco::Util::Application
{
protected:
    void defineOptions(Poco::Util::OptionSet& options) override;
    void handleOption(const std::string& name, const std::string& value) override;
    int main(const std::vector<std::string>& args) override;

private:
    void PrintHelp();
    void UseConsoleLogger();

    bool m_helpRequested = false;
    unsigned short m_port = 7285;
    bool m_signedIn = true;
    std::string m_servicesFile;
    AgentUser m_user{"Mira Solberg", "mira.solberg@example.com", "admin", "demo-api-key", "demo-api-secret"};
};
