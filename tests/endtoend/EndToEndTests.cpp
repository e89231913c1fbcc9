// The demonstration host drives the stand-ins of the local agent and the
// cloud, all three real processes on the loopback address: the session, the
// single commands, and a restart of the cloud.

#include "Processes.h"

#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>

#include <sstream>

using namespace EndToEnd;

namespace
{
const std::string kPublicName = "Atelier-Einstellungen für Zoë – ✓ 設定";
const std::string kPrivateName = "dorvannebiuserpersonalsetting";

Json::Value ParseJson(const std::string& text)
{
    Json::Value value;
    std::istringstream stream(text);
    std::string errors;
    EXPECT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), stream, &value, &errors)) << errors << text;
    return value;
}

// Each text appears in output, after the one before.
void ExpectInOrder(const std::string& output, const std::vector<std::string>& texts)
{
    std::size_t from = 0;
    for (const std::string& text : texts)
    {
        const std::size_t at = output.find(text, from);
        ASSERT_NE(at, std::string::npos) << "missing, or out of order: " << text << "\n" << output;
        from = at + text.size();
    }
}

// The rest of the first line of output that holds marker, after marker.
std::string After(const std::string& output, const std::string& marker)
{
    const std::size_t at = output.find(marker);
    if (at == std::string::npos)
    {
        return std::string();
    }
    const std::size_t begin = at + marker.size();
    return output.substr(begin, output.find('\n', begin) - begin);
}

// The id the list printed for the backup named name.
std::string ListedId(const std::string& output, const std::string& name)
{
    std::istringstream lines(output);
    for (std::string line; std::getline(lines, line);)
    {
        if (line.find("name=\"" + name + "\"") != std::string::npos && line.find("id=") != std::string::npos)
        {
            const std::size_t begin = line.find("id=") + 3;
            return line.substr(begin, line.find(' ', begin) - begin);
        }
    }
    return std::string();
}

class EndToEndTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        m_agent = std::make_unique<Agent>();
        m_cloud = std::make_unique<Cloud>(m_cloudDir);
        m_host.Configure(m_agent->Port(), m_cloud->Port());
    }

    // Runs the host trusting the cloud's authority.
    HostResult RunHost(std::vector<std::string> arguments)
    {
        arguments.insert(arguments.begin(), {"--ca", m_cloud->CaFile()});
        return m_host.Run(arguments);
    }

    // The metadata of every archive the cloud keeps on disk.
    std::vector<Json::Value> StoredResources() const
    {
        std::vector<Json::Value> resources;
        for (const std::string& file : FilesEndingIn(m_cloudDir + "/resources", ".json"))
        {
            resources.push_back(ParseJson(ReadWholeFile(file)));
        }
        return resources;
    }

    std::string StoredArchive(const std::string& id) const
    {
        return ReadWholeFile(m_cloudDir + "/resources/" + id + ".data");
    }

    const std::string m_cloudDir = SandboxPath("cloud");
    std::unique_ptr<Agent> m_agent;
    std::unique_ptr<Cloud> m_cloud;
    Host m_host;
};
} // namespace

TEST_F(EndToEndTest, SessionTellsTheWholeStory)
{
    const HostResult session = RunHost({"session"});
    ASSERT_EQ(session.status, 0) << session.output;
    // The signals of every step, in the order they happened.
    const std::vector<std::string> story = {
        "m_sigLoginStateChanged state=LoggedIn",
        "m_sigBackupStatus",
        "state=Started error=NoError",
        "m_sigLastPrivateBackupTimestampChanged time=2",
        "state=Finished error=NoError",
        "private name=\"" + kPrivateName + "\"",
        "m_sigRestoreStatus",
        "state=Finished error=NoError filePath=",
        "identical: ",
        "public name=\"" + kPublicName + "\"",
        "deleted=true",
        "m_sigLastPrivateBackupTimestampChanged time=(none)",
        "m_sigLoginStateChanged state=LoggedOut",
        "m_sigLogOutResult",
        "confirmed=true",
        "== done",
    };
    ExpectInOrder(session.output, story);

    // The cloud keeps the private backup only; it saw the public one, named
    // in UTF-8, come and go.
    const std::vector<Json::Value> stored = StoredResources();
    ASSERT_EQ(stored.size(), 1u);
    EXPECT_EQ(stored[0]["accessibility"].asString(), "private");
    EXPECT_EQ(stored[0]["resourcename"].asString(), kPrivateName);
    const std::string cloudSaw = m_cloud->Process().Output();
    EXPECT_NE(cloudSaw.find("public \"" + kPublicName + "\""), std::string::npos) << cloudSaw;
    EXPECT_NE(cloudSaw.find("DELETE "), std::string::npos) << cloudSaw;

    // The host left no archive behind: the connector removed the uploaded
    // one, the host its restored copy.
    EXPECT_TRUE(FilesEndingIn(m_host.UserDataDir() + "/dorvan-nebi-host", ".zip").empty());
    EXPECT_TRUE(FilesEndingIn(m_host.UserDataDir() + "/Backup", ".zip").empty());

    // The logout cleared the stored backup time, and the agent signed out.
    const Json::Value config =
        ParseJson(ReadWholeFile(m_host.UserDataDir() + "/dorvannebiconnector/dorvannebiconnector.json"));
    EXPECT_EQ(config["dorvannebilastprivatebackuptime"].asString(), "");
    const HostResult status = RunHost({"status"});
    EXPECT_EQ(status.status, 0) << status.output;
    EXPECT_NE(status.output.find("nobody is signed in"), std::string::npos) << status.output;
}

TEST_F(EndToEndTest, BackupRestoreListAndDeleteOneCommandAtATime)
{
    const std::string archive = SandboxPath("Einstellungen-ü.zip");
    const std::string content = RandomBytes(700 * 1024);
    WriteWholeFile(archive, content);

    // A private backup arrives whole in the cloud's store.
    const HostResult backup = RunHost({"backup", archive});
    ASSERT_EQ(backup.status, 0) << backup.output;
    EXPECT_NE(backup.output.find("stored; last private backup: 2"), std::string::npos) << backup.output;
    std::vector<Json::Value> stored = StoredResources();
    ASSERT_EQ(stored.size(), 1u);
    EXPECT_EQ(StoredArchive(stored[0]["resourceid"].asString()), content);
    EXPECT_TRUE(FileExists(archive)) << "removed without --remove";

    // ...and comes back byte for byte.
    const HostResult restore = RunHost({"restore"});
    ASSERT_EQ(restore.status, 0) << restore.output;
    const std::string restored = After(restore.output, "restored to ");
    ASSERT_FALSE(restored.empty()) << restore.output;
    EXPECT_EQ(ReadWholeFile(restored), content);

    // A public backup under a name in several scripts; --remove removes the
    // file before the host ends.
    const std::string name = "Ωmega ✓ 設定 für alle";
    const HostResult publicBackup = RunHost({"backup", archive, "--public", name, "for the team", "--remove"});
    ASSERT_EQ(publicBackup.status, 0) << publicBackup.output;
    EXPECT_FALSE(FileExists(archive));

    const HostResult list = RunHost({"list"});
    ASSERT_EQ(list.status, 0) << list.output;
    EXPECT_NE(list.output.find("private name=\"" + kPrivateName + "\""), std::string::npos) << list.output;
    EXPECT_NE(list.output.find("public name=\"" + name + "\" description=\"for the team\""), std::string::npos)
        << list.output;
    const std::string publicId = ListedId(list.output, name);
    ASSERT_FALSE(publicId.empty()) << list.output;
    EXPECT_EQ(StoredResources().size(), 2u);

    // Restoring the public backup by its id gives the same bytes.
    const HostResult restorePublic = RunHost({"restore", publicId});
    ASSERT_EQ(restorePublic.status, 0) << restorePublic.output;
    EXPECT_EQ(ReadWholeFile(After(restorePublic.output, "restored to ")), content);

    const HostResult deletion = RunHost({"delete", publicId});
    ASSERT_EQ(deletion.status, 0) << deletion.output;
    EXPECT_NE(deletion.output.find("resourceId=" + publicId + " deleted=true"), std::string::npos) << deletion.output;
    EXPECT_FALSE(FileExists(m_cloudDir + "/resources/" + publicId + ".data"));
    const HostResult listAfter = RunHost({"list"});
    EXPECT_EQ(listAfter.output.find(name), std::string::npos) << listAfter.output;

    // A second private backup replaces the first.
    WriteWholeFile(archive, "a newer archive");
    ASSERT_EQ(RunHost({"backup", archive}).status, 0);
    stored = StoredResources();
    ASSERT_EQ(stored.size(), 1u);
    EXPECT_EQ(StoredArchive(stored[0]["resourceid"].asString()), "a newer archive");
}

TEST_F(EndToEndTest, SignInAndOutThroughTheAgentsPages)
{
    const HostResult services = RunHost({"services"});
    ASSERT_EQ(services.status, 0) << services.output;
    ExpectInOrder(services.output, {"m_sigServicesReceived services=3", "id=settings-backup name=\"Settings backup\""});

    const HostResult invite = RunHost({"invite"});
    EXPECT_EQ(invite.status, 0) << invite.output;
    EXPECT_FALSE(m_agent->Process().WaitForOutput("invite-user page shown").empty());

    const HostResult logout = RunHost({"logout"});
    ASSERT_EQ(logout.status, 0) << logout.output;
    ExpectInOrder(logout.output, {"m_sigLoginStateChanged state=LoggedOut", "confirmed=true"});

    // Signed out: the cloud commands and the invitation are refused at once.
    for (const std::vector<std::string>& command :
         {std::vector<std::string>{"list"}, std::vector<std::string>{"restore"}, std::vector<std::string>{"invite"}})
    {
        const HostResult refused = RunHost(command);
        EXPECT_EQ(refused.status, 1) << refused.output;
        EXPECT_NE(refused.output.find("nobody is signed in"), std::string::npos) << refused.output;
    }

    const HostResult login = RunHost({"login"});
    ASSERT_EQ(login.status, 0) << login.output;
    ExpectInOrder(login.output, {"nobody is signed in", "m_sigUserInfoChanged name=\"Mira Solberg\"",
                                 "m_sigUserRoleChanged role=admin", "m_sigLoginStateChanged state=LoggedIn"});
    const HostResult status = RunHost({"status"});
    EXPECT_NE(status.output.find("signed in as Mira Solberg <mira.solberg@example.com> (admin)"), std::string::npos)
        << status.output;

    ASSERT_EQ(RunHost({"logout"}).status, 0);
    const HostResult signup = RunHost({"signup"});
    EXPECT_EQ(signup.status, 0) << signup.output;
    EXPECT_FALSE(m_agent->Process().WaitForOutput("sign-up page: signed in as Mira Solberg").empty());
}

TEST_F(EndToEndTest, CloudKeepsArchivesAndAuthorityAcrossARestart)
{
    const std::string archive = SandboxPath("settings.zip");
    const std::string content = RandomBytes(100 * 1024);
    WriteWholeFile(archive, content);
    ASSERT_EQ(RunHost({"backup", archive}).status, 0);
    const std::string authority = ReadWholeFile(m_cloud->CaFile());

    EXPECT_EQ(m_cloud->Process().Stop(), 0) << m_cloud->Process().Output();
    m_cloud = std::make_unique<Cloud>(m_cloudDir);
    m_host.Configure(m_agent->Port(), m_cloud->Port());

    // The same authority: a host that trusts it goes on trusting the cloud.
    EXPECT_EQ(ReadWholeFile(m_cloud->CaFile()), authority);
    EXPECT_FALSE(m_cloud->Process().WaitForOutput(": 1 stored").empty()) << m_cloud->Process().Output();
    const HostResult list = RunHost({"list"});
    ASSERT_EQ(list.status, 0) << list.output;
    EXPECT_NE(list.output.find("private name=\"" + kPrivateName + "\""), std::string::npos) << list.output;
    const HostResult restore = RunHost({"restore"});
    ASSERT_EQ(restore.status, 0) << restore.output;
    EXPECT_EQ(ReadWholeFile(After(restore.output, "restored to ")), content);
}
