// A host that ends its process while the connector still has work: one job
// blocked on a page of the agent that never answers, cloud requests running
// and many more queued. The process-exit test starts it against its own
// stand-ins and checks that it ends cleanly.
//
//     exit_with_jobs_in_flight AGENT_PORT CLOUD_PORT CA_FILE
//
// Prints "sandbox PATH" first (the test removes it afterwards) and "exiting
// with jobs in flight" just before main returns 0.

#include "TestHost.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <Poco/Net/Context.h>
#include <Poco/Net/RejectCertificateHandler.h>
#include <Poco/Net/SSLManager.h>

#include <iostream>
#include <string>

using namespace TestSupport;

namespace
{
// The host's TLS set-up, done after the connector has started (as the
// demonstration host's order allows): strict verification against the
// stand-in's authority.
void TrustAuthority(const std::string& caFile)
{
    Poco::Net::initializeSSL();
    Poco::Net::Context::Ptr context = new Poco::Net::Context(Poco::Net::Context::TLS_CLIENT_USE, "", "", caFile,
                                                             Poco::Net::Context::VERIFY_STRICT, 9, false);
    Poco::Net::SSLManager::instance().initializeClient(nullptr, new Poco::Net::RejectCertificateHandler(false),
                                                       context);
}
} // namespace

int main(int argc, char** argv)
{
    if (argc != 4)
    {
        std::cerr << "usage: exit_with_jobs_in_flight AGENT_PORT CLOUD_PORT CA_FILE\n";
        return 2;
    }
    StartTestHost(1, argv);
    std::cout << "sandbox " << SandboxDir().utf8_string() << std::endl;
    WriteCloudConfig(std::string("{\"quarlport\": \"") + argv[1] + "\", \"nebidomain\": \"localhost\", " +
                     "\"nebiport\": \"" + argv[2] + "\"}");

    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    TrustAuthority(argv[3]);
    DorvanNebiConnector* connector = DorvanNebiConnector::GetInstance();
    auto login = connector->GetLoginComponent();
    auto backup = connector->GetBackupRestoreComponent();
    if (!RunEventLoopUntil([&] { return login->GetLoginState() == LoggedIn; }))
    {
        std::cerr << "the agent stand-in reported nobody signed in\n";
        return 1;
    }

    int finished = 0;
    backup->m_sigBackupStatus.connect([&](BackupRestoreComponent::BackupStatus status) {
        finished += status.state == BackupRestoreComponent::Finished ? 1 : 0;
    });
    backup->m_sigRestoreStatus.connect([&](BackupRestoreComponent::RestoreStatus status) {
        finished += status.state == BackupRestoreComponent::Finished ? 1 : 0;
    });
    backup->m_sigListOfBackup.connect([&](wxString, std::vector<DorvanNebiResource>) { ++finished; });
    connector->GetServicesComponent()->m_sigServicesReceived.connect(
        [&](std::vector<DorvanNebiServiceInfo>) { ++finished; });

    // One worker stays blocked on the invite page, the other works through
    // the cloud requests one after the other.
    login->RequestInviteUser();
    const wxString archive = SandboxDir() + "/settings.zip";
    WriteFile(archive, std::string(64 * 1024, 'a'));
    int issued = 0;
    for (int round = 0; round < 10; ++round)
    {
        backup->BackupToPrivateSpace(archive, false);
        backup->RestoreFromPublicSpace("r-1");
        backup->GetListOfBackup();
        connector->GetServicesComponent()->GetServices();
        issued += 4;
    }
    // Exit once results are arriving: some jobs are done, one is running,
    // one is blocked, and the rest wait in the queue.
    if (!RunEventLoopUntil([&] { return finished >= 2; }, std::chrono::seconds(30)))
    {
        std::cerr << "no cloud request finished\n";
        return 1;
    }
    DorvanNebiConnectorContext::UninitializeDorvanNebiConnector();
    std::cout << "exiting with jobs in flight: " << finished << " of " << issued + 1 << " results received"
              << std::endl;
    return 0;
}
