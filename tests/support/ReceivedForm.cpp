#include "ReceivedForm.h"

#include <CoreServices/GlobalUtils.h>

#include <Poco/Net/HTMLForm.h>
#include <Poco/Net/HTTPRequest.h>
#include <Poco/Net/MessageHeader.h>
#include <Poco/Net/PartHandler.h>
#include <Poco/StreamCopier.h>

#include <filesystem>
#include <sstream>

namespace TestSupport
{
namespace
{
class CollectFiles : public Poco::Net::PartHandler
{
public:
    explicit CollectFiles(ReceivedForm& form) : m_form(form) {}

    void handlePart(const Poco::Net::MessageHeader& header, std::istream& stream) override
    {
        std::string disposition;
        Poco::Net::NameValueCollection parameters;
        Poco::Net::MessageHeader::splitParameters(header.get("Content-Disposition", ""), disposition, parameters);
        std::ostringstream content;
        Poco::StreamCopier::copyStream(stream, content);
        m_form.files.push_back({parameters.get("name", ""), parameters.get("filename", ""), content.str()});
    }

private:
    ReceivedForm& m_form;
};
} // namespace

ReceivedForm ParseForm(const RecordedRequest& recorded)
{
    Poco::Net::HTTPRequest request(Poco::Net::HTTPRequest::HTTP_POST, recorded.target,
                                   Poco::Net::HTTPMessage::HTTP_1_1);
    request.setContentType(recorded.HeaderValues("Content-Type").at(0));
    ReceivedForm form;
    CollectFiles files(form);
    Poco::Net::HTMLForm parsed;
    std::istringstream body(recorded.body);
    parsed.load(request, body, files);
    for (const auto& field : parsed)
    {
        form.fields.emplace_back(field.first, field.second);
    }
    return form;
}

std::vector<std::string> FilesIn(const wxString& directory)
{
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(GlobalUtils::ToFileSystemPath(directory)))
    {
        names.push_back(entry.path().filename().string());
    }
    return names;
}
} // namespace TestSupport
