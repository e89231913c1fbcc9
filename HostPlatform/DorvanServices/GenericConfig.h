#pragma once

#include <DorvanServices/DorvanServicesExport.h>

#include <boost/property_tree/ptree.hpp>
#include <wx/string.h>

#include <cctype>
#include <limits>
#include <locale>
#include <mutex>
#include <optional>
#include <shared_mutex>
#include <sstream>
#include <string>
#include <type_traits>

namespace GenericConfigText
{
// Converts the stored text of a key to the type asked for; nothing when it
// does not convert. White space around the text is accepted.
template <typename T>
std::optional<T> FromText(const std::string& text)
{
    if constexpr (std::is_integral_v<T> && !std::is_same_v<T, bool>)
    {
        // Decimal digits only, with a minus sign for signed types, and the
        // value must fit: "-1" is no unsigned number and 65536 no 16-bit one.
        const std::size_t first = text.find_first_not_of(" \t\r\n\f\v");
        if (first == std::string::npos)
        {
            return std::nullopt;
        }
        const std::size_t last = text.find_last_not_of(" \t\r\n\f\v");
        const bool negative = std::is_signed_v<T> && text[first] == '-';
        const std::size_t digits = negative ? first + 1 : first;
        if (digits > last)
        {
            return std::nullopt;
        }
        unsigned long long magnitude = 0;
        for (std::size_t i = digits; i <= last; ++i)
        {
            const unsigned char c = static_cast<unsigned char>(text[i]);
            if (!std::isdigit(c) || magnitude > (std::numeric_limits<unsigned long long>::max() - (c - '0')) / 10)
            {
                return std::nullopt;
            }
            magnitude = magnitude * 10 + (c - '0');
        }
        if (negative)
        {
            // |min| = max + 1 for the two's complement types.
            const unsigned long long largest = static_cast<unsigned long long>(std::numeric_limits<T>::max()) + 1;
            if (magnitude > largest)
            {
                return std::nullopt;
            }
            return static_cast<T>(-static_cast<long long>(magnitude - 1) - 1);
        }
        if (magnitude > static_cast<unsigned long long>(std::numeric_limits<T>::max()))
        {
            return std::nullopt;
        }
        return static_cast<T>(magnitude);
    }
    else
    {
        std::istringstream stream(text);
        stream.imbue(std::locale());
        T value{};
        stream >> value;
        if (stream.fail())
        {
            return std::nullopt;
        }
        stream >> std::ws;
        if (!stream.eof())
        {
            return std::nullopt;
        }
        return value;
    }
}

template <>
inline std::optional<std::string> FromText<std::string>(const std::string& text)
{
    return text;
}

template <>
inline std::optional<wxString> FromText<wxString>(const std::string& text)
{
    const wxString value = wxString::FromUTF8(text);
    if (value.empty() && !text.empty())
    {
        return std::nullopt; // not valid UTF-8
    }
    return value;
}
} // namespace GenericConfigText

// A configuration kept as a JSON file. Reads come from the tree loaded when the
// object was made; each write stores the value and saves the whole file at once.
// A missing, empty or unreadable file gives a configuration in which every read
// returns its default. Readers on several threads run at once; a write (with
// its save) excludes everything else.
class DORVANSERVICES_EXPORT GenericConfig
{
public:
    explicit GenericConfig(const wxString& path);
    ~GenericConfig();

    GenericConfig(const GenericConfig&) = delete;
    GenericConfig& operator=(const GenericConfig&) = delete;

    // The value at key, or defaultValue when the key is absent, holds an
    // object or array, or its text does not convert to T.
    template <typename T>
    T GetValue(const wxString& key, const T& defaultValue) const
    {
        std::shared_lock<std::shared_mutex> lock(m_mutex);
        const auto node = m_tree.get_child_optional(KeyPath(key));
        if (!node || !node->empty())
        {
            return defaultValue;
        }
        const std::optional<T> value = GenericConfigText::FromText<T>(node->data());
        return value ? *value : defaultValue;
    }

    // Stores the value's text at key and saves the file.
    template <typename T>
    void SetValue(const wxString& key, const T& value)
    {
        wxString text;
        text << value;
        std::unique_lock<std::shared_mutex> lock(m_mutex);
        m_tree.put_child(KeyPath(key), boost::property_tree::ptree(std::string(text.utf8_str())));
        SaveConfig(m_path);
    }

    const wxString& GetPath() const { return m_path; }

private:
    static boost::property_tree::ptree::path_type KeyPath(const wxString& key)
    {
        return boost::property_tree::ptree::path_type(std::string(key.utf8_str()), '.');
    }

    void LoadConfig();
    void MarkUnreadable(const char* reason);
    void SaveConfig(const wxString& path);
    bool KeepUnreadableFile();

    wxString m_path;
    boost::property_tree::ptree m_tree;
    mutable std::shared_mutex m_mutex;
    // The file existed but could not be read as a configuration: its content is
    // copied aside before the first save replaces it.
    bool m_unreadableFileToKeep = false;
};
