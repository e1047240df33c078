// The SDK error channel: one handler, serialised so that reports from render threads do not
// interleave.
#include <trelm/core/sdk_errors.h>

#include <cstdio>
#include <mutex>

namespace TrelmSDK {

namespace {
struct ErrorChannel {
    std::mutex mutex; // guards handler; taken by every reporting thread
    SDKErrorHandler handler;
};

ErrorChannel& Channel() {
    // Never destroyed: objects torn down at exit may still report.
    static auto* channel = new ErrorChannel;
    return *channel;
}
} // namespace

SDKErrorHandler SetSDKErrorHandler(SDKErrorHandler handler) {
    auto& c = Channel();
    std::lock_guard lock(c.mutex);
    std::swap(c.handler, handler);
    return handler;
}

void ReportSDKError(const MSTR& text) {
    auto& c = Channel();
    std::lock_guard lock(c.mutex);
    if (c.handler) {
        c.handler(text);
    } else {
        std::fprintf(stderr, "Trelm SDK: %s\n", ToUTF8(text).c_str());
    }
}

} // namespace TrelmSDK
