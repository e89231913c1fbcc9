#pragma once

#include <CoreServices/CoreServicesExport.h>

#include <string>

class wxString;

// How serious a log record is. The numbers are part of the interface.
enum SeverityLevel
{
    SeverityTrace = 0,
    SeverityDebug = 1,
    SeverityInfo = 2,
    SeverityWarning = 3,
    SeverityError = 4,
    SeverityFatal = 5
};

// One log record. It collects the pieces streamed into it and writes them as
// one line when it is destroyed, that is at the end of the statement that made
// it:
//
//     SetLevelAndGetLogger(SeverityError, "Dir/File", "Class::Method", __LINE__)
//         << "text " << number;
//
// Each line holds the local time (ISO 8601 with milliseconds), the severity's
// name, the source path, the function, the line and the message. Lines go to
// stderr and, when asked for, are appended to a file; lines written from
// several threads never interleave. Logging never fails to its caller.
class CORESERVICES_EXPORT LogRecord
{
public:
    LogRecord(SeverityLevel severity, const char* file, const char* function, long line);
    LogRecord(LogRecord&& other) noexcept;
    LogRecord(const LogRecord&) = delete;
    LogRecord& operator=(const LogRecord&) = delete;
    LogRecord& operator=(LogRecord&&) = delete;
    ~LogRecord();

    void Append(const char* text, std::size_t length) const;

private:
    SeverityLevel m_severity;
    const char* m_file;
    const char* m_function;
    long m_line;
    mutable std::string m_message;
    bool m_active;
};

CORESERVICES_EXPORT LogRecord SetLevelAndGetLogger(SeverityLevel severity, const char* file,
                                                   const char* function, long line);

CORESERVICES_EXPORT const LogRecord& operator<<(const LogRecord& record, const char* text);
CORESERVICES_EXPORT const LogRecord& operator<<(const LogRecord& record, const std::string& text);
CORESERVICES_EXPORT const LogRecord& operator<<(const LogRecord& record, const int& number);

namespace Logging
{
// Appends every later line to the file at path as well (UTF-8 text); an empty
// path stops that. Without a call, the environment variable DORVAN_LOG_FILE
// names the file, if set. Returns false when the file cannot be opened.
CORESERVICES_EXPORT bool SetLogFile(const wxString& path);

// Turns the copy of each line on stderr on or off (on by default).
CORESERVICES_EXPORT void SetStderrEnabled(bool enabled);

// The name used in log lines for a severity ("trace", "debug", "info",
// "warning", "error", "fatal"; "level-N" for any other number).
CORESERVICES_EXPORT std::string SeverityName(SeverityLevel severity);
} // namespace Logging
