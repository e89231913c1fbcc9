// The connector under load and at the end of its process: thousands of mixed
// operations with faults injected at random, and a host process that exits
// while jobs are still running.

#include "AgentFixture.h"
#include "TestTls.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <CoreServices/GlobalUtils.h>

#include <Poco/Net/HTTPServerRequest.h>
#include <Poco/Pipe.h>
#include <Poco/Process.h>
#include <Poco/Net/HTTPServerResponse.h>
#include <gtest/gtest.h>
#include <wx/filename.h>

#include <condition_variable>
#include <filesystem>
#include <future>
#include <thread>

using namespace TestSupport;

namespace
{
const char kLoginPath[] = "/api/v1/nebilogin";
const char kUploadPath[] = "/api/clientapp/v1/resource";
const char kResourcePath[] = "/api/clientapp/v1/resource/r-1/";
const char kListPath[] = "/api/clientapp/v1/resources/dorvannebiusersettingresource";

Reply Slow(Reply reply, std::chrono::milliseconds delay)
{
    reply.delay = delay;
    return reply;
}

struct ProcessResult
{
    int status = -1;
    std::string output; // stdout and stderr
};

// Runs program to its end (killing it after timeout) and collects its output.
ProcessResult RunProcess(const std::string& program, const std::vector<std::string>& arguments,
                         std::chrono::seconds timeout)
{
    Poco::Pipe pipe;
    Poco::ProcessHandle handle = Poco::Process::launch(program, arguments, nullptr, &pipe, &pipe);
    std::future<std::string> output = std::async(std::launch::async, [&pipe] {
        std::string collected;
        char buffer[4096];
        for (int got = pipe.readBytes(buffer, sizeof(buffer)); got > 0; got = pipe.readBytes(buffer, sizeof(buffer)))
        {
            collected.append(buffer, static_cast<std::size_t>(got));
        }
        return collected;
    });
    if (output.wait_for(timeout) != std::future_status::ready)
    {
        Poco::Process::kill(handle);
    }
    ProcessResult result;
    result.status = handle.wait();
    result.output = output.get();
    return result;
}

// Text that shows a sanitizer or the system found fault with a process.
bool HasFaultReport(const std::string& output)
{
    for (const char* marker : {"Sanitizer", "runtime error:", "Segmentation fault", "Aborted", "terminate called"})
    {
        if (output.find(marker) != std::string::npos)
        {
            return true;
        }
    }
    return false;
}
} // namespace

// A host that returns from main while one job is blocked on a peer that never
// answers, a download is streaming, and many jobs wait in the queue: the
// process ends, with status 0 and without a sanitizer's report.
TEST(ProcessExit, EndsCleanlyWithJobsInFlight)
{
    LoopbackServer agent;
    LoopbackServer cloud(ServerTlsContext());
    agent.Route(kLoginPath, Reply::Json(SignedInRecord()));
    agent.Route("/api/v1/nebiinviteuserui", Slow(Reply::Json("{}"), std::chrono::minutes(10)));
    agent.Route("/api/v1/nebiservices", Slow(Reply::Json("[]"), std::chrono::milliseconds(100)));
    cloud.Route(kUploadPath, Slow(Reply::Json("{\"resourceid\":\"r-1\"}"), std::chrono::milliseconds(150)));
    cloud.Route(kListPath, Slow(Reply::Json("{\"response\":[]}"), std::chrono::milliseconds(150)));
    // The archive comes in slowly, block by block.
    cloud.RouteRaw(kResourcePath, [](Poco::Net::HTTPServerRequest&, Poco::Net::HTTPServerResponse& response) {
        const std::string block(4096, 'z');
        response.setContentLength(static_cast<std::streamsize>(block.size() * 20));
        std::ostream& body = response.send();
        for (int i = 0; i < 20 && body; ++i)
        {
            body << block << std::flush;
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
        }
    });

    // A host that hung at exit would be killed, and fail.
    const ProcessResult host = RunProcess(EXIT_WITH_JOBS_IN_FLIGHT_PATH,
                                          {std::to_string(agent.Port()), std::to_string(cloud.Port()),
                                           TestAuthorityFile().utf8_string()},
                                          std::chrono::seconds(60));
    const int status = host.status;
    const std::string& output = host.output;

    EXPECT_EQ(status, 0) << output;
    EXPECT_NE(output.find("exiting with jobs in flight"), std::string::npos) << output;
    EXPECT_FALSE(HasFaultReport(output)) << output;
    // The blocked job and the cloud's work really were under way.
    EXPECT_EQ(agent.RequestCount("/api/v1/nebiinviteuserui"), 1u);
    EXPECT_GE(cloud.Requests().size(), 2u);

    const std::string sandboxLine = output.substr(0, output.find('\n'));
    ASSERT_EQ(sandboxLine.rfind("sandbox ", 0), 0u) << output;
    const std::filesystem::path sandbox = std::filesystem::u8path(sandboxLine.substr(8));
    // A download cut off at exit leaves no partial file behind.
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator(sandbox / "userdata" / "Backup", ignored))
    {
        EXPECT_EQ(entry.path().extension(), ".zip") << entry.path();
    }
    std::filesystem::remove_all(sandbox, ignored);
}
