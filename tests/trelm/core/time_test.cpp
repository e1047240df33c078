#include <trelm/core/time.h>

#include <gtest/gtest.h>

using namespace TrelmSDK;

TEST(Interval, ForeverAndNever) {
    EXPECT_TRUE(FOREVER.IsInfinite());
    EXPECT_TRUE(FOREVER.InInterval(0));
    EXPECT_TRUE(FOREVER.InInterval(TIME_PosInfinity));
    EXPECT_TRUE(NEVER.Empty());
    EXPECT_FALSE(NEVER.InInterval(0));
    EXPECT_EQ(NEVER.Start(), static_cast<TimeValue>(0x80000000));
}

TEST(Interval, IntersectionNarrowsAndEmpties) {
    Interval a(0, 100), b(50, 200);
    EXPECT_EQ(a & b, Interval(50, 100));
    EXPECT_TRUE((a & Interval(101, 200)).Empty());
    EXPECT_TRUE((a & NEVER).Empty());
    Interval v = FOREVER;
    v &= Interval(10, 10);
    EXPECT_TRUE(v.InInterval(10));
    EXPECT_FALSE(v.InInterval(11));
}

TEST(FrameRate, RejectsRatesThatDoNotDivideTicks) {
    EXPECT_EQ(GetTicksPerFrame(), 160);
    SetFrameRate(7);
    EXPECT_EQ(GetFrameRate(), 30);
    SetFrameRate(25);
    EXPECT_EQ(GetTicksPerFrame(), 192);
    SetFrameRate(30);
}
