#include <DorvanNebiConnector/DorvanNebiHTTPSDeleteRestClient.h>

#include <Poco/Net/HTTPRequest.h>

DorvanNebiHTTPSDeleteRestClient::DorvanNebiHTTPSDeleteRestClient(const Poco::URI& uri, const HeaderFields& headers)
    : DorvanNebiHTTPSRestClient(uri),
      m_headers(headers)
{
}

DorvanNebiHTTPSDeleteRestClient::~DorvanNebiHTTPSDeleteRestClient() = default;

bool DorvanNebiHTTPSDeleteRestClient::SendRequest()
{
    return SendWithoutBody(Poco::Net::HTTPRequest::HTTP_DELETE, m_headers,
                           "DorvanNebiHTTPSDeleteRestClient::SendRequest", "HTTP_DELETE ", m_response, m_responseBody);
}
