#include <trelm/core/mstr.h>
#include <trelm/core/resource_strings.h>
#include <trelm/core/sdk_errors.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <fstream>

using namespace TrelmSDK;

TEST(ResourceStrings, ReadByNumberPerModule) {
    HINSTANCE a = RegisterModuleInstance(L"tests_module_a");
    HINSTANCE b = RegisterModuleInstance(L"tests_module_b");
    EXPECT_EQ(RegisterModuleInstance(L"tests_module_a"), a);
    EXPECT_NE(a, b);
    EXPECT_EQ(ModuleInstanceName(a), L"tests_module_a");
    SetResourceString(a, 9, L"Tessel Map");
    SetResourceStrings(b, {{9, L"Other"}, {2, L"Maps"}});
    EXPECT_STREQ(GetResourceString(a, 9), L"Tessel Map");
    EXPECT_STREQ(GetResourceString(b, 9), L"Other");
    EXPECT_EQ(GetResourceString(a, 2), nullptr) << "a missing string reads as none";
    EXPECT_EQ(GetResourceString(nullptr, 9), nullptr);

    MCHAR buf[256];
    EXPECT_EQ(LoadString(a, 9, buf, 256), 10);
    EXPECT_STREQ(buf, L"Tessel Map");
    EXPECT_EQ(LoadString(a, 9, buf, 7), 6) << "truncated to the buffer with its terminator";
    EXPECT_STREQ(buf, L"Tessel");
    EXPECT_EQ(LoadString(a, 77, buf, 256), 0);
    EXPECT_STREQ(buf, L"");
}

TEST(ResourceStrings, TableFilesWithEscapesAndBadLines) {
    auto dir = std::filesystem::temp_directory_path();
    auto good = (dir / "trelm_strings_good.txt").string();
    auto bad = (dir / "trelm_strings_bad.txt").string();
    {
        std::ofstream f(good, std::ios::binary);
        f << "# module strings\n1\tTessel \xC3\xA9\\tmap\r\n\n7\tChange\\nshader \\\\ code\n";
    }
    {
        std::ofstream f(bad, std::ios::binary);
        f << "3\tfine\nnot a number\ttext\n";
    }
    HINSTANCE m = RegisterModuleInstance(L"tests_module_files");
    SetResourceString(m, 3, L"before");
    ASSERT_TRUE(LoadStringTableFile(m, good));
    EXPECT_STREQ(GetResourceString(m, 1), L"Tessel \u00e9\tmap");
    EXPECT_STREQ(GetResourceString(m, 7), L"Change\nshader \\ code");

    std::vector<MSTR> errors;
    auto previous = SetSDKErrorHandler([&](const MSTR& e) { errors.push_back(e); });
    EXPECT_FALSE(LoadStringTableFile(m, bad));
    EXPECT_FALSE(LoadStringTableFile(m, (dir / "trelm_strings_missing.txt").string()));
    SetSDKErrorHandler(previous);
    ASSERT_EQ(errors.size(), 2u);
    EXPECT_NE(errors[0].find(L"line 2"), MSTR::npos);
    EXPECT_STREQ(GetResourceString(m, 3), L"before") << "a bad file changes nothing";
    std::filesystem::remove(good);
    std::filesystem::remove(bad);
}

TEST(Text, Utf8RoundTripAndMalformedBytes) {
    const std::string utf8 = "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x8E\xA8";
    MSTR wide = FromUTF8(utf8);
    EXPECT_EQ(wide, MSTR(L"a\u00e9\u20ac\U0001F3A8"));
    EXPECT_EQ(ToUTF8(wide), utf8);
    EXPECT_EQ(FromUTF8("x\xFFy"), MSTR(L"x\uFFFDy"));
    EXPECT_EQ(FromUTF8("\xC3"), MSTR(L"\uFFFD")) << "a truncated sequence";
    EXPECT_EQ(FromUTF8("\xC0\xAF"), MSTR(L"\uFFFD\uFFFD")) << "an overlong form";
}
