#pragma once

// Text helpers shared by the connector's sources. Internal: not installed
// with the public headers.

#include <wx/string.h>

#include <string>

namespace DorvanNebiConnectorUtil
{
// The text as UTF-8 bytes.
std::string ToUtf8(const wxString& text);

// The JSON text with the value of every member whose name ends in "key",
// "secret", "sceret" or "token" (in any letter case) replaced by "***", so
// that credentials never reach a log line. Works on any text, also on broken
// or truncated JSON: whatever looks like such a member is masked.
std::string MaskSecrets(const std::string& text);

// The bytes as one segment of a URI path: every byte other than an ASCII
// letter, digit, "-", "_", "." or "~" becomes %XX (upper-case hex), so that a
// resource id can neither add path segments nor a query. Empty for "", "."
// and "..", which name no resource of their own: callers refuse those ids.
std::string EncodePathSegment(const std::string& bytes);
} // namespace DorvanNebiConnectorUtil
