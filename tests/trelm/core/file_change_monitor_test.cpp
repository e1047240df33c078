// The file-change monitor: real files in a scratch folder, deliveries through the main-thread
// queue.
#include <trelm/core/file_change_monitor.h>
#include <trelm/core/main_thread.h>
#include <trelm/core/sdk_errors.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

namespace fs = std::filesystem;
using namespace std::chrono_literals;

namespace {

struct Seen {
    std::vector<MSTR> paths;
};

void Record(const MSTR& path, void* param) {
    static_cast<Seen*>(param)->paths.push_back(path);
}

void Write(const fs::path& file, const std::string& text) {
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out << text;
}

// Pumps the main-thread queue until pred holds or about five seconds passed.
template <class Pred>
bool PumpUntil(Pred pred) {
    const auto end = std::chrono::steady_clock::now() + 5s;
    while (!pred()) {
        if (std::chrono::steady_clock::now() > end) return false;
        TrelmSDK::MainThreadTaskManager::Instance().WaitAndPump(20ms);
    }
    return true;
}

// Runs whatever is already queued or arrives within a short settling time.
void Drain() {
    for (int i = 0; i < 10; ++i) TrelmSDK::MainThreadTaskManager::Instance().WaitAndPump(20ms);
}

class FileChangeMonitorTest : public ::testing::Test {
protected:
    void SetUp() override {
        TrelmSDK::MainThreadTaskManager::Instance().BindToCurrentThread();
        std::string pattern = (fs::temp_directory_path() / "trelm-watch-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        dir = pattern;
    }
    void TearDown() override {
        Drain();
        std::error_code ec;
        fs::remove_all(dir, ec);
    }
    fs::path dir;
    TrelmSDK::FileChangeMonitor monitor;
};

} // namespace

TEST(FileChangeMonitorInterface, IsTheCoreInterface4097) {
    auto* found = GetCOREInterface(TrelmSDK::FILE_CHANGE_MONITOR_INTERFACE_ID);
    ASSERT_NE(found, nullptr);
    EXPECT_EQ(found, &TrelmSDK::FileChangeMonitor::Instance());
    EXPECT_EQ(TrelmSDK::FILE_CHANGE_MONITOR_INTERFACE_ID.PartA(), 4097u);
}

TEST_F(FileChangeMonitorTest, DeliversAWriteOnTheMainThreadWithThePathGiven) {
    const fs::path file = dir / "a.osl";
    Write(file, "one");
    Seen seen;
    const MSTR path = file.wstring();
    const auto h = monitor.AddWatch(path, &Record, &seen);
    ASSERT_NE(h, 0u);
    Write(file, "two");
    ASSERT_TRUE(PumpUntil([&] { return !seen.paths.empty(); }));
    EXPECT_EQ(seen.paths[0], path);
    EXPECT_TRUE(monitor.RemoveWatch(h));
}

TEST_F(FileChangeMonitorTest, SeesAFileReplacedByRename) {
    const fs::path file = dir / "b.osl";
    Write(file, "one");
    Seen seen;
    const auto h = monitor.AddWatch(file.wstring(), &Record, &seen);
    ASSERT_NE(h, 0u);
    Write(dir / "b.osl.tmp", "two");
    fs::rename(dir / "b.osl.tmp", file);
    ASSERT_TRUE(PumpUntil([&] { return !seen.paths.empty(); }));
    monitor.RemoveWatch(h);
}

TEST_F(FileChangeMonitorTest, WatchesAFileThatAppearsLater) {
    const fs::path file = dir / "later.osl";
    Seen seen;
    const auto h = monitor.AddWatch(file.wstring(), &Record, &seen);
    ASSERT_NE(h, 0u);
    Write(file, "now here");
    ASSERT_TRUE(PumpUntil([&] { return !seen.paths.empty(); }));
    monitor.RemoveWatch(h);
}

TEST_F(FileChangeMonitorTest, IgnoresOtherFilesOfTheFolder) {
    const fs::path file = dir / "mine.osl";
    Write(file, "x");
    Seen mine, other;
    const auto a = monitor.AddWatch(file.wstring(), &Record, &mine);
    const auto b = monitor.AddWatch((dir / "other.osl").wstring(), &Record, &other);
    ASSERT_NE(a, 0u);
    ASSERT_NE(b, 0u);
    EXPECT_NE(a, b);
    Write(dir / "other.osl", "y");
    ASSERT_TRUE(PumpUntil([&] { return !other.paths.empty(); }));
    Drain();
    EXPECT_TRUE(mine.paths.empty());
    monitor.RemoveWatch(a);
    monitor.RemoveWatch(b);
}

TEST_F(FileChangeMonitorTest, RemovedWatchAndDisabledMonitorDeliverNothing) {
    const fs::path file = dir / "c.osl";
    Write(file, "x");
    Seen removed, probe;
    const auto h = monitor.AddWatch(file.wstring(), &Record, &removed);
    ASSERT_TRUE(monitor.RemoveWatch(h));
    EXPECT_FALSE(monitor.RemoveWatch(h));
    EXPECT_EQ(monitor.WatchCount(), 0);

    monitor.SetEnabled(false);
    EXPECT_FALSE(monitor.IsEnabled());
    const auto p = monitor.AddWatch(file.wstring(), &Record, &probe);
    Write(file, "y");
    Drain();
    EXPECT_TRUE(probe.paths.empty());
    EXPECT_TRUE(removed.paths.empty());

    monitor.SetEnabled(true);
    Write(file, "z");
    ASSERT_TRUE(PumpUntil([&] { return !probe.paths.empty(); }));
    EXPECT_TRUE(removed.paths.empty());
    monitor.RemoveWatch(p);
}

TEST_F(FileChangeMonitorTest, ABurstOfWritesIsDeliveredAtLeastOnceAndAtMostOncePerWrite) {
    const fs::path file = dir / "burst.osl";
    Seen seen;
    const auto h = monitor.AddWatch(file.wstring(), &Record, &seen);
    for (int i = 0; i < 5; ++i) Write(file, std::to_string(i));
    ASSERT_TRUE(PumpUntil([&] { return !seen.paths.empty(); }));
    Drain();
    EXPECT_GE(seen.paths.size(), 1u);
    EXPECT_LE(seen.paths.size(), 5u);
    monitor.RemoveWatch(h);
}

TEST_F(FileChangeMonitorTest, RefusesBadInputWithAReport) {
    MSTR reported;
    auto previous = TrelmSDK::SetSDKErrorHandler([&](const MSTR& t) { reported = t; });
    Seen seen;
    EXPECT_EQ(monitor.AddWatch((dir / "no-such-folder" / "x.osl").wstring(), &Record, &seen), 0u);
    EXPECT_NE(reported.find(L"cannot watch"), MSTR::npos);
    reported.clear();
    EXPECT_EQ(monitor.AddWatch(L"", &Record, &seen), 0u);
    EXPECT_FALSE(reported.empty());
    EXPECT_EQ(monitor.AddWatch((dir / "x.osl").wstring(), nullptr, &seen), 0u);
    TrelmSDK::SetSDKErrorHandler(previous);
    EXPECT_EQ(monitor.WatchCount(), 0);
}

TEST(FileChangeMonitorLifetime, ADeliveryQueuedForADestroyedMonitorIsDropped) {
    TrelmSDK::MainThreadTaskManager::Instance().BindToCurrentThread();
    std::string pattern = (fs::temp_directory_path() / "trelm-watch-XXXXXX").string();
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    const fs::path file = fs::path(pattern) / "gone.osl";
    Seen seen;
    {
        TrelmSDK::FileChangeMonitor monitor;
        monitor.AddWatch(file.wstring(), &Record, &seen);
        Write(file, "x");
        // Wait until the reader has queued the delivery, without running it.
        const auto end = std::chrono::steady_clock::now() + 5s;
        while (TrelmSDK::MainThreadTaskManager::Instance().Pending() == 0 &&
               std::chrono::steady_clock::now() < end)
            std::this_thread::sleep_for(5ms);
    }
    Drain();
    EXPECT_TRUE(seen.paths.empty());
    fs::remove_all(pattern);
}
