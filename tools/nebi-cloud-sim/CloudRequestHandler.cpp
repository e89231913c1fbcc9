#include "CloudRequestHandler.h"

#include "UploadForm.h"

#include <Poco/Exception.h>
#include <Poco/File.h>
#include <Poco/Net/HTTPServerRequest.h>
#include <Poco/Net/HTTPServerResponse.h>
#include <Poco/Net/MediaType.h>
#include <Poco/String.h>
#include <Poco/TextIterator.h>
#include <Poco/URI.h>
#include <Poco/UTF8Encoding.h>
#include <json/writer.h>

#include <algorithm>
#include <optional>
#include <sstream>
#include <utility>

namespace
{
using Poco::Net::HTTPRequest;
using Poco::Net::HTTPResponse;

bool IsUtf8(const std::string& text)
{
    Poco::UTF8Encoding utf8;
    for (Poco::TextIterator it(text, utf8), end(text); it != end; ++it)
    {
        if (*it < 0)
        {
            return false;
        }
    }
    return true;
}

// A form field that must be present, as UTF-8 text.
std::string RequiredText(const UploadForm& form, const std::string& name)
{
    const std::string value = form.Field(name);
    if (value.empty())
    {
        throw UploadError(HTTPResponse::HTTP_BAD_REQUEST, "the field \"" + name + "\" is missing or empty");
    }
    return value;
}

StoredResource ResourceFrom(const UploadForm& form)
{
    StoredResource resource;
    resource.accessibility = RequiredText(form, "accessibility");
    if (resource.accessibility != "private" && resource.accessibility != "public")
    {
        throw UploadError(HTTPResponse::HTTP_BAD_REQUEST,
                          "\"accessibility\" must be \"private\" or \"public\", not \"" + resource.accessibility +
                              "\"");
    }
    resource.name = RequiredText(form, "resourcename");
    resource.type = RequiredText(form, "type");
    resource.description = form.Field("description");
    resource.appName = form.Field("appname");
    resource.keywords = form.Field("keywords");
    resource.fileName = form.FileName();
    for (const std::string* text : {&resource.name, &resource.type, &resource.description, &resource.appName,
                                    &resource.keywords, &resource.fileName})
    {
        if (!IsUtf8(*text))
        {
            throw UploadError(HTTPResponse::HTTP_BAD_REQUEST, "a form field is not UTF-8 text");
        }
    }
    return resource;
}

// What the list and the upload answer tell about a resource.
Json::Value Summary(const StoredResource& resource)
{
    Json::Value json(Json::objectValue);
    json["resourceid"] = resource.id;
    json["resourcename"] = resource.name;
    json["description"] = resource.description;
    json["accessibility"] = resource.accessibility;
    json["type"] = resource.type;
    json["size"] = static_cast<Json::UInt64>(resource.size);
    json["created"] = resource.created;
    return json;
}

std::string Describe(const StoredResource& resource)
{
    return resource.id + ": " + resource.accessibility + " \"" + resource.name + "\", " +
           std::to_string(resource.size) + " bytes";
}

// The file an upload is written to; gone again when the upload is over,
// unless the store has taken it in.
class IncomingFile
{
public:
    explicit IncomingFile(std::string path) : m_path(std::move(path)) {}
    ~IncomingFile()
    {
        try
        {
            Poco::File file(m_path);
            if (file.exists())
            {
                file.remove();
            }
        }
        catch (const Poco::Exception&)
        {
            // The store empties its incoming directory at the next start.
        }
    }
    IncomingFile(const IncomingFile&) = delete;
    IncomingFile& operator=(const IncomingFile&) = delete;

    const std::string& Path() const { return m_path; }

private:
    std::string m_path;
};
} // namespace

void CloudRequestHandler::handleRequest(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    const std::string line = request.getMethod() + " " + request.getURI();
    try
    {
        Serve(request, response);
    }
    catch (const std::exception& e)
    {
        // Most likely the client went away while it was answered.
        m_note = std::string("failed: ") + e.what();
    }
    m_context.logger.information(line + " -> " + std::to_string(static_cast<int>(response.getStatus())) +
                                 (m_note.empty() ? std::string() : " (" + m_note + ")"));
}

void CloudRequestHandler::Serve(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    try
    {
        std::vector<std::string> segments;
        if (request.getVersion() != HTTPRequest::HTTP_1_0 && request.getVersion() != HTTPRequest::HTTP_1_1)
        {
            response.setVersion(HTTPRequest::HTTP_1_1);
            SendError(response, HTTPResponse::HTTP_BAD_REQUEST, "not an HTTP/1 request");
        }
        else if (SplitTarget(request.getURI(), segments))
        {
            Route(segments, request, response);
        }
        else
        {
            SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no such path: " + request.getURI());
        }
    }
    catch (const Poco::SyntaxException& e)
    {
        SendError(response, HTTPResponse::HTTP_BAD_REQUEST, "malformed request target: " + e.message());
    }
    catch (const std::exception& e)
    {
        if (response.sent())
        {
            throw;
        }
        SendError(response, HTTPResponse::HTTP_INTERNAL_SERVER_ERROR, e.what());
    }
}

bool CloudRequestHandler::SplitTarget(const std::string& target, std::vector<std::string>& segments) const
{
    const std::string path = target.substr(0, target.find_first_of("?#"));
    const std::string base = m_context.settings.basePath + "/";
    if (path.compare(0, base.size(), base) != 0)
    {
        return false;
    }
    std::string raw;
    std::istringstream rest(path.substr(base.size()));
    while (std::getline(rest, raw, '/'))
    {
        std::string segment;
        Poco::URI::decode(raw, segment); // throws Poco::SyntaxException for a broken %XX
        segments.push_back(segment);
    }
    // "resource/<id>/" and "resource/<id>" name the same resource.
    if (segments.size() > 1 && segments.back().empty())
    {
        segments.pop_back();
    }
    return true;
}

void CloudRequestHandler::Route(const std::vector<std::string>& segments, Poco::Net::HTTPServerRequest& request,
                                Poco::Net::HTTPServerResponse& response)
{
    const bool one = segments.size() == 1;
    const bool two = segments.size() == 2 && !segments[1].empty();
    if (one && segments[0] == "resource")
    {
        if (Allow(request, response, {HTTPRequest::HTTP_POST}))
        {
            Upload(request, response);
        }
    }
    else if (two && segments[0] == "resource")
    {
        if (Allow(request, response, {HTTPRequest::HTTP_GET, HTTPRequest::HTTP_DELETE}))
        {
            request.getMethod() == HTTPRequest::HTTP_GET ? Download(segments[1], response)
                                                         : Delete(segments[1], response);
        }
    }
    else if (two && segments[0] == "resources")
    {
        if (Allow(request, response, {HTTPRequest::HTTP_GET}))
        {
            List(segments[1], response);
        }
    }
    else
    {
        SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no such path: " + request.getURI());
    }
}

bool CloudRequestHandler::IsAuthorized(const Poco::Net::HTTPServerRequest& request) const
{
    return request.get(HTTPRequest::AUTHORIZATION, "") == "Bearer " + m_context.settings.apiSecret &&
           request.get("apikey", "") == m_context.settings.apiKey;
}

// Answers 405 for a method the path does not take and 401 for missing or
// wrong credentials; true when the request may go on.
bool CloudRequestHandler::Allow(const Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response,
                                const std::vector<std::string>& methods)
{
    if (std::find(methods.begin(), methods.end(), request.getMethod()) == methods.end())
    {
        response.set("Allow", Poco::cat(std::string(", "), methods.begin(), methods.end()));
        SendError(response, HTTPResponse::HTTP_METHOD_NOT_ALLOWED, "this path takes " + response.get("Allow"));
        return false;
    }
    if (!IsAuthorized(request))
    {
        SendError(response, HTTPResponse::HTTP_UNAUTHORIZED, "missing or wrong API key or secret");
        return false;
    }
    return true;
}

void CloudRequestHandler::Upload(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    const Poco::Net::MediaType type(request.getContentType());
    if (!type.matches("multipart", "form-data") || !type.hasParameter("boundary"))
    {
        SendError(response, HTTPResponse::HTTP_UNSUPPORTEDMEDIATYPE, "expected multipart/form-data with a boundary");
        return;
    }
    // What follows the closing boundary is left unread: the connection ends
    // with the answer.
    response.setKeepAlive(false);
    const IncomingFile incoming(m_context.store.NewIncomingPath());
    try
    {
        UploadForm form(incoming.Path(), m_context.settings.maxArchiveBytes);
        form.Read(request.stream(), type.getParameter("boundary"));
        const StoredResource stored = m_context.store.Add(ResourceFrom(form), incoming.Path());
        m_note = "stored " + Describe(stored);
        Json::Value body(Json::objectValue);
        body["response"] = Summary(stored);
        SendJson(response, body);
    }
    catch (const UploadError& e)
    {
        SendError(response, e.Status(), e.what());
    }
}

void CloudRequestHandler::Download(const std::string& id, Poco::Net::HTTPServerResponse& response)
{
    const std::optional<StoredResource> resource = m_context.store.Find(id);
    if (!resource)
    {
        SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no resource " + id);
        return;
    }
    try
    {
        // Streams the archive from disk, with its length in Content-Length.
        response.sendFile(m_context.store.DataPath(resource->id), "application/octet-stream");
        m_note = "sent " + Describe(*resource);
    }
    catch (const Poco::FileException&)
    {
        if (response.sent())
        {
            throw;
        }
        SendError(response, HTTPResponse::HTTP_NOT_FOUND, "resource " + id + " was deleted meanwhile");
    }
}

void CloudRequestHandler::Delete(const std::string& id, Poco::Net::HTTPServerResponse& response)
{
    if (!m_context.store.Remove(id))
    {
        SendError(response, HTTPResponse::HTTP_NOT_FOUND, "no resource " + id);
        return;
    }
    m_note = "deleted " + id;
    Json::Value body(Json::objectValue);
    body["response"]["resourceid"] = id;
    body["response"]["deleted"] = true;
    SendJson(response, body);
}

void CloudRequestHandler::List(const std::string& type, Poco::Net::HTTPServerResponse& response)
{
    Json::Value body(Json::objectValue);
    body["response"] = Json::Value(Json::arrayValue);
    for (const StoredResource& resource : m_context.store.OfType(type))
    {
        body["response"].append(Summary(resource));
    }
    m_note = std::to_string(body["response"].size()) + " listed";
    SendJson(response, body);
}

void CloudRequestHandler::SendJson(Poco::Net::HTTPServerResponse& response, const Json::Value& body)
{
    Json::StreamWriterBuilder writer;
    writer["indentation"] = "";
    writer["emitUTF8"] = true;
    const std::string text = Json::writeString(writer, body);
    response.setStatusAndReason(HTTPResponse::HTTP_OK);
    response.setContentType("application/json; charset=utf-8");
    response.sendBuffer(text.data(), text.size());
}

void CloudRequestHandler::SendError(Poco::Net::HTTPServerResponse& response, HTTPResponse::HTTPStatus status,
                                    const std::string& message)
{
    if (m_note.empty())
    {
        m_note = message;
    }
    Json::Value body(Json::objectValue);
    body["error"] = message;
    Json::StreamWriterBuilder writer;
    writer["indentation"] = "";
    const std::string text = Json::writeString(writer, body);
    // The request's body may be unread: the connection ends with this answer.
    response.setKeepAlive(false);
    response.setStatusAndReason(status);
    response.setContentType("application/json; charset=utf-8");
    response.sendBuffer(text.data(), text.size());
}
