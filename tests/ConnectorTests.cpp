// The connector's spine: the instance, its worker pool, the delivery of
// results to the GUI thread, the configuration files and the role texts.

#include "AgentFixture.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/Net/ServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <Poco/Pipe.h>
#include <Poco/PipeStream.h>
#include <Poco/Process.h>
#include <gtest/gtest.h>
#include <wx/app.h>
#include <wx/filename.h>

#include <functional>
#include <string>
#include <thread>

using namespace TestSupport;

namespace
{
wxString Normalised(const wxString& path)
{
    wxFileName name(path);
    name.Normalize(wxPATH_NORM_ABSOLUTE | wxPATH_NORM_DOTS);
    return name.GetFullPath();
}
} // namespace

TEST(UserRole, TextConversions)
{
    using namespace DorvanNebiConnectorTypes;
    EXPECT_EQ(FromString("admin"), UserRoleAdmin);
    EXPECT_EQ(FromString("operator"), UserRoleOperator);
    for (const char* other : {"Admin", "ADMIN", " admin", "admin ", "", "unknown", "Operator", "root"})
    {
        EXPECT_EQ(FromString(other), UserRoleUnknown) << '"' << other << '"';
    }
    EXPECT_EQ(ToString(UserRoleAdmin), "admin");
    EXPECT_EQ(ToString(UserRoleOperator), "operator");
    EXPECT_EQ(ToString(UserRoleUnknown), "unknown");
    EXPECT_EQ(ToString(static_cast<NebiUserRole>(3)), "unknown");
    EXPECT_EQ(ToString(static_cast<NebiUserRole>(-1)), "unknown");
    for (const char* text : {"admin", "operator"})
    {
        EXPECT_EQ(ToString(FromString(text)), text);
    }
    EXPECT_EQ(ToString(FromString("superuser")), "unknown");
}

using Connector = AgentFixture;

TEST_F(Connector, FirstUseFromTwoThreadsConstructsOneInstance)
{
    WriteCloudConfig("{\"quarlport\": \"" + std::to_string(m_agent.Port()) + "\"}");
    DorvanNebiConnector* seen[2] = {nullptr, nullptr};
    std::thread other([&] { seen[1] = DorvanNebiConnector::GetInstance(); });
    seen[0] = DorvanNebiConnector::GetInstance();
    other.join();

    EXPECT_NE(seen[0], nullptr);
    EXPECT_EQ(seen[0], seen[1]);
    EXPECT_EQ(DorvanNebiConnector::GetInstance(), seen[0]);
    // One login component, so one start-up query.
    WaitForStartupQuery();
    RunEventLoopFor(std::chrono::milliseconds(300));
    EXPECT_EQ(m_agent.RequestCount("/api/v1/nebilogin"), 1u);
}

TEST_F(Connector, UninitializeAsFirstCallConstructsTheConnector)
{
    WriteCloudConfig("{\"quarlport\": \"" + std::to_string(m_agent.Port()) + "\"}");
    EXPECT_TRUE(DorvanNebiConnectorContext::UninitializeDorvanNebiConnector());
    DorvanNebiConnector* connector = DorvanNebiConnector::GetInstance();
    EXPECT_NE(connector->GetLoginComponent(), nullptr);
    EXPECT_NE(connector->GetServicesComponent(), nullptr);
    EXPECT_NE(connector->GetBackupRestoreComponent(), nullptr);
    EXPECT_NE(connector->GetConfig(), nullptr);
    EXPECT_NE(connector->GetCloudConfig(), nullptr);
    // The start-up query runs all the same.
    EXPECT_TRUE(m_agent.WaitForRequests("/api/v1/nebilogin", 1));
}

TEST_F(Connector, InitializeAndUninitializeMayBeRepeated)
{
    StartConnector();
    EXPECT_TRUE(DorvanNebiConnectorContext::InitializeDorvanNebiConnector());
    EXPECT_TRUE(DorvanNebiConnectorContext::UninitializeDorvanNebiConnector());
    EXPECT_TRUE(DorvanNebiConnectorContext::UninitializeDorvanNebiConnector());
    EXPECT_TRUE(DorvanNebiConnectorContext::InitializeDorvanNebiConnector());
    EXPECT_EQ(DorvanNebiConnector::GetInstance(), DorvanNebiConnector::GetInstance());
}

TEST_F(Connector, ConfigurationFilesLiveWhereTheHostKeepsThem)
{
    StartConnector();
    DorvanNebiConnector* connector = DorvanNebiConnector::GetInstance();
    EXPECT_EQ(Normalised(connector->GetConfig()->GetPath()),
              Normalised(UserDataDir() + "/dorvannebiconnector/dorvannebiconnector.json"));
    EXPECT_EQ(Normalised(connector->GetCloudConfig()->GetPath()), Normalised(ExecutableDir() + "/quarlconfig.json"));
}

TEST(ConnectorDefaults, AddressesWithoutAnyConfiguration)
{
    // No "quarlconfig.json": every key takes its default, and nothing is written.
    const Poco::URI agent = DorvanNebiConnectorUtil::MakeLocalhostURI("/nebiservices");
    EXPECT_EQ(agent.toString(), "http://127.0.0.1:7285/api/v1/nebiservices");
    const Poco::URI cloud = DorvanNebiConnectorUtil::MakeCloudURI("/resource");
    EXPECT_EQ(cloud.getScheme(), "https");
    EXPECT_EQ(cloud.getHost(), "api.nebi.dorvan.com");
    EXPECT_EQ(cloud.getPort(), 443);
    EXPECT_EQ(cloud.getPath(), "/api/clientapp/v1/resource");
    EXPECT_FALSE(wxFileName::FileExists(ExecutableDir() + "/quarlconfig.json"));
    EXPECT_FALSE(wxFileName::FileExists(UserDataDir() + "/dorvannebiconnector/dorvannebiconnector.json"));
}

TEST(ConnectorDefaults, AddressesFromTheCloudConfiguration)
{
    WriteCloudConfig(R"({"quarlport": "4711", "nebiprotocol": "http", "nebidomain": "cloud.test",
                         "nebiport": "8443", "nebiclientappapiversion": "/v9"})");
    EXPECT_EQ(DorvanNebiConnectorUtil::GetLocalhostPort(), 4711);
    EXPECT_EQ(DorvanNebiConnectorUtil::MakeLocalhostURI("/nebilogin").toString(), "http://127.0.0.1:4711/api/v1/nebilogin");
    EXPECT_EQ(DorvanNebiConnectorUtil::MakeCloudURI("/resources/x").toString(), "http://cloud.test:8443/v9/resources/x");
}

// Two workers, whatever the machine: a third job waits until one of two
// blocked jobs ends.
TEST_F(Connector, PoolRunsExactlyTwoJobsAtOnce)
{
    Reply slow = Reply::Json("[]");
    slow.delay = std::chrono::milliseconds(1500);
    m_agent.Route("/api/v1/nebiservices", slow);
    StartConnector();
    WaitForStartupQuery();

    auto services = DorvanNebiConnector::GetInstance()->GetServicesComponent();
    int received = 0;
    services->m_sigServicesReceived.connect([&](std::vector<DorvanNebiServiceInfo>) { ++received; });
    for (int i = 0; i < 3; ++i)
    {
        EXPECT_TRUE(services->GetServices());
    }

    ASSERT_TRUE(RunEventLoopUntil([&] { return received == 3; }));
    const std::vector<RecordedRequest> requests = m_agent.Requests();
    std::vector<std::chrono::steady_clock::time_point> arrivals;
    for (const RecordedRequest& request : requests)
    {
        if (request.path == "/api/v1/nebiservices")
        {
            arrivals.push_back(request.arrived);
        }
    }
    ASSERT_EQ(arrivals.size(), 3u);
    std::sort(arrivals.begin(), arrivals.end());
    // The third request could only start once a worker was free again, that
    // is after the first answer's delay.
    EXPECT_GE(arrivals[2] - arrivals[0], std::chrono::milliseconds(1400));
}

TEST_F(Connector, ResultsArriveOnTheGuiThreadAlsoAfterUninitialize)
{
    Reply slow = Reply::Json("[]");
    slow.delay = std::chrono::milliseconds(300);
    m_agent.Route("/api/v1/nebiservices", slow);
    StartConnector();

    auto services = DorvanNebiConnector::GetInstance()->GetServicesComponent();
    std::thread::id deliveredOn;
    bool delivered = false;
    services->m_sigServicesReceived.connect([&](std::vector<DorvanNebiServiceInfo>) {
        deliveredOn = std::this_thread::get_id();
        delivered = true;
    });
    services->GetServices();
    DorvanNebiConnectorContext::UninitializeDorvanNebiConnector();

    ASSERT_TRUE(RunEventLoopUntil([&] { return delivered; }));
    EXPECT_EQ(deliveredOn, std::this_thread::get_id());
}

TEST_F(Connector, WithoutAnApplicationObjectResultsAreDroppedAndLogged)
{
    StartConnector();
    WaitForStartupQuery();
    wxAppConsole* const app = wxTheApp;
    wxApp::SetInstance(nullptr);
    DorvanNebiConnector::GetInstance()->GetServicesComponent()->GetServices();
    const bool logged = m_agent.WaitForRequests("/api/v1/nebiservices", 1) && [] {
        for (int i = 0; i < 200 && CountLogLines("no application object") == 0; ++i)
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return CountLogLines("no application object") == 1;
    }();
    wxApp::SetInstance(app);
    EXPECT_TRUE(logged);
}

// The process exit. A host whose main() returns while connector jobs are in
// flight ends at once and with the exit code main() returned: the jobs are
// neither waited for nor allowed to hang or crash the exit.
namespace
{
struct ExitingHost
{
    bool ended = false;
    int exitCode = -1;
    std::string output;
};

// Runs exit_with_jobs MODE PORT; once it has printed "posted", calls
// whenPosted (which may write to its standard input), then waits for its end.
// A host still running a minute later is taken for hung and killed.
ExitingHost RunExitingHost(const std::string& mode, unsigned short port,
                           const std::function<void(Poco::PipeOutputStream&)>& whenPosted)
{
    Poco::Pipe in;
    Poco::Pipe out;
    Poco::ProcessHandle process = Poco::Process::launch(HelperProgram("exit_with_jobs").utf8_string(),
                                                        {mode, std::to_string(port)}, &in, &out, nullptr);
    Poco::PipeInputStream fromHost(out);
    Poco::PipeOutputStream toHost(in);
    ExitingHost host;
    std::string line;
    while (std::getline(fromHost, line))
    {
        host.output += line + "\n";
        if (line.rfind("posted", 0) == 0)
        {
            whenPosted(toHost);
            break;
        }
    }
    toHost.close();
    for (int i = 0; i < 600 && !host.ended; ++i)
    {
        host.exitCode = process.tryWait();
        host.ended = host.exitCode != -1;
        if (!host.ended)
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
        }
    }
    if (!host.ended)
    {
        Poco::Process::kill(process.id()); // by id: keeps the handle open on Windows
        process.wait();
    }
    for (std::string rest; std::getline(fromHost, rest);)
    {
        host.output += rest + "\n";
    }
    return host;
}

unsigned short PortNobodyListensOn()
{
    Poco::Net::ServerSocket socket(Poco::Net::SocketAddress("127.0.0.1", 0));
    const unsigned short port = socket.address().port();
    socket.close();
    return port;
}
} // namespace

// On Windows the connector's exit handler runs when the workers have already
// been ended; one that waited in a pause must not make the exit wait for it.
TEST(ProcessExit, HostEndsWhileTheStartupQueryPausesBetweenAttempts)
{
    const ExitingHost host = RunExitingHost("paused", PortNobodyListensOn(), [](Poco::PipeOutputStream&) {});
    ASSERT_TRUE(host.ended) << "the host did not end; it printed:\n" << host.output;
    EXPECT_EQ(host.exitCode, 7) << host.output;
    EXPECT_NE(host.output.find("leaving main"), std::string::npos) << host.output;
}

TEST(ProcessExit, HostEndsWhileJobsWaitForASilentAgent)
{
    LoopbackServer agent;
    agent.Route("/api/v1/nebilogin", Reply::Json(SignedOutRecord()));
    Reply never = Reply::Json("[]");
    never.delay = std::chrono::hours(1); // cut short only when the agent stops
    agent.Route("/api/v1/nebiservices", never);

    const ExitingHost host = RunExitingHost("blocked", agent.Port(), [&agent](Poco::PipeOutputStream& toHost) {
        // Both workers hold a request to the agent; the third job is queued.
        EXPECT_TRUE(agent.WaitForRequests("/api/v1/nebiservices", 2));
        toHost << "exit" << std::endl;
    });
    ASSERT_TRUE(host.ended) << "the host did not end; it printed:\n" << host.output;
    EXPECT_EQ(host.exitCode, 7) << host.output;
    EXPECT_NE(host.output.find("leaving main"), std::string::npos) << host.output;
    // The queued job never started.
    EXPECT_EQ(agent.RequestCount("/api/v1/nebiservices"), 2u);
}
