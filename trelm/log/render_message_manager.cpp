// The render message window's channel.
#include <trelm/log/render_message_manager.h>

#include <trelm/core/mstr.h>

namespace TrelmSDK {

MessageSeverity RenderMessageSeverity(std::uint32_t type) {
    switch (type) {
    case kType_Fatal:
        return MessageSeverity::Fatal;
    case kType_Error:
        return MessageSeverity::Error;
    case kType_Warning:
        return MessageSeverity::Warning;
    case kType_Debug:
        return MessageSeverity::Debug;
    default:
        return MessageSeverity::Info;
    }
}

void IRenderMessageManager::LogMessage(int source, std::uint32_t type, std::uint32_t systemLogType,
                                       std::string_view text) {
    TrelmSDK::LogMessage message;
    message.source = source;
    message.type = type;
    message.systemLogType = systemLogType;
    message.severity = RenderMessageSeverity(type);
    message.text = std::string(text);
    sink_.Add(std::move(message));
}

void IRenderMessageManager::LogMessage(int source, std::uint32_t type, std::uint32_t systemLogType,
                                       std::wstring_view text) {
    LogMessage(source, type, systemLogType, std::string_view(ToUTF8(text)));
}

std::vector<TrelmSDK::LogMessage> IRenderMessageManager::MessagesOf(int source) const {
    std::vector<TrelmSDK::LogMessage> all = sink_.Snapshot();
    std::erase_if(all, [source](const TrelmSDK::LogMessage& m) { return m.source != source; });
    return all;
}

IRenderMessageManager& GetRenderMessageManager() {
    // Never destroyed: render threads may report until the process ends.
    static IRenderMessageManager* manager = [] {
        auto* created = new IRenderMessageManager;
        RegisterCOREInterface(created);
        return created;
    }();
    return *manager;
}

namespace {
// Makes the manager reachable through GetCOREInterface from the start.
[[maybe_unused]] const bool registeredAtStart = (GetRenderMessageManager(), true);
} // namespace

} // namespace TrelmSDK
