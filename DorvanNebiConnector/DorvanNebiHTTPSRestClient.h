#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <Poco/URI.h>
#include <wx/object.h>

#include <map>
#include <string>

// One request to the cloud's REST interface over HTTPS. A client object
// serves exactly one SendRequest call: construct it with the URI (from
// DorvanNebiConnectorUtil::MakeCloudURI) and the header fields, call
// SendRequest on a worker thread, then read the outcome from the object's
// fields. Every request opens its own TLS connection, with the process's
// default client TLS context, and closes it before SendRequest returns. The
// scheme of the URI has no effect: the request always goes over TLS to its
// host and port.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiHTTPSRestClient : public wxObject
{
public:
    using HeaderFields = std::map<std::string, std::string>;

    explicit DorvanNebiHTTPSRestClient(const Poco::URI& uri);
    ~DorvanNebiHTTPSRestClient() override;

    DorvanNebiHTTPSRestClient(const DorvanNebiHTTPSRestClient&) = delete;
    DorvanNebiHTTPSRestClient& operator=(const DorvanNebiHTTPSRestClient&) = delete;

    // Performs the exchange. What true and false mean is each client's own.
    virtual bool SendRequest() = 0;

    Poco::URI m_uri;

protected:
    // The path and query of m_uri as sent, or "/" when both are empty.
    std::string RequestTarget() const;

    // The one place where a request is made: method, target, HTTP/1.1 and
    // each header field once, in ascending name order. Throws
    // Poco::InvalidArgumentException for a field whose name or value would
    // break the header (a line break, a NUL, a name that is no token), so
    // that such a request is never sent.
    void PrepareRequest(Poco::Net::HTTPRequest& request, const std::string& method,
                        const HeaderFields& headers) const;

    // A request without a body whose answer is kept in memory, as GET and
    // DELETE make it. Returns true when an answer arrived and its body was
    // read, whatever the status; false, after logging
    // logName + target + " failed, message " + reason, when the exchange failed.
    bool SendWithoutBody(const std::string& method, const HeaderFields& headers, const char* function,
                         const char* logName, Poco::Net::HTTPResponse& response, std::string& responseBody);

    // The severity-4 line of a failed exchange.
    static void LogFailure(const char* function, int line, const std::string& message);
};
