#include <DorvanNebiConnector/DorvanNebiHTTPSRestClient.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <CoreServices/Logger.h>

#include <Poco/Exception.h>
#include <Poco/StreamCopier.h>

#include <algorithm>
#include <cstring>
#include <sstream>

namespace
{
// RFC 9110 token characters: what a header field name may consist of.
bool IsTokenCharacter(char c)
{
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
           std::strchr("!#$%&'*+-.^_`|~", c) != nullptr;
}

bool IsLineBreakOrNul(char c)
{
    return c == '\r' || c == '\n' || c == '\0';
}

// A name that is no token, or a value with a line break, would let the text
// of a field (credentials from the agent, say) end the header early or add
// fields of its own.
void CheckHeaderField(const std::string& name, const std::string& value)
{
    if (name.empty() || !std::all_of(name.begin(), name.end(), IsTokenCharacter))
    {
        throw Poco::InvalidArgumentException("unusable header field name", name);
    }
    if (std::any_of(value.begin(), value.end(), IsLineBreakOrNul))
    {
        throw Poco::InvalidArgumentException("line break or NUL in the value of the header field", name);
    }
}
} // namespace

DorvanNebiHTTPSRestClient::DorvanNebiHTTPSRestClient(const Poco::URI& uri) : m_uri(uri)
{
}

DorvanNebiHTTPSRestClient::~DorvanNebiHTTPSRestClient() = default;

std::string DorvanNebiHTTPSRestClient::RequestTarget() const
{
    const std::string target = m_uri.getPathAndQuery();
    return target.empty() ? "/" : target;
}

void DorvanNebiHTTPSRestClient::PrepareRequest(Poco::Net::HTTPRequest& request, const std::string& method,
                                               const HeaderFields& headers) const
{
    request.setMethod(method);
    request.setURI(RequestTarget());
    request.setVersion(Poco::Net::HTTPMessage::HTTP_1_1);
    // A std::map hands its entries out in ascending key order, byte by byte.
    for (const auto& field : headers)
    {
        CheckHeaderField(field.first, field.second);
        request.add(field.first, field.second);
    }
}

bool DorvanNebiHTTPSRestClient::SendWithoutBody(const std::string& method, const HeaderFields& headers,
                                                const char* function, const char* logName,
                                                Poco::Net::HTTPResponse& response, std::string& responseBody)
{
    const std::string target = RequestTarget();
    try
    {
        DorvanNebiHTTPSSession session(m_uri);
        Poco::Net::HTTPRequest request;
        PrepareRequest(request, method, headers);
        session.sendRequest(request);
        std::istream& body = session.receiveResponse(response);
        std::stringstream collected;
        Poco::StreamCopier::copyStream(body, collected, DorvanNebiConstants::kBodyCopyBufferSize);
        responseBody = collected.str();
        return true;
    }
    catch (const Poco::Exception& e)
    {
        LogFailure(function, __LINE__, logName + target + " failed, message " + e.displayText());
    }
    catch (const std::exception& e)
    {
        LogFailure(function, __LINE__, logName + target + " failed, message " + e.what());
    }
    return false;
}

void DorvanNebiHTTPSRestClient::LogFailure(const char* function, int line, const std::string& message)
{
    SetLevelAndGetLogger(SeverityError, DorvanNebiConstants::kLogSourceRestClient, function, line) << message;
}
