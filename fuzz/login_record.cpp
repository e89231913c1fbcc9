// The agent's login data record, along the path the login component takes:
// the body decoded as UTF-8 into JsonUtil::ParseJson's map, the sign-in time
// parse, the role mapping, and the masking of credentials for the log line.
//
// Invariant: no value of a member whose name ends in "key", "secret",
// "sceret" or "token" (in any ASCII letter case) survives into the masked
// text: masking a record keeps it a record, in which each such member's value
// reads "***".

#include "FuzzSupport.h"

#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnectorText.h>
#include <DorvanNebiConnector/DorvanNebiLoginRecord.h>

#include <cstddef>
#include <cstdint>
#include <string>

namespace
{
bool EndsWith(const std::string& text, const char* suffix)
{
    const std::string tail(suffix);
    return text.size() >= tail.size() && text.compare(text.size() - tail.size(), tail.size(), tail) == 0;
}

bool IsSecretName(const wxString& name)
{
    std::string lower = name.utf8_string();
    for (char& c : lower)
    {
        if (c >= 'A' && c <= 'Z')
        {
            c = static_cast<char>(c - 'A' + 'a');
        }
    }
    return EndsWith(lower, "key") || EndsWith(lower, "secret") || EndsWith(lower, "sceret") ||
           EndsWith(lower, "token");
}
} // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    FuzzSupport::Initialize();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    const std::string body(reinterpret_cast<const char*>(data), size);
    DorvanNebiLoginRecord::Members record;
    const bool parsed = DorvanNebiLoginRecord::Parse(body, record);
    if (parsed)
    {
        wxDateTime signinTime;
        DorvanNebiLoginRecord::ReadSigninTime(record, signinTime);
        const NebiUserRole role = DorvanNebiConnectorTypes::FromString(record["userrole"]);
        if (role != UserRoleUnknown && role != UserRoleAdmin && role != UserRoleOperator)
        {
            FuzzSupport::Fail("a role outside the enum");
        }
    }

    const std::string masked = DorvanNebiConnectorUtil::MaskSecrets(body);
    if (!parsed)
    {
        return 0;
    }
    DorvanNebiLoginRecord::Members maskedRecord;
    if (!DorvanNebiLoginRecord::Parse(masked, maskedRecord))
    {
        FuzzSupport::Fail("masking a record made it no record");
    }
    for (const auto& member : record)
    {
        if (IsSecretName(member.first) && maskedRecord[member.first] != "***")
        {
            FuzzSupport::Fail("a credential survived the masking");
        }
    }
    return 0;
}
