#pragma once

// The cloud stand-in as a POCO server application: reads its options, makes
// or reuses its TLS identity, opens its store and serves the cloud's REST
// interface over HTTPS on 127.0.0.1 until it is asked to stop (Ctrl+C or
// SIGTERM), with one console line per request.

#include "CloudRequestHandler.h"
#include "StandInApplication.h"

class CloudApplication : public StandInApplication
{
public:
    CloudApplication();

protected:
    void defineOptions(Poco::Util::OptionSet& options) override;
    void handleOption(const std::string& name, const std::string& value) override;
    int Serve() override;

private:
    int ServeOverHttps();

    unsigned short m_port = 8443;
    std::string m_dataDir = "nebi-cloud-data";
    CloudSettings m_settings;
};
