#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <boost/signals2/signal.hpp>
#include <wx/string.h>

#include <string>
#include <vector>

namespace boost::asio
{
class thread_pool;
}

// One entry of the services catalogue: a plain copyable record.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiServiceInfo
{
public:
    const std::string& GetServiceId() const { return m_serviceId; }
    void SetServiceId(const std::string& serviceId) { m_serviceId = serviceId; }
    const wxString& GetServiceName() const { return m_serviceName; }
    void SetServiceName(const wxString& serviceName) { m_serviceName = serviceName; }
    const wxString& GetDescription() const { return m_description; }
    void SetDescription(const wxString& description) { m_description = description; }
    const std::string& GetUrl() const { return m_url; }
    void SetUrl(const std::string& url) { m_url = url; }

private:
    std::string m_serviceId;
    wxString m_serviceName;
    wxString m_description;
    std::string m_url;
};

// The catalogue of the cloud's services for the signed-in user, asked of the
// local agent.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiServicesComponent : public DorvanNebiConnectorComponent
{
public:
    // Raised on the GUI thread once for every GetServices call: the catalogue,
    // or an empty vector when the agent could not be asked or its answer did
    // not parse.
    boost::signals2::signal<void(std::vector<DorvanNebiServiceInfo>)> m_sigServicesReceived;

    explicit DorvanNebiServicesComponent(boost::asio::thread_pool* pool);
    ~DorvanNebiServicesComponent() override;

    DorvanNebiServicesComponent(DorvanNebiServicesComponent&& other) noexcept;
    DorvanNebiServicesComponent& operator=(DorvanNebiServicesComponent&& other) noexcept;
    DorvanNebiServicesComponent(const DorvanNebiServicesComponent&) = delete;
    DorvanNebiServicesComponent& operator=(const DorvanNebiServicesComponent&) = delete;

    // Queues a request for the catalogue and returns true at once.
    bool GetServices();

private:
    bool DoGetServices();

    boost::asio::thread_pool* m_pThreadPool;
};
