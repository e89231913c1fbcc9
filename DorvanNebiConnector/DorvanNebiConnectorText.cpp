#include <DorvanNebiConnector/DorvanNebiConnectorText.h>

#include <cctype>

namespace
{
const char* const kSecretNameEndings[] = {"key", "secret", "sceret", "token"};
const char kMask[] = "\"***\"";

bool IsSpace(char c)
{
    return c == ' ' || c == '\t' || c == '\r' || c == '\n';
}

std::size_t SkipSpace(const std::string& text, std::size_t position)
{
    while (position < text.size() && IsSpace(text[position]))
    {
        ++position;
    }
    return position;
}

// position is at an opening quote; returns the index after the closing quote,
// or the end of the text when the string never closes.
std::size_t EndOfString(const std::string& text, std::size_t position)
{
    for (std::size_t i = position + 1; i < text.size(); ++i)
    {
        if (text[i] == '\\')
        {
            ++i;
        }
        else if (text[i] == '"')
        {
            return i + 1;
        }
    }
    return text.size();
}

// position is at the first character of a value; returns the index after it.
// An object or array ends at its matching bracket, a scalar at the next
// separator; anything unterminated ends with the text.
std::size_t EndOfValue(const std::string& text, std::size_t position)
{
    if (position >= text.size())
    {
        return position;
    }
    if (text[position] == '"')
    {
        return EndOfString(text, position);
    }
    if (text[position] == '{' || text[position] == '[')
    {
        int depth = 0;
        for (std::size_t i = position; i < text.size();)
        {
            const char c = text[i];
            if (c == '"')
            {
                i = EndOfString(text, i);
                continue;
            }
            if (c == '{' || c == '[')
            {
                ++depth;
            }
            else if ((c == '}' || c == ']') && --depth == 0)
            {
                return i + 1;
            }
            ++i;
        }
        return text.size();
    }
    std::size_t i = position;
    while (i < text.size() && text[i] != ',' && text[i] != '}' && text[i] != ']' && !IsSpace(text[i]))
    {
        ++i;
    }
    return i;
}

int HexValue(char c)
{
    if (c >= '0' && c <= '9')
    {
        return c - '0';
    }
    c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return (c >= 'a' && c <= 'f') ? c - 'a' + 10 : -1;
}

// The member name between the quotes, lower case, with escapes of ASCII
// characters resolved, so that "api\u004Bey" is seen as "apikey".
std::string NormalisedName(const std::string& quoted)
{
    std::string name;
    const std::size_t end = quoted.size() >= 2 && quoted.back() == '"' ? quoted.size() - 1 : quoted.size();
    for (std::size_t i = 1; i < end; ++i)
    {
        char c = quoted[i];
        if (c == '\\' && i + 1 < end)
        {
            c = quoted[++i];
            if (c == 'u' && i + 4 < end)
            {
                int code = 0;
                for (std::size_t k = 1; k <= 4 && code >= 0; ++k)
                {
                    const int digit = HexValue(quoted[i + k]);
                    code = digit < 0 ? -1 : code * 16 + digit;
                }
                if (code >= 0 && code < 0x80)
                {
                    c = static_cast<char>(code);
                    i += 4;
                }
            }
        }
        name += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
    return name;
}

bool IsUnreservedInPath(unsigned char c)
{
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_' ||
           c == '.' || c == '~';
}

bool IsSecretName(const std::string& quoted)
{
    const std::string name = NormalisedName(quoted);
    for (const char* ending : kSecretNameEndings)
    {
        const std::string suffix(ending);
        if (name.size() >= suffix.size() && name.compare(name.size() - suffix.size(), suffix.size(), suffix) == 0)
        {
            return true;
        }
    }
    return false;
}
} // namespace

namespace DorvanNebiConnectorUtil
{
std::string ToUtf8(const wxString& text)
{
    return text.utf8_string();
}

std::string MaskSecrets(const std::string& text)
{
    std::string masked;
    masked.reserve(text.size());
    std::size_t i = 0;
    while (i < text.size())
    {
        if (text[i] != '"')
        {
            masked += text[i++];
            continue;
        }
        const std::size_t nameEnd = EndOfString(text, i);
        const std::string quoted = text.substr(i, nameEnd - i);
        masked += quoted;
        i = nameEnd;
        const std::size_t colon = SkipSpace(text, i);
        if (colon < text.size() && text[colon] == ':' && IsSecretName(quoted))
        {
            const std::size_t value = SkipSpace(text, colon + 1);
            masked.append(text, i, value - i);
            masked += kMask;
            i = EndOfValue(text, value);
        }
    }
    return masked;
}

std::string EncodePathSegment(const std::string& bytes)
{
    if (bytes.empty() || bytes == "." || bytes == "..")
    {
        return std::string();
    }
    static const char kHexDigits[] = "0123456789ABCDEF";
    std::string encoded;
    encoded.reserve(bytes.size());
    for (const char c : bytes)
    {
        const unsigned char byte = static_cast<unsigned char>(c);
        if (IsUnreservedInPath(byte))
        {
            encoded += c;
        }
        else
        {
            encoded += '%';
            encoded += kHexDigits[byte >> 4];
            encoded += kHexDigits[byte & 0x0F];
        }
    }
    return encoded;
}
} // namespace DorvanNebiConnectorUtil
