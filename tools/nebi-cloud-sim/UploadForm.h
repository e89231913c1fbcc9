#pragma once

// The multipart body of an upload, read part by part as it arrives: form
// fields into memory (each a few kilobytes at most), the part named "file"
// block by block straight into a file, so that an archive is never held in
// memory whole. A body that ends before its closing boundary is refused, so
// that a cut-off upload is never stored as a complete archive.

#include <Poco/Net/HTTPResponse.h>
#include <Poco/Types.h>

#include <istream>
#include <map>
#include <stdexcept>
#include <string>

namespace Poco::Net
{
class MessageHeader;
}

// Why an upload was refused, with the status to answer.
class UploadError : public std::runtime_error
{
public:
    UploadError(Poco::Net::HTTPResponse::HTTPStatus status, const std::string& message)
        : std::runtime_error(message), m_status(status)
    {
    }
    Poco::Net::HTTPResponse::HTTPStatus Status() const { return m_status; }

private:
    Poco::Net::HTTPResponse::HTTPStatus m_status;
};

class UploadForm
{
public:
    // The archive goes to archivePath; one larger than maxArchiveBytes is refused.
    UploadForm(std::string archivePath, Poco::UInt64 maxArchiveBytes);

    // Reads the whole body. Throws UploadError for a malformed body (400), a
    // missing or repeated part "file" (400) or an archive too large (413).
    void Read(std::istream& body, const std::string& boundary);

    // The value of a form field; empty when it was not sent.
    std::string Field(const std::string& name) const;
    // The file name the uploader gave the part "file".
    const std::string& FileName() const { return m_fileName; }

private:
    void ReadPart(const Poco::Net::MessageHeader& header, std::istream& part);
    void ReadField(const std::string& name, std::istream& part);
    void ReadArchive(std::istream& part);

    const std::string m_archivePath;
    const Poco::UInt64 m_maxArchiveBytes;
    std::map<std::string, std::string> m_fields;
    bool m_hasArchive = false;
    std::string m_fileName;
};
