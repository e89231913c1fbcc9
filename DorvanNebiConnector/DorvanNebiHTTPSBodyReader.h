#pragma once

// Reads a response body off its session and makes sure it arrived whole.
// Internal: not installed with the public headers.

#include <Poco/Net/HTTPResponse.h>

#include <cstddef>
#include <cstdint>
#include <vector>

class DorvanNebiHTTPSSession;

// The body of a response whose header the session has just received, read
// with the framing the header announces:
//   - chunked transfer coding: chunk by chunk up to the last (empty) chunk
//     and the trailer, with every size line and delimiter checked;
//   - Content-Length: exactly that many bytes;
//   - neither: everything until the server closes the connection cleanly.
// A body that ends before its framing says, or whose framing is malformed,
// makes Read throw Poco::Net::MessageException, so that a cut-off transfer is
// never taken for a complete one.
class DorvanNebiHTTPSBodyReader
{
public:
    // Throws Poco::Net::MessageException for a header whose framing cannot be
    // read: a transfer coding other than chunked, or a Content-Length that is
    // no number or is given twice with different values.
    DorvanNebiHTTPSBodyReader(DorvanNebiHTTPSSession& session, const Poco::Net::HTTPResponse& response);

    // Puts up to size (> 0) bytes of the body into buffer and returns how
    // many; 0 once the whole body has been read.
    std::size_t Read(char* buffer, std::size_t size);

    // Body bytes handed out so far.
    std::uint64_t BytesRead() const { return m_bytesRead; }

private:
    enum class Framing
    {
        Chunked,
        ContentLength,
        UntilClose
    };

    static Framing FramingOf(const Poco::Net::HTTPResponse& response);
    static std::uint64_t ContentLengthOf(const Poco::Net::HTTPResponse& response);

    std::size_t ReadChunked(char* buffer, std::size_t size);
    std::size_t ReadFixedLength(char* buffer, std::size_t size);
    std::size_t ReadUntilClose(char* buffer, std::size_t size);

    // Chunked framing.
    void StartChunk();
    void EndChunk();
    void SkipTrailer();
    std::uint64_t ParseChunkSize(const std::string& line) const;

    // Bytes off the connection, through this reader's own buffer.
    std::size_t ReadData(char* buffer, std::size_t size);
    std::string ReadLine(std::size_t maxLength);
    bool Fill();
    [[noreturn]] void Fail(const std::string& reason) const;

    DorvanNebiHTTPSSession& m_session;
    Framing m_framing;
    std::uint64_t m_contentLength = 0;
    std::uint64_t m_chunkLeft = 0; // data bytes of the current chunk not yet read
    bool m_inChunk = false;        // between a size line and the chunk's CRLF
    bool m_finished = false;
    std::uint64_t m_bytesRead = 0;
    std::vector<char> m_buffer;
    std::size_t m_bufferBegin = 0;
    std::size_t m_bufferEnd = 0;
};
