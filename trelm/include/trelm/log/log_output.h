// Where messages go besides memory: one log file shared by all channels, and an echo to the
// terminal that the CLI switches on when asked.
#pragma once

#include <trelm/log/message_sink.h>

#include <cstdio>
#include <filesystem>
#include <functional>
#include <string>

namespace TrelmSDK {

// Process-wide; every operation is thread-safe (one mutex, taken after a sink's own lock).
// On first use the environment may set it up: TRELM_LOG_FILE names the log file, and
// TRELM_LOG_ECHO turns the echo on ("1", "on" or a minimum severity: "debug", "info",
// "warning", "error", "fatal"; "0" or "off" leaves it off).
class LogOutput {
public:
    static LogOutput& Instance();

    // Appends every message to `file` (created with its folders when missing); an empty path
    // stops writing. Returns false, with the reason in `error`, when the file cannot be opened;
    // the previous file is kept then.
    bool SetLogFile(const std::filesystem::path& file, std::string* error = nullptr);
    std::filesystem::path LogFile() const;

    // The echo writes messages of at least `minimum` severity to stderr (or to `writer` when
    // one is given: tests and tools capture it that way). The writer runs under the output's
    // lock, on the reporting thread: it must not report messages itself.
    void SetEcho(bool on, MessageSeverity minimum = MessageSeverity::Info);
    void SetEchoWriter(std::function<void(const std::string& line)> writer);
    bool EchoEnabled() const;

    // One message as a single text line (continuation lines indented), as written to the file.
    static std::string FormatLine(const LogMessage& message, bool withTime);

    // Called by MessageSink::Add.
    void Write(const LogMessage& message);

    ~LogOutput();

private:
    LogOutput();
    struct State;
    State* state_;
};

// Convenience for the CLI: the echo switch.
inline void SetMessageEcho(bool on, MessageSeverity minimum = MessageSeverity::Info) {
    LogOutput::Instance().SetEcho(on, minimum);
}

} // namespace TrelmSDK
