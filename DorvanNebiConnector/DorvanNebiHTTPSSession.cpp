#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <Poco/Exception.h>
#include <Poco/Net/IPAddress.h>
#include <Poco/Timespan.h>

#include <algorithm>

namespace
{
bool IsHostNameCharacter(char c)
{
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' || c == '.' ||
           c == '_';
}

// The host of a cloud URI comes from the configuration as it is. Only a DNS
// name or an IP address is looked up and connected to: a path, a port, user
// information or a line break there would otherwise go to the name resolver,
// to a proxy's CONNECT line or into the Host field.
const std::string& CheckedHost(const std::string& host)
{
    Poco::Net::IPAddress address;
    const bool isName = !host.empty() && host.size() <= DorvanNebiConstants::kMaxHostNameLength &&
                        std::all_of(host.begin(), host.end(), IsHostNameCharacter);
    if (!isName && !Poco::Net::IPAddress::tryParse(host, address))
    {
        throw Poco::InvalidArgumentException("the cloud host in the configuration is no host name");
    }
    return host;
}
} // namespace

DorvanNebiHTTPSSession::DorvanNebiHTTPSSession(const Poco::URI& uri)
    : Poco::Net::HTTPSClientSession(CheckedHost(uri.getHost()), uri.getPort())
{
    setTimeout(Poco::Timespan(DorvanNebiConstants::kCloudConnectTimeoutSeconds, 0),
               Poco::Timespan(DorvanNebiConstants::kCloudSendReceiveTimeoutSeconds, 0),
               Poco::Timespan(DorvanNebiConstants::kCloudSendReceiveTimeoutSeconds, 0));
}

int DorvanNebiHTTPSSession::ReadBody(char* buffer, std::streamsize length)
{
    return Poco::Net::HTTPSession::read(buffer, length);
}
