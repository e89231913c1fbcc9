#include "UploadForm.h"

#include <Poco/Exception.h>
#include <Poco/FileStream.h>
#include <Poco/Net/MessageHeader.h>
#include <Poco/Net/MultipartReader.h>

#include <utility>

namespace
{
using Poco::Net::HTTPResponse;

const std::string kArchivePartName = "file";
constexpr std::size_t kMaxFieldLength = 16 * 1024;
constexpr std::size_t kMaxFields = 32;
constexpr std::size_t kBlockSize = 64 * 1024;

// The request body, read through to its end once: after the end it answers
// "end" without asking the connection again. (A chunked body's own stream
// would wait for another chunk, for as long as the client keeps the
// connection open.)
class BodyOnce : public std::streambuf
{
public:
    explicit BodyOnce(std::istream& body) : m_body(*body.rdbuf()) {}

protected:
    int_type underflow() override
    {
        if (m_ended)
        {
            return traits_type::eof();
        }
        const std::streamsize got = m_body.sgetn(m_buffer, sizeof(m_buffer));
        m_ended = got < static_cast<std::streamsize>(sizeof(m_buffer));
        if (got <= 0)
        {
            return traits_type::eof();
        }
        setg(m_buffer, m_buffer, m_buffer + got);
        return traits_type::to_int_type(m_buffer[0]);
    }

private:
    std::streambuf& m_body;
    char m_buffer[8192];
    bool m_ended = false;
};

UploadError Malformed(const std::string& reason)
{
    return UploadError(HTTPResponse::HTTP_BAD_REQUEST, "malformed multipart body: " + reason);
}
} // namespace

UploadForm::UploadForm(std::string archivePath, Poco::UInt64 maxArchiveBytes)
    : m_archivePath(std::move(archivePath)), m_maxArchiveBytes(maxArchiveBytes)
{
}

void UploadForm::Read(std::istream& body, const std::string& boundary)
{
    BodyOnce bodyOnce(body);
    std::istream input(&bodyOnce);
    bool closed = false;
    try
    {
        Poco::Net::MultipartReader reader(input, boundary);
        while (reader.hasNextPart())
        {
            Poco::Net::MessageHeader header;
            reader.nextPart(header);
            ReadPart(header, reader.stream());
            // The reader's part stream knows whether the closing boundary came;
            // a body that has run out without it was cut off.
            closed = static_cast<Poco::Net::MultipartInputStream&>(reader.stream()).lastPart();
            if (!closed && input.rdbuf()->sgetc() == std::char_traits<char>::eof())
            {
                break;
            }
        }
    }
    catch (const Poco::Exception& e)
    {
        throw Malformed(e.displayText());
    }
    if (!closed)
    {
        throw Malformed("it ends before its closing boundary");
    }
    if (!m_hasArchive)
    {
        throw UploadError(HTTPResponse::HTTP_BAD_REQUEST, "the part \"file\" with the archive is missing");
    }
}

std::string UploadForm::Field(const std::string& name) const
{
    const auto found = m_fields.find(name);
    return found == m_fields.end() ? std::string() : found->second;
}

void UploadForm::ReadPart(const Poco::Net::MessageHeader& header, std::istream& part)
{
    std::string disposition;
    Poco::Net::NameValueCollection parameters;
    Poco::Net::MessageHeader::splitParameters(header.get("Content-Disposition", ""), disposition, parameters);
    const std::string name = parameters.get("name", "");
    if (disposition != "form-data" || name.empty())
    {
        throw Malformed("a part without a form-data name");
    }
    if (name == kArchivePartName)
    {
        if (m_hasArchive)
        {
            throw UploadError(HTTPResponse::HTTP_BAD_REQUEST, "more than one part \"file\"");
        }
        m_fileName = parameters.get("filename", "");
        ReadArchive(part);
        m_hasArchive = true;
    }
    else
    {
        ReadField(name, part);
    }
}

void UploadForm::ReadField(const std::string& name, std::istream& part)
{
    if (m_fields.size() >= kMaxFields)
    {
        throw Malformed("more than " + std::to_string(kMaxFields) + " fields");
    }
    std::string value;
    for (int c = part.get(); c != std::char_traits<char>::eof(); c = part.get())
    {
        if (value.size() == kMaxFieldLength)
        {
            throw Malformed("the field \"" + name + "\" is longer than " + std::to_string(kMaxFieldLength) + " bytes");
        }
        value += static_cast<char>(c);
    }
    m_fields[name] = value;
}

void UploadForm::ReadArchive(std::istream& part)
{
    Poco::FileOutputStream file;
    try
    {
        file.open(m_archivePath, std::ios::out | std::ios::trunc);
    }
    catch (const Poco::FileException& e)
    {
        throw UploadError(HTTPResponse::HTTP_INTERNAL_SERVER_ERROR, "cannot store the archive: " + e.displayText());
    }
    std::string block(kBlockSize, '\0');
    Poco::UInt64 total = 0;
    while (part)
    {
        part.read(&block[0], static_cast<std::streamsize>(block.size()));
        const std::streamsize got = part.gcount();
        total += static_cast<Poco::UInt64>(got);
        if (total > m_maxArchiveBytes)
        {
            throw UploadError(HTTPResponse::HTTP_REQUESTENTITYTOOLARGE,
                              "the archive is larger than " + std::to_string(m_maxArchiveBytes) + " bytes");
        }
        file.write(block.data(), got);
    }
    file.close();
    if (!file.good())
    {
        throw UploadError(HTTPResponse::HTTP_INTERNAL_SERVER_ERROR, "cannot write the archive to disk");
    }
}
