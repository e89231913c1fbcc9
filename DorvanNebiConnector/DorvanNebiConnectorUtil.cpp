#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>

#include <CoreServices/Logger.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/Net/HTTPClientSession.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <Poco/StreamCopier.h>
#include <Poco/Timespan.h>

#include <memory>
#include <sstream>

namespace
{
using namespace DorvanNebiConstants;

template <typename T>
T ReadCloudConfig(const char* key, const T& defaultValue)
{
    const std::shared_ptr<GenericConfig> config = DorvanNebiConnector::GetInstance()->GetCloudConfig();
    return config->GetValue<T>(key, defaultValue);
}

std::string RequestTarget(const Poco::URI& uri)
{
    const std::string target = uri.getPathAndQuery();
    return target.empty() ? "/" : target;
}

std::shared_ptr<Poco::Net::HTTPClientSession> MakeAgentSession(const Poco::URI& uri)
{
    auto session = std::make_shared<Poco::Net::HTTPClientSession>(uri.getHost(), uri.getPort());
    session->setTimeout(Poco::Timespan(kAgentSessionTimeoutSeconds, 0));
    // The agent is always reached directly, whatever proxy the process uses.
    session->setProxyConfig(Poco::Net::HTTPClientSession::ProxyConfig());
    return session;
}

void LogUtil(SeverityLevel severity, int line, const std::string& message)
{
    SetLevelAndGetLogger(severity, kLogSourceUtil, "DorvanNebiConnectorUtil::SendHTTPRequest", line) << message;
}
} // namespace

namespace DorvanNebiConnectorUtil
{
unsigned short GetLocalhostPort()
{
    return ReadCloudConfig<unsigned short>(kKeyQuarlPort, kDefaultQuarlPort);
}

Poco::URI MakeLocalhostURI(const std::string& path)
{
    Poco::URI uri;
    uri.setScheme(kAgentScheme);
    uri.setHost(kAgentHost);
    uri.setPort(GetLocalhostPort());
    uri.setPath(std::string(kAgentApiBase) + path);
    return uri;
}

bool SendHTTPRequest(const Poco::URI& uri, std::string& response)
{
    std::shared_ptr<Poco::Net::HTTPClientSession> session;
    try
    {
        session = MakeAgentSession(uri);
    }
    catch (const std::exception& e)
    {
        LogUtil(SeverityError, __LINE__, std::string("HTTPClientSession creation failed, message ") + e.what());
        return false;
    }

    const std::string target = RequestTarget(uri);
    Poco::Net::HTTPRequest request(Poco::Net::HTTPRequest::HTTP_GET, target, Poco::Net::HTTPMessage::HTTP_1_1);
    Poco::Net::HTTPResponse httpResponse;
    try
    {
        // An interactive page may keep the agent's answer back for days: at
        // process exit the connection is cut rather than waited for.
        const DorvanNebiConnectorUtil::ConnectionCutAtExit cutAtExit(*session);
        session->sendRequest(request);
        std::istream& body = session->receiveResponse(httpResponse);
        if (httpResponse.getStatus() != Poco::Net::HTTPResponse::HTTP_OK)
        {
            response.clear();
            LogUtil(SeverityError, __LINE__, "HTTPRequest " + target + " failed");
            return true;
        }
        std::stringstream collected;
        Poco::StreamCopier::copyStream(body, collected, kBodyCopyBufferSize);
        response = collected.str();
        // The body of the login data record carries the API key and secret.
        LogUtil(SeverityTrace, __LINE__, "HTTPRequest " + target + " success " + ", response " + MaskSecrets(response));
    }
    catch (const std::exception& e)
    {
        LogUtil(SeverityError, __LINE__, "HTTPRequest " + target + " exception, message " + e.what());
        return false;
    }
    return true;
}

Poco::URI MakeCloudURI(const std::string& path)
{
    Poco::URI uri;
    uri.setScheme(ReadCloudConfig<std::string>(kKeyNebiProtocol, kDefaultNebiProtocol));
    uri.setHost(ReadCloudConfig<std::string>(kKeyNebiDomain, kDefaultNebiDomain));
    uri.setPort(ReadCloudConfig<unsigned short>(kKeyNebiPort, kDefaultNebiPort));
    uri.setPath(ReadCloudConfig<std::string>(kKeyNebiApiVersion, kDefaultNebiApiVersion) + path);
    return uri;
}
} // namespace DorvanNebiConnectorUtil
