#pragma once

#include <DorvanNebiConnector/DorvanNebiConnectorExport.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSRestClient.h>

#include <Poco/Net/HTTPResponse.h>
#include <wx/string.h>

#include <map>
#include <string>

// A multipart POST to the cloud: the form fields, then the file as the part
// "file", streamed from disk in a chunked request body (the file is never
// measured beforehand nor held in memory). The answer is kept in memory.
class DORVANNEBICONNECTOR_EXPORT DorvanNebiHTTPSPostRestClient : public DorvanNebiHTTPSRestClient
{
public:
    using FormFields = std::map<std::string, std::string>;

    // An empty uploadFilePath sends the fields alone.
    DorvanNebiHTTPSPostRestClient(const Poco::URI& uri, const HeaderFields& headers, const FormFields& formFields,
                                  const wxString& uploadFilePath);
    ~DorvanNebiHTTPSPostRestClient() override;

    // True when the form was sent whole and an answer arrived and was read,
    // whatever its status: a caller succeeds only with true and then status
    // 200 in m_response. False, with a log line, when the file cannot be
    // opened or read to its end (the request is then broken off, so that the
    // cloud never receives a complete form) or the exchange failed.
    bool SendRequest() override;

    HeaderFields m_headers;
    FormFields m_formFields; // name to value, values UTF-8; sent in ascending name order
    wxString m_uploadFilePath;
    Poco::Net::HTTPResponse m_response;
    std::string m_responseBody;
};
