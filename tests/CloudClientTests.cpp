// The cloud REST clients against real HTTPS servers on the loopback address:
// what goes on the wire, what comes back, and how broken exchanges end.

#include "LoopbackServer.h"
#include "ReceivedForm.h"
#include "TestHost.h"
#include "TestTls.h"

#include <DorvanNebiConnector/DorvanNebiHTTPSDeleteRestClient.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSGetClientForDownload.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSGetRestClient.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSPostRestClient.h>

#include <CoreServices/GlobalUtils.h>

#include <Poco/Net/HTTPServerRequestImpl.h>
#include <Poco/Net/SecureStreamSocket.h>
#include <gtest/gtest.h>
#include <wx/filename.h>

#include <iterator>
#include <regex>
#include <set>
#include <sstream>

using namespace TestSupport;

namespace
{
using Headers = std::map<std::string, std::string>;

// The port of a server that is gone: connections are refused.
unsigned short ClosedPort()
{
    LoopbackServer gone;
    const unsigned short port = gone.Port();
    gone.Stop();
    return port;
}

Poco::URI CloudUri(unsigned short port, const std::string& pathAndQuery, const std::string& host = "localhost",
                   const std::string& scheme = "https")
{
    Poco::URI uri;
    uri.setScheme(scheme);
    uri.setHost(host);
    uri.setPort(port);
    if (!pathAndQuery.empty())
    {
        uri.setPathEtc(pathAndQuery);
    }
    return uri;
}

// The names of the header fields the caller could have added, in the order
// they arrived.
std::vector<std::string> CallerFieldNames(const RecordedRequest& request)
{
    std::vector<std::string> names;
    for (const auto& field : request.headers)
    {
        if (field.first != "Host" && field.first != "Connection" && field.first != "Content-Type" &&
            field.first != "Transfer-Encoding")
        {
            names.push_back(field.first);
        }
    }
    return names;
}

std::string TestContent(std::size_t size)
{
    std::string content(size, '\0');
    for (std::size_t i = 0; i < size; ++i)
    {
        content[i] = static_cast<char>((i * 131 + i / 7) & 0xFF);
    }
    return content;
}

// Writes bytes to the bare connection of request and ends it: with a TLS
// close_notify when clean, otherwise by dropping the TCP connection.
void AnswerRaw(Poco::Net::HTTPServerRequest& request, const std::string& bytes, bool clean = true)
{
    Poco::Net::StreamSocket socket = static_cast<Poco::Net::HTTPServerRequestImpl&>(request).detachSocket();
    try
    {
        std::size_t sent = 0;
        while (sent < bytes.size())
        {
            sent += static_cast<std::size_t>(
                socket.sendBytes(bytes.data() + sent, static_cast<int>(bytes.size() - sent)));
        }
        if (clean)
        {
            socket.shutdown();
        }
        else
        {
            Poco::Net::SecureStreamSocket(socket).abort();
        }
    }
    catch (const Poco::Exception&)
    {
        // The client went away first.
    }
    socket.close();
}

wxString DownloadDir()
{
    return GlobalUtils::GetUserDataSubDir("Backup");
}

class CloudClient : public ::testing::Test
{
protected:
    CloudClient() : m_cloud(ServerTlsContext()) { TrustTestAuthority(); }

    Poco::URI Uri(const std::string& pathAndQuery) const { return CloudUri(m_cloud.Port(), pathAndQuery); }

    // Downloads target; the client is kept for its fields.
    bool Download(const std::string& target)
    {
        m_download = std::make_shared<DorvanNebiHTTPSGetClientForDownload>(Uri(target), Headers());
        return m_download->SendRequest();
    }

    LoopbackServer m_cloud;
    std::shared_ptr<DorvanNebiHTTPSGetClientForDownload> m_download;
};
} // namespace

TEST_F(CloudClient, GetSendsEachHeaderFieldOnceInByteOrderAndKeepsTheAnswer)
{
    m_cloud.Route("/api/items", Reply::Json("{\"response\":[1,2]}"));
    const Headers headers{{"apikey", "K"}, {"Authorization", "Bearer S"}, {"X-Trace", "7"}};
    auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(Uri("/api/items?page=2"), headers);

    ASSERT_TRUE(client->SendRequest());
    EXPECT_EQ(client->m_response.getStatus(), 200);
    EXPECT_EQ(client->m_responseBody, "{\"response\":[1,2]}");

    const std::vector<RecordedRequest> requests = m_cloud.Requests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(requests[0].method, "GET");
    EXPECT_EQ(requests[0].target, "/api/items?page=2");
    // Upper case sorts before lower case: by byte value, not alphabetically.
    EXPECT_EQ(CallerFieldNames(requests[0]), (std::vector<std::string>{"Authorization", "X-Trace", "apikey"}));
    EXPECT_EQ(requests[0].HeaderValues("Authorization"), std::vector<std::string>{"Bearer S"});
    EXPECT_EQ(requests[0].HeaderValues("apikey"), std::vector<std::string>{"K"});
}

TEST_F(CloudClient, ErrorAnswersAreReadLikeAnyOtherWithoutALogLine)
{
    m_cloud.Route("/api/items/7/", Reply::Json("{\"error\":\"no such item\"}", 404));
    auto remove = std::make_shared<DorvanNebiHTTPSDeleteRestClient>(Uri("/api/items/7/"), Headers());
    ASSERT_TRUE(remove->SendRequest());
    EXPECT_EQ(remove->m_response.getStatus(), 404);
    EXPECT_EQ(remove->m_responseBody, "{\"error\":\"no such item\"}");
    EXPECT_EQ(m_cloud.Requests().at(0).method, "DELETE");

    m_cloud.Route("/api/items", Reply::Status(500, "oops"));
    auto get = std::make_shared<DorvanNebiHTTPSGetRestClient>(Uri("/api/items"), Headers());
    ASSERT_TRUE(get->SendRequest());
    EXPECT_EQ(get->m_response.getStatus(), 500);
    EXPECT_EQ(get->m_responseBody, "oops");
    EXPECT_EQ(CountLogLines("HTTP_"), 0u);
}

TEST_F(CloudClient, EmptyTargetIsSlashAndNoFieldOfTheCallerIsAdded)
{
    m_cloud.Route("/", Reply::Json("{}"));
    auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(Uri(""), Headers());
    ASSERT_TRUE(client->SendRequest());
    EXPECT_EQ(client->m_response.getStatus(), 200);
    const RecordedRequest request = m_cloud.Requests().at(0);
    EXPECT_EQ(request.target, "/");
    EXPECT_TRUE(CallerFieldNames(request).empty());
}

TEST_F(CloudClient, TheSchemeNeverTurnsTlsOff)
{
    // Also reached by address: the certificate names 127.0.0.1 too.
    m_cloud.Route("/x", Reply::Json("{}"));
    auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(CloudUri(m_cloud.Port(), "/x", "127.0.0.1", "http"),
                                                                 Headers());
    ASSERT_TRUE(client->SendRequest());
    EXPECT_EQ(client->m_response.getStatus(), 200);
}

TEST_F(CloudClient, FailedExchangesReturnFalseWithOneLogLine)
{
    const unsigned short closed = ClosedPort();
    auto get = std::make_shared<DorvanNebiHTTPSGetRestClient>(CloudUri(closed, "/gone"), Headers());
    EXPECT_FALSE(get->SendRequest());
    EXPECT_TRUE(get->m_responseBody.empty());
    EXPECT_EQ(CountLogLines("HTTP_GET /gone failed, message "), 1u);

    auto remove = std::make_shared<DorvanNebiHTTPSDeleteRestClient>(CloudUri(closed, "/gone/1/"), Headers());
    EXPECT_FALSE(remove->SendRequest());
    EXPECT_EQ(CountLogLines("HTTP_DELETE /gone/1/ failed, message "), 1u);

    // Not HTTP at all, and no answer at all.
    m_cloud.Route("/garbage", Reply::Failing(Reply::Fault::NotHttp, "junk"));
    m_cloud.Route("/silent", Reply::Failing(Reply::Fault::CloseWithoutAnswer));
    for (const char* target : {"/garbage", "/silent"})
    {
        auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(Uri(target), Headers());
        EXPECT_FALSE(client->SendRequest()) << target;
        EXPECT_EQ(CountLogLines(std::string("HTTP_GET ") + target + " failed"), 1u) << target;
    }
}

TEST(CloudClientTls, ServersWithoutAValidCertificateForTheHostAreRefused)
{
    TrustTestAuthority();
    for (ServerCertificate certificate : {ServerCertificate::SelfSigned, ServerCertificate::OtherHost})
    {
        LoopbackServer impostor(ServerTlsContext(certificate));
        impostor.Route("/secret", Reply::Json("{}"));
        auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(CloudUri(impostor.Port(), "/secret"),
                                                                     Headers{{"apikey", "K"}});
        EXPECT_FALSE(client->SendRequest());
        EXPECT_TRUE(impostor.Requests().empty()) << "the request reached a server it must not trust";
    }
    EXPECT_EQ(CountLogLines("HTTP_GET /secret failed, message "), 2u);
}

TEST_F(CloudClient, HeaderFieldsThatWouldBreakTheHeaderAreNeverSent)
{
    m_cloud.Route("/x", Reply::Json("{}"));
    const Headers injected[] = {{{"Authorization", "Bearer S\r\nX-Injected: 1"}},
                                {{"apikey", std::string("K\0L", 3)}},
                                {{"api key", "K"}}};
    for (const Headers& headers : injected)
    {
        auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(Uri("/x"), headers);
        EXPECT_FALSE(client->SendRequest());
    }
    EXPECT_TRUE(m_cloud.Requests().empty());
    EXPECT_EQ(CountLogLines("HTTP_GET /x failed, message "), 3u);
}

TEST_F(CloudClient, PostStreamsTheFieldsInNameOrderThenTheFileInAChunkedBody)
{
    m_cloud.Route("/resource", Reply::Json("{\"resourceid\":\"r1\"}"));
    const wxString file = SandboxDir() + "/settings archive.zip";
    const std::string content = TestContent(300000);
    WriteFile(file, content);
    const DorvanNebiHTTPSPostRestClient::FormFields fields{
        {"type", "t"}, {"accessibility", "private"}, {"description", "caf\xC3\xA9"}, {"appname", "dorvan"}};

    auto client = std::make_shared<DorvanNebiHTTPSPostRestClient>(Uri("/resource"), Headers{{"apikey", "K"}}, fields,
                                                                  file);
    ASSERT_TRUE(client->SendRequest());
    EXPECT_EQ(client->m_response.getStatus(), 200);
    EXPECT_EQ(client->m_responseBody, "{\"resourceid\":\"r1\"}");

    const RecordedRequest request = m_cloud.Requests().at(0);
    EXPECT_EQ(request.method, "POST");
    EXPECT_TRUE(request.chunked);
    EXPECT_FALSE(request.hasContentLength);
    EXPECT_EQ(request.HeaderValues("apikey"), std::vector<std::string>{"K"});
    EXPECT_EQ(request.HeaderValues("Content-Type").at(0).rfind("multipart/form-data; boundary=", 0), 0u);

    const ReceivedForm form = ParseForm(request);
    const std::vector<std::pair<std::string, std::string>> expected{
        {"accessibility", "private"}, {"appname", "dorvan"}, {"description", "caf\xC3\xA9"}, {"type", "t"}};
    EXPECT_EQ(form.fields, expected);
    ASSERT_EQ(form.files.size(), 1u);
    EXPECT_EQ(form.files[0].name, "file");
    EXPECT_EQ(form.files[0].fileName, "settings archive.zip");
    EXPECT_TRUE(form.files[0].content == content) << "the file arrived altered";
    // The fields come before the file in the body itself.
    EXPECT_LT(request.body.find("name=\"type\""), request.body.find("name=\"file\""));
}

TEST_F(CloudClient, PostWithoutFileSendsTheFieldsAlone)
{
    m_cloud.Route("/resource", Reply::Status(201));
    auto client = std::make_shared<DorvanNebiHTTPSPostRestClient>(
        Uri("/resource"), Headers(), DorvanNebiHTTPSPostRestClient::FormFields{{"a", "1"}}, wxString());
    ASSERT_TRUE(client->SendRequest());
    EXPECT_EQ(client->m_response.getStatus(), 201);
    const ReceivedForm form = ParseForm(m_cloud.Requests().at(0));
    EXPECT_EQ(form.fields, (std::vector<std::pair<std::string, std::string>>{{"a", "1"}}));
    EXPECT_TRUE(form.files.empty());
}

TEST_F(CloudClient, PostOfAFileThatCannotBeReadWholeNeverDeliversACompleteForm)
{
    m_cloud.Route("/resource", Reply::Json("{}"));
    std::vector<wxString> unreadable{SandboxDir() + "/missing.zip", SandboxDir()};
#ifdef __linux__
    // Opens, but every read fails (EIO): the part would silently go out empty.
    unreadable.push_back("/proc/self/mem");
#endif
    for (const wxString& path : unreadable)
    {
        auto client = std::make_shared<DorvanNebiHTTPSPostRestClient>(
            Uri("/resource"), Headers(), DorvanNebiHTTPSPostRestClient::FormFields{{"type", "t"}}, path);
        EXPECT_FALSE(client->SendRequest()) << path;
    }
    EXPECT_EQ(CountLogLines("HTTP_POST /resource failed, message "), unreadable.size());
    // Whatever reached the server is no complete form: no closing delimiter.
    for (const RecordedRequest& request : m_cloud.Requests())
    {
        const std::string contentType = request.HeaderValues("Content-Type").at(0);
        const std::string boundary = contentType.substr(contentType.find("boundary=") + 9);
        EXPECT_EQ(request.body.find(boundary + "--"), std::string::npos);
    }
}

TEST_F(CloudClient, DownloadsTheWholeBodyIntoANewArchiveFile)
{
    const std::string content = TestContent(200000);
    m_cloud.Route("/fixed", Reply::Status(200, content));
    Reply chunked = Reply::Status(200, content);
    chunked.framing = Reply::Framing::Chunked;
    m_cloud.Route("/chunked", chunked);
    m_cloud.RouteRaw("/closed", [&](Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse&) {
        AnswerRaw(request, "HTTP/1.1 200 OK\r\nConnection: close\r\n\r\n" + content);
    });
    // Several chunks, an extension, a size in upper case, a trailer field.
    m_cloud.RouteRaw("/pieces", [](Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse&) {
        AnswerRaw(request, "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n"
                           "5;name=value\r\nhello\r\n1 \r\n,\r\nA\r\n world, an\r\n"
                           "3\r\nd a\r\n0\r\nX-Checksum: 1\r\n\r\n");
    });
    m_cloud.Route("/empty", Reply::Status(200));

    const std::regex archiveName("[0-9a-f]{8}\\.zip");
    std::set<wxString> paths;
    const std::pair<const char*, std::string> cases[] = {{"/fixed", content},
                                                         {"/chunked", content},
                                                         {"/closed", content},
                                                         {"/pieces", "hello, world, and a"},
                                                         {"/empty", ""}};
    for (const auto& [target, expected] : cases)
    {
        ASSERT_TRUE(Download(target)) << target;
        const wxFileName path(m_download->m_downloadedFilePath);
        EXPECT_TRUE(std::regex_match(path.GetFullName().utf8_string(), archiveName)) << path.GetFullName();
        EXPECT_EQ(path.GetPath(), wxFileName(DownloadDir(), wxEmptyString).GetPath());
        EXPECT_TRUE(ReadFile(path.GetFullPath()) == expected) << target;
        paths.insert(path.GetFullPath());
    }
    EXPECT_EQ(paths.size(), std::size(cases)) << "two downloads went into one file";
    EXPECT_EQ(FilesIn(DownloadDir()).size(), std::size(cases)) << "something besides the archives was left";
    EXPECT_EQ(CountLogLines("HTTP_DOWNLOAD"), 0u);
}

TEST_F(CloudClient, DownloadRefusedByStatusCreatesNoFileAndLogsNothing)
{
    m_cloud.Route("/missing", Reply::Json("{\"error\":\"not found\"}", 404));
    m_cloud.Route("/moved", Reply::Status(204));
    EXPECT_FALSE(Download("/missing"));
    EXPECT_FALSE(Download("/moved"));
    EXPECT_TRUE(m_download->m_downloadedFilePath.empty());
    EXPECT_TRUE(FilesIn(DownloadDir()).empty());
    EXPECT_EQ(CountLogLines("HTTP_DOWNLOAD"), 0u);
}

// A transfer that ends before the body is complete, or whose framing is
// broken, is a failure and leaves no file behind, not even a partial one.
TEST_F(CloudClient, IncompleteOrMalformedDownloadsFailAndLeaveNoFile)
{
    const std::string header = "HTTP/1.1 200 OK\r\n";
    const std::string chunked = header + "Transfer-Encoding: chunked\r\n\r\n";
    const std::string part(5000, 'x');
    struct Case
    {
        const char* target;
        std::string answer;
        bool clean;
    };
    const Case cases[] = {
        {"/short", header + "Content-Length: 10000\r\n\r\n" + part, true},
        {"/no-last-chunk", chunked + "1388\r\n" + part + "\r\n", true},
        {"/inside-a-chunk", chunked + "2710\r\n" + part, true},
        {"/bad-size", chunked + "zz\r\nabc\r\n0\r\n\r\n", true},
        {"/overlong-chunk", chunked + "2\r\nabc\r\n0\r\n\r\n", true},
        {"/huge-size", chunked + "1FFFFFFFFFFFFFFFFF\r\nabc\r\n0\r\n\r\n", true},
        {"/no-close-notify", header + "Connection: close\r\n\r\n" + part, false},
        {"/gzip", header + "Transfer-Encoding: gzip\r\nConnection: close\r\n\r\n" + part, true},
        {"/bad-length", header + "Content-Length: 12abc\r\n\r\n" + part, true},
        {"/two-lengths", header + "Content-Length: 5000\r\nContent-Length: 4000\r\n\r\n" + part, true},
    };
    for (const Case& c : cases)
    {
        m_cloud.RouteRaw(c.target, [c](Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse&) {
            AnswerRaw(request, c.answer, c.clean);
        });
        EXPECT_FALSE(Download(c.target)) << c.target;
        EXPECT_TRUE(m_download->m_downloadedFilePath.empty()) << c.target;
        EXPECT_EQ(CountLogLines(std::string("HTTP_DOWNLOAD ") + c.target + " failed, message "), 1u) << c.target;
    }
    // And a connection that ends before the response header.
    m_cloud.Route("/silent", Reply::Failing(Reply::Fault::CloseWithoutAnswer));
    EXPECT_FALSE(Download("/silent"));
    EXPECT_EQ(CountLogLines("HTTP_DOWNLOAD /silent failed"), 1u);

    EXPECT_TRUE(FilesIn(DownloadDir()).empty());
}
