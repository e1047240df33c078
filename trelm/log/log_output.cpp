// The shared log file and the terminal echo behind every message channel.
#include <trelm/log/log_output.h>

#include <cstdlib>
#include <ctime>
#include <iomanip>
#include <mutex>
#include <sstream>
#include <unistd.h>

namespace TrelmSDK {

struct LogOutput::State {
    std::mutex mutex; // guards everything below
    std::filesystem::path path;
    std::FILE* file = nullptr;
    bool echo = false;
    MessageSeverity echoMinimum = MessageSeverity::Info;
    std::function<void(const std::string&)> echoWriter;
};

namespace {

bool parseEchoSetting(const char* value, bool& on, MessageSeverity& minimum) {
    const std::string v = value;
    on = true;
    if (v == "0" || v == "off" || v.empty())
        on = false;
    else if (v == "1" || v == "on" || v == "info")
        minimum = MessageSeverity::Info;
    else if (v == "debug")
        minimum = MessageSeverity::Debug;
    else if (v == "warning")
        minimum = MessageSeverity::Warning;
    else if (v == "error")
        minimum = MessageSeverity::Error;
    else if (v == "fatal")
        minimum = MessageSeverity::Fatal;
    else
        return false;
    return true;
}

std::string timeText(std::chrono::system_clock::time_point time) {
    const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
    const auto millis =
        std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count() %
        1000;
    std::tm local{};
    localtime_r(&seconds, &local);
    char buffer[32];
    std::strftime(buffer, sizeof buffer, "%Y-%m-%d %H:%M:%S", &local);
    std::ostringstream out;
    out << buffer << '.' << std::setw(3) << std::setfill('0') << millis;
    return out.str();
}

} // namespace

LogOutput::LogOutput() : state_(new State) {
    if (const char* echo = std::getenv("TRELM_LOG_ECHO")) {
        bool on = false;
        MessageSeverity minimum = MessageSeverity::Info;
        if (parseEchoSetting(echo, on, minimum)) SetEcho(on, minimum);
    }
    if (const char* file = std::getenv("TRELM_LOG_FILE"); file && *file) SetLogFile(file);
}

LogOutput::~LogOutput() {
    if (state_->file) std::fclose(state_->file);
    delete state_;
}

LogOutput& LogOutput::Instance() {
    // Never destroyed: messages may still arrive from other static destructors at exit.
    static LogOutput* instance = new LogOutput;
    return *instance;
}

bool LogOutput::SetLogFile(const std::filesystem::path& file, std::string* error) {
    std::FILE* opened = nullptr;
    if (!file.empty()) {
        std::error_code ec;
        if (file.has_parent_path()) std::filesystem::create_directories(file.parent_path(), ec);
        opened = std::fopen(file.c_str(), "a");
        if (!opened) {
            if (error) *error = "cannot open log file " + file.string() + " for appending";
            return false;
        }
    }
    std::lock_guard lock(state_->mutex);
    if (state_->file) std::fclose(state_->file);
    state_->file = opened;
    state_->path = file;
    return true;
}

std::filesystem::path LogOutput::LogFile() const {
    std::lock_guard lock(state_->mutex);
    return state_->path;
}

void LogOutput::SetEcho(bool on, MessageSeverity minimum) {
    std::lock_guard lock(state_->mutex);
    state_->echo = on;
    state_->echoMinimum = minimum;
}

void LogOutput::SetEchoWriter(std::function<void(const std::string&)> writer) {
    std::lock_guard lock(state_->mutex);
    state_->echoWriter = std::move(writer);
}

bool LogOutput::EchoEnabled() const {
    std::lock_guard lock(state_->mutex);
    return state_->echo;
}

std::string LogOutput::FormatLine(const LogMessage& message, bool withTime) {
    std::string line;
    if (withTime) line = timeText(message.time) + " ";
    line += "[" + message.channel + "] ";
    line += SeverityName(message.severity);
    if (message.source >= 0) line += " (source " + std::to_string(message.source) + ")";
    if (!message.title.empty()) line += " " + message.title;
    line += ": ";
    // One message stays one record: continuation lines are indented, a final break dropped.
    std::string_view text = message.text;
    while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.remove_suffix(1);
    for (char c : text) {
        if (c == '\r') continue;
        line += c;
        if (c == '\n') line += "    ";
    }
    return line;
}

void LogOutput::Write(const LogMessage& message) {
    std::lock_guard lock(state_->mutex);
    if (state_->file) {
        const std::string line = FormatLine(message, true) + "\n";
        std::fwrite(line.data(), 1, line.size(), state_->file);
        std::fflush(state_->file);
    }
    if (state_->echo && message.severity >= state_->echoMinimum) {
        const std::string line = FormatLine(message, false);
        if (state_->echoWriter) {
            state_->echoWriter(line);
        } else {
            const std::string withBreak = line + "\n";
            [[maybe_unused]] const auto written =
                ::write(STDERR_FILENO, withBreak.data(), withBreak.size());
        }
    }
}

} // namespace TrelmSDK
