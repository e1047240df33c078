#include <trelm/core/notifications.h>
#include <trelm/scene/color_pipeline.h>

#include <gtest/gtest.h>

using namespace TrelmSDK;

TEST(ColorPipeline, SRGBDecodesToLinear) {
    ColorPipelineManager cm;
    auto conv = cm.GetConverter("sRGB", "linear");
    ASSERT_TRUE(conv);
    const Color c = conv->Convert(Color(0.5f, 0.0f, 1.0f));
    EXPECT_NEAR(c.x, 0.21404f, 1e-4f);
    EXPECT_NEAR(c.y, 0.0f, 1e-6f);
    EXPECT_NEAR(c.z, 1.0f, 1e-5f);
    // The linear segment near black.
    EXPECT_NEAR(conv->Convert(Color(0.02f, 0.02f, 0.02f)).x, 0.02f / 12.92f, 1e-7f);
}

TEST(ColorPipeline, ACEScgRoundTripsAndKeepsWhite) {
    ColorPipelineManager cm;
    auto to = cm.GetConverter("linear", "ACEScg");
    auto from = cm.GetConverter("ACEScg", "linear");
    ASSERT_TRUE(to && from);
    const Color white = to->Convert(Color(1, 1, 1));
    EXPECT_NEAR(white.x, 1, 1e-4f);
    EXPECT_NEAR(white.y, 1, 1e-4f);
    EXPECT_NEAR(white.z, 1, 1e-4f);
    const Color red = to->Convert(Color(1, 0, 0));
    EXPECT_NEAR(red.x, 0.6131f, 1e-3f);
    EXPECT_NEAR(red.y, 0.0702f, 1e-3f);
    const Color back = from->Convert(red);
    EXPECT_NEAR(back.x, 1, 1e-4f);
    EXPECT_NEAR(back.y, 0, 1e-4f);
    EXPECT_NEAR(back.z, 0, 1e-4f);
}

TEST(ColorPipeline, NamesAliasesAndUnknownSpaces) {
    EXPECT_EQ(ColorPipelineManager::Canonical("Linear Rec.709"), "linear");
    EXPECT_EQ(ColorPipelineManager::Canonical("acescg"), "ACEScg");
    EXPECT_EQ(ColorPipelineManager::Canonical("srgb"), "sRGB");
    EXPECT_EQ(ColorPipelineManager::Canonical("P3"), "");
    ColorPipelineManager cm;
    std::string error;
    EXPECT_FALSE(cm.GetConverter("P3", "linear", &error));
    EXPECT_NE(error.find("P3"), std::string::npos);
    EXPECT_FALSE(cm.SetRenderingSpace("raw"));
    EXPECT_EQ(cm.RenderingSpace(), "linear");
    EXPECT_EQ(ColorPipelineManager::FileColorSpace("", false), "sRGB");
    EXPECT_EQ(ColorPipelineManager::FileColorSpace("", true), "linear");
    EXPECT_EQ(ColorPipelineManager::FileColorSpace("ACEScg", false), "ACEScg");
}

TEST(ColorPipeline, ChangesReachListenersAndArraysConvertInPlace) {
    ColorPipelineManager cm;
    int heard = 0, broadcasts = 0;
    cm.AddChangeListener([&] { ++heard; });
    auto count = [](void* param, NotifyInfo*) { ++*static_cast<int*>(param); };
    RegisterNotification(count, &broadcasts, NOTIFY_COLOR_MANAGEMENT_CHANGED);
    cm.SetColorManagementActive(false);
    cm.SetColorManagementActive(false); // no change, no call
    EXPECT_TRUE(cm.SetRenderingSpace("ACEScg"));
    UnRegisterNotification(count, &broadcasts, NOTIFY_COLOR_MANAGEMENT_CHANGED);
    EXPECT_EQ(heard, 2);
    EXPECT_EQ(broadcasts, 2);
    EXPECT_EQ(cm.GetConverter("sRGB", "sRGB"), cm.GetConverter("srgb", "sRGB")); // cached

    auto conv = cm.GetConverter("linear", "sRGB");
    float rgba[8] = {0.21404f, 0.21404f, 0.21404f, 0.25f, 1, 0, 0, 0.75f};
    conv->ConvertArray(rgba, 2, 4 * sizeof(float));
    EXPECT_NEAR(rgba[0], 0.5f, 1e-4f);
    EXPECT_EQ(rgba[3], 0.25f); // alpha untouched
    EXPECT_NEAR(rgba[4], 1.0f, 1e-5f);
    EXPECT_EQ(rgba[7], 0.75f);
}
