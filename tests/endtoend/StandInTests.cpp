// The stand-ins on their own, asked directly over HTTP and HTTPS: what they
// answer, what they keep, and how they take bad input (a 4xx answer, and
// they go on serving).

#include "Processes.h"

#include <Poco/Net/Context.h>
#include <Poco/Net/HTMLForm.h>
#include <Poco/Net/HTTPClientSession.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <Poco/Net/HTTPSClientSession.h>
#include <Poco/Net/NetException.h>
#include <Poco/Net/NetSSL.h>
#include <Poco/Net/SecureStreamSocket.h>
#include <Poco/Net/StringPartSource.h>
#include <Poco/StreamCopier.h>
#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>

#include <regex>
#include <sstream>

using namespace EndToEnd;
using Poco::Net::HTTPRequest;

namespace
{
struct Answer
{
    int status = 0;
    std::string body;
    Poco::Net::HTTPResponse response;

    Json::Value Json() const
    {
        Json::Value value;
        std::istringstream stream(body);
        std::string errors;
        EXPECT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), stream, &value, &errors)) << body;
        return value;
    }
};

using Headers = std::vector<std::pair<std::string, std::string>>;

Answer Exchange(Poco::Net::HTTPClientSession& session, HTTPRequest& request, Poco::Net::HTMLForm* form = nullptr)
{
    // A stand-in that hung would fail the test here instead of stalling it.
    session.setTimeout(Poco::Timespan(20, 0));
    if (form)
    {
        form->prepareSubmit(request);
        form->write(session.sendRequest(request));
    }
    else
    {
        session.sendRequest(request);
    }
    Answer answer;
    std::istream& body = session.receiveResponse(answer.response);
    Poco::StreamCopier::copyToString(body, answer.body);
    answer.status = answer.response.getStatus();
    return answer;
}

Answer AskAgent(unsigned short port, const std::string& target, const std::string& method = HTTPRequest::HTTP_GET)
{
    Poco::Net::HTTPClientSession session("127.0.0.1", port);
    HTTPRequest request(method, target, Poco::Net::HTTPMessage::HTTP_1_1);
    return Exchange(session, request);
}

// Sends bytes that are no proper request on a connection of its own and
// returns whatever comes back before the server closes it.
std::string SendRaw(Poco::Net::StreamSocket& socket, const std::string& bytes)
{
    socket.setReceiveTimeout(Poco::Timespan(20, 0));
    std::string answer;
    char buffer[1024];
    try
    {
        // A server that refuses what it got may reset the connection while
        // the bytes are still going out, too.
        socket.sendBytes(bytes.data(), static_cast<int>(bytes.size()));
        for (int got; (got = socket.receiveBytes(buffer, sizeof(buffer))) > 0;)
        {
            answer.append(buffer, static_cast<std::size_t>(got));
        }
    }
    catch (const Poco::Net::ConnectionResetException&)
    {
        // The server closed at once after its answer, or instead of one.
    }
    return answer;
}

std::string ServicesFile(const std::string& json)
{
    const std::string path = SandboxPath("services.json");
    WriteWholeFile(path, json);
    return path;
}
} // namespace

TEST(AgentStandIn, ItsPagesChangeTheSignInItReports)
{
    Agent agent({"--name", "Zoë Ørsted", "--email", "zoe@example.org", "--role", "operator", "--api-key", "K-1",
                 "--api-secret", "S-1"});
    const std::string base = "/api/v1/";

    const Json::Value first = AskAgent(agent.Port(), base + "nebilogin").Json();
    EXPECT_EQ(first["isLoginSuccess"].asString(), "yes");
    EXPECT_EQ(first["name"].asString(), "Zoë Ørsted");
    EXPECT_EQ(first["email"].asString(), "zoe@example.org");
    EXPECT_EQ(first["userrole"].asString(), "operator");
    EXPECT_EQ(first["apiKey"].asString(), "K-1");
    EXPECT_EQ(first["apiSceret"].asString(), "S-1");
    EXPECT_TRUE(std::regex_match(first["signintime"].asString(), std::regex(R"(\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d)")));
    EXPECT_FALSE(first["sessionid"].asString().empty());

    EXPECT_EQ(AskAgent(agent.Port(), base + "nebilogout").Json()["isLogoutSuccess"].asString(), "yes");
    EXPECT_EQ(AskAgent(agent.Port(), base + "nebilogout").Json()["isLogoutSuccess"].asString(), "no");
    const Json::Value signedOut = AskAgent(agent.Port(), base + "nebilogin").Json();
    EXPECT_EQ(signedOut["isLoginSuccess"].asString(), "no");
    EXPECT_FALSE(signedOut.isMember("apiKey")) << "credentials handed out while signed out";
    EXPECT_EQ(AskAgent(agent.Port(), base + "nebiservices").Json().size(), 0u);
    EXPECT_EQ(AskAgent(agent.Port(), base + "nebiinviteuserui").status, 409);

    const Json::Value signedUp = AskAgent(agent.Port(), base + "nebisignupui").Json();
    EXPECT_EQ(signedUp["isLoginSuccess"].asString(), "yes");
    EXPECT_NE(signedUp["sessionid"].asString(), first["sessionid"].asString());
    EXPECT_EQ(AskAgent(agent.Port(), base + "nebiinviteuserui").status, 200);
    const Json::Value services = AskAgent(agent.Port(), base + "nebiservices").Json();
    ASSERT_TRUE(services.isArray());
    ASSERT_EQ(services.size(), 3u);
    for (const Json::Value& service : services)
    {
        EXPECT_TRUE(service["serviceid"].isString() && service["servicename"].isString()) << service.toStyledString();
    }
}

TEST(AgentStandIn, BadRequestsGetAnErrorAndItGoesOnServing)
{
    Agent agent;
    EXPECT_EQ(AskAgent(agent.Port(), "/api/v1/nebinothing").status, 404);
    EXPECT_EQ(AskAgent(agent.Port(), "/elsewhere").status, 404);
    const Answer post = AskAgent(agent.Port(), "/api/v1/nebilogin", HTTPRequest::HTTP_POST);
    EXPECT_EQ(post.status, 405);
    EXPECT_EQ(post.response.get("Allow", ""), "GET");
    EXPECT_FALSE(post.Json()["error"].asString().empty());
    EXPECT_EQ(AskAgent(agent.Port(), "/api/v1/%zz").status, 400);

    Poco::Net::StreamSocket garbage(Poco::Net::SocketAddress("127.0.0.1", agent.Port()));
    EXPECT_EQ(SendRaw(garbage, "\x01\x02 no request at all\r\n\r\n").rfind("HTTP/1.", 0), 0u);
    Poco::Net::StreamSocket cut(Poco::Net::SocketAddress("127.0.0.1", agent.Port()));
    cut.sendBytes("GET /api/v1/nebil", 17);
    cut.close();

    EXPECT_EQ(AskAgent(agent.Port(), "/api/v1/nebilogin").status, 200);
    EXPECT_TRUE(agent.Process().IsRunning());
    EXPECT_EQ(agent.Process().Stop(), 0) << agent.Process().Output();
}

TEST(AgentStandIn, CommandLineAndServicesFile)
{
    ChildProcess help(AgentProgram(), {"--help"});
    EXPECT_EQ(help.WaitForExit(), 0);
    EXPECT_NE(help.Output().find("--api-secret"), std::string::npos) << help.Output();

    ChildProcess badPort(AgentProgram(), {"--port", "seventy"});
    EXPECT_NE(badPort.WaitForExit(), 0);
    EXPECT_NE(badPort.Output().find("port must be an integer"), std::string::npos) << badPort.Output();

    ChildProcess missing(AgentProgram(), {"--port", "0", "--services", SandboxPath("none.json")});
    EXPECT_NE(missing.WaitForExit(), 0);
    EXPECT_NE(missing.Output().find("cannot open the services file"), std::string::npos) << missing.Output();

    ChildProcess notAList(AgentProgram(), {"--port", "0", "--services", ServicesFile("{\"a\": 1}")});
    EXPECT_NE(notAList.WaitForExit(), 0);
    EXPECT_NE(notAList.Output().find("does not hold a JSON array"), std::string::npos) << notAList.Output();

    Agent agent({"--services", ServicesFile(R"([{"serviceid": 7, "servicename": "Flottenübersicht"}])")});
    const Json::Value services = AskAgent(agent.Port(), "/api/v1/nebiservices").Json();
    ASSERT_EQ(services.size(), 1u);
    EXPECT_EQ(services[0]["servicename"].asString(), "Flottenübersicht");
}

class CloudStandIn : public ::testing::Test
{
protected:
    CloudStandIn() : m_cloud(m_dataDir, {"--max-archive-mb", "1", "--api-key", "K-1", "--api-secret", "S-1"})
    {
        Poco::Net::initializeSSL();
        m_tls = new Poco::Net::Context(Poco::Net::Context::TLS_CLIENT_USE, "", "", m_cloud.CaFile(),
                                       Poco::Net::Context::VERIFY_STRICT, 9, false);
    }

    Answer Ask(const std::string& method, const std::string& path, const Headers& headers = Credentials(),
               Poco::Net::HTMLForm* form = nullptr)
    {
        Poco::Net::HTTPSClientSession session("127.0.0.1", m_cloud.Port(), m_tls);
        HTTPRequest request(method, "/api/clientapp/v1" + path, Poco::Net::HTTPMessage::HTTP_1_1);
        for (const auto& header : headers)
        {
            request.add(header.first, header.second);
        }
        return Exchange(session, request, form);
    }

    Answer Upload(const std::string& accessibility, const std::string& name, const std::string& archive)
    {
        Poco::Net::HTMLForm form;
        form.setEncoding(Poco::Net::HTMLForm::ENCODING_MULTIPART);
        form.set("accessibility", accessibility);
        form.set("resourcename", name);
        form.set("type", "settings");
        form.set("description", "from the test");
        form.addPart("file", new Poco::Net::StringPartSource(archive, "application/zip", "settings.zip"));
        return Ask(HTTPRequest::HTTP_POST, "/resource", Credentials(), &form);
    }

    // A request written by hand on a TLS connection of its own.
    std::string SendRawOverTls(const std::string& bytes)
    {
        Poco::Net::SecureStreamSocket socket(Poco::Net::SocketAddress("127.0.0.1", m_cloud.Port()), m_tls);
        return SendRaw(socket, bytes);
    }

    static Headers Credentials() { return {{"Authorization", "Bearer S-1"}, {"apikey", "K-1"}}; }

    std::size_t StoredCount() const { return FilesEndingIn(m_dataDir + "/resources", ".data").size(); }

    const std::string m_dataDir = SandboxPath("cloud");
    Cloud m_cloud;
    Poco::Net::Context::Ptr m_tls;
};

TEST_F(CloudStandIn, EveryRequestNeedsTheKeyAndTheSecret)
{
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/settings", {}).status, 401);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/settings", {{"apikey", "K-1"}}).status, 401);
    EXPECT_EQ(
        Ask(HTTPRequest::HTTP_GET, "/resources/settings", {{"Authorization", "Bearer S-1"}, {"apikey", "K-2"}}).status,
        401);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/settings", {{"Authorization", "S-1"}, {"apikey", "K-1"}}).status,
              401);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_DELETE, "/resource/x/", {}).status, 401);
    const Answer list = Ask(HTTPRequest::HTTP_GET, "/resources/settings");
    EXPECT_EQ(list.status, 200);
    EXPECT_TRUE(list.Json()["response"].isArray());
}

TEST_F(CloudStandIn, ArchivesGoInAndComeOutWhole)
{
    const std::string archive = RandomBytes(300 * 1024);
    const Answer upload = Upload("private", "dorvannebiuserpersonalsetting", archive);
    ASSERT_EQ(upload.status, 200) << upload.body;
    const std::string id = upload.Json()["response"]["resourceid"].asString();
    ASSERT_FALSE(id.empty());

    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/" + id + "/").body, archive);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/dorvannebiuserpersonalsetting/").body, archive);
    const Json::Value listed = Ask(HTTPRequest::HTTP_GET, "/resources/settings").Json()["response"];
    ASSERT_EQ(listed.size(), 1u);
    EXPECT_EQ(listed[0]["resourceid"].asString(), id);
    EXPECT_EQ(listed[0]["resourcename"].asString(), "dorvannebiuserpersonalsetting");
    EXPECT_EQ(listed[0]["description"].asString(), "from the test");
    EXPECT_EQ(listed[0]["accessibility"].asString(), "private");
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/othertype").Json()["response"].size(), 0u);

    // A new private backup replaces the old one; public ones add up.
    ASSERT_EQ(Upload("private", "dorvannebiuserpersonalsetting", "newer").status, 200);
    ASSERT_EQ(Upload("public", "Ωmega ✓", "shared").status, 200);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/" + id + "/").status, 404);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/dorvannebiuserpersonalsetting/").body, "newer");
    const Json::Value both = Ask(HTTPRequest::HTTP_GET, "/resources/settings").Json()["response"];
    ASSERT_EQ(both.size(), 2u);
    EXPECT_EQ(both[1]["resourcename"].asString(), "Ωmega ✓");

    const std::string publicId = both[1]["resourceid"].asString();
    EXPECT_EQ(Ask(HTTPRequest::HTTP_DELETE, "/resource/" + publicId + "/").status, 200);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_DELETE, "/resource/" + publicId + "/").status, 404);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/" + publicId + "/").status, 404);
    EXPECT_EQ(StoredCount(), 1u);
}

TEST_F(CloudStandIn, UploadsAreCheckedBeforeAnythingIsStored)
{
    Poco::Net::HTMLForm urlEncoded;
    urlEncoded.set("accessibility", "private");
    EXPECT_EQ(Ask(HTTPRequest::HTTP_POST, "/resource", Credentials(), &urlEncoded).status, 415);

    Poco::Net::HTMLForm noFile;
    noFile.setEncoding(Poco::Net::HTMLForm::ENCODING_MULTIPART);
    noFile.set("accessibility", "private");
    noFile.set("resourcename", "x");
    noFile.set("type", "settings");
    const Answer missing = Ask(HTTPRequest::HTTP_POST, "/resource", Credentials(), &noFile);
    EXPECT_EQ(missing.status, 400);
    EXPECT_NE(missing.Json()["error"].asString().find("\"file\""), std::string::npos) << missing.body;

    EXPECT_EQ(Upload("Private", "x", "a").status, 400);
    EXPECT_EQ(Upload("public", "", "a").status, 400);
    EXPECT_EQ(Upload("public", "too large", std::string(1024 * 1024 + 1, 'x')).status, 413);
    EXPECT_EQ(Upload("public", "just fits", std::string(1024 * 1024, 'x')).status, 200);

    // A complete chunked body whose multipart content stops short of its
    // closing boundary: refused at once, not waited on.
    const std::string part = "--B\r\nContent-Disposition: form-data; name=\"file\"; filename=\"a\"\r\n\r\nabcdef";
    std::ostringstream chunked;
    chunked << std::hex << part.size() << "\r\n" << part << "\r\n0\r\n\r\n";
    const std::string answer = SendRawOverTls(
        "POST /api/clientapp/v1/resource HTTP/1.1\r\nHost: 127.0.0.1\r\nAuthorization: Bearer S-1\r\napikey: K-1\r\n"
        "Content-Type: multipart/form-data; boundary=B\r\nTransfer-Encoding: chunked\r\n\r\n" +
        chunked.str());
    EXPECT_EQ(answer.rfind("HTTP/1.1 400", 0), 0u) << answer;
    EXPECT_NE(answer.find("closing boundary"), std::string::npos) << answer;

    // A body that breaks off with the connection.
    {
        Poco::Net::SecureStreamSocket socket(Poco::Net::SocketAddress("127.0.0.1", m_cloud.Port()), m_tls);
        const std::string head =
            "POST /api/clientapp/v1/resource HTTP/1.1\r\nHost: 127.0.0.1\r\nAuthorization: Bearer S-1\r\n"
            "apikey: K-1\r\nContent-Type: multipart/form-data; boundary=B\r\nContent-Length: 100000\r\n\r\n" +
            part;
        socket.sendBytes(head.data(), static_cast<int>(head.size()));
    }

    EXPECT_EQ(StoredCount(), 1u) << "only \"just fits\" may be stored";
    EXPECT_TRUE(m_cloud.Process().IsRunning());
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/settings").status, 200);
    EXPECT_TRUE(FilesEndingIn(m_dataDir + "/incoming", ".upload").empty()) << "an upload left its file behind";
}

TEST_F(CloudStandIn, MalformedRequestsGetA4xxAndItGoesOnServing)
{
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/nothing").status, 404);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/a/b/c").status, 404);
    const Answer put = Ask(HTTPRequest::HTTP_PUT, "/resource/abc/");
    EXPECT_EQ(put.status, 405);
    EXPECT_EQ(put.response.get("Allow", ""), "GET, DELETE");
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource").status, 405);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/%zz/").status, 400);
    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resource/..%2F..%2Ftls%2Fca-key/").status, 404);

    EXPECT_EQ(SendRawOverTls("\x01\x02 no request at all\r\n\r\n").rfind("HTTP/1.", 0), 0u);
    Poco::Net::StreamSocket plain(Poco::Net::SocketAddress("127.0.0.1", m_cloud.Port()));
    SendRaw(plain, "GET / HTTP/1.1\r\nHost: 127.0.0.1\r\n\r\n"); // plain HTTP on the TLS port

    EXPECT_EQ(Ask(HTTPRequest::HTTP_GET, "/resources/settings").status, 200);
    EXPECT_TRUE(m_cloud.Process().IsRunning());
    EXPECT_EQ(m_cloud.Process().Stop(), 0) << m_cloud.Process().Output();
}

TEST(CloudStandInCommandLine, BadOptionsAndUnusableDirectoriesAreNamed)
{
    ChildProcess help(CloudProgram(), {"--help"});
    EXPECT_EQ(help.WaitForExit(), 0);
    EXPECT_NE(help.Output().find("--data"), std::string::npos) << help.Output();

    ChildProcess basePath(CloudProgram(), {"--base-path", "api/"});
    EXPECT_NE(basePath.WaitForExit(), 0);
    EXPECT_NE(basePath.Output().find("--base-path must start with"), std::string::npos) << basePath.Output();

    const std::string notADirectory = SandboxPath("a-file");
    WriteWholeFile(notADirectory, "x");
    ChildProcess unusable(CloudProgram(), {"--port", "0", "--data", notADirectory});
    EXPECT_NE(unusable.WaitForExit(), 0);
    EXPECT_NE(unusable.Output().find("cannot start"), std::string::npos) << unusable.Output();
}
