#pragma once

// Every fixed text and number of the connector, in one place. Internal: not
// installed with the public headers.

#include <cstddef>

namespace DorvanNebiConstants
{
// Worker pool: a fixed size, whatever the machine. Two jobs run at once;
// the rest wait in the queue.
inline constexpr std::size_t kWorkerThreadCount = 2;

// Configuration files and directories.
inline constexpr char kConnectorConfigDirName[] = "dorvannebiconnector";
inline constexpr char kConnectorConfigFileName[] = "dorvannebiconnector.json";
inline constexpr char kCloudConfigFileName[] = "quarlconfig.json";
inline constexpr char kDownloadDirName[] = "Backup";

// Configuration keys (all top-level) and their defaults.
inline constexpr char kKeyQuarlPort[] = "quarlport";
inline constexpr unsigned short kDefaultQuarlPort = 7285;
inline constexpr char kKeyNebiProtocol[] = "nebiprotocol";
inline constexpr char kDefaultNebiProtocol[] = "https";
inline constexpr char kKeyNebiDomain[] = "nebidomain";
inline constexpr char kDefaultNebiDomain[] = "api.nebi.dorvan.com";
inline constexpr char kKeyNebiPort[] = "nebiport";
inline constexpr unsigned short kDefaultNebiPort = 443;
// The longest host name the cloud may have (a DNS name's limit).
inline constexpr std::size_t kMaxHostNameLength = 253;
inline constexpr char kKeyNebiApiVersion[] = "nebiclientappapiversion";
inline constexpr char kDefaultNebiApiVersion[] = "/api/clientapp/v1";
inline constexpr char kKeyLastPrivateBackupTime[] = "dorvannebilastprivatebackuptime";

// Names in the cloud: the one private backup of the user, and the resource
// type of every backup.
inline constexpr char kPrivateBackupResourceName[] = "dorvannebiuserpersonalsetting";
inline constexpr char kBackupResourceType[] = "dorvannebiusersettingresource";

// Access texts of a resource, on the wire and in the host's calls.
inline constexpr char kAccessPublic[] = "public";
inline constexpr char kAccessPrivate[] = "private";

// User role texts.
inline constexpr char kRoleAdmin[] = "admin";
inline constexpr char kRoleOperator[] = "operator";
inline constexpr char kRoleUnknown[] = "unknown";

// The local agent: plain HTTP on the loopback address.
inline constexpr char kAgentScheme[] = "http";
inline constexpr char kAgentHost[] = "127.0.0.1";
inline constexpr char kAgentApiBase[] = "/api/v1";
inline constexpr char kAgentLoginPath[] = "/nebilogin";
inline constexpr char kAgentLoginUiPath[] = "/nebiloginui";
inline constexpr char kAgentSignUpUiPath[] = "/nebisignupui";
inline constexpr char kAgentInviteUserUiPath[] = "/nebiinviteuserui";
inline constexpr char kAgentLogoutPath[] = "/nebilogout";
inline constexpr char kAgentServicesPath[] = "/nebiservices";
// The interactive pages (login, sign-up, invite user) answer only when the
// person in front of them has finished, which may take very long: the agent
// session therefore waits up to ten days for connecting, sending and receiving.
inline constexpr long kAgentSessionTimeoutSeconds = 864000;

// Members of the agent's login data record and logout answer.
inline constexpr char kKeyIsLoginSuccess[] = "isLoginSuccess";
inline constexpr char kKeyIsLogoutSuccess[] = "isLogoutSuccess";
inline constexpr char kKeySigninTime[] = "signintime";
inline constexpr char kKeySessionId[] = "sessionid";
inline constexpr char kKeyUserName[] = "name";
inline constexpr char kKeyEmail[] = "email";
inline constexpr char kKeyUserRole[] = "userrole";
inline constexpr char kKeyApiKey[] = "apiKey";
inline constexpr char kKeyApiSecret[] = "apiSceret"; // sic: the agent's own spelling
inline constexpr char kYes[] = "yes";

// Members of the agent's services catalogue.
inline constexpr char kKeyServiceId[] = "serviceid";
inline constexpr char kKeyServiceName[] = "servicename";
inline constexpr char kKeyServiceDescription[] = "description";
inline constexpr char kKeyServiceUrl[] = "url";

// The cloud's REST paths, below the configured base path.
inline constexpr char kCloudUploadPath[] = "/resource";
inline constexpr char kCloudResourcePathPrefix[] = "/resource/";
inline constexpr char kCloudResourcePathSuffix[] = "/";
inline constexpr char kCloudResourceListPathPrefix[] = "/resources/";

// Request header fields of every cloud request (besides Authorization).
inline constexpr char kHeaderApiKey[] = "apikey";
inline constexpr char kBearerPrefix[] = "Bearer ";

// Form fields of an upload, and the fixed values among them.
inline constexpr char kFieldAccessibility[] = "accessibility";
inline constexpr char kFieldType[] = "type";
inline constexpr char kFieldAppName[] = "appname";
inline constexpr char kFieldDescription[] = "description";
inline constexpr char kFieldKeywords[] = "keywords";
inline constexpr char kFieldResourceName[] = "resourcename";
inline constexpr char kFilePartName[] = "file";
inline constexpr char kFilePartMediaType[] = "application/octet-stream";
inline constexpr char kAppName[] = "dorvan";
inline constexpr char kKeywords[] = "dorvan";

// Members of the cloud's list answer.
inline constexpr char kKeyListResponse[] = "response";
inline constexpr char kKeyResourceId[] = "resourceid";
inline constexpr char kKeyResourceName[] = "resourcename";
inline constexpr char kKeyResourceDescription[] = "description";
inline constexpr char kKeyAccessibility[] = "accessibility";

// Transfers.
inline constexpr std::size_t kBodyCopyBufferSize = 8192;
inline constexpr std::size_t kDownloadBlockSize = 2048;
inline constexpr std::size_t kDownloadFileNameLength = 8;
inline constexpr char kDownloadFileExtension[] = ".zip";
// A download is written under a name of its own beside the final one and
// renamed only once it is complete.
inline constexpr char kPartialDownloadExtension[] = ".part";
// Fresh names tried before a download gives up for want of a free file name.
inline constexpr int kDownloadNameAttempts = 16;
// Limits on the framing lines of a chunked body (chunk sizes and trailer
// fields), so that a broken answer cannot make the reader collect without end.
inline constexpr std::size_t kChunkLineMaxLength = 4096;
inline constexpr std::size_t kChunkTrailerMaxLength = 65536;

// Cloud sessions wait as long as the HTTP library does by default; with POCO
// 1.11 that is 30 s for the connection and 60 s for each send and each
// receive. They are set explicitly so that they stay so with any library
// version.
inline constexpr long kCloudConnectTimeoutSeconds = 30;
inline constexpr long kCloudSendReceiveTimeoutSeconds = 60;

// Source paths named in log lines.
inline constexpr char kLogSourceConnector[] = "DorvanNebiConnector/DorvanNebiConnector";
inline constexpr char kLogSourceUtil[] = "DorvanNebiConnector/DorvanNebiConnectorUtil";
inline constexpr char kLogSourceRestClient[] = "DorvanNebiConnector/DorvanNebiHTTPSRestClient";
inline constexpr char kLogSourceLogin[] = "DorvanNebiConnector/DorvanNebiLoginComponent";
inline constexpr char kLogSourceServices[] = "DorvanNebiConnector/DorvanNebiServicesComponent";
inline constexpr char kLogSourceBackup[] = "DorvanNebiConnector/BackupRestoreComponent";
} // namespace DorvanNebiConstants
