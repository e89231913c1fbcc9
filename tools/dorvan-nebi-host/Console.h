#pragma once

// What the host prints: UTF-8 lines on stdout (the transcript) and error
// messages on stderr.

#include <wx/string.h>

namespace Console
{
// A line of the transcript.
void Line(const wxString& text);

// A detail of the current step, indented under its heading.
void Detail(const wxString& text);

// One signal as it arrived: time, component, signal and its fields.
void Signal(const wxString& component, const wxString& signal, const wxString& fields);

// "dorvan-nebi-host: <text>" on stderr.
void Error(const wxString& text);

// A count or size as decimal text.
wxString Number(unsigned long long number);

// Text in double quotes, for names that may hold blanks.
wxString Quoted(const wxString& text);
} // namespace Console
