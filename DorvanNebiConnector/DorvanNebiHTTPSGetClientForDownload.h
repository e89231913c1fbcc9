#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSRestClient.h>

#include <wx/string.h>

// A GET to the cloud whose answer, a stored archive, is written to a new file
// in the user data sub-directory "Backup", named by eight characters of a new
// UUID and ".zip". The body streams to disk block by block, whatever its size.
//
// The file appears under its name only once the whole body has arrived: the
// body goes into a file of its own beside it (the name plus ".part", created
// anew, never one that exists), which is renamed when the body is complete
// and removed on every failure. Complete means: as many bytes as the
// Content-Length says, or a chunked body up to its last chunk, or, with
// neither, a connection that the server closed properly.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiHTTPSGetClientForDownload : public DorvanNebiHTTPSRestClient
{
public:
    DorvanNebiHTTPSGetClientForDownload(const Poco::URI& uri, const HeaderFields& headers);
    ~DorvanNebiHTTPSGetClientForDownload() override;

    // True when the answer had status 200 and its whole body is in the file
    // named by m_downloadedFilePath. False otherwise, and no file is left
    // behind: silently for another status; with a log line when the exchange
    // failed, the body arrived incomplete or the file could not be written.
    bool SendRequest() override;

    wxString m_downloadedFilePath; // full path of the file written; empty until a successful SendRequest
    HeaderFields m_headers;
};
