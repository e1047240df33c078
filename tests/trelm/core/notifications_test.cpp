#include <trelm/core/notifications.h>

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

using namespace TrelmSDK;

namespace {
// Codes chosen away from the host's so that these tests never meet other registrations.
constexpr int kCodeA = 900001;
constexpr int kCodeB = 900002;

struct Log {
    std::vector<int> codes;
    std::vector<void*> params;
};

void Record(void* param, NotifyInfo* info) {
    auto* log = static_cast<Log*>(param);
    log->codes.push_back(info->intcode);
    log->params.push_back(info->callParam);
}
} // namespace

TEST(Notifications, CallbacksGetTheirUserDataAndTheInformationRecord) {
    Log one, two;
    ASSERT_TRUE(RegisterNotification(Record, &one, kCodeA));
    ASSERT_TRUE(RegisterNotification(Record, &two, kCodeA));
    ASSERT_TRUE(RegisterNotification(Record, &one, kCodeB));
    EXPECT_FALSE(RegisterNotification(Record, &one, kCodeA)) << "registered once only";
    EXPECT_FALSE(RegisterNotification(nullptr, &one, kCodeA));

    int record = 42;
    BroadcastNotification(kCodeA, &record);
    BroadcastNotification(kCodeB);
    EXPECT_EQ(one.codes, (std::vector<int>{kCodeA, kCodeB}));
    EXPECT_EQ(one.params, (std::vector<void*>{&record, nullptr}));
    EXPECT_EQ(two.codes, (std::vector<int>{kCodeA}));

    EXPECT_TRUE(UnRegisterNotification(Record, &two, kCodeA));
    EXPECT_FALSE(UnRegisterNotification(Record, &two, kCodeA));
    BroadcastNotification(kCodeA);
    EXPECT_EQ(two.codes.size(), 1u);
    EXPECT_EQ(UnRegisterNotification(Record, &one), 2);
    BroadcastNotification(kCodeA);
    BroadcastNotification(kCodeB);
    EXPECT_EQ(one.codes.size(), 3u);
}

TEST(Notifications, UnregisteringDuringABroadcastSkipsTheRemovedCallback) {
    Log log;
    struct Remover {
        Log* victim;
    } remover{&log};
    auto removeVictim = [](void* param, NotifyInfo*) {
        auto* r = static_cast<Remover*>(param);
        UnRegisterNotification(Record, r->victim, kCodeA);
    };
    ASSERT_TRUE(RegisterNotification(removeVictim, &remover, kCodeA));
    ASSERT_TRUE(RegisterNotification(Record, &log, kCodeA));
    BroadcastNotification(kCodeA);
    EXPECT_TRUE(log.codes.empty()) << "removed before its turn came";
    UnRegisterNotification(removeVictim, &remover);
}

TEST(Notifications, RegistrationAndBroadcastFromSeveralThreads) {
    std::atomic<int> calls{0};
    auto count = [](void* param, NotifyInfo*) {
        static_cast<std::atomic<int>*>(param)->fetch_add(1);
    };
    ASSERT_TRUE(RegisterNotification(count, &calls, kCodeB));
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([t, &calls, count] {
            for (int i = 0; i < 500; ++i) {
                // Churn registrations under another code while broadcasting this one.
                RegisterNotification(count, &calls + 0, kCodeA + 10 + t);
                BroadcastNotification(kCodeB);
                UnRegisterNotification(count, &calls, kCodeA + 10 + t);
            }
        });
    for (auto& th : threads) th.join();
    EXPECT_EQ(calls.load(), 4 * 500);
    UnRegisterNotification(count, &calls);
}
