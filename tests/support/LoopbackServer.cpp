#include "LoopbackServer.h"

#include <Poco/Net/HTTPRequestHandler.h>
#include <Poco/Net/HTTPRequestHandlerFactory.h>
#include <Poco/Net/HTTPServer.h>
#include <Poco/Net/HTTPServerParams.h>
#include <Poco/Net/HTTPServerRequestImpl.h>
#include <Poco/Net/SecureServerSocket.h>
#include <Poco/Net/ServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <Poco/Net/StreamSocket.h>
#include <Poco/StreamCopier.h>
#include <Poco/ThreadPool.h>
#include <Poco/URI.h>

#include <algorithm>
#include <cctype>
#include <sstream>

namespace TestSupport
{
namespace
{
bool EqualNoCase(const std::string& a, const std::string& b)
{
    return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) {
               return std::tolower(static_cast<unsigned char>(x)) == std::tolower(static_cast<unsigned char>(y));
           });
}

class Handler : public Poco::Net::HTTPRequestHandler
{
public:
    explicit Handler(LoopbackServer& server) : m_server(server) {}
    void handleRequest(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response) override
    {
        m_server.Serve(request, response);
    }

private:
    LoopbackServer& m_server;
};

class HandlerFactory : public Poco::Net::HTTPRequestHandlerFactory
{
public:
    explicit HandlerFactory(LoopbackServer& server) : m_server(server) {}
    Poco::Net::HTTPRequestHandler* createRequestHandler(const Poco::Net::HTTPServerRequest&) override
    {
        return new Handler(m_server);
    }

private:
    LoopbackServer& m_server;
};

void SendAll(Poco::Net::StreamSocket& socket, const std::string& bytes)
{
    std::size_t sent = 0;
    while (sent < bytes.size())
    {
        const int n = socket.sendBytes(bytes.data() + sent, static_cast<int>(bytes.size() - sent));
        if (n <= 0)
        {
            return;
        }
        sent += static_cast<std::size_t>(n);
    }
}

std::string ChunkOf(const std::string& data)
{
    std::ostringstream chunk;
    chunk << std::hex << data.size() << "\r\n" << data << "\r\n";
    return chunk.str();
}

// The reply written byte by byte, for the cases POCO's response object would
// not produce: a body without framing, or one cut short.
std::string RawReply(const Reply& reply)
{
    std::ostringstream raw;
    raw << "HTTP/1.1 " << reply.status << " "
        << Poco::Net::HTTPResponse::getReasonForStatus(static_cast<Poco::Net::HTTPResponse::HTTPStatus>(reply.status))
        << "\r\n";
    for (const auto& header : reply.headers)
    {
        raw << header.first << ": " << header.second << "\r\n";
    }
    const std::string body =
        reply.fault == Reply::Fault::CutBodyShort ? reply.body.substr(0, reply.cutAfter) : reply.body;
    switch (reply.framing)
    {
    case Reply::Framing::ContentLength:
        raw << "Content-Length: " << reply.body.size() << "\r\n\r\n" << body;
        break;
    case Reply::Framing::Chunked:
        raw << "Transfer-Encoding: chunked\r\n\r\n";
        if (!body.empty())
        {
            raw << ChunkOf(body);
        }
        if (reply.fault != Reply::Fault::CutBodyShort)
        {
            raw << "0\r\n\r\n";
        }
        break;
    case Reply::Framing::CloseDelimited:
        raw << "Connection: close\r\n\r\n" << body;
        break;
    }
    return raw.str();
}
} // namespace

std::vector<std::string> RecordedRequest::HeaderValues(const std::string& name) const
{
    std::vector<std::string> values;
    for (const auto& header : headers)
    {
        if (EqualNoCase(header.first, name))
        {
            values.push_back(header.second);
        }
    }
    return values;
}

Reply Reply::Json(const std::string& json, int status)
{
    Reply reply;
    reply.status = status;
    reply.body = json;
    reply.headers.emplace_back("Content-Type", "application/json");
    return reply;
}

Reply Reply::Status(int status, const std::string& body)
{
    Reply reply;
    reply.status = status;
    reply.body = body;
    return reply;
}

Reply Reply::Failing(Fault fault, const std::string& body, std::size_t cutAfter)
{
    Reply reply;
    reply.fault = fault;
    reply.body = body;
    reply.cutAfter = cutAfter;
    return reply;
}

LoopbackServer::LoopbackServer()
{
    Start(Poco::Net::ServerSocket(Poco::Net::SocketAddress("127.0.0.1", 0)));
}

LoopbackServer::LoopbackServer(Poco::Net::Context::Ptr tlsContext)
{
    Start(Poco::Net::SecureServerSocket(Poco::Net::SocketAddress("127.0.0.1", 0), 64, tlsContext));
}

LoopbackServer::~LoopbackServer()
{
    Stop();
}

void LoopbackServer::Start(const Poco::Net::ServerSocket& socket)
{
    m_port = socket.address().port();
    auto params = new Poco::Net::HTTPServerParams();
    params->setMaxThreads(16);
    params->setMaxQueued(64);
    params->setKeepAlive(false);
    m_threads = std::make_unique<Poco::ThreadPool>(2, 24);
    m_server = std::make_unique<Poco::Net::HTTPServer>(new HandlerFactory(*this), *m_threads, socket, params);
    m_server->start();
}

void LoopbackServer::Stop()
{
    if (!m_server)
    {
        return;
    }
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_stopping = true;
    }
    m_requestArrived.notify_all();
    m_server->stopAll(true);
    m_threads->joinAll();
    m_server.reset();
}

void LoopbackServer::Route(const std::string& path, const Reply& reply)
{
    Route(path, [reply](const RecordedRequest&) { return reply; });
}

void LoopbackServer::Route(const std::string& path, Handler handler)
{
    std::lock_guard<std::mutex> lock(m_mutex);
    m_rawHandlers.erase(path);
    m_handlers[path] = std::move(handler);
}

void LoopbackServer::RouteRaw(const std::string& path, RawHandler handler)
{
    std::lock_guard<std::mutex> lock(m_mutex);
    m_handlers.erase(path);
    m_rawHandlers[path] = std::move(handler);
}

std::vector<RecordedRequest> LoopbackServer::Requests() const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return m_requests;
}

std::size_t LoopbackServer::RequestCount(const std::string& path) const
{
    std::lock_guard<std::mutex> lock(m_mutex);
    return static_cast<std::size_t>(std::count_if(m_requests.begin(), m_requests.end(),
                                                  [&](const RecordedRequest& r) { return r.path == path; }));
}

bool LoopbackServer::WaitForRequests(const std::string& path, std::size_t count,
                                     std::chrono::milliseconds timeout) const
{
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_requestArrived.wait_for(lock, timeout, [&] {
        return static_cast<std::size_t>(std::count_if(m_requests.begin(), m_requests.end(),
                                                      [&](const RecordedRequest& r) { return r.path == path; })) >=
               count;
    });
}

void LoopbackServer::Record(const RecordedRequest& request)
{
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_requests.push_back(request);
    }
    m_requestArrived.notify_all();
}

bool LoopbackServer::Delay(std::chrono::milliseconds delay)
{
    std::unique_lock<std::mutex> lock(m_mutex);
    return !m_requestArrived.wait_for(lock, delay, [this] { return m_stopping; });
}

void LoopbackServer::Serve(Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response)
{
    const std::string path = Poco::URI(request.getURI()).getPath();
    Handler handler;
    RawHandler rawHandler;
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        if (auto raw = m_rawHandlers.find(path); raw != m_rawHandlers.end())
        {
            rawHandler = raw->second;
        }
        else if (auto found = m_handlers.find(path); found != m_handlers.end())
        {
            handler = found->second;
        }
    }

    RecordedRequest recorded;
    recorded.arrived = std::chrono::steady_clock::now();
    recorded.method = request.getMethod();
    recorded.target = request.getURI();
    recorded.path = path;
    for (const auto& header : request)
    {
        recorded.headers.emplace_back(header.first, header.second);
    }
    recorded.chunked = request.getChunkedTransferEncoding();
    recorded.hasContentLength = request.hasContentLength();

    if (rawHandler)
    {
        Record(recorded);
        rawHandler(request, response);
        return;
    }

    std::ostringstream body;
    Poco::StreamCopier::copyStream(request.stream(), body);
    recorded.body = body.str();
    Record(recorded);

    Answer(handler ? handler(recorded) : Reply::Status(404, "{\"error\":\"no such path\"}"), request, response);
}

void LoopbackServer::Answer(const Reply& reply, Poco::Net::HTTPServerRequest& request,
                            Poco::Net::HTTPServerResponse& response)
{
    if (reply.delay.count() > 0 && !Delay(reply.delay))
    {
        return;
    }
    if (reply.fault == Reply::Fault::None && reply.framing != Reply::Framing::CloseDelimited)
    {
        response.setStatus(static_cast<Poco::Net::HTTPResponse::HTTPStatus>(reply.status));
        for (const auto& header : reply.headers)
        {
            response.add(header.first, header.second);
        }
        if (reply.framing == Reply::Framing::Chunked)
        {
            response.setChunkedTransferEncoding(true);
            response.send() << reply.body;
        }
        else
        {
            response.sendBuffer(reply.body.data(), reply.body.size());
        }
        return;
    }

    // Everything else is written to the bare connection, which is then closed.
    Poco::Net::StreamSocket socket = static_cast<Poco::Net::HTTPServerRequestImpl&>(request).detachSocket();
    try
    {
        if (reply.fault == Reply::Fault::NotHttp)
        {
            SendAll(socket, "this is not an HTTP answer\r\n\r\n" + reply.body);
        }
        else if (reply.fault != Reply::Fault::CloseWithoutAnswer)
        {
            SendAll(socket, RawReply(reply));
        }
        socket.shutdown();
    }
    catch (const Poco::Exception&)
    {
        // The client went away first; nothing to do.
    }
    socket.close();
}
} // namespace TestSupport
