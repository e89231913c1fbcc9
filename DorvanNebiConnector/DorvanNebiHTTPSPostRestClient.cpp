#include <DorvanNebiConnector/DorvanNebiHTTPSPostRestClient.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiFilePartSource.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <Poco/Exception.h>
#include <Poco/Net/HTMLForm.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/StreamCopier.h>

#include <memory>
#include <sstream>

namespace
{
void AddFormFields(Poco::Net::HTMLForm& form, const DorvanNebiHTTPSPostRestClient::FormFields& formFields)
{
    // The form keeps the order in which the fields are set: ascending names.
    for (const auto& field : formFields)
    {
        form.set(field.first, field.second);
    }
}

// The file part, owned by the form; null without a file.
DorvanNebiFilePartSource* AddFilePart(Poco::Net::HTMLForm& form, const wxString& uploadFilePath)
{
    if (uploadFilePath.empty())
    {
        return nullptr;
    }
    auto filePart = std::make_unique<DorvanNebiFilePartSource>(uploadFilePath);
    DorvanNebiFilePartSource* const part = filePart.get();
    form.addPart(DorvanNebiConstants::kFilePartName, filePart.release());
    return part;
}

// A file that could not be read to its end has gone out short. The connection
// is dropped before the request body's last chunk, so that the cloud never
// sees a complete form and stores no truncated archive.
void BreakOffUnlessReadWhole(const DorvanNebiFilePartSource* filePart, const wxString& path,
                             DorvanNebiHTTPSSession& session)
{
    if (filePart && !filePart->WasReadToTheEnd())
    {
        session.abort();
        throw Poco::ReadFileException("the upload file could not be read to its end",
                                       DorvanNebiConnectorUtil::ToUtf8(path));
    }
}
} // namespace

DorvanNebiHTTPSPostRestClient::DorvanNebiHTTPSPostRestClient(const Poco::URI& uri, const HeaderFields& headers,
                                                             const FormFields& formFields,
                                                             const wxString& uploadFilePath)
    : DorvanNebiHTTPSRestClient(uri),
      m_headers(headers),
      m_formFields(formFields),
      m_uploadFilePath(uploadFilePath)
{
}

DorvanNebiHTTPSPostRestClient::~DorvanNebiHTTPSPostRestClient() = default;

bool DorvanNebiHTTPSPostRestClient::SendRequest()
{
    const std::string target = RequestTarget();
    try
    {
        DorvanNebiHTTPSSession session(m_uri);
        Poco::Net::HTMLForm form;
        form.setEncoding(Poco::Net::HTMLForm::ENCODING_MULTIPART);
        AddFormFields(form, m_formFields);
        const DorvanNebiFilePartSource* filePart = AddFilePart(form, m_uploadFilePath);

        Poco::Net::HTTPRequest request;
        PrepareRequest(request, Poco::Net::HTTPRequest::HTTP_POST, m_headers);
        // Multipart over HTTP/1.1 without options: chunked, no Content-Length.
        form.prepareSubmit(request);

        std::ostream& requestBody = session.sendRequest(request);
        form.write(requestBody);
        BreakOffUnlessReadWhole(filePart, m_uploadFilePath, session);

        std::istream& responseBody = session.receiveResponse(m_response);
        std::stringstream collected;
        Poco::StreamCopier::copyStream(responseBody, collected, DorvanNebiConstants::kBodyCopyBufferSize);
        m_responseBody = collected.str();
        return true;
    }
    catch (const Poco::Exception& e)
    {
        LogFailure("DorvanNebiHTTPSPostRestClient::SendRequest", __LINE__,
                   "HTTP_POST " + target + " failed, message " + e.displayText());
    }
    catch (const std::exception& e)
    {
        LogFailure("DorvanNebiHTTPSPostRestClient::SendRequest", __LINE__,
                   "HTTP_POST " + target + " failed, message " + e.what());
    }
    return false;
}
