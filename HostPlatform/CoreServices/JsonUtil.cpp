#include <CoreServices/JsonUtil.h>

#include <json/reader.h>
#include <json/writer.h>

#include <memory>

namespace
{
// One document and nothing after it; no comments; nesting deeper than the
// limit is refused rather than recursed into.
Json::CharReaderBuilder MakeReaderBuilder()
{
    Json::CharReaderBuilder builder;
    builder["collectComments"] = false;
    builder["allowComments"] = false;
    builder["failIfExtra"] = true;
    builder["stackLimit"] = 256;
    return builder;
}

// The builders below are made once and never destroyed: workers may still be
// parsing while the process exits.
bool ParseDocument(const char* begin, const char* end, Json::Value& root)
{
    static const Json::CharReaderBuilder* const builder = new Json::CharReaderBuilder(MakeReaderBuilder());
    const std::unique_ptr<Json::CharReader> reader(builder->newCharReader());
    std::string errors;
    try
    {
        return reader->parse(begin, end, &root, &errors);
    }
    catch (const std::exception&)
    {
        return false;
    }
}

wxString CompactText(const Json::Value& value)
{
    static const Json::StreamWriterBuilder* const builder = [] {
        auto* b = new Json::StreamWriterBuilder();
        (*b)["indentation"] = "";
        (*b)["emitUTF8"] = true;
        return b;
    }();
    return wxString::FromUTF8(Json::writeString(*builder, value));
}
} // namespace

namespace JsonUtil
{
Result ParseJson(const wxString& text, std::map<wxString, wxString>& members)
{
    const wxScopedCharBuffer utf8 = text.utf8_str();
    Json::Value root;
    if (!ParseDocument(utf8.data(), utf8.data() + utf8.length(), root))
    {
        return InvalidJson;
    }
    if (!root.isObject())
    {
        return NotAnObject;
    }
    std::map<wxString, wxString> parsed;
    for (auto it = root.begin(); it != root.end(); ++it)
    {
        const wxString name = wxString::FromUTF8(it.name());
        parsed[name] = it->isString() ? wxString::FromUTF8(it->asString()) : CompactText(*it);
    }
    for (auto& member : parsed)
    {
        members[member.first] = std::move(member.second);
    }
    return Success;
}

bool ParseJson(const std::string& text, Json::Value& root)
{
    Json::Value parsed;
    if (!ParseDocument(text.data(), text.data() + text.size(), parsed))
    {
        root = Json::Value();
        return false;
    }
    root.swap(parsed);
    return true;
}
} // namespace JsonUtil
