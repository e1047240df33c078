// Bounded, thread-safe message storage shared by the render message window and the system log.
#include <trelm/log/log_output.h>
#include <trelm/log/message_sink.h>

#include <algorithm>

namespace TrelmSDK {

std::string_view SeverityName(MessageSeverity severity) {
    switch (severity) {
    case MessageSeverity::Debug:
        return "debug";
    case MessageSeverity::Info:
        return "info";
    case MessageSeverity::Warning:
        return "warning";
    case MessageSeverity::Error:
        return "error";
    case MessageSeverity::Fatal:
        return "fatal";
    }
    return "info";
}

MessageSink::MessageSink(std::string channel, std::size_t capacity)
    : channel_(std::move(channel)), capacity_(std::max<std::size_t>(capacity, 1)) {}

std::uint64_t MessageSink::Add(LogMessage message) {
    std::vector<std::shared_ptr<const Listener>> listeners;
    {
        std::lock_guard lock(mutex_);
        message.sequence = nextSequence_++;
        message.time = std::chrono::system_clock::now();
        message.channel = channel_;
        messages_.push_back(message);
        trimLocked();
        // Written under the sink's lock so that the file keeps the channel's order.
        LogOutput::Instance().Write(message);
        listeners.reserve(listeners_.size());
        for (const auto& entry : listeners_) listeners.push_back(entry.second);
    }
    for (const auto& listener : listeners) (*listener)(message);
    return message.sequence;
}

void MessageSink::trimLocked() {
    while (messages_.size() > capacity_) {
        messages_.pop_front();
        ++dropped_;
    }
}

std::vector<LogMessage> MessageSink::Snapshot() const {
    std::lock_guard lock(mutex_);
    return {messages_.begin(), messages_.end()};
}

std::vector<LogMessage> MessageSink::Since(std::uint64_t sequence) const {
    std::lock_guard lock(mutex_);
    // Sequence numbers increase along the queue, so the first newer message is found by halving.
    const auto first =
        std::partition_point(messages_.begin(), messages_.end(),
                             [&](const LogMessage& m) { return m.sequence <= sequence; });
    return {first, messages_.end()};
}

std::uint64_t MessageSink::LastSequence() const {
    std::lock_guard lock(mutex_);
    return nextSequence_ - 1;
}

std::size_t MessageSink::Size() const {
    std::lock_guard lock(mutex_);
    return messages_.size();
}

std::size_t MessageSink::Capacity() const {
    std::lock_guard lock(mutex_);
    return capacity_;
}

void MessageSink::SetCapacity(std::size_t capacity) {
    std::lock_guard lock(mutex_);
    capacity_ = std::max<std::size_t>(capacity, 1);
    trimLocked();
}

std::uint64_t MessageSink::Dropped() const {
    std::lock_guard lock(mutex_);
    return dropped_;
}

void MessageSink::Clear() {
    std::lock_guard lock(mutex_);
    messages_.clear();
}

int MessageSink::AddListener(Listener listener) {
    std::lock_guard lock(mutex_);
    const int id = nextListenerId_++;
    listeners_.emplace_back(id, std::make_shared<const Listener>(std::move(listener)));
    return id;
}

void MessageSink::RemoveListener(int id) {
    std::lock_guard lock(mutex_);
    std::erase_if(listeners_, [id](const auto& entry) { return entry.first == id; });
}

} // namespace TrelmSDK
