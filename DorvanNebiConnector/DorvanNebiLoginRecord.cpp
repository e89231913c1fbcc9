#include <DorvanNebiConnector/DorvanNebiLoginRecord.h>

#include <DorvanNebiConnector/DorvanNebiConnectorConstants.h>

#include <CoreServices/JsonUtil.h>

bool DorvanNebiLoginRecord::Parse(const std::string& body, Members& members)
{
    // JSON is UTF-8, whatever the process's locale.
    return JsonUtil::ParseJson(wxString::FromUTF8(body), members) == JsonUtil::Success;
}

void DorvanNebiLoginRecord::ReadSigninTime(Members& members, wxDateTime& time)
{
    // Whether the whole text parsed is not asked: a time followed by more
    // (a zone, fractions of a second) is taken as far as it reads.
    time.ParseISOCombined(members[DorvanNebiConstants::kKeySigninTime], 'T');
}
