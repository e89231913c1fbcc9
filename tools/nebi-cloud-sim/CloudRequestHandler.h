#pragma once

// Answers one request to the cloud stand-in. Below the base path
// (default /api/clientapp/v1):
//
//   POST   /resource              multipart upload: fields accessibility
//                                 ("private"|"public"), resourcename, type,
//                                 description, appname, keywords; the archive
//                                 as the part "file"
//   GET    /resource/<id>/        the archive
//   DELETE /resource/<id>/        removes it
//   GET    /resources/<type>      {"response": [{"resourceid", "resourcename",
//                                 "description", "accessibility", ...}]}
//
// The user's private backup is also reachable as /resource/<its name>/.
// Every request must carry "Authorization: Bearer <secret>" and
// "apikey: <key>" with the stand-in's credentials (401 otherwise). Success is
// always 200 with a JSON body (the archive for a download); every failure is
// a 4xx (5xx only for a fault of the stand-in itself) with {"error": "..."}.

#include "ResourceStore.h"

#include <Poco/Logger.h>
#include <Poco/Net/HTTPRequestHandler.h>
#include <Poco/Net/HTTPRequestHandlerFactory.h>
#include <Poco/Net/HTTPResponse.h>
#include <json/value.h>

#include <string>
#include <vector>

struct CloudSettings
{
    std::string basePath = "/api/clientapp/v1";
    std::string apiKey = "demo-api-key";
    std::string apiSecret = "demo-api-secret";
    Poco::UInt64 maxArchiveBytes = 1024ull * 1024 * 1024;
};

struct CloudContext
{
    const CloudSettings& settings;
    ResourceStore& store;
    Poco::Logger& logger;
};

class CloudRequestHandler : public Poco::Net::HTTPRequestHandler
{
public:
    explicit CloudRequestHandler(CloudContext context) : m_context(context) {}

    void handleRequest(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response) override;

private:
    void Serve(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response);
    // The route's segments below the base path; false when the target lies
    // outside it or is no valid URI path.
    bool SplitTarget(const std::string& target, std::vector<std::string>& segments) const;
    void Route(const std::vector<std::string>& segments, Poco::Net::HTTPServerRequest& request,
               Poco::Net::HTTPServerResponse& response);
    bool IsAuthorized(const Poco::Net::HTTPServerRequest& request) const;
    bool Allow(const Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response,
               const std::vector<std::string>& methods);

    void Upload(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response);
    void Download(const std::string& id, Poco::Net::HTTPServerResponse& response);
    void Delete(const std::string& id, Poco::Net::HTTPServerResponse& response);
    void List(const std::string& type, Poco::Net::HTTPServerResponse& response);

    void SendJson(Poco::Net::HTTPServerResponse& response, const Json::Value& body);
    void SendError(Poco::Net::HTTPServerResponse& response, Poco::Net::HTTPResponse::HTTPStatus status,
                   const std::string& message);

    CloudContext m_context;
    std::string m_note; // what the console line says about the outcome
};

class CloudRequestHandlerFactory : public Poco::Net::HTTPRequestHandlerFactory
{
public:
    explicit CloudRequestHandlerFactory(CloudContext context) : m_context(context) {}

    Poco::Net::HTTPRequestHandler* createRequestHandler(const Poco::Net::HTTPServerRequest&) override
    {
        return new CloudRequestHandler(m_context);
    }

private:
    CloudContext m_context;
};
