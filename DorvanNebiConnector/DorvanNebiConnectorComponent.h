#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>

#include <wx/object.h>
#include <wx/string.h>

// The signed-in user's role. The numbers cross the interface.
enum NebiUserRole
{
    UserRoleUnknown = 0,
    UserRoleAdmin = 1,
    UserRoleOperator = 2
};

// Base of the connector's long-lived components (login, services catalogue,
// backup and restore). The connector initializes and uninitializes every
// component through it; the base itself does nothing in either.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiConnectorComponent : public wxObject
{
public:
    DorvanNebiConnectorComponent() = default;
    DorvanNebiConnectorComponent(const DorvanNebiConnectorComponent& other) = default;
    DorvanNebiConnectorComponent& operator=(const DorvanNebiConnectorComponent& other) = default;
    virtual ~DorvanNebiConnectorComponent();

    virtual void Initialize();
    virtual void Uninitialize();
};

namespace DorvanNebiConnectorTypes
{
// "admin", "operator", or "unknown" for every other value.
DORVANNEBICONNECTOR_EXPORT wxString ToString(NebiUserRole role);

// UserRoleAdmin for exactly "admin", UserRoleOperator for exactly "operator",
// UserRoleUnknown for any other text: the comparison is case-sensitive and
// nothing is trimmed.
DORVANNEBICONNECTOR_EXPORT NebiUserRole FromString(const wxString& text);
} // namespace DorvanNebiConnectorTypes
