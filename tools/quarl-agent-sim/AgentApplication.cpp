#include "AgentApplication.h"

#include "AgentRequestHandler.h"
#include "StopRequest.h"
#include "ServicesCatalogue.h"

#include <Poco/Net/HTTPServer.h>
#include <Poco/Net/HTTPServerParams.h>
#include <Poco/Net/ServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <Poco/NumberParser.h>
#include <Poco/Util/IntValidator.h>
#include <Poco/Util/OptionSet.h>

using Poco::Util::Option;

AgentApplication::AgentApplication()
    : StandInApplication("A stand-in of the local agent: serves the agent's endpoints below /api/v1 over plain HTTP "
                         "on 127.0.0.1, for one user whose sign-in the login, sign-up and logout pages change.")
{
}

void AgentApplication::defineOptions(Poco::Util::OptionSet& options)
{
    StandInApplication::defineOptions(options);
    options.addOption(Option("port", "p", "TCP port on 127.0.0.1 (default 7285; 0 picks a free one).")
                          .argument("PORT")
                          .validator(new Poco::Util::IntValidator(0, 65535)));
    options.addOption(Option("name", "", "The user's name.").argument("TEXT"));
    options.addOption(Option("email", "", "The user's e-mail address.").argument("ADDRESS"));
    options.addOption(Option("role", "", "The user's role: admin, operator or any other text.").argument("ROLE"));
    options.addOption(Option("api-key", "", "The API key handed to the connector.").argument("KEY"));
    options.addOption(Option("api-secret", "", "The API secret handed to the connector.").argument("SECRET"));
    options.addOption(Option("signed-out", "", "Start with nobody signed in (default: the user is signed in)."));
    options.addOption(Option("services", "",
                             "A JSON file with the services catalogue (an array of service "
                             "objects) in place of the built-in one.")
                          .argument("FILE"));
}

void AgentApplication::handleOption(const std::string& name, const std::string& value)
{
    StandInApplication::handleOption(name, value);
    if (name == "port")
    {
        m_port = static_cast<unsigned short>(Poco::NumberParser::parseUnsigned(value));
    }
    else if (name == "name")
    {
        m_user.name = value;
    }
    else if (name == "email")
    {
        m_user.email = value;
    }
    else if (name == "role")
    {
        m_user.role = value;
    }
    else if (name == "api-key")
    {
        m_user.apiKey = value;
    }
    else if (name == "api-secret")
    {
        m_user.apiSecret = value;
    }
    else if (name == "signed-out")
    {
        m_signedIn = false;
    }
    else if (name == "services")
    {
        m_servicesFile = value;
    }
}

int AgentApplication::Serve()
{
    Json::Value services;
    Poco::Net::ServerSocket socket;
    try
    {
        services = m_servicesFile.empty() ? ServicesCatalogue::Default() : ServicesCatalogue::Load(m_servicesFile);
        socket.bind(Poco::Net::SocketAddress("127.0.0.1", m_port), true);
        socket.listen();
    }
    catch (const Poco::Exception& e)
    {
        logger().error("cannot listen on 127.0.0.1:" + std::to_string(m_port) + ": " + e.displayText());
        return EXIT_UNAVAILABLE;
    }
    catch (const std::exception& e)
    {
        logger().error(e.what());
        return EXIT_CONFIG;
    }
    SignInState signIn(m_user, m_signedIn);

    Poco::Net::HTTPServerParams::Ptr params = new Poco::Net::HTTPServerParams();
    params->setMaxThreads(8);
    Poco::Net::HTTPServer server(new AgentRequestHandlerFactory({signIn, services, logger()}), socket, params);
    // Ctrl+C, SIGTERM or (on Windows) POCO's termination request end the
    // wait below.
    StopRequest stopRequest;
    server.start();

    logger().information("listening on http://127.0.0.1:" + std::to_string(socket.address().port()) + "/api/v1");
    logger().information("user " + m_user.name + " <" + m_user.email + ">, role " + m_user.role + ", " +
                         (m_signedIn ? "signed in" : "signed out"));
    stopRequest.Wait();
    server.stopAll(true);
    logger().information("stopped");
    return EXIT_OK;
}
