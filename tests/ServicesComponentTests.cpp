// The services catalogue, asked of the local agent stand-in.

#include "AgentFixture.h"

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

#include <gtest/gtest.h>

using namespace TestSupport;

namespace
{
const char kServicesPath[] = "/api/v1/nebiservices";

class Services : public AgentFixture
{
protected:
    // Answers the catalogue request with reply and returns every delivery
    // that one GetServices call caused.
    std::vector<std::vector<DorvanNebiServiceInfo>> Fetch(const Reply& reply)
    {
        m_agent.Route(kServicesPath, reply);
        if (!m_services)
        {
            StartConnector();
            m_services = DorvanNebiConnector::GetInstance()->GetServicesComponent();
            m_services->m_sigServicesReceived.connect(
                [this](std::vector<DorvanNebiServiceInfo> services) { m_deliveries.push_back(services); });
        }
        m_deliveries.clear();
        EXPECT_TRUE(m_services->GetServices());
        EXPECT_TRUE(RunEventLoopUntil([this] { return !m_deliveries.empty(); }));
        RunEventLoopFor(std::chrono::milliseconds(100)); // and nothing more
        return m_deliveries;
    }

    std::shared_ptr<DorvanNebiServicesComponent> m_services;
    std::vector<std::vector<DorvanNebiServiceInfo>> m_deliveries;
};
} // namespace

TEST_F(Services, CatalogueFromAnArray)
{
    const auto deliveries = Fetch(Reply::Json(R"([
        {"serviceid": "svc-1", "servicename": "Remote Backup", "description": "Keeps settings safe",
         "url": "https://nebi.example/backup"},
        {"serviceid": 7, "servicename": "Flottenübersicht ✓"}
    ])"));
    ASSERT_EQ(deliveries.size(), 1u);
    const std::vector<DorvanNebiServiceInfo>& services = deliveries[0];
    ASSERT_EQ(services.size(), 2u);
    EXPECT_EQ(services[0].GetServiceId(), "svc-1");
    EXPECT_EQ(services[0].GetServiceName(), "Remote Backup");
    EXPECT_EQ(services[0].GetDescription(), "Keeps settings safe");
    EXPECT_EQ(services[0].GetUrl(), "https://nebi.example/backup");
    EXPECT_EQ(services[1].GetServiceId(), "7");
    EXPECT_EQ(services[1].GetServiceName(), wxString::FromUTF8("Flottenübersicht ✓"));
    EXPECT_EQ(services[1].GetDescription(), "");
    EXPECT_EQ(services[1].GetUrl(), "");
    EXPECT_EQ(m_agent.RequestCount(kServicesPath), 1u);
}

TEST_F(Services, CatalogueFromAnObjectSkipsWhatIsNoServiceObject)
{
    const auto deliveries = Fetch(Reply::Json(R"({
        "b": {"serviceid": "b", "servicename": "Second"},
        "a": {"serviceid": "a", "servicename": "First", "url": 5},
        "c": "not an object",
        "d": {"serviceid": "d", "servicename": 12},
        "e": {"serviceid": "e"},
        "f": [1, 2]
    })"));
    ASSERT_EQ(deliveries.size(), 1u);
    ASSERT_EQ(deliveries[0].size(), 2u);
    // Members are visited in name order.
    EXPECT_EQ(deliveries[0][0].GetServiceName(), "First");
    EXPECT_EQ(deliveries[0][0].GetUrl(), ""); // a url that is no string is left out
    EXPECT_EQ(deliveries[0][1].GetServiceName(), "Second");
    EXPECT_EQ(CountLogLines("nebiservices element "), 4u);
}

TEST_F(Services, EveryFailureEndsInOneEmptyDelivery)
{
    const Reply failures[] = {Reply::Json("not json"), Reply::Status(503, "[{\"servicename\":\"x\"}]"),
                              Reply::Failing(Reply::Fault::CloseWithoutAnswer), Reply::Json("\"a string\""),
                              Reply::Json("[]"), Reply::Json("{}")};
    for (const Reply& failure : failures)
    {
        const auto deliveries = Fetch(failure);
        ASSERT_EQ(deliveries.size(), 1u) << failure.body;
        EXPECT_TRUE(deliveries[0].empty()) << failure.body;
    }
    EXPECT_EQ(m_agent.RequestCount(kServicesPath), 6u);
}

TEST(ServicesWithoutAgent, GetServicesStillAnswers)
{
    LoopbackServer gone;
    const unsigned short port = gone.Port();
    gone.Stop();
    WriteCloudConfig("{\"quarlport\": \"" + std::to_string(port) + "\"}");
    auto services = DorvanNebiConnector::GetInstance()->GetServicesComponent();
    int deliveries = 0;
    services->m_sigServicesReceived.connect([&](std::vector<DorvanNebiServiceInfo> received) {
        EXPECT_TRUE(received.empty());
        ++deliveries;
    });
    EXPECT_TRUE(services->GetServices());
    EXPECT_TRUE(services->GetServices());
    EXPECT_TRUE(RunEventLoopUntil([&] { return deliveries == 2; }));
}
