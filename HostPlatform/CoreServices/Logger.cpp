#include <CoreServices/Logger.h>

#include <CoreServices/GlobalUtils.h>

#include <wx/datetime.h>
#include <wx/string.h>
#include <wx/utils.h>

#include <cstdio>
#include <fstream>
#include <memory>
#include <mutex>

namespace
{
// Where the lines go. One process-wide object, created on first use and never
// destroyed, so that worker threads may still log while the process exits.
class LogSink
{
public:
    static LogSink& Instance()
    {
        static LogSink* sink = new LogSink();
        return *sink;
    }

    void Write(const std::string& line)
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        if (m_stderrEnabled)
        {
            std::fwrite(line.data(), 1, line.size(), stderr);
            std::fflush(stderr);
        }
        if (m_file && m_file->is_open())
        {
            m_file->write(line.data(), static_cast<std::streamsize>(line.size()));
            m_file->flush();
        }
    }

    bool SetFile(const wxString& path)
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        return OpenFile(path);
    }

    void SetStderrEnabled(bool enabled)
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_stderrEnabled = enabled;
    }

private:
    LogSink()
    {
        wxString path;
        if (wxGetEnv("DORVAN_LOG_FILE", &path) && !path.empty())
        {
            OpenFile(path);
        }
    }

    bool OpenFile(const wxString& path)
    {
        m_file.reset();
        if (path.empty())
        {
            return true;
        }
        auto file = std::make_unique<std::ofstream>(GlobalUtils::ToFileSystemPath(path),
                                                    std::ios::out | std::ios::app | std::ios::binary);
        if (!file->is_open())
        {
            return false;
        }
        m_file = std::move(file);
        return true;
    }

    std::mutex m_mutex;
    bool m_stderrEnabled = true;
    std::unique_ptr<std::ofstream> m_file;
};

// A record's message must stay on its one line.
void AppendEscaped(std::string& out, const std::string& text)
{
    for (char c : text)
    {
        if (c == '\n')
        {
            out += "\\n";
        }
        else if (c == '\r')
        {
            out += "\\r";
        }
        else
        {
            out += c;
        }
    }
}

std::string FormatLine(SeverityLevel severity, const char* file, const char* function, long line,
                       const std::string& message)
{
    std::string text = wxDateTime::UNow().Format("%Y-%m-%dT%H:%M:%S.%l").utf8_string();
    text += ' ';
    text += Logging::SeverityName(severity);
    text += ' ';
    text += file ? file : "?";
    text += ' ';
    text += function ? function : "?";
    text += ':';
    text += std::to_string(line);
    text += ' ';
    AppendEscaped(text, message);
    text += '\n';
    return text;
}
} // namespace

LogRecord::LogRecord(SeverityLevel severity, const char* file, const char* function, long line)
    : m_severity(severity), m_file(file), m_function(function), m_line(line), m_active(true)
{
}

LogRecord::LogRecord(LogRecord&& other) noexcept
    : m_severity(other.m_severity),
      m_file(other.m_file),
      m_function(other.m_function),
      m_line(other.m_line),
      m_message(std::move(other.m_message)),
      m_active(other.m_active)
{
    other.m_active = false;
}

LogRecord::~LogRecord()
{
    if (!m_active)
    {
        return;
    }
    try
    {
        LogSink::Instance().Write(FormatLine(m_severity, m_file, m_function, m_line, m_message));
    }
    catch (...)
    {
        // Logging never fails to its caller.
    }
}

void LogRecord::Append(const char* text, std::size_t length) const
{
    try
    {
        m_message.append(text, length);
    }
    catch (...)
    {
    }
}

LogRecord SetLevelAndGetLogger(SeverityLevel severity, const char* file, const char* function, long line)
{
    return LogRecord(severity, file, function, line);
}

const LogRecord& operator<<(const LogRecord& record, const char* text)
{
    if (text)
    {
        record.Append(text, std::char_traits<char>::length(text));
    }
    return record;
}

const LogRecord& operator<<(const LogRecord& record, const std::string& text)
{
    record.Append(text.data(), text.size());
    return record;
}

const LogRecord& operator<<(const LogRecord& record, const int& number)
{
    const std::string text = std::to_string(number);
    record.Append(text.data(), text.size());
    return record;
}

namespace Logging
{
bool SetLogFile(const wxString& path)
{
    return LogSink::Instance().SetFile(path);
}

void SetStderrEnabled(bool enabled)
{
    LogSink::Instance().SetStderrEnabled(enabled);
}

std::string SeverityName(SeverityLevel severity)
{
    switch (severity)
    {
    case SeverityTrace:
        return "trace";
    case SeverityDebug:
        return "debug";
    case SeverityInfo:
        return "info";
    case SeverityWarning:
        return "warning";
    case SeverityError:
        return "error";
    case SeverityFatal:
        return "fatal";
    }
    return "level-" + std::to_string(static_cast<int>(severity));
}
} // namespace Logging
