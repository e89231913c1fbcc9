#pragma once

// The agent's login data record. Internal: not installed with the public
// headers.

#include <wx/datetime.h>
#include <wx/string.h>

#include <map>
#include <string>

// What the agent answers at "/nebilogin", "/nebiloginui", "/nebisignupui" and
// "/nebilogout": a JSON object whose top-level members the login component
// reads as text.
class DorvanNebiLoginRecord
{
public:
    using Members = std::map<wxString, wxString>;

    // The body, decoded as UTF-8 whatever the process's locale, into the
    // record's members (each member's text; other values in their compact
    // JSON form). False when it is no JSON object; members may then hold
    // nothing of it.
    static bool Parse(const std::string& body, Members& members);

    // The sign-in time of the record ("signintime", ISO 8601 combined with
    // the separator T, local time) into time, as far as it parses; text that
    // does not begin with such a time leaves time as it was.
    static void ReadSigninTime(Members& members, wxDateTime& time);
};
