// Configuration files that a careless tool, a broken disk or an attacker left
// behind: each gives the defaults, or a request that fails cleanly, and never
// a crash or a hang. Each row runs in a process of its own, since the
// connector reads its files once.

#include "AgentFixture.h"
#include "TestTls.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>

#include <gtest/gtest.h>
#include <wx/filename.h>

using namespace TestSupport;

namespace
{
const char kListPath[] = "/api/clientapp/v1/resources/dorvannebiusersettingresource";

// What a row expects of the cloud configuration.
enum class Expect
{
    // Every address key reads as its default.
    Defaults,
    // The cloud is reached over TLS all the same: the list request succeeds.
    RequestSucceeds,
    // The list request fails cleanly, before anything reaches the network.
    RequestFails
};

struct Row
{
    const char* name;
    // "quarlconfig.json"; $AGENT and $CLOUD stand for the stand-ins' ports.
    std::string cloudConfig;
    // "dorvannebiconnector.json", when the row writes one.
    std::string connectorConfig;
    Expect expect;
};

std::string Repeat(const std::string& text, std::size_t count)
{
    std::string repeated;
    repeated.reserve(text.size() * count);
    for (std::size_t i = 0; i < count; ++i)
    {
        repeated += text;
    }
    return repeated;
}

std::string Nested(std::size_t depth)
{
    return "{\"quarlport\": \"$AGENT\", \"a\": " + Repeat("[", depth) + Repeat("]", depth) + "}";
}

std::string NestedObjects(std::size_t depth)
{
    return "{\"quarlport\": \"$AGENT\", " + Repeat("\"k\": {", depth) + Repeat("}", depth) + "}";
}

const std::string kCloudAt = ", \"nebidomain\": \"localhost\", \"nebiport\": \"$CLOUD\"";

std::vector<Row> Rows()
{
    return {
        {"NotJson", "quarlport = $AGENT\nnebidomain = localhost\n", "", Expect::Defaults},
        {"BinaryGarbage", std::string("\x00\xff{\"quarlport\":\x01\"$AGENT\"}\xfe", 24), "", Expect::Defaults},
        {"JsonArray", "[{\"quarlport\": \"$AGENT\"}]", "", Expect::Defaults},
        {"Huge", "{\"quarlport\": \"$AGENT\", \"pad\": \"" + std::string(5 * 1024 * 1024, 'x') + "\"}", "",
         Expect::Defaults},
        {"DeeplyNestedArrays", Nested(200000), "", Expect::Defaults},
        {"DeeplyNestedObjects", NestedObjects(100000), "", Expect::Defaults},
        {"NestedKeys",
         "{\"quarlport\": {\"value\": \"$AGENT\"}, \"nebiprotocol\": [\"http\"], \"nebidomain\": {\"host\": "
         "\"localhost\"}, \"nebiport\": {\"\": \"$CLOUD\"}, \"nebiclientappapiversion\": {\"v\": \"/x\"}}",
         "", Expect::Defaults},
        {"KeysInsideOtherKeys",
         "{\"cloud\": {\"quarlport\": \"$AGENT\", \"nebidomain\": \"localhost\", \"nebiport\": \"$CLOUD\"}}", "",
         Expect::Defaults},
        {"NegativePorts", "{\"quarlport\": \"-1\", \"nebiport\": \"-1\"}", "", Expect::Defaults},
        {"PortsAbove16Bits", "{\"quarlport\": \"65536\", \"nebiport\": \"65536\"}", "", Expect::Defaults},
        {"PortsThatAreNoDecimalNumbers", "{\"quarlport\": \"0x1c75\", \"nebiport\": \"443.0\"}", "",
         Expect::Defaults},
        {"ProtocolFtp", "{\"quarlport\": \"$AGENT\", \"nebiprotocol\": \"ftp\"" + kCloudAt + "}", "",
         Expect::RequestSucceeds},
        {"ProtocolHttp", "{\"quarlport\": \"$AGENT\", \"nebiprotocol\": \"http\"" + kCloudAt + "}", "",
         Expect::RequestSucceeds},
        {"DomainWithPath",
         "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"localhost/evil\", \"nebiport\": \"$CLOUD\"}", "",
         Expect::RequestFails},
        {"DomainWithPort", "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"localhost:$CLOUD\"}", "",
         Expect::RequestFails},
        {"DomainWithPortAndPath",
         "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"127.0.0.1:$CLOUD/api?x=1\", \"nebiport\": \"$CLOUD\"}",
         "", Expect::RequestFails},
        {"DomainWithUserInfo",
         "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"user@localhost\", \"nebiport\": \"$CLOUD\"}", "",
         Expect::RequestFails},
        {"DomainWithLineBreak",
         "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"localhost\\r\\nX-Injected: 1\", \"nebiport\": \"$CLOUD\"}",
         "", Expect::RequestFails},
        {"EmptyDomain", "{\"quarlport\": \"$AGENT\", \"nebidomain\": \"\", \"nebiport\": \"$CLOUD\"}", "",
         Expect::RequestFails},
        {"ConnectorConfigNotJson", "{\"quarlport\": \"$AGENT\"" + kCloudAt + "}", "not json at all",
         Expect::RequestSucceeds},
        {"ConnectorConfigNested", "{\"quarlport\": \"$AGENT\"" + kCloudAt + "}",
         "{\"dorvannebilastprivatebackuptime\": {\"t\": \"2023-05-04T10:11:12\"}}", Expect::RequestSucceeds},
        {"ConnectorConfigDeeplyNested", "{\"quarlport\": \"$AGENT\"" + kCloudAt + "}", Nested(200000),
         Expect::RequestSucceeds},
        {"ConnectorConfigHuge", "{\"quarlport\": \"$AGENT\"" + kCloudAt + "}",
         "{\"dorvannebilastprivatebackuptime\": \"2023-05-04T10:11:12\", \"pad\": \"" +
             std::string(5 * 1024 * 1024, 'x') + "\"}",
         Expect::RequestSucceeds},
    };
}

void PrintTo(const Row& row, std::ostream* out)
{
    *out << row.name;
}

std::string RowName(const testing::TestParamInfo<Row>& info)
{
    return info.param.name;
}

std::string WithPorts(std::string text, unsigned short agent, unsigned short cloud)
{
    for (const auto& [name, port] : {std::make_pair(std::string("$AGENT"), agent), {"$CLOUD", cloud}})
    {
        for (std::size_t at = text.find(name); at != std::string::npos; at = text.find(name))
        {
            text.replace(at, name.size(), std::to_string(port));
        }
    }
    return text;
}

wxString ConnectorConfigPath()
{
    return UserDataDir() + "/dorvannebiconnector/dorvannebiconnector.json";
}

class HostileConfiguration : public AgentFixture, public testing::WithParamInterface<Row>
{
protected:
    HostileConfiguration() : m_cloud(ServerTlsContext())
    {
        TrustTestAuthority();
        m_agent.Route("/api/v1/nebilogin", Reply::Json(SignedInRecord()));
        m_cloud.Route(kListPath, Reply::Json("{\"response\":[{\"resourceid\":\"r-1\",\"resourcename\":\"n\","
                                             "\"description\":\"\"}]}"));
    }

    // The list request's delivery: how many records, or -1 when none came.
    int ListedRecords()
    {
        auto backup = DorvanNebiConnector::GetInstance()->GetBackupRestoreComponent();
        int deliveries = 0;
        int records = -1;
        const wxString requestId = backup->GetListOfBackup();
        auto connection = backup->m_sigListOfBackup.connect([&](wxString id, std::vector<DorvanNebiResource> list) {
            EXPECT_EQ(id, requestId);
            ++deliveries;
            records = static_cast<int>(list.size());
        });
        EXPECT_TRUE(RunEventLoopUntil([&] { return deliveries > 0; }));
        RunEventLoopFor(std::chrono::milliseconds(200));
        EXPECT_EQ(deliveries, 1);
        connection.disconnect();
        return records;
    }

    LoopbackServer m_cloud;
};
} // namespace

TEST_P(HostileConfiguration, GivesTheDefaultsOrARequestThatFailsCleanly)
{
    const Row& row = GetParam();
    const std::string cloudConfig = WithPorts(row.cloudConfig, m_agent.Port(), m_cloud.Port());
    WriteCloudConfig(cloudConfig);
    if (!row.connectorConfig.empty())
    {
        wxFileName::Mkdir(UserDataDir() + "/dorvannebiconnector", wxS_DIR_DEFAULT, wxPATH_MKDIR_FULL);
        WriteFile(ConnectorConfigPath(), WithPorts(row.connectorConfig, m_agent.Port(), m_cloud.Port()));
    }
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    RunEventLoopFor(std::chrono::milliseconds(100));

    switch (row.expect)
    {
    case Expect::Defaults:
    {
        EXPECT_EQ(DorvanNebiConnectorUtil::GetLocalhostPort(), 7285);
        const Poco::URI cloud = DorvanNebiConnectorUtil::MakeCloudURI("/resource");
        EXPECT_EQ(cloud.getScheme(), "https");
        EXPECT_EQ(cloud.getHost(), "api.nebi.dorvan.com");
        EXPECT_EQ(cloud.getPort(), 443);
        EXPECT_EQ(cloud.getPath(), "/api/clientapp/v1/resource");
        EXPECT_EQ(m_agent.RequestCount("/api/v1/nebilogin"), 0u) << "the agent was reached on its configured port";
        break;
    }
    case Expect::RequestSucceeds:
        EXPECT_EQ(ListedRecords(), 1);
        EXPECT_EQ(m_cloud.RequestCount(kListPath), 1u);
        // A connector configuration that is no configuration gives no time.
        EXPECT_FALSE(DorvanNebiConnector::GetInstance()->GetBackupRestoreComponent()
                         ->GetLastPrivateBackupTimestamp()
                         .IsValid());
        break;
    case Expect::RequestFails:
        EXPECT_EQ(ListedRecords(), 0);
        EXPECT_TRUE(m_cloud.Requests().empty());
        // Refused before any name lookup or connection.
        EXPECT_EQ(CountLogLines("HTTP_GET " + std::string(kListPath) +
                                " failed, message Invalid argument: the cloud host in the configuration is no host name"),
                  1u);
        break;
    }
    // Reading never rewrites the file the host gave.
    EXPECT_TRUE(ReadFile(ExecutableDir() + "/quarlconfig.json") == cloudConfig);
}

INSTANTIATE_TEST_SUITE_P(Files, HostileConfiguration, testing::ValuesIn(Rows()), RowName);
