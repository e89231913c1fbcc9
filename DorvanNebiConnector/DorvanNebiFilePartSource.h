#pragma once

// The archive of an upload as a part of the multipart form. Internal: not
// installed with the public headers.

#include <Poco/Net/PartSource.h>
#include <wx/string.h>

#include <fstream>
#include <string>

// Streams a file from disk into the form, so that the file is never held in
// memory whole. The part is named after the file (its last path component).
class DorvanNebiFilePartSource : public Poco::Net::PartSource
{
public:
    // Opens the file at once; throws Poco::OpenFileException when path names
    // no regular file or the file cannot be opened for reading.
    explicit DorvanNebiFilePartSource(const wxString& path);

    std::istream& stream() override;
    const std::string& filename() const override;

    // Whether the form writer read the file to its end. False when reading
    // failed part-way: the part then holds less than the file.
    bool WasReadToTheEnd() const;

private:
    std::ifstream m_stream;
    std::string m_fileName;
};
