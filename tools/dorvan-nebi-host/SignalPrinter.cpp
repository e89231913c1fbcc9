#include "SignalPrinter.h"

#include "Console.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>
#include <DorvanNebiConnector/DorvanNebiServicesComponent.h>

namespace
{
using Backup = BackupRestoreComponent;

wxString StateText(LoginState state)
{
    return state == LoggedIn ? "LoggedIn" : "LoggedOut";
}

// Request ids are UUIDs; their first eight characters tell them apart.
wxString Request(const wxString& requestId)
{
    return "request=" + requestId.Left(8);
}

wxString Progress(Backup::OperationState state, Backup::OperationError error)
{
    return wxString(" state=") + (state == Backup::Started ? "Started" : "Finished") +
           " error=" + (error == Backup::NoError ? "NoError" : "Failed");
}

wxString AccessText(DorvanNebiResource::DorvanNebiResourceAccess access)
{
    return access == DorvanNebiResource::Public ? "public" : "private";
}

// One slot per signal: each prints the signal and its fields.
void OnLoginStateChanged(LoginState state)
{
    Console::Signal("login", "m_sigLoginStateChanged", "state=" + StateText(state));
}

void OnUserInfoChanged(wxString name, wxString email)
{
    Console::Signal("login", "m_sigUserInfoChanged", "name=" + Console::Quoted(name) + " email=" + email);
}

void OnUserRoleChanged(NebiUserRole role)
{
    Console::Signal("login", "m_sigUserRoleChanged", "role=" + DorvanNebiConnectorTypes::ToString(role));
}

void OnLogOutResult(wxString requestId, bool confirmed)
{
    Console::Signal("login", "m_sigLogOutResult", Request(requestId) + " confirmed=" + (confirmed ? "true" : "false"));
}

void OnServicesReceived(std::vector<DorvanNebiServiceInfo> services)
{
    Console::Signal("services", "m_sigServicesReceived", "services=" + Console::Number(services.size()));
    for (const DorvanNebiServiceInfo& service : services)
    {
        Console::Detail("    id=" + wxString::FromUTF8(service.GetServiceId()) + " name=" +
                        Console::Quoted(service.GetServiceName()) + " url=" + wxString::FromUTF8(service.GetUrl()));
    }
}

void OnBackupStatus(Backup::BackupStatus status)
{
    Console::Signal("backup", "m_sigBackupStatus", Request(status.requestId) + Progress(status.state, status.error));
}

void OnRestoreStatus(Backup::RestoreStatus status)
{
    const wxString file = status.filePath.empty() ? wxString() : " filePath=" + status.filePath;
    Console::Signal("backup", "m_sigRestoreStatus",
                    Request(status.requestId) + Progress(status.state, status.error) + file);
}

void OnLastPrivateBackupTimestampChanged(wxDateTime time)
{
    Console::Signal("backup", "m_sigLastPrivateBackupTimestampChanged",
                    "time=" + (time.IsValid() ? time.FormatISOCombined(' ') : wxString("(none)")));
}

void OnListOfBackup(wxString requestId, std::vector<DorvanNebiResource> resources)
{
    Console::Signal("backup", "m_sigListOfBackup",
                    Request(requestId) + " resources=" + Console::Number(resources.size()));
    for (const DorvanNebiResource& resource : resources)
    {
        Console::Detail("    id=" + wxString::FromUTF8(resource.GetResourceId()) + " " +
                        AccessText(resource.GetAccess()) + " name=" + Console::Quoted(resource.GetResourceName()) +
                        " description=" + Console::Quoted(resource.GetResourceDescription()));
    }
}

void OnDeleteResult(wxString requestId, wxString resourceId, bool deleted)
{
    Console::Signal("backup", "m_sigDeleteResult",
                    Request(requestId) + " resourceId=" + resourceId + " deleted=" + (deleted ? "true" : "false"));
}
} // namespace

SignalPrinter::SignalPrinter()
{
    const auto connector = DorvanNebiConnector::GetInstance();
    const auto login = connector->GetLoginComponent();
    m_connections.emplace_back(login->m_sigLoginStateChanged.connect(&OnLoginStateChanged));
    m_connections.emplace_back(login->m_sigUserInfoChanged.connect(&OnUserInfoChanged));
    m_connections.emplace_back(login->m_sigUserRoleChanged.connect(&OnUserRoleChanged));
    m_connections.emplace_back(login->m_sigLogOutResult.connect(&OnLogOutResult));

    const auto services = connector->GetServicesComponent();
    m_connections.emplace_back(services->m_sigServicesReceived.connect(&OnServicesReceived));

    const auto backup = connector->GetBackupRestoreComponent();
    m_connections.emplace_back(backup->m_sigBackupStatus.connect(&OnBackupStatus));
    m_connections.emplace_back(backup->m_sigRestoreStatus.connect(&OnRestoreStatus));
    m_connections.emplace_back(
        backup->m_sigLastPrivateBackupTimestampChanged.connect(&OnLastPrivateBackupTimestampChanged));
    m_connections.emplace_back(backup->m_sigListOfBackup.connect(&OnListOfBackup));
    m_connections.emplace_back(backup->m_sigDeleteResult.connect(&OnDeleteResult));
}
