// The host's system log: titled entries of a type (error, warning, info, debug), optionally
// asking for a dialog, kept for the log viewer and written to the log file.
#pragma once

#include <trelm/log/message_sink.h>

#include <cstdint>
#include <functional>
#include <mutex>
#include <string_view>

namespace TrelmSDK {

inline constexpr std::uint32_t SYSLOG_ERROR = 1;
inline constexpr std::uint32_t SYSLOG_WARN = 2;
inline constexpr std::uint32_t SYSLOG_INFO = 4;
inline constexpr std::uint32_t SYSLOG_DEBUG = 8;

inline constexpr std::uint32_t NO_DIALOG = 0;
inline constexpr std::uint32_t DISPLAY_DIALOG = 1;

MessageSeverity SystemLogSeverity(std::uint32_t type);

// Thread-safe; entries may come from any thread. The text is plain text, never a format.
class SystemLog {
public:
    using DialogHandler = std::function<void(const LogMessage&)>;

    void LogEntry(std::uint32_t type, std::uint32_t dialog, std::string_view title,
                  std::string_view text);
    void LogEntry(std::uint32_t type, std::uint32_t dialog, std::wstring_view title,
                  std::wstring_view text);

    MessageSink& Messages() { return sink_; }
    const MessageSink& Messages() const { return sink_; }

    // The desktop host shows DISPLAY_DIALOG entries through this handler (called on the logging
    // thread; the handler must hand the dialog to the UI thread). Without a handler, as in the
    // CLI and in quiet mode, the entry is only logged.
    void SetDialogHandler(DialogHandler handler);

private:
    MessageSink sink_{"system"};
    std::mutex dialogMutex_; // guards dialogHandler_
    DialogHandler dialogHandler_;
};

SystemLog& GetSystemLog();

// A debugger trace: kept in the system log as a debug entry titled "debug".
void DebugPrint(std::string_view text);
void DebugPrint(std::wstring_view text);

} // namespace TrelmSDK
