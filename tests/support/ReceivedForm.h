#pragma once

// What a cloud stand-in received: the multipart form of an upload, and the
// files that a download left behind.

#include "LoopbackServer.h"

#include <wx/string.h>

#include <string>
#include <utility>
#include <vector>

namespace TestSupport
{
// The multipart form of a recorded upload, as a server reads it.
struct ReceivedForm
{
    struct File
    {
        std::string name;     // the part's name
        std::string fileName; // its filename parameter
        std::string content;
    };

    std::vector<std::pair<std::string, std::string>> fields; // in the order received
    std::vector<File> files;
};

// Parses the body of request by its Content-Type; throws when it is no form.
ReceivedForm ParseForm(const RecordedRequest& request);

// The names of the entries of directory.
std::vector<std::string> FilesIn(const wxString& directory);
} // namespace TestSupport
