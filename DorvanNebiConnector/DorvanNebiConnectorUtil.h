#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <Poco/URI.h>

#include <string>

namespace DorvanNebiConnectorUtil
{
// The local agent's TCP port: "quarlport" of the cloud configuration, 7285
// when absent or not a 16-bit decimal number. Read afresh on every call.
DORVANNEBICONNECTOR_EXPORT unsigned short GetLocalhostPort();

// http://127.0.0.1:<agent port>/api/v1<path>
DORVANNEBICONNECTOR_EXPORT Poco::URI MakeLocalhostURI(const std::string& path);

// One HTTP/1.1 GET to the local agent, never through a proxy. Returns false
// when the exchange failed (agent not listening, connection broken, time-out,
// malformed answer); response is then left as it was. Returns true when an
// answer arrived: response holds its body for status 200 and is emptied for
// any other status.
DORVANNEBICONNECTOR_EXPORT bool SendHTTPRequest(const Poco::URI& uri, std::string& response);

// <nebiprotocol>://<nebidomain>:<nebiport><nebiclientappapiversion><path>,
// each read afresh from the cloud configuration, with its default when absent.
DORVANNEBICONNECTOR_EXPORT Poco::URI MakeCloudURI(const std::string& path);
} // namespace DorvanNebiConnectorUtil
