#include <DorvanNebiConnector/DorvanNebiFilePartSource.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>

#include <CoreServices/GlobalUtils.h>

#include <Poco/Exception.h>
#include <wx/filename.h>

namespace
{
// The file name goes into the part header between quotes, as it is: a quote
// or a line break there would end the header field early.
std::string PartFileName(const wxString& path)
{
    std::string name = DorvanNebiConnectorUtil::ToUtf8(wxFileName(path).GetFullName());
    for (char& c : name)
    {
        if (c == '"' || c == '\r' || c == '\n' || c == '\0')
        {
            c = '_';
        }
    }
    return name;
}
} // namespace

DorvanNebiFilePartSource::DorvanNebiFilePartSource(const wxString& path)
    : Poco::Net::PartSource(DorvanNebiConstants::kFilePartMediaType),
      m_fileName(PartFileName(path))
{
    if (!wxFileName::FileExists(path))
    {
        throw Poco::OpenFileException("no such file", DorvanNebiConnectorUtil::ToUtf8(path));
    }
    m_stream.open(GlobalUtils::ToFileSystemPath(path), std::ios::in | std::ios::binary);
    if (!m_stream.is_open())
    {
        throw Poco::OpenFileException("cannot open the file", DorvanNebiConnectorUtil::ToUtf8(path));
    }
}

std::istream& DorvanNebiFilePartSource::stream()
{
    return m_stream;
}

const std::string& DorvanNebiFilePartSource::filename() const
{
    return m_fileName;
}

bool DorvanNebiFilePartSource::WasReadToTheEnd() const
{
    return m_stream.eof() && !m_stream.bad();
}
