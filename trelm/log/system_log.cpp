// The host's system log channel.
#include <trelm/log/system_log.h>

#include <trelm/core/mstr.h>

namespace TrelmSDK {

MessageSeverity SystemLogSeverity(std::uint32_t type) {
    switch (type) {
    case SYSLOG_ERROR:
        return MessageSeverity::Error;
    case SYSLOG_WARN:
        return MessageSeverity::Warning;
    case SYSLOG_DEBUG:
        return MessageSeverity::Debug;
    default:
        return MessageSeverity::Info;
    }
}

void SystemLog::LogEntry(std::uint32_t type, std::uint32_t dialog, std::string_view title,
                         std::string_view text) {
    LogMessage message;
    message.type = type;
    message.systemLogType = type;
    message.dialog = dialog == DISPLAY_DIALOG;
    message.severity = SystemLogSeverity(type);
    message.title = std::string(title);
    message.text = std::string(text);
    sink_.Add(message);
    if (message.dialog) {
        DialogHandler handler;
        {
            std::lock_guard lock(dialogMutex_);
            handler = dialogHandler_;
        }
        if (handler) handler(message);
    }
}

void SystemLog::LogEntry(std::uint32_t type, std::uint32_t dialog, std::wstring_view title,
                         std::wstring_view text) {
    LogEntry(type, dialog, ToUTF8(title), ToUTF8(text));
}

void SystemLog::SetDialogHandler(DialogHandler handler) {
    std::lock_guard lock(dialogMutex_);
    dialogHandler_ = std::move(handler);
}

SystemLog& GetSystemLog() {
    // Never destroyed: render threads and static destructors may log until the process ends.
    static SystemLog* log = new SystemLog;
    return *log;
}

void DebugPrint(std::string_view text) {
    GetSystemLog().LogEntry(SYSLOG_DEBUG, NO_DIALOG, "debug", text);
}

void DebugPrint(std::wstring_view text) {
    DebugPrint(ToUTF8(text));
}

} // namespace TrelmSDK
