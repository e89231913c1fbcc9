// The demonstration host against bad input and a broken world: a clear
// message and a non-zero exit status, never a crash or a hang, and never a
// certificate it should not trust.

#include "Processes.h"

#include <CertificateAuthority.h>

#include <Poco/Net/ServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <gtest/gtest.h>

#include <filesystem>

using namespace EndToEnd;

namespace
{
void ExpectRefused(const HostResult& result, int status, const std::string& message)
{
    EXPECT_EQ(result.status, status) << result.output;
    EXPECT_NE(result.output.find(message), std::string::npos) << result.output;
}
} // namespace

TEST(HostCommandLine, MistakesAreNamedAndEndWithStatusTwo)
{
    const Host host;
    ExpectRefused(host.Run({}), 2, "no command given");
    ExpectRefused(host.Run({"frobnicate"}), 2, "unknown command frobnicate");
    ExpectRefused(host.Run({"--verbose", "status"}), 2, "unknown option --verbose");
    ExpectRefused(host.Run({"--ca"}), 2, "--ca needs a value");
    ExpectRefused(host.Run({"--timeout", "soon", "status"}), 2, "--timeout takes a number of seconds");
    ExpectRefused(host.Run({"--timeout", "0", "status"}), 2, "--timeout takes a number of seconds");
    ExpectRefused(host.Run({"backup"}), 2, "backup needs the FILE");
    ExpectRefused(host.Run({"backup", SandboxPath("missing.zip")}), 2, "no such file: " + SandboxPath("missing.zip"));
    ExpectRefused(host.Run({"delete"}), 2, "delete needs the ID");
    ExpectRefused(host.Run({"list", "everything"}), 2, "unexpected argument everything");
    ExpectRefused(host.Run({"restore", "a", "b"}), 2, "unexpected argument b");

    WriteWholeFile(SandboxPath("a.zip"), "x");
    ExpectRefused(host.Run({"backup", SandboxPath("a.zip"), "--public"}), 2, "--public needs a NAME");
    ExpectRefused(host.Run({"backup", SandboxPath("a.zip"), "--shred"}), 2, "unexpected argument --shred");

    const HostResult help = host.Run({"--help"});
    EXPECT_EQ(help.status, 0);
    EXPECT_NE(help.output.find("usage: dorvan-nebi-host"), std::string::npos) << help.output;
}

TEST(HostCommandLine, ACaFileThatCannotBeUsedIsRefused)
{
    const Host host;
    ExpectRefused(host.Run({"--ca", SandboxPath("nowhere.pem"), "status"}), 2, "does not exist");
    WriteWholeFile(SandboxPath("garbage.pem"), "this is no certificate");
    ExpectRefused(host.Run({"--ca", SandboxPath("garbage.pem"), "status"}), 2, "cannot use");
}

TEST(HostFaults, AnAgentThatDoesNotAnswerIsReported)
{
    Host host;
    unsigned short closedPort = 0;
    {
        Agent gone;
        closedPort = gone.Port();
        EXPECT_EQ(gone.Process().Stop(), 0);
    }
    host.Configure(closedPort, 443);
    ExpectRefused(host.Run({"status"}), 1, "the agent does not answer");
    ExpectRefused(host.Run({"session"}), 1, "FAILED at step 1/");
}

TEST(HostFaults, AServerThatNeverAnswersEndsInATimeoutNotAHang)
{
    // Takes connections (the system does, into the backlog) and never reads
    // or answers a byte.
    Poco::Net::ServerSocket silent(Poco::Net::SocketAddress("127.0.0.1", 0));
    const unsigned short silentPort = silent.address().port();

    Host host;
    host.Configure(silentPort, 443);
    ExpectRefused(host.Run({"--timeout", "2", "status"}), 1, "no result within 2 s");

    Agent agent;
    host.Configure(agent.Port(), silentPort);
    WriteWholeFile(SandboxPath("a.zip"), "x");
    ExpectRefused(host.Run({"--timeout", "2", "backup", SandboxPath("a.zip")}), 1, "no result within 2 s");
}

class HostAgainstTheCloud : public ::testing::Test
{
protected:
    void SetUp() override { WriteWholeFile(m_archive, RandomBytes(64 * 1024)); }

    void Start(const std::vector<std::string>& agentOptions, const std::vector<std::string>& cloudOptions)
    {
        m_agent = std::make_unique<Agent>(agentOptions);
        m_cloud = std::make_unique<Cloud>(m_cloudDir, cloudOptions);
        m_host.Configure(m_agent->Port(), m_cloud->Port());
    }

    bool CloudStoredSomething() const { return !FilesEndingIn(m_cloudDir + "/resources", ".data").empty(); }

    const std::string m_archive = SandboxPath("settings.zip");
    const std::string m_cloudDir = SandboxPath("cloud");
    std::unique_ptr<Agent> m_agent;
    std::unique_ptr<Cloud> m_cloud;
    Host m_host;
};

TEST_F(HostAgainstTheCloud, AnUntrustedCertificateIsNeverAccepted)
{
    Start({}, {});
    // Another authority altogether, and the system's store: neither vouches
    // for the stand-in's certificate.
    const std::string otherAuthority = SandboxPath("other-authority.pem");
    DorvanNebiPki::WritePemFile(
        std::filesystem::u8path(otherAuthority),
        DorvanNebiPki::CertificateAuthority::Create("Some other authority").GetCredentials().certificatePem, false);
    ExpectRefused(m_host.Run({"--ca", otherAuthority, "backup", m_archive}), 1, "error=Failed");
    ExpectRefused(m_host.Run({"backup", m_archive}), 1, "error=Failed");
    ExpectRefused(m_host.Run({"--ca", otherAuthority, "list"}), 1, "no backups listed");
    EXPECT_FALSE(CloudStoredSomething());
    EXPECT_EQ(m_cloud->Process().Output().find("POST "), std::string::npos) << "a request got through";
}

TEST_F(HostAgainstTheCloud, WrongCredentialsAreRefusedByTheCloud)
{
    Start({"--api-secret", "not-the-secret"}, {});
    ExpectRefused(m_host.Run({"--ca", m_cloud->CaFile(), "backup", m_archive}), 1, "error=Failed");
    ExpectRefused(m_host.Run({"--ca", m_cloud->CaFile(), "session"}), 1, "FAILED at step");
    EXPECT_FALSE(CloudStoredSomething());
    EXPECT_NE(m_cloud->Process().Output().find("-> 401"), std::string::npos) << m_cloud->Process().Output();
}

TEST_F(HostAgainstTheCloud, ACloudThatIsGoneFailsTheCommand)
{
    Start({}, {});
    const std::string authority = m_cloud->CaFile();
    EXPECT_EQ(m_cloud->Process().Stop(), 0);
    ExpectRefused(m_host.Run({"--ca", authority, "backup", m_archive}), 1, "error=Failed");
    ExpectRefused(m_host.Run({"--ca", authority, "restore"}), 1, "the cloud did not send the archive");
    ExpectRefused(m_host.Run({"--ca", authority, "delete", "abc"}), 1, "there is no backup abc");
}
