// The in-memory record of one message channel (render message window or system log): bounded,
// shared by every thread that reports and by the UI that lists the messages.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace TrelmSDK {

// A channel-independent grading, used to filter the echo and by the UI.
enum class MessageSeverity { Debug, Info, Warning, Error, Fatal };

std::string_view SeverityName(MessageSeverity severity);

struct LogMessage {
    std::uint64_t sequence = 0; // 1 for a channel's first message, increasing by one
    std::chrono::system_clock::time_point time;
    std::string channel;    // "render" or "system"
    int source = -1;        // render message source; -1 on the system log
    std::uint32_t type = 0; // the channel's own type code (render message type or system-log type)
    std::uint32_t systemLogType = 0; // the system-log type given with a render message
    bool dialog = false;             // the caller asked for a dialog (system log)
    MessageSeverity severity = MessageSeverity::Info;
    std::string title; // system-log title, e.g. "OSLTex"
    std::string text;  // UTF-8, plain text (never a format)
};

// Thread-safe: Add may be called from any thread (render threads included) and takes one mutex;
// readers get copies. When the capacity is reached the oldest messages are dropped and counted.
class MessageSink {
public:
    using Listener = std::function<void(const LogMessage&)>;

    explicit MessageSink(std::string channel, std::size_t capacity = 10000);
    MessageSink(const MessageSink&) = delete;
    MessageSink& operator=(const MessageSink&) = delete;

    const std::string& Channel() const { return channel_; }

    // Stores the message (its sequence, time and channel are filled in), appends it to the log
    // file and echoes it when those are enabled (LogOutput), then calls the listeners. Returns
    // the sequence number given.
    std::uint64_t Add(LogMessage message);

    std::vector<LogMessage> Snapshot() const;
    // Messages with a sequence number above `sequence` still held: what a UI polls for.
    std::vector<LogMessage> Since(std::uint64_t sequence) const;
    std::uint64_t LastSequence() const;
    std::size_t Size() const;
    std::size_t Capacity() const;
    void SetCapacity(std::size_t capacity); // at least 1; drops the oldest when shrinking
    std::uint64_t Dropped() const;
    void Clear(); // forgets the messages held; sequence numbers keep increasing

    // Listeners run on the thread that added the message, outside the sink's lock, possibly on
    // several threads at once; they must be quick and thread-safe (a UI posts to its own thread).
    int AddListener(Listener listener);
    void RemoveListener(int id);

private:
    void trimLocked();

    const std::string channel_;
    mutable std::mutex mutex_; // guards everything below
    std::deque<LogMessage> messages_;
    std::size_t capacity_;
    std::uint64_t nextSequence_ = 1;
    std::uint64_t dropped_ = 0;
    std::vector<std::pair<int, std::shared_ptr<const Listener>>> listeners_;
    int nextListenerId_ = 1;
};

} // namespace TrelmSDK
