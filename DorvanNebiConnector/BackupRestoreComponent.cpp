#include <DorvanNebiConnector/BackupRestoreComponent.h>

#include <DorvanNebiConnector/DorvanNebiBackupListReader.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiConnectorThreads.h>
#include <DorvanNebiConnector/DorvanNebiConnectorUtil.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSDeleteRestClient.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSGetClientForDownload.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSGetRestClient.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSPostRestClient.h>

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>
#include <DorvanServices/GenericConfig.h>

#include <Poco/Exception.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <wx/filefn.h>
#include <wx/log.h>

#include <exception>
#include <memory>
#include <utility>

using namespace DorvanNebiConstants;

namespace
{
using HeaderFields = std::map<std::string, std::string>;
using FormFields = std::map<std::string, std::string>;
using Resources = std::vector<DorvanNebiResource>;

void LogBackup(const char* function, int line, const std::string& message)
{
    SetLevelAndGetLogger(SeverityError, kLogSourceBackup, function, line) << message;
}

std::string Utf8(const wxString& text)
{
    return DorvanNebiConnectorUtil::ToUtf8(text);
}

// The most telling text of an exception: POCO's own exceptions name their
// cause only in their display text.
std::string MessageOf(const std::exception& e)
{
    const auto* pocoException = dynamic_cast<const Poco::Exception*>(&e);
    return pocoException ? pocoException->displayText() : std::string(e.what());
}

std::string StatusText(const Poco::Net::HTTPResponse& response)
{
    return std::to_string(static_cast<int>(response.getStatus()));
}

// ---- Resource ids -----------------------------------------------------------

// A resource id names exactly one path segment below "/resource/". The
// request URI keeps its path decoded, so an encoded "/" would reach the wire
// as a separator: ids with one are refused, like "." and "..".
bool IsUsableResourceId(const wxString& resourceId, const char* function)
{
    if (resourceId.empty())
    {
        return false;
    }
    const std::string id = Utf8(resourceId);
    if (DorvanNebiConnectorUtil::EncodePathSegment(id).empty() || id.find('/') != std::string::npos)
    {
        LogBackup(function, __LINE__, "resource id \"" + id + "\" refused: it names no single resource");
        return false;
    }
    return true;
}

// "/resource/<id>/", the id percent-encoded as one segment.
std::string ResourcePath(const wxString& resourceId)
{
    return std::string(kCloudResourcePathPrefix) + DorvanNebiConnectorUtil::EncodePathSegment(Utf8(resourceId)) +
           kCloudResourcePathSuffix;
}

wxString AccessText(const DorvanNebiResource& resource)
{
    return resource.GetAccess() == DorvanNebiResource::Public ? kAccessPublic : kAccessPrivate;
}

// ---- Deliveries to the GUI thread -------------------------------------------

BackupRestoreComponent::BackupStatus BackupStatusOf(const wxString& requestId,
                                                    BackupRestoreComponent::OperationState state,
                                                    BackupRestoreComponent::OperationError error)
{
    BackupRestoreComponent::BackupStatus status;
    status.requestId = requestId;
    status.state = state;
    status.error = error;
    return status;
}

void PostBackupStatus(BackupRestoreComponent* component, const wxString& requestId,
                      BackupRestoreComponent::OperationState state, BackupRestoreComponent::OperationError error)
{
    const BackupRestoreComponent::BackupStatus status = BackupStatusOf(requestId, state, error);
    DorvanNebiConnectorUtil::PostToGuiThread([component, status] { component->m_sigBackupStatus(status); });
}

void PostRestoreStatus(BackupRestoreComponent* component, const wxString& requestId,
                       BackupRestoreComponent::OperationState state, BackupRestoreComponent::OperationError error,
                       const wxString& filePath)
{
    BackupRestoreComponent::RestoreStatus status;
    status.requestId = requestId;
    status.state = state;
    status.error = error;
    status.filePath = filePath;
    DorvanNebiConnectorUtil::PostToGuiThread([component, status] { component->m_sigRestoreStatus(status); });
}

// ---- The last private backup time in the connector configuration -----------

wxString ReadLastPrivateBackupTime()
{
    return DorvanNebiConnector::GetInstance()->GetConfig()->GetValue<wxString>(kKeyLastPrivateBackupTime, wxString());
}

void WriteLastPrivateBackupTime(const wxString& text)
{
    DorvanNebiConnector::GetInstance()->GetConfig()->SetValue<wxString>(kKeyLastPrivateBackupTime, text);
}

// ---- The four exchanges ------------------------------------------------------
// Each runs on a worker and reports failure by its result, whatever goes wrong:
// also a configuration whose base path is no URI path makes it fail, rather
// than end the job without a word to the host.

FormFields MakeUploadFields(const wxString& access, const wxString& resourceName, const wxString& description)
{
    FormFields fields;
    fields[kFieldAccessibility] = Utf8(access);
    fields[kFieldType] = kBackupResourceType;
    fields[kFieldAppName] = kAppName;
    fields[kFieldDescription] = Utf8(description);
    fields[kFieldKeywords] = kKeywords;
    fields[kFieldResourceName] = Utf8(resourceName);
    return fields;
}

bool UploadArchive(const wxString& filePath, const FormFields& fields, const HeaderFields& headers)
{
    try
    {
        auto client = std::make_shared<DorvanNebiHTTPSPostRestClient>(
            DorvanNebiConnectorUtil::MakeCloudURI(kCloudUploadPath), headers, fields, filePath);
        if (!client->SendRequest())
        {
            return false;
        }
        if (client->m_response.getStatus() != Poco::Net::HTTPResponse::HTTP_OK)
        {
            LogBackup("BackupRestoreComponent::DoBackup", __LINE__,
                      "upload of " + Utf8(filePath) + " refused, status " + StatusText(client->m_response));
            return false;
        }
        return true;
    }
    catch (const std::exception& e)
    {
        LogBackup("BackupRestoreComponent::DoBackup", __LINE__, "upload failed, message " + MessageOf(e));
    }
    return false;
}

bool DownloadArchive(const wxString& resourceId, const HeaderFields& headers, wxString& filePath)
{
    try
    {
        auto client = std::make_shared<DorvanNebiHTTPSGetClientForDownload>(
            DorvanNebiConnectorUtil::MakeCloudURI(ResourcePath(resourceId)), headers);
        if (!client->SendRequest())
        {
            LogBackup("BackupRestoreComponent::DoRestore", __LINE__,
                      "restore of resource \"" + Utf8(resourceId) + "\" failed");
            return false;
        }
        filePath = client->m_downloadedFilePath;
        return true;
    }
    catch (const std::exception& e)
    {
        LogBackup("BackupRestoreComponent::DoRestore", __LINE__, "restore failed, message " + MessageOf(e));
    }
    return false;
}

bool DeleteResource(const wxString& resourceId, const HeaderFields& headers)
{
    try
    {
        auto client = std::make_shared<DorvanNebiHTTPSDeleteRestClient>(
            DorvanNebiConnectorUtil::MakeCloudURI(ResourcePath(resourceId)), headers);
        if (!client->SendRequest())
        {
            return false;
        }
        if (client->m_response.getStatus() != Poco::Net::HTTPResponse::HTTP_OK)
        {
            LogBackup("BackupRestoreComponent::DoDelete", __LINE__,
                      "delete of resource \"" + Utf8(resourceId) + "\" refused, status " +
                          StatusText(client->m_response));
            return false;
        }
        return true;
    }
    catch (const std::exception& e)
    {
        LogBackup("BackupRestoreComponent::DoDelete", __LINE__, "delete failed, message " + MessageOf(e));
    }
    return false;
}

bool FetchBackupList(const HeaderFields& headers, Resources& resources)
{
    try
    {
        auto client = std::make_shared<DorvanNebiHTTPSGetRestClient>(
            DorvanNebiConnectorUtil::MakeCloudURI(kCloudResourceListPathPrefix + std::string(kBackupResourceType)),
            headers);
        if (!client->SendRequest())
        {
            return false;
        }
        if (client->m_response.getStatus() != Poco::Net::HTTPResponse::HTTP_OK)
        {
            LogBackup("BackupRestoreComponent::DoGetListOfBackup", __LINE__,
                      "list of backups refused, status " + StatusText(client->m_response));
            return false;
        }
        std::string reason;
        switch (DorvanNebiBackupListReader::Read(client->m_responseBody, resources, reason))
        {
        case DorvanNebiBackupListReader::Result::Read:
            return true;
        case DorvanNebiBackupListReader::Result::NotJson:
            LogBackup("BackupRestoreComponent::DoGetListOfBackup", __LINE__, "list of backups: " + reason);
            return false;
        case DorvanNebiBackupListReader::Result::Unusable:
            LogBackup("BackupRestoreComponent::DoGetListOfBackup", __LINE__,
                      "list of backups failed, message " + reason);
            return false;
        }
        return false;
    }
    catch (const std::exception& e)
    {
        LogBackup("BackupRestoreComponent::DoGetListOfBackup", __LINE__,
                  "list of backups failed, message " + MessageOf(e));
    }
    return false;
}

void RemoveUploadedFile(const wxString& filePath)
{
    wxLogNull noWxMessages; // reported below
    if (!wxRemoveFile(filePath))
    {
        LogBackup("BackupRestoreComponent::DoBackup", __LINE__, "cannot remove the uploaded file " + Utf8(filePath));
    }
}
} // namespace

BackupRestoreComponent::BackupRestoreComponent(boost::asio::thread_pool* pool) : m_pThreadPool(pool)
{
}

BackupRestoreComponent::~BackupRestoreComponent() = default;

BackupRestoreComponent::BackupRestoreComponent(BackupRestoreComponent&& other) noexcept
    : DorvanNebiConnectorComponent(other),
      m_sigBackupStatus(std::move(other.m_sigBackupStatus)),
      m_sigRestoreStatus(std::move(other.m_sigRestoreStatus)),
      m_sigLastPrivateBackupTimestampChanged(std::move(other.m_sigLastPrivateBackupTimestampChanged)),
      m_sigListOfBackup(std::move(other.m_sigListOfBackup)),
      m_sigDeleteResult(std::move(other.m_sigDeleteResult)),
      m_lastPrivateBackupTimestamp(other.m_lastPrivateBackupTimestamp),
      m_pThreadPool(other.m_pThreadPool),
      m_loginStateConnection(std::move(other.m_loginStateConnection))
{
}

BackupRestoreComponent& BackupRestoreComponent::operator=(BackupRestoreComponent&& other) noexcept
{
    DorvanNebiConnectorComponent::operator=(other);
    m_sigBackupStatus = std::move(other.m_sigBackupStatus);
    m_sigRestoreStatus = std::move(other.m_sigRestoreStatus);
    m_sigLastPrivateBackupTimestampChanged = std::move(other.m_sigLastPrivateBackupTimestampChanged);
    m_sigListOfBackup = std::move(other.m_sigListOfBackup);
    m_sigDeleteResult = std::move(other.m_sigDeleteResult);
    m_lastPrivateBackupTimestamp = other.m_lastPrivateBackupTimestamp;
    m_pThreadPool = other.m_pThreadPool;
    m_loginStateConnection = std::move(other.m_loginStateConnection);
    return *this;
}

void BackupRestoreComponent::Initialize()
{
    std::shared_ptr<DorvanNebiLoginComponent> login = DorvanNebiConnector::GetInstance()->GetLoginComponent();
    // A further Initialize connects once more; only the last connection is kept.
    m_loginStateConnection =
        login->m_sigLoginStateChanged.connect([this](LoginState state) { OnLoginStateChanged(state); });
}

void BackupRestoreComponent::Uninitialize()
{
    m_loginStateConnection.disconnect();
}

void BackupRestoreComponent::OnLoginStateChanged(LoginState state)
{
    if (state != LoggedOut)
    {
        return;
    }
    m_lastPrivateBackupTimestamp = wxInvalidDateTime;
    WriteLastPrivateBackupTime(wxString());
    m_sigLastPrivateBackupTimestampChanged(m_lastPrivateBackupTimestamp);
}

wxDateTime BackupRestoreComponent::GetLastPrivateBackupTimestamp()
{
    if (m_lastPrivateBackupTimestamp.IsValid())
    {
        return m_lastPrivateBackupTimestamp;
    }
    const wxString text = ReadLastPrivateBackupTime();
    wxDateTime stored;
    // Text that is no combined ISO date and time leaves the cache invalid.
    if (!text.empty() && stored.ParseISOCombined(text, 'T'))
    {
        m_lastPrivateBackupTimestamp = stored;
    }
    return m_lastPrivateBackupTimestamp;
}

std::map<std::string, std::string> BackupRestoreComponent::MakeRequestHeaders()
{
    // Asks the agent afresh for every request: key first, secret second.
    const std::pair<std::string, std::string> token =
        DorvanNebiConnector::GetInstance()->GetLoginComponent()->GetLoginToken();
    std::map<std::string, std::string> headers;
    headers[Poco::Net::HTTPRequest::AUTHORIZATION] = kBearerPrefix + token.second;
    headers[kHeaderApiKey] = token.first;
    return headers;
}

// ---- Backup ---------------------------------------------------------------

wxString BackupRestoreComponent::BackupToPrivateSpace(const wxString& filePath, bool removeFile)
{
    return Backup(filePath, kAccessPrivate, kPrivateBackupResourceName, wxString(), removeFile);
}

wxString BackupRestoreComponent::BackupToPublicSpace(const wxString& filePath, const wxString& resourceName,
                                                     const wxString& description, bool removeFile)
{
    return Backup(filePath, kAccessPublic, resourceName, description, removeFile);
}

wxString BackupRestoreComponent::Backup(const wxString& filePath, const wxString& access,
                                        const wxString& resourceName, const wxString& description, bool removeFile)
{
    if (resourceName.empty() || access.empty() || filePath.empty())
    {
        return wxString();
    }
    const wxString requestId = GlobalUtils::GetUUID();
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, requestId, filePath, access, resourceName, description,
                                                     removeFile] {
        DoBackup(requestId, filePath, access, resourceName, description, removeFile);
    });
    return requestId;
}

void BackupRestoreComponent::DoBackup(const wxString& requestId, const wxString& filePath, const wxString& access,
                                      const wxString& resourceName, const wxString& description, bool removeFile)
{
    PostBackupStatus(this, requestId, Started, NoError);

    const FormFields fields = MakeUploadFields(access, resourceName, description);
    if (UploadArchive(filePath, fields, MakeRequestHeaders()))
    {
        // On the GUI thread a private backup first records its time; then the
        // host learns that the upload has finished.
        DorvanNebiConnectorUtil::PostToGuiThread([this, requestId, access] {
            if (access == kAccessPrivate)
            {
                m_lastPrivateBackupTimestamp = wxDateTime::Now();
                WriteLastPrivateBackupTime(m_lastPrivateBackupTimestamp.FormatISOCombined('T'));
                m_sigLastPrivateBackupTimestampChanged(m_lastPrivateBackupTimestamp);
            }
            m_sigBackupStatus(BackupStatusOf(requestId, Finished, NoError));
        });
    }
    else
    {
        PostBackupStatus(this, requestId, Finished, Failed);
    }

    if (removeFile)
    {
        RemoveUploadedFile(filePath);
    }
}

// ---- Restore ----------------------------------------------------------------

wxString BackupRestoreComponent::RestoreFromPrivateSpace()
{
    return Restore(kAccessPrivate, kPrivateBackupResourceName);
}

wxString BackupRestoreComponent::RestoreFromPublicSpace(const wxString& resourceId)
{
    return Restore(kAccessPublic, resourceId);
}

wxString BackupRestoreComponent::Restore(const DorvanNebiResource& resource)
{
    return Restore(AccessText(resource), wxString::FromUTF8(resource.GetResourceId()));
}

wxString BackupRestoreComponent::Restore(const wxString& access, const wxString& resourceId)
{
    if (!IsUsableResourceId(resourceId, "BackupRestoreComponent::Restore") || access.empty())
    {
        return wxString();
    }
    const wxString requestId = GlobalUtils::GetUUID();
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, requestId, access, resourceId] {
        DoRestore(requestId, access, resourceId);
    });
    return requestId;
}

// The access text takes no part in the request: both spaces are fetched alike.
void BackupRestoreComponent::DoRestore(const wxString& requestId, const wxString& /*access*/,
                                       const wxString& resourceId)
{
    PostRestoreStatus(this, requestId, Started, NoError, wxString());

    wxString filePath;
    if (DownloadArchive(resourceId, MakeRequestHeaders(), filePath))
    {
        PostRestoreStatus(this, requestId, Finished, NoError, filePath);
    }
    else
    {
        PostRestoreStatus(this, requestId, Finished, Failed, wxString());
    }
}

// ---- List and delete --------------------------------------------------------

wxString BackupRestoreComponent::GetListOfBackup()
{
    const wxString requestId = GlobalUtils::GetUUID();
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, requestId] { DoGetListOfBackup(requestId); });
    return requestId;
}

void BackupRestoreComponent::DoGetListOfBackup(const wxString& requestId)
{
    Resources resources;
    if (!FetchBackupList(MakeRequestHeaders(), resources))
    {
        resources.clear(); // a failure never delivers part of a list
    }
    DorvanNebiConnectorUtil::PostToGuiThread(
        [this, requestId, resources] { m_sigListOfBackup(requestId, resources); });
}

wxString BackupRestoreComponent::Delete(const DorvanNebiResource& resource)
{
    return Delete(AccessText(resource), wxString::FromUTF8(resource.GetResourceId()));
}

wxString BackupRestoreComponent::Delete(const wxString& access, const wxString& resourceId)
{
    if (!IsUsableResourceId(resourceId, "BackupRestoreComponent::Delete") || access.empty())
    {
        return wxString();
    }
    const wxString requestId = GlobalUtils::GetUUID();
    DorvanNebiConnectorUtil::PostJob(m_pThreadPool, [this, requestId, access, resourceId] {
        DoDelete(requestId, access, resourceId);
    });
    return requestId;
}

// The access text takes no part in the request: both spaces are deleted alike.
void BackupRestoreComponent::DoDelete(const wxString& requestId, const wxString& /*access*/,
                                      const wxString& resourceId)
{
    const bool deleted = DeleteResource(resourceId, MakeRequestHeaders());
    DorvanNebiConnectorUtil::PostToGuiThread(
        [this, requestId, resourceId, deleted] { m_sigDeleteResult(requestId, resourceId, deleted); });
}
