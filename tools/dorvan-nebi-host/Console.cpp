#include "Console.h"

#include <wx/datetime.h>

#include <iostream>
#include <string>

namespace Console
{
void Line(const wxString& text)
{
    // UTF-8 whatever the locale, so that names in any script come out whole.
    std::cout << text.utf8_string() << std::endl;
}

void Detail(const wxString& text)
{
    Line("   " + text);
}

void Signal(const wxString& component, const wxString& signal, const wxString& fields)
{
    const wxString time = wxDateTime::UNow().Format("%H:%M:%S.%l");
    Line(wxString::Format("   %s %-7s %s %s", time, component, signal, fields));
}

void Error(const wxString& text)
{
    std::cerr << "dorvan-nebi-host: " << text.utf8_string() << std::endl;
}

wxString Number(unsigned long long number)
{
    return wxString::FromUTF8(std::to_string(number));
}

wxString Quoted(const wxString& text)
{
    return "\"" + text + "\"";
}
} // namespace Console
