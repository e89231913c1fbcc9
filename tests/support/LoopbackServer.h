#pragma once

// A programmable HTTP server on the loopback address, for the tests to play
// the local agent or the cloud. It listens on an ephemeral port, answers each
// path with what the test set up (404 for any other path), and records every
// request it received. Besides proper answers it can answer slowly, close
// without answering, answer with something that is not HTTP, and cut a body
// short.

#include <Poco/Net/Context.h>
#include <Poco/Net/HTTPServerRequest.h>
#include <Poco/Net/HTTPServerResponse.h>

#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

namespace Poco
{
class ThreadPool;
}

namespace Poco::Net
{
class HTTPServer;
class ServerSocket;
}

namespace TestSupport
{
struct RecordedRequest
{
    std::string method;
    std::string target; // path and query as sent
    std::string path;   // without the query
    std::vector<std::pair<std::string, std::string>> headers; // in the order received
    std::string body;   // decoded from chunked transfer when it was chunked
    bool chunked = false;
    bool hasContentLength = false;
    std::chrono::steady_clock::time_point arrived; // when the request's header had been read

    // Every value of the header field name (compared without letter case).
    std::vector<std::string> HeaderValues(const std::string& name) const;
};

struct Reply
{
    enum class Framing
    {
        ContentLength, // Content-Length with the body's size
        Chunked,       // chunked transfer encoding, the body in chunks
        CloseDelimited // neither: the body ends when the connection closes
    };
    enum class Fault
    {
        None,
        CloseWithoutAnswer, // accept the request, then close the connection
        NotHttp,            // answer with text that is no HTTP response
        CutBodyShort        // send cutAfter bytes of the body, then close
    };

    int status = 200;
    std::vector<std::pair<std::string, std::string>> headers;
    std::string body;
    Framing framing = Framing::ContentLength;
    Fault fault = Fault::None;
    std::size_t cutAfter = 0;
    std::chrono::milliseconds delay{0}; // waited before answering

    static Reply Json(const std::string& json, int status = 200);
    static Reply Status(int status, const std::string& body = std::string());
    static Reply Failing(Fault fault, const std::string& body = std::string(), std::size_t cutAfter = 0);
};

class LoopbackServer
{
public:
    using Handler = std::function<Reply(const RecordedRequest&)>;
    // Handles the exchange itself, for bodies too large to record.
    using RawHandler = std::function<void(Poco::Net::HTTPServerRequest&, Poco::Net::HTTPServerResponse&)>;

    // Plain HTTP.
    LoopbackServer();
    // HTTPS with the given server context (certificate and key).
    explicit LoopbackServer(Poco::Net::Context::Ptr tlsContext);
    ~LoopbackServer();

    LoopbackServer(const LoopbackServer&) = delete;
    LoopbackServer& operator=(const LoopbackServer&) = delete;

    unsigned short Port() const { return m_port; }

    // Answers every request for path (without query) with the same reply, or
    // with what handler returns. A later call for the same path replaces it.
    void Route(const std::string& path, const Reply& reply);
    void Route(const std::string& path, Handler handler);
    void RouteRaw(const std::string& path, RawHandler handler);

    std::vector<RecordedRequest> Requests() const;
    std::size_t RequestCount(const std::string& path) const;
    // Waits until count requests for path have arrived.
    bool WaitForRequests(const std::string& path, std::size_t count,
                         std::chrono::milliseconds timeout = std::chrono::seconds(10)) const;

    // Stops listening and ends every open connection.
    void Stop();

    // Used by the server's request handler.
    void Serve(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response);

private:
    void Start(const Poco::Net::ServerSocket& socket);
    void Record(const RecordedRequest& request);
    void Answer(const Reply& reply, Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response);
    // Waits for the reply's delay; false when the server stopped meanwhile.
    bool Delay(std::chrono::milliseconds delay);

    std::unique_ptr<Poco::ThreadPool> m_threads;
    std::unique_ptr<Poco::Net::HTTPServer> m_server;
    bool m_stopping = false;
    unsigned short m_port = 0;
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_requestArrived;
    std::map<std::string, Handler> m_handlers;
    std::map<std::string, RawHandler> m_rawHandlers;
    std::vector<RecordedRequest> m_requests;
};
} // namespace TestSupport
