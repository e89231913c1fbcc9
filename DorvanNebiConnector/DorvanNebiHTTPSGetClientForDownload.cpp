#include <DorvanNebiConnector/DorvanNebiHTTPSGetClientForDownload.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSBodyReader.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>

#include <Poco/Exception.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/HTTPResponse.h>
#include <wx/file.h>
#include <wx/filefn.h>
#include <wx/filename.h>
#include <wx/log.h>

#include <vector>

using namespace DorvanNebiConstants;

namespace
{
// Eight characters of a new UUID and ".zip".
wxString NewDownloadFileName()
{
    return GlobalUtils::GetUUID().Left(kDownloadFileNameLength) + kDownloadFileExtension;
}

wxString PathIn(const wxString& directory, const wxString& fileName)
{
    wxFileName path(directory, wxEmptyString, wxPATH_NATIVE);
    path.SetFullName(fileName);
    return path.GetFullPath(wxPATH_NATIVE);
}

std::string Utf8(const wxString& text)
{
    return DorvanNebiConnectorUtil::ToUtf8(text);
}

// A new, empty file for the body, beside the final name; returns its path.
wxString CreatePartialFile(const wxString& directory, wxFile& file)
{
    for (int attempt = 0; attempt < kDownloadNameAttempts; ++attempt)
    {
        const wxString path = PathIn(directory, NewDownloadFileName() + kPartialDownloadExtension);
        // Created only if no file of that name exists: never someone else's.
        if (file.Create(path, false))
        {
            return path;
        }
        if (!wxFileName::Exists(path))
        {
            throw Poco::CreateFileException("cannot create a file in the download directory", Utf8(directory));
        }
    }
    throw Poco::CreateFileException("no free file name in the download directory", Utf8(directory));
}

// Copies the response body into file (at path); throws when the body does
// not arrive whole or cannot be written.
void CopyBody(DorvanNebiHTTPSSession& session, const Poco::Net::HTTPResponse& response, wxFile& file,
              const wxString& path)
{
    DorvanNebiHTTPSBodyReader body(session, response);
    std::vector<char> block(kDownloadBlockSize);
    for (std::size_t n = body.Read(block.data(), block.size()); n > 0; n = body.Read(block.data(), block.size()))
    {
        if (file.Write(block.data(), n) != n)
        {
            throw Poco::WriteFileException("cannot write the downloaded archive", Utf8(path));
        }
    }
}

void CloseFile(wxFile& file, const wxString& path)
{
    if (!file.Close())
    {
        throw Poco::WriteFileException("cannot close the downloaded archive", Utf8(path));
    }
}

// Renames the complete file to its final name; returns that name's path.
wxString MoveIntoPlace(const wxString& partialPath, const wxString& directory)
{
    // First the name the partial file was made for, then fresh ones: an
    // archive already there is never replaced.
    wxString fileName = wxFileName(partialPath).GetName();
    for (int attempt = 0; attempt < kDownloadNameAttempts; ++attempt)
    {
        const wxString path = PathIn(directory, fileName);
        if (wxRenameFile(partialPath, path, false))
        {
            return path;
        }
        if (!wxFileName::Exists(path))
        {
            break;
        }
        fileName = NewDownloadFileName();
    }
    throw Poco::FileException("cannot give the downloaded archive its name", Utf8(partialPath));
}

void RemovePartialFile(const wxString& partialPath)
{
    if (!partialPath.empty() && wxFileName::Exists(partialPath) && !wxRemoveFile(partialPath))
    {
        SetLevelAndGetLogger(SeverityError, kLogSourceRestClient, "DorvanNebiHTTPSGetClientForDownload::SendRequest",
                             __LINE__)
            << "cannot remove the incomplete download " << Utf8(partialPath);
    }
}
} // namespace

DorvanNebiHTTPSGetClientForDownload::DorvanNebiHTTPSGetClientForDownload(const Poco::URI& uri,
                                                                         const HeaderFields& headers)
    : DorvanNebiHTTPSRestClient(uri),
      m_headers(headers)
{
}

DorvanNebiHTTPSGetClientForDownload::~DorvanNebiHTTPSGetClientForDownload() = default;

bool DorvanNebiHTTPSGetClientForDownload::SendRequest()
{
    // wxWidgets would report file errors on its own; they are logged here.
    wxLogNull noWxMessages;
    const std::string target = RequestTarget();
    wxString partialPath;
    std::string failure;
    try
    {
        DorvanNebiHTTPSSession session(m_uri);
        Poco::Net::HTTPRequest request;
        PrepareRequest(request, Poco::Net::HTTPRequest::HTTP_GET, m_headers);
        session.sendRequest(request);
        Poco::Net::HTTPResponse response;
        session.receiveResponse(response);
        if (response.getStatus() != Poco::Net::HTTPResponse::HTTP_OK)
        {
            return false;
        }

        const wxString directory = GlobalUtils::GetUserDataSubDir(kDownloadDirName);
        wxFile file;
        partialPath = CreatePartialFile(directory, file);
        CopyBody(session, response, file, partialPath);
        CloseFile(file, partialPath);
        m_downloadedFilePath = MoveIntoPlace(partialPath, directory);
        return true;
    }
    catch (const Poco::Exception& e)
    {
        failure = e.displayText();
    }
    catch (const std::exception& e)
    {
        failure = e.what();
    }
    catch (...)
    {
        failure = "unknown exception";
    }
    // The file was closed when the try block was left.
    RemovePartialFile(partialPath);
    LogFailure("DorvanNebiHTTPSGetClientForDownload::SendRequest", __LINE__,
               "HTTP_DOWNLOAD " + target + " failed, message " + failure);
    return false;
}
