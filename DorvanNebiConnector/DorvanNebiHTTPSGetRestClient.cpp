#include <DorvanNebiConnector/DorvanNebiHTTPSGetRestClient.h>

#include <Poco/Net/HTTPRequest.h>

DorvanNebiHTTPSGetRestClient::DorvanNebiHTTPSGetRestClient(const Poco::URI& uri, const HeaderFields& headers)
    : DorvanNebiHTTPSRestClient(uri),
      m_headers(headers)
{
}

DorvanNebiHTTPSGetRestClient::~DorvanNebiHTTPSGetRestClient() = default;

bool DorvanNebiHTTPSGetRestClient::SendRequest()
{
    return SendWithoutBody(Poco::Net::HTTPRequest::HTTP_GET, m_headers, "DorvanNebiHTTPSGetRestClient::SendRequest",
                           "HTTP_GET ", m_response, m_responseBody);
}
