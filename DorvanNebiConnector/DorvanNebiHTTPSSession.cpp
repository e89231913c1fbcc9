#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <Poco/Timespan.h>

DorvanNebiHTTPSSession::DorvanNebiHTTPSSession(const Poco::URI& uri)
    : Poco::Net::HTTPSClientSession(uri.getHost(), uri.getPort())
{
    setTimeout(Poco::Timespan(DorvanNebiConstants::kCloudConnectTimeoutSeconds, 0),
               Poco::Timespan(DorvanNebiConstants::kCloudSendReceiveTimeoutSeconds, 0),
               Poco::Timespan(DorvanNebiConstants::kCloudSendReceiveTimeoutSeconds, 0));
}

int DorvanNebiHTTPSSession::ReadBody(char* buffer, std::streamsize length)
{
    return Poco::Net::HTTPSession::read(buffer, length);
}
