#include "AgentRequestHandler.h"

#include <Poco/Exception.h>
#include <Poco/Net/HTTPServerRequest.h>
#include <Poco/Net/HTTPServerResponse.h>
#include <Poco/URI.h>
#include <json/writer.h>

namespace
{
using Poco::Net::HTTPResponse;

const std::string kApiBase = "/api/v1/";

void SendJson(Poco::Net::HTTPServerResponse& response, HTTPResponse::HTTPStatus status, const Json::Value& body)
{
    Json::StreamWriterBuilder writer;
    writer["indentation"] = "";
    writer["emitUTF8"] = true;
    const std::string text = Json::writeString(writer, body);
    response.setStatusAndReason(status);
    response.setContentType("application/json; charset=utf-8");
    response.sendBuffer(text.data(), text.size());
}

void SendError(Poco::Net::HTTPServerResponse& response, HTTPResponse::HTTPStatus status, const std::string& message)
{
    Json::Value body(Json::objectValue);
    body["error"] = message;
    SendJson(response, status, body);
}

// True for HTTP/1.0 and 1.1; for anything else the answer is made HTTP/1.1.
bool IsHttp1(const Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    if (request.getVersion() == Poco::Net::HTTPMessage::HTTP_1_0 ||
        request.getVersion() == Poco::Net::HTTPMessage::HTTP_1_1)
    {
        return true;
    }
    response.setVersion(Poco::Net::HTTPMessage::HTTP_1_1);
    response.setKeepAlive(false);
    return false;
}

std::string Describe(const Json::Value& record)
{
    return record["isLoginSuccess"].asString() == "yes" ? "signed in as " + record["name"].asString()
                                                        : "nobody signed in";
}
} // namespace

void AgentRequestHandler::handleRequest(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    const std::string line = request.getMethod() + " " + request.getURI();
    std::string note;
    try
    {
        const std::string path = Poco::URI(request.getURI()).getPath();
        if (!IsHttp1(request, response))
        {
            SendError(response, HTTPResponse::HTTP_BAD_REQUEST, "not an HTTP/1 request");
        }
        else if (path.compare(0, kApiBase.size(), kApiBase) != 0)
        {
            SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no such endpoint: " + path);
        }
        else if (request.getMethod() != Poco::Net::HTTPRequest::HTTP_GET)
        {
            response.set("Allow", "GET");
            SendError(response, HTTPResponse::HTTP_METHOD_NOT_ALLOWED, "the agent answers GET only");
        }
        else
        {
            Answer(path.substr(kApiBase.size()), response, note);
        }
    }
    catch (const Poco::SyntaxException& e)
    {
        SendError(response, HTTPResponse::HTTP_BAD_REQUEST, "malformed request target: " + e.message());
    }
    m_context.logger.information(line + " -> " + std::to_string(static_cast<int>(response.getStatus())) +
                                 (note.empty() ? std::string() : " (" + note + ")"));
}

void AgentRequestHandler::Answer(const std::string& endpoint, Poco::Net::HTTPServerResponse& response,
                                 std::string& note)
{
    SignInState& signIn = m_context.signIn;
    if (endpoint == "nebilogin")
    {
        const Json::Value record = signIn.LoginRecord();
        note = Describe(record);
        SendJson(response, HTTPResponse::HTTP_OK, record);
    }
    else if (endpoint == "nebiloginui" || endpoint == "nebisignupui")
    {
        // A person would fill in the page; the stand-in signs its user in at once.
        const Json::Value record = signIn.SignIn();
        note = (endpoint == "nebiloginui" ? "login page: " : "sign-up page: ") + Describe(record);
        SendJson(response, HTTPResponse::HTTP_OK, record);
    }
    else if (endpoint == "nebiinviteuserui")
    {
        if (!signIn.IsSignedIn())
        {
            note = "invite-user page refused: nobody signed in";
            SendError(response, HTTPResponse::HTTP_CONFLICT, "nobody is signed in");
            return;
        }
        note = "invite-user page shown";
        Json::Value body(Json::objectValue);
        body["isInviteShown"] = "yes";
        SendJson(response, HTTPResponse::HTTP_OK, body);
    }
    else if (endpoint == "nebilogout")
    {
        const bool signedOut = signIn.SignOut();
        note = signedOut ? "signed out" : "nobody was signed in";
        Json::Value body(Json::objectValue);
        body["isLogoutSuccess"] = signedOut ? "yes" : "no";
        SendJson(response, HTTPResponse::HTTP_OK, body);
    }
    else if (endpoint == "nebiservices")
    {
        // The catalogue belongs to the signed-in user: nobody signed in, no services.
        const bool signedIn = signIn.IsSignedIn();
        const Json::Value catalogue = signedIn ? m_context.services : Json::Value(Json::arrayValue);
        note = signedIn ? std::to_string(catalogue.size()) + " services" : "nobody signed in: no services";
        SendJson(response, HTTPResponse::HTTP_OK, catalogue);
    }
    else
    {
        SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no such endpoint: " + kApiBase + endpoint);
    }
}
