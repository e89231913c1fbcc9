// A host that ends its process while connector jobs are in flight, for the
// process exit tests: they check that it ends at once and cleanly, with the
// exit code its main() returned.
//
//     exit_with_jobs paused PORT    nothing listens at PORT: main() returns
//                                   while the start-up query pauses between
//                                   two attempts
//     exit_with_jobs blocked PORT   the agent at PORT never answers: three
//                                   catalogue requests are posted (two jobs
//                                   wait for the agent, one stays queued);
//                                   main() returns once a line arrives on
//                                   standard input
//
// Prints "posted" when the jobs are under way and "leaving main" last.

#include "TestHost.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <iostream>
#include <string>

namespace
{
constexpr int kExitCode = 7;
}

int main(int argc, char** argv)
{
    if (argc != 3)
    {
        std::cerr << "usage: exit_with_jobs paused|blocked PORT" << std::endl;
        return 2;
    }
    const std::string mode = argv[1];
    const std::string port = argv[2];

    TestSupport::StartTestHost(1, argv);
    TestSupport::WriteCloudConfig("{\"quarlport\": \"" + port + "\"}");
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();

    if (mode == "paused")
    {
        // The first attempt has failed once its line is logged; the job
        // then waits a second before the next one.
        if (!TestSupport::RunEventLoopUntil(
                [] { return TestSupport::CountLogLines("Initial login Retry attempt: 1") > 0; }))
        {
            std::cerr << "the start-up query never ran" << std::endl;
            return 3;
        }
        TestSupport::RunEventLoopFor(std::chrono::milliseconds(200));
        std::cout << "posted" << std::endl;
    }
    else if (mode == "blocked")
    {
        auto services = DorvanNebiConnector::GetInstance()->GetServicesComponent();
        for (int i = 0; i < 3; ++i)
        {
            services->GetServices();
        }
        std::cout << "posted" << std::endl;
        std::string line;
        std::getline(std::cin, line);
    }
    else
    {
        std::cerr << "unknown mode " << mode << std::endl;
        return 2;
    }

    TestSupport::StopTestHost();
    std::cout << "leaving main" << std::endl;
    return kExitCode;
}
