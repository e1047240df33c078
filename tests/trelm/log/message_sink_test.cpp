#include <trelm/log/message_sink.h>

#include <gtest/gtest.h>

#include <atomic>
#include <map>
#include <thread>

using namespace TrelmSDK;

namespace {
LogMessage textMessage(std::string text, MessageSeverity severity = MessageSeverity::Info) {
    LogMessage m;
    m.text = std::move(text);
    m.severity = severity;
    return m;
}
} // namespace

TEST(MessageSink, KeepsTheNewestMessagesUpToItsCapacity) {
    MessageSink sink("test", 3);
    for (int i = 1; i <= 5; ++i)
        EXPECT_EQ(sink.Add(textMessage(std::string("m").append(std::to_string(i)))), i);
    EXPECT_EQ(sink.Size(), 3u);
    EXPECT_EQ(sink.Dropped(), 2u);
    const auto all = sink.Snapshot();
    ASSERT_EQ(all.size(), 3u);
    EXPECT_EQ(all.front().text, "m3");
    EXPECT_EQ(all.front().sequence, 3u);
    EXPECT_EQ(all.back().channel, "test");
    const auto recent = sink.Since(4);
    ASSERT_EQ(recent.size(), 1u);
    EXPECT_EQ(recent[0].text, "m5");
    EXPECT_TRUE(sink.Since(5).empty());
    EXPECT_EQ(sink.Since(0).size(), 3u);
}

TEST(MessageSink, ShrinkingAndClearingKeepSequenceNumbersGoing) {
    MessageSink sink("test", 10);
    for (int i = 0; i < 6; ++i) sink.Add(textMessage("x"));
    sink.SetCapacity(2);
    EXPECT_EQ(sink.Size(), 2u);
    EXPECT_EQ(sink.Dropped(), 4u);
    sink.SetCapacity(0);
    EXPECT_EQ(sink.Capacity(), 1u);
    sink.Clear();
    EXPECT_EQ(sink.Size(), 0u);
    EXPECT_EQ(sink.Add(textMessage("after")), 7u);
    EXPECT_EQ(sink.LastSequence(), 7u);
}

TEST(MessageSink, ListenersHearEveryMessageUntilRemoved) {
    MessageSink sink("test");
    std::vector<std::string> heard;
    const int id = sink.AddListener([&](const LogMessage& m) { heard.push_back(m.text); });
    sink.Add(textMessage("one"));
    sink.Add(textMessage("two"));
    sink.RemoveListener(id);
    sink.Add(textMessage("three"));
    EXPECT_EQ(heard, (std::vector<std::string>{"one", "two"}));
}

TEST(MessageSink, ListenerMayLogWithoutDeadlock) {
    MessageSink sink("test");
    sink.AddListener([&](const LogMessage& m) {
        if (m.text == "first") sink.Add(textMessage("echo"));
    });
    sink.Add(textMessage("first"));
    EXPECT_EQ(sink.Size(), 2u);
}

TEST(MessageSink, ConcurrentWritersLoseNothingAndKeepTheirOrder) {
    constexpr int kThreads = 8, kPerThread = 2000;
    MessageSink sink("test", kThreads * kPerThread);
    std::atomic<int> listened{0};
    sink.AddListener([&](const LogMessage&) { listened.fetch_add(1, std::memory_order_relaxed); });
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back([&sink, t] {
            for (int i = 0; i < kPerThread; ++i)
                sink.Add(textMessage(std::to_string(t) + ":" + std::to_string(i)));
        });
    // A reader polls while the writers run, as the UI does.
    std::uint64_t seen = 0;
    std::size_t polled = 0;
    while (polled < static_cast<std::size_t>(kThreads * kPerThread)) {
        const auto fresh = sink.Since(seen);
        for (const auto& m : fresh) {
            EXPECT_EQ(m.sequence, seen + 1);
            seen = m.sequence;
        }
        polled += fresh.size();
    }
    for (auto& thread : threads) thread.join();

    const auto all = sink.Snapshot();
    ASSERT_EQ(all.size(), static_cast<std::size_t>(kThreads * kPerThread));
    EXPECT_EQ(listened.load(), kThreads * kPerThread);
    std::map<int, int> next;
    for (std::size_t k = 0; k < all.size(); ++k) {
        EXPECT_EQ(all[k].sequence, k + 1);
        const auto colon = all[k].text.find(':');
        const int t = std::stoi(all[k].text.substr(0, colon));
        const int i = std::stoi(all[k].text.substr(colon + 1));
        EXPECT_EQ(i, next[t]++) << "thread " << t << " out of order";
    }
    EXPECT_EQ(sink.Dropped(), 0u);
}
