// The render message window: messages from renderers and maps, grouped by source (one tab per
// source in the UI) and typed from fatal to debug.
#pragma once

#include <trelm/core/core_interface.h>
#include <trelm/log/message_sink.h>

#include <cstdint>
#include <string_view>
#include <vector>

namespace TrelmSDK {

// Message sources (window tabs).
enum MessageSource : int {
    kSource_ActiveShade = 0,
    kSource_MaterialEditor = 1,
    kSource_ProductionRender = 2,
};

// Message types; the values are bits so that a UI can filter with a mask.
enum MessageType : std::uint32_t {
    kType_Fatal = 1,
    kType_Error = 2,
    kType_Warning = 4,
    kType_Info = 8,
    kType_Progress = 16,
    kType_Debug = 32,
};

// The identifier under which GetCOREInterface hands out the manager. It is registered when the
// process starts (as soon as anything in the program uses the manager).
inline constexpr Interface_ID IRENDERMESSAGEMANAGER_INTERFACE_ID{0x794E519B, 0x3A74408A};

MessageSeverity RenderMessageSeverity(std::uint32_t type);

// Thread-safe: render threads report through it while the UI reads. The system-log type given
// with a message is recorded with it; the message is not copied into the system log (callers
// that want a system-log entry write one themselves).
class IRenderMessageManager : public FPInterface {
public:
    Interface_ID GetID() const override { return IRENDERMESSAGEMANAGER_INTERFACE_ID; }

    void LogMessage(int source, std::uint32_t type, std::uint32_t systemLogType,
                    std::string_view text);
    void LogMessage(int source, std::uint32_t type, std::uint32_t systemLogType,
                    std::wstring_view text);

    // The messages of one source still held, oldest first.
    std::vector<TrelmSDK::LogMessage> MessagesOf(int source) const;

    MessageSink& Messages() { return sink_; }
    const MessageSink& Messages() const { return sink_; }

private:
    MessageSink sink_{"render"};
};

IRenderMessageManager& GetRenderMessageManager();

} // namespace TrelmSDK

using TrelmSDK::IRenderMessageManager;
