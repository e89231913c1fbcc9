#pragma once

// Answers one request to the agent stand-in. Every endpoint lives below
// /api/v1 and is asked with GET:
//
//   /nebilogin         the login data record
//   /nebiloginui       the login page: signs the user in, answers the record
//   /nebisignupui      the sign-up page: signs the user in, answers the record
//   /nebiinviteuserui  the invite-user page (only while signed in)
//   /nebilogout        signs the user out: {"isLogoutSuccess": "yes"|"no"}
//   /nebiservices      the services catalogue
//
// Anything else gets a JSON error: 404 for an unknown path, 405 for another
// method, 400 for a request target that is no URI.

#include "SignInState.h"

#include <Poco/Logger.h>
#include <Poco/Net/HTTPRequestHandler.h>
#include <Poco/Net/HTTPRequestHandlerFactory.h>
#include <json/value.h>

struct AgentContext
{
    SignInState& signIn;
    const Json::Value& services;
    Poco::Logger& logger;
};

class AgentRequestHandler : public Poco::Net::HTTPRequestHandler
{
public:
    explicit AgentRequestHandler(AgentContext context) : m_context(context) {}

    void handleRequest(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response) override;

private:
    // The answer for one endpoint (the path below /api/v1), and a note for
    // the console.
    void Answer(const std::string& endpoint, Poco::Net::HTTPServerResponse& response, std::string& note);

    AgentContext m_context;
};

class AgentRequestHandlerFactory : public Poco::Net::HTTPRequestHandlerFactory
{
public:
    explicit AgentRequestHandlerFactory(AgentContext context) : m_context(context) {}

    Poco::Net::HTTPRequestHandler* createRequestHandler(const Poco::Net::HTTPServerRequest&) override
    {
        return new AgentRequestHandler(m_context);
    }

private:
    AgentContext m_context;
};
