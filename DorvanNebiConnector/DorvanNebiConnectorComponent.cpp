#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

DorvanNebiConnectorComponent::~DorvanNebiConnectorComponent() = default;

void DorvanNebiConnectorComponent::Initialize()
{
}

void DorvanNebiConnectorComponent::Uninitialize()
{
}

namespace DorvanNebiConnectorTypes
{
wxString ToString(NebiUserRole role)
{
    switch (role)
    {
    case UserRoleAdmin:
        return DorvanNebiConstants::kRoleAdmin;
    case UserRoleOperator:
        return DorvanNebiConstants::kRoleOperator;
    default:
        return DorvanNebiConstants::kRoleUnknown;
    }
}

NebiUserRole FromString(const wxString& text)
{
    if (text == DorvanNebiConstants::kRoleAdmin)
    {
        return UserRoleAdmin;
    }
    if (text == DorvanNebiConstants::kRoleOperator)
    {
        return UserRoleOperator;
    }
    return UserRoleUnknown;
}
} // namespace DorvanNebiConnectorTypes
