#include <DorvanNebiConnector/DorvanNebiHTTPSBodyReader.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiHTTPSSession.h>

#include <Poco/Net/NetException.h>
#include <Poco/String.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <string>

namespace
{
constexpr char kTransferEncoding[] = "Transfer-Encoding";
constexpr char kContentLength[] = "Content-Length";
constexpr char kChunked[] = "chunked";
// 16 hex digits fill 64 bits.
constexpr std::size_t kMaxChunkSizeDigits = 16;

bool IsHexDigit(char c)
{
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}

unsigned HexValue(char c)
{
    if (c >= '0' && c <= '9')
    {
        return static_cast<unsigned>(c - '0');
    }
    return static_cast<unsigned>((c | 0x20) - 'a' + 10);
}

// Every value of the header field name (names compared without letter case).
std::vector<std::string> ValuesOf(const Poco::Net::HTTPResponse& response, const char* name)
{
    std::vector<std::string> values;
    for (const auto& field : response)
    {
        if (Poco::icompare(field.first, name) == 0)
        {
            values.push_back(Poco::trim(field.second));
        }
    }
    return values;
}

void FailHeader(const std::string& reason)
{
    throw Poco::Net::MessageException(reason);
}
} // namespace

DorvanNebiHTTPSBodyReader::DorvanNebiHTTPSBodyReader(DorvanNebiHTTPSSession& session,
                                                     const Poco::Net::HTTPResponse& response)
    : m_session(session),
      m_framing(FramingOf(response)),
      m_buffer(DorvanNebiConstants::kBodyCopyBufferSize)
{
    if (m_framing == Framing::ContentLength)
    {
        m_contentLength = ContentLengthOf(response);
    }
}

DorvanNebiHTTPSBodyReader::Framing DorvanNebiHTTPSBodyReader::FramingOf(const Poco::Net::HTTPResponse& response)
{
    const std::vector<std::string> codings = ValuesOf(response, kTransferEncoding);
    if (codings.size() > 1 || (codings.size() == 1 && Poco::icompare(codings.front(), kChunked) != 0))
    {
        FailHeader("unsupported transfer coding in the response header");
    }
    if (codings.size() == 1)
    {
        return Framing::Chunked; // a Content-Length beside it does not count
    }
    return ValuesOf(response, kContentLength).empty() ? Framing::UntilClose : Framing::ContentLength;
}

std::uint64_t DorvanNebiHTTPSBodyReader::ContentLengthOf(const Poco::Net::HTTPResponse& response)
{
    const std::vector<std::string> values = ValuesOf(response, kContentLength);
    const std::string& text = values.front();
    const bool allDigits = !text.empty() && text.size() <= 18 &&
                           std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
    if (!allDigits)
    {
        FailHeader("malformed Content-Length in the response header: " + text);
    }
    if (std::any_of(values.begin(), values.end(), [&](const std::string& value) { return value != text; }))
    {
        FailHeader("conflicting Content-Length fields in the response header");
    }
    return std::stoull(text);
}

std::size_t DorvanNebiHTTPSBodyReader::Read(char* buffer, std::size_t size)
{
    if (m_finished || size == 0)
    {
        return 0;
    }
    switch (m_framing)
    {
    case Framing::Chunked:
        return ReadChunked(buffer, size);
    case Framing::ContentLength:
        return ReadFixedLength(buffer, size);
    case Framing::UntilClose:
        break;
    }
    return ReadUntilClose(buffer, size);
}

std::size_t DorvanNebiHTTPSBodyReader::ReadFixedLength(char* buffer, std::size_t size)
{
    const std::uint64_t left = m_contentLength - m_bytesRead;
    if (left == 0)
    {
        m_finished = true;
        return 0;
    }
    const std::size_t n = ReadData(buffer, static_cast<std::size_t>(std::min<std::uint64_t>(size, left)));
    if (n == 0)
    {
        Fail("the body ended after " + std::to_string(m_bytesRead) + " of its " + std::to_string(m_contentLength) +
             " bytes");
    }
    m_bytesRead += n;
    return n;
}

std::size_t DorvanNebiHTTPSBodyReader::ReadUntilClose(char* buffer, std::size_t size)
{
    const std::size_t n = ReadData(buffer, size);
    m_finished = n == 0;
    m_bytesRead += n;
    return n;
}

std::size_t DorvanNebiHTTPSBodyReader::ReadChunked(char* buffer, std::size_t size)
{
    while (m_chunkLeft == 0)
    {
        if (m_inChunk)
        {
            EndChunk();
        }
        StartChunk();
        if (m_finished)
        {
            return 0;
        }
    }
    const std::size_t n = ReadData(buffer, static_cast<std::size_t>(std::min<std::uint64_t>(size, m_chunkLeft)));
    if (n == 0)
    {
        Fail("the body ended inside a chunk, after " + std::to_string(m_bytesRead) + " bytes");
    }
    m_chunkLeft -= n;
    m_bytesRead += n;
    return n;
}

void DorvanNebiHTTPSBodyReader::StartChunk()
{
    const std::uint64_t size = ParseChunkSize(ReadLine(DorvanNebiConstants::kChunkLineMaxLength));
    if (size == 0)
    {
        SkipTrailer();
        m_finished = true;
        return;
    }
    m_chunkLeft = size;
    m_inChunk = true;
}

void DorvanNebiHTTPSBodyReader::EndChunk()
{
    if (!ReadLine(DorvanNebiConstants::kChunkLineMaxLength).empty())
    {
        Fail("a chunk's data is longer than its size line says");
    }
    m_inChunk = false;
}

void DorvanNebiHTTPSBodyReader::SkipTrailer()
{
    std::size_t trailerLength = 0;
    for (std::string line = ReadLine(DorvanNebiConstants::kChunkLineMaxLength); !line.empty();
         line = ReadLine(DorvanNebiConstants::kChunkLineMaxLength))
    {
        trailerLength += line.size();
        if (trailerLength > DorvanNebiConstants::kChunkTrailerMaxLength)
        {
            Fail("the trailer of the chunked body is too long");
        }
    }
}

// chunk-size [ BWS ";" chunk-ext ]: the hex digits up to any extension, which
// is ignored, with blanks allowed after the digits.
std::uint64_t DorvanNebiHTTPSBodyReader::ParseChunkSize(const std::string& line) const
{
    const std::string digits = Poco::trimRight(line.substr(0, line.find(';')));
    if (digits.empty() || digits.size() > kMaxChunkSizeDigits ||
        !std::all_of(digits.begin(), digits.end(), IsHexDigit))
    {
        Fail("malformed chunk size line");
    }
    std::uint64_t size = 0;
    for (const char c : digits)
    {
        size = size * 16 + HexValue(c);
    }
    return size;
}

std::size_t DorvanNebiHTTPSBodyReader::ReadData(char* buffer, std::size_t size)
{
    if (m_bufferBegin < m_bufferEnd)
    {
        const std::size_t n = std::min(size, m_bufferEnd - m_bufferBegin);
        std::memcpy(buffer, m_buffer.data() + m_bufferBegin, n);
        m_bufferBegin += n;
        return n;
    }
    const std::size_t limit = std::min<std::size_t>(size, std::numeric_limits<int>::max());
    return static_cast<std::size_t>(m_session.ReadBody(buffer, static_cast<std::streamsize>(limit)));
}

// One framing line without its line end (CRLF, or a bare LF).
std::string DorvanNebiHTTPSBodyReader::ReadLine(std::size_t maxLength)
{
    std::string line;
    for (;;)
    {
        if (m_bufferBegin == m_bufferEnd && !Fill())
        {
            Fail("the body ended before its last chunk, after " + std::to_string(m_bytesRead) + " bytes");
        }
        const char c = m_buffer[m_bufferBegin++];
        if (c == '\n')
        {
            break;
        }
        if (line.size() == maxLength)
        {
            Fail("a framing line of the chunked body is too long");
        }
        line += c;
    }
    if (!line.empty() && line.back() == '\r')
    {
        line.pop_back();
    }
    return line;
}

bool DorvanNebiHTTPSBodyReader::Fill()
{
    m_bufferBegin = 0;
    m_bufferEnd = static_cast<std::size_t>(m_session.ReadBody(m_buffer.data(),
                                                               static_cast<std::streamsize>(m_buffer.size())));
    return m_bufferEnd > 0;
}

void DorvanNebiHTTPSBodyReader::Fail(const std::string& reason) const
{
    throw Poco::Net::MessageException(reason);
}
