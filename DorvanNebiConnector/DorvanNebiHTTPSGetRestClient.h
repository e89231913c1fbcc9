#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSRestClient.h>

#include <Poco/Net/HTTPResponse.h>

#include <string>

// A GET request to the cloud that reads a resource (the list of backups); the answer is kept in memory.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiHTTPSGetRestClient : public DorvanNebiHTTPSRestClient
{
public:
    DorvanNebiHTTPSGetRestClient(const Poco::URI& uri, const HeaderFields& headers);
    ~DorvanNebiHTTPSGetRestClient() override;

    // True when an answer arrived and its body was read, whatever its status:
    // a caller succeeds only with true and then status 200 in m_response.
    // False, with a log line, when the exchange failed (connection, TLS,
    // time-out, malformed answer); m_response and m_responseBody then say
    // nothing. A body cut short after the header has arrived counts as read.
    bool SendRequest() override;

    HeaderFields m_headers;
    Poco::Net::HTTPResponse m_response;
    std::string m_responseBody;
};
