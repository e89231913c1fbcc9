#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <wx/string.h>

#include <string>

// One backup archive stored in the cloud, as the list of backups gives it.
// A plain value: copy, move and compare it freely.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiResource
{
public:
    // Which space the resource lives in. The numbers cross the interface.
    enum DorvanNebiResourceAccess
    {
        Public = 0,
        Private = 1
    };

    DorvanNebiResource() = default;
    DorvanNebiResource(const DorvanNebiResource& other) = default;
    DorvanNebiResource(DorvanNebiResource&& other) noexcept = default;
    DorvanNebiResource& operator=(const DorvanNebiResource& other) = default;
    DorvanNebiResource& operator=(DorvanNebiResource&& other) noexcept = default;
    ~DorvanNebiResource() = default;

    const std::string& GetResourceId() const { return m_resourceId; }
    void SetResourceId(const std::string& resourceId) { m_resourceId = resourceId; }
    const wxString& GetResourceName() const { return m_resourceName; }
    void SetResourceName(const wxString& resourceName) { m_resourceName = resourceName; }
    const wxString& GetResourceDescription() const { return m_resourceDescription; }
    void SetResourceDescription(const wxString& description) { m_resourceDescription = description; }
    DorvanNebiResourceAccess GetAccess() const { return m_access; }
    void SetAccess(DorvanNebiResourceAccess access) { m_access = access; }

private:
    std::string m_resourceId;
    wxString m_resourceName;
    wxString m_resourceDescription;
    // A record made by the host starts private: the safer of the two spaces.
    DorvanNebiResourceAccess m_access = Private;
};
