// Animation time in ticks and validity intervals, the host's unit of "when".
#pragma once

#include <cstdint>

namespace TrelmSDK {

// Time in ticks: 4800 per second.
using TimeValue = int32_t;

inline constexpr TimeValue TICKS_PER_SECOND = 4800;
inline constexpr TimeValue TIME_NegInfinity = static_cast<TimeValue>(0x80000000);
inline constexpr TimeValue TIME_PosInfinity = 0x7fffffff;

// Frames per second of the scene; 30 unless the scene says otherwise.
int GetFrameRate();
void SetFrameRate(int fps);
inline int GetTicksPerFrame() {
    return TICKS_PER_SECOND / GetFrameRate();
}

// Conversions between ticks, seconds and (possibly fractional) frames at the current frame rate.
inline double TicksToSec(TimeValue t) {
    return static_cast<double>(t) / TICKS_PER_SECOND;
}
inline TimeValue SecToTicks(double s) {
    return static_cast<TimeValue>(s * TICKS_PER_SECOND);
}
inline double TicksToFrames(TimeValue t) {
    return static_cast<double>(t) / GetTicksPerFrame();
}
inline TimeValue FramesToTicks(double f) {
    return static_cast<TimeValue>(f * GetTicksPerFrame());
}

// The scene's current animation time (the time slider). Written on the main thread; panels and
// updates read it there too.
TimeValue GetAnimTime();
void SetAnimTime(TimeValue t);

// A closed time interval [start, end]. "never" is the empty interval (both ends 0x80000000);
// "forever" covers all time.
class Interval {
public:
    constexpr Interval() : start_(TIME_NegInfinity), end_(TIME_NegInfinity) {}
    constexpr Interval(TimeValue start, TimeValue end) : start_(start), end_(end) {}

    constexpr TimeValue Start() const { return start_; }
    constexpr TimeValue End() const { return end_; }
    constexpr void Set(TimeValue start, TimeValue end) { start_ = start, end_ = end; }
    constexpr void SetStart(TimeValue t) { start_ = t; }
    constexpr void SetEnd(TimeValue t) { end_ = t; }
    constexpr void SetInfinite() { Set(TIME_NegInfinity, TIME_PosInfinity); }
    constexpr void SetEmpty() { Set(TIME_NegInfinity, TIME_NegInfinity); }
    constexpr void SetInstant(TimeValue t) { Set(t, t); }

    constexpr bool Empty() const { return start_ == TIME_NegInfinity && end_ == TIME_NegInfinity; }
    constexpr bool IsInfinite() const {
        return start_ == TIME_NegInfinity && end_ == TIME_PosInfinity;
    }
    constexpr bool InInterval(TimeValue t) const { return !Empty() && t >= start_ && t <= end_; }

    // Intersection: the part of time both intervals cover.
    constexpr Interval operator&(const Interval& o) const {
        if (Empty() || o.Empty()) return Interval();
        TimeValue s = start_ > o.start_ ? start_ : o.start_;
        TimeValue e = end_ < o.end_ ? end_ : o.end_;
        return s > e ? Interval() : Interval(s, e);
    }
    constexpr Interval& operator&=(const Interval& o) { return *this = *this & o; }
    constexpr bool operator==(const Interval& o) const = default;

private:
    TimeValue start_, end_;
};

inline constexpr Interval FOREVER{TIME_NegInfinity, TIME_PosInfinity};
inline constexpr Interval NEVER{TIME_NegInfinity, TIME_NegInfinity};

} // namespace TrelmSDK

using TrelmSDK::FOREVER;
using TrelmSDK::Interval;
using TrelmSDK::NEVER;
using TrelmSDK::TimeValue;
