// Smoke test of the Windows dependency prefix: every third-party library the
// project uses is included, linked and exercised once, and the program runs
// under Wine as a GoogleTest executable.

#include <boost/asio/io_context.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/asio/thread_pool.hpp>
#include <boost/signals2/signal.hpp>

#include <Poco/Crypto/DigestEngine.h>
#include <Poco/Net/Context.h>
#include <Poco/Net/HTTPSClientSession.h>
#include <Poco/Net/NetSSL.h>
#include <Poco/Net/ServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <Poco/Net/StreamSocket.h>
#include <Poco/Util/MapConfiguration.h>

#include <json/json.h>

#include <openssl/crypto.h>

#include <wx/app.h>
#include <wx/datetime.h>
#include <wx/init.h>
#include <wx/stdpaths.h>
#include <wx/string.h>

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <sstream>
#include <string>

namespace {

// A console application object, so that wxStandardPaths has its traits.
class SmokeApp : public wxAppConsole {
public:
    bool OnInit() override { return true; }
    int OnRun() override { return 0; }
};

} // namespace

TEST(Smoke, Trivial)
{
    EXPECT_EQ(2, 1 + 1);
}

TEST(Smoke, WxStringAndDateTime)
{
    const wxString s = wxString::Format("%d-%s", 42, "nebi");
    EXPECT_EQ(s, "42-nebi");

    const wxString umlauts = wxString::FromUTF8("Gr\xC3\xBC\xC3\x9F" "e");
    EXPECT_EQ(umlauts.length(), 5u);
    EXPECT_EQ(std::string(umlauts.utf8_str()), "Gr\xC3\xBC\xC3\x9F" "e");

    const wxDateTime dt(15, wxDateTime::Mar, 2024, 12, 30, 5);
    ASSERT_TRUE(dt.IsValid());
    EXPECT_EQ(dt.Format("%Y-%m-%d %H:%M:%S"), "2024-03-15 12:30:05");
    wxDateTime parsed;
    ASSERT_TRUE(parsed.ParseISOCombined("2024-03-15T12:30:05"));
    EXPECT_EQ(parsed, dt);
    EXPECT_EQ(parsed.GetWeekDay(), wxDateTime::Fri);
}

TEST(Smoke, WxStandardPaths)
{
    ASSERT_NE(wxTheApp, nullptr);
    const wxStandardPaths& paths = wxStandardPaths::Get();
    const wxString exe = paths.GetExecutablePath();
    EXPECT_TRUE(exe.Lower().EndsWith("smoke.exe")) << exe.utf8_str();
    EXPECT_FALSE(paths.GetUserConfigDir().empty());
    EXPECT_FALSE(paths.GetTempDir().empty());
}

TEST(Smoke, PocoCryptoUsesOpenSsl)
{
    EXPECT_GE(OpenSSL_version_num(), 0x30000000UL);
    Poco::Crypto::DigestEngine sha256("SHA256");
    sha256.update(std::string("abc"));
    EXPECT_EQ(Poco::DigestEngine::digestToHex(sha256.digest()),
              "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
}

TEST(Smoke, PocoHttpsClientSession)
{
    Poco::Net::initializeSSL();
    {
        Poco::Net::Context::Ptr context = new Poco::Net::Context(
            Poco::Net::Context::TLS_CLIENT_USE, "", "", "",
            Poco::Net::Context::VERIFY_NONE);
        Poco::Net::HTTPSClientSession session("example.invalid", 443, context);
        EXPECT_EQ(session.getHost(), "example.invalid");
        EXPECT_EQ(session.getPort(), 443);
        EXPECT_FALSE(session.connected());
    }
    Poco::Net::uninitializeSSL();
}

TEST(Smoke, PocoLoopbackSocket)
{
    Poco::Net::ServerSocket server(Poco::Net::SocketAddress("127.0.0.1", 0));
    Poco::Net::StreamSocket client(server.address());
    Poco::Net::StreamSocket accepted = server.acceptConnection();
    const std::string ping = "ping";
    ASSERT_EQ(client.sendBytes(ping.data(), static_cast<int>(ping.size())), 4);
    char buffer[8] = {};
    ASSERT_EQ(accepted.receiveBytes(buffer, sizeof buffer), 4);
    EXPECT_EQ(std::string(buffer, 4), ping);

    Poco::AutoPtr<Poco::Util::MapConfiguration> config(new Poco::Util::MapConfiguration);
    config->setInt("port", server.address().port());
    EXPECT_EQ(config->getInt("port"), server.address().port());
}

TEST(Smoke, JsonCpp)
{
    Json::CharReaderBuilder reader;
    Json::Value root;
    std::string errors;
    std::istringstream in(R"({"a": [1, 2, 3], "b": "x"})");
    ASSERT_TRUE(Json::parseFromStream(reader, in, &root, &errors)) << errors;
    EXPECT_EQ(root["a"].size(), 3u);
    EXPECT_EQ(root["a"][2].asInt(), 3);
    EXPECT_EQ(root["b"].asString(), "x");

    Json::StreamWriterBuilder writer;
    writer["indentation"] = "";
    EXPECT_EQ(Json::writeString(writer, root), R"({"a":[1,2,3],"b":"x"})");
}

TEST(Smoke, BoostAsioThreadPoolAndTimer)
{
    std::atomic<int> count{0};
    boost::asio::thread_pool pool(4);
    for (int i = 0; i < 100; ++i)
        boost::asio::post(pool, [&count] { ++count; });
    pool.join();
    EXPECT_EQ(count.load(), 100);

    boost::asio::io_context io;
    boost::asio::steady_timer timer(io, std::chrono::milliseconds(10));
    bool fired = false;
    timer.async_wait([&fired](const boost::system::error_code& ec) { fired = !ec; });
    io.run();
    EXPECT_TRUE(fired);
}

TEST(Smoke, BoostSignals2)
{
    boost::signals2::signal<void(int)> changed;
    int sum = 0;
    boost::signals2::connection first = changed.connect([&sum](int v) { sum += v; });
    changed.connect([&sum](int v) { sum += 10 * v; });
    changed(1);
    first.disconnect();
    changed(2);
    EXPECT_EQ(sum, 1 + 10 + 20);
}

int main(int argc, char** argv)
{
    testing::InitGoogleTest(&argc, argv);

    wxApp::SetInstance(new SmokeApp);
    if (!wxEntryStart(argc, argv))
        return 2;
    if (!wxTheApp->CallOnInit()) {
        wxEntryCleanup();
        return 3;
    }

    const int result = RUN_ALL_TESTS();

    wxTheApp->OnExit();
    wxEntryCleanup();
    return result;
}
