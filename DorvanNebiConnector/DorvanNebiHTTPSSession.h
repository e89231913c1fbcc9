#pragma once

// The HTTPS session of one cloud request. Internal: not installed with the
// public headers.

#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>

#include <Poco/Net/HTTPSClientSession.h>
#include <Poco/URI.h>

#include <ios>

// An HTTPS session to the host and port of a cloud URI, whatever its scheme,
// with the process's default client TLS context and proxy settings. Besides
// the streams of its base it lets a caller read the response body itself, so
// that the caller can check the body's framing (see DorvanNebiHTTPSBodyReader).
class DorvanNebiHTTPSSession : public Poco::Net::HTTPSClientSession
{
public:
    explicit DorvanNebiHTTPSSession(const Poco::URI& uri);

    // Up to length bytes of what follows the response header: first the bytes
    // the session has already buffered, then straight from the connection.
    // 0 when the server has closed the connection cleanly (TLS close_notify).
    // A connection that ends without close_notify, or breaks, throws: unlike
    // the base's own read, which takes that for a regular end.
    int ReadBody(char* buffer, std::streamsize length);

private:
    // Made after the base, gone before it: the connection is cut at process
    // exit while the session exists.
    DorvanNebiConnectorUtil::ConnectionCutAtExit m_cutAtExit{*this};
};
