// Routing of OSLC_ErrorHandler messages to the render message window and the system log.
#include "compile/oslc_error_handler.h"

#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace {

struct Row {
    int code;
    std::uint32_t renderType, systemLogType, logEntry;
};

} // namespace

TEST(OSLCErrorHandler, RoutesEverySeverityAsTheTableSays) {
    const Row rows[] = {{0x10000, 8, 4, 0}, {0x20000, 4, 2, 2},  {0x30000, 2, 1, 1},
                        {0x40000, 1, 1, 1}, {0x50000, 32, 8, 0}, {0, 32, 8, 0}};
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    auto& system = TrelmSDK::GetSystemLog().Messages();
    for (const Row& row : rows) {
        SCOPED_TRACE(row.code);
        const auto renderBefore = render.LastSequence();
        const auto systemBefore = system.LastSequence();
        const std::string text = "routing %s %d check " + std::to_string(row.code);
        SharedOSLCErrorHandler()(row.code | 7, text);
        auto sent = render.Since(renderBefore);
        ASSERT_EQ(sent.size(), 1u);
        EXPECT_EQ(sent[0].source, 1);
        EXPECT_EQ(sent[0].type, row.renderType);
        EXPECT_EQ(sent[0].systemLogType, row.systemLogType);
        EXPECT_EQ(sent[0].text, text); // plain text, never a format
        auto logged = system.Since(systemBefore);
        if (row.logEntry == 0) {
            EXPECT_TRUE(logged.empty());
        } else {
            ASSERT_EQ(logged.size(), 1u);
            EXPECT_EQ(logged[0].type, row.logEntry);
            EXPECT_EQ(logged[0].title, "OSLTex");
            EXPECT_FALSE(logged[0].dialog);
            EXPECT_EQ(logged[0].text, text);
        }
    }
}

TEST(OSLCErrorHandler, KeepsNonAsciiText) {
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    const auto before = render.LastSequence();
    SharedOSLCErrorHandler()(0x10000, "Gr\xC3\xBC\xC3\x9F"
                                      "e");
    auto sent = render.Since(before);
    ASSERT_EQ(sent.size(), 1u);
    EXPECT_EQ(sent[0].text, "Gr\xC3\xBC\xC3\x9F"
                            "e");
}

TEST(OSLCErrorHandler, SerialisesMessagesFromManyThreads) {
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    const auto before = render.LastSequence();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([] {
            for (int i = 0; i < 50; ++i) SharedOSLCErrorHandler()(0x10000, "threaded message");
        });
    for (auto& t : threads) t.join();
    int count = 0;
    for (const auto& m : render.Since(before)) count += m.text == "threaded message";
    EXPECT_EQ(count, 200);
}

TEST(OSLCErrorHandler, IsOneSharedInstance) {
    EXPECT_EQ(&SharedOSLCErrorHandler(), &SharedOSLCErrorHandler());
}
