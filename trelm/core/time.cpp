// Scene frame rate shared by controllers and expressions.
#include <trelm/core/time.h>

#include <atomic>

namespace TrelmSDK {

namespace {
// Written on the main thread when a scene is loaded; read by any thread evaluating time.
std::atomic<int> g_frameRate{30};
// Written and read on the main thread; atomic so that a stray read elsewhere is still defined.
std::atomic<TimeValue> g_animTime{0};
} // namespace

int GetFrameRate() {
    return g_frameRate.load(std::memory_order_relaxed);
}

void SetFrameRate(int fps) {
    if (fps > 0 && TICKS_PER_SECOND % fps == 0) g_frameRate.store(fps, std::memory_order_relaxed);
}

TimeValue GetAnimTime() {
    return g_animTime.load(std::memory_order_relaxed);
}

void SetAnimTime(TimeValue t) {
    g_animTime.store(t, std::memory_order_relaxed);
}

} // namespace TrelmSDK
