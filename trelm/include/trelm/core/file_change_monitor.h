// The host's file-change monitor: plug-ins watch files on disk and hear about changes on the main
// thread, through the core interface 4097.
#pragma once

#include <trelm/core/core_interface.h>
#include <trelm/core/mstr.h>

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <mutex>
#include <thread>

namespace TrelmSDK {

inline constexpr Interface_ID FILE_CHANGE_MONITOR_INTERFACE_ID{4097, 0};

// A watch's handle; 0 is never a valid handle.
using FileWatchHandle = std::uint64_t;
// Called on the main thread with the watched path (as it was given) and the watch's user data.
using FileChangeCallback = void (*)(const MSTR& path, void* param);

class IFileChangeMonitor : public FPInterface {
public:
    Interface_ID GetID() const override { return FILE_CHANGE_MONITOR_INTERFACE_ID; }
    // Watches path (a file whose folder exists; the file itself may be missing and appear later).
    // Returns 0, with the problem reported, when the path cannot be watched.
    virtual FileWatchHandle AddWatch(const MSTR& path, FileChangeCallback callback,
                                     void* param) = 0;
    // Ends a watch; false for an unknown handle. A change already queued for it is dropped.
    virtual bool RemoveWatch(FileWatchHandle handle) = 0;
    // While disabled, changes are dropped rather than delivered.
    virtual bool IsEnabled() const = 0;
    virtual void SetEnabled(bool enabled) = 0;
};

// The Linux monitor: one inotify instance watching the folders of watched files (editors that
// save by writing a new file and renaming it over the old one stay watched), a reader thread, and
// delivery through the main-thread task queue. A change is a file closed after writing, or a file
// renamed or moved onto the watched name. Changes of one watch that arrive before its delivery ran
// are delivered once.
//
// Threads: AddWatch, RemoveWatch and SetEnabled on the main thread (any thread is safe); the
// reader thread only matches events and posts; callbacks run on the main thread. watches_ and
// folders_ are guarded by mutex_.
class FileChangeMonitor : public IFileChangeMonitor {
public:
    // The host's monitor, created and registered under 4097 on first use.
    static FileChangeMonitor& Instance();

    FileChangeMonitor();
    ~FileChangeMonitor() override;
    FileChangeMonitor(const FileChangeMonitor&) = delete;
    FileChangeMonitor& operator=(const FileChangeMonitor&) = delete;

    FileWatchHandle AddWatch(const MSTR& path, FileChangeCallback callback, void* param) override;
    bool RemoveWatch(FileWatchHandle handle) override;
    bool IsEnabled() const override { return enabled_.load(); }
    void SetEnabled(bool enabled) override { enabled_.store(enabled); }

    int WatchCount() const;

private:
    struct Watch {
        MSTR path;
        std::filesystem::path folder;
        std::string fileName;
        int folderWatch;
        FileChangeCallback callback;
        void* param;
        bool queued = false;
    };
    void readLoop();
    void dispatch(int folderWatch, const std::string& name);
    void deliver(FileWatchHandle handle);

    mutable std::mutex mutex_;
    std::map<FileWatchHandle, Watch> watches_;
    std::map<int, int> folderUsers_; // inotify watch descriptor -> watches using it
    FileWatchHandle nextHandle_ = 1;
    std::atomic<bool> enabled_{true};
    int inotifyFd_ = -1;
    int wakeFd_ = -1;
    std::thread reader_;
    // Queued deliveries hold it weakly, so a monitor destroyed first is not called.
    std::shared_ptr<FileChangeMonitor*> self_;
};

} // namespace TrelmSDK

using TrelmSDK::IFileChangeMonitor;
