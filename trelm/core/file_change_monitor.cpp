// The file-change monitor on Linux: inotify on the folders of watched files, delivered through
// the main-thread task queue.
#include <trelm/core/file_change_monitor.h>
#include <trelm/core/main_thread.h>
#include <trelm/core/sdk_errors.h>

#include <cerrno>
#include <cstring>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

namespace TrelmSDK {

namespace {

constexpr uint32_t kChangeEvents = IN_CLOSE_WRITE | IN_MOVED_TO;

MSTR ErrnoText() {
    return FromUTF8(std::strerror(errno));
}

} // namespace

FileChangeMonitor& FileChangeMonitor::Instance() {
    // Never destroyed: its reader thread may still be waiting while the process exits.
    static FileChangeMonitor* monitor = [] {
        auto* created = new FileChangeMonitor;
        RegisterCOREInterface(created);
        return created;
    }();
    return *monitor;
}

namespace {
// Makes the monitor reachable through GetCOREInterface from the start of a host process.
[[maybe_unused]] const bool registeredAtStart = (FileChangeMonitor::Instance(), true);
} // namespace

FileChangeMonitor::FileChangeMonitor() : self_(std::make_shared<FileChangeMonitor*>(this)) {
    inotifyFd_ = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    wakeFd_ = eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
    if (inotifyFd_ < 0 || wakeFd_ < 0) {
        ReportSDKError(L"File change monitor: cannot start (" + ErrnoText() + L")");
        return;
    }
    reader_ = std::thread([this] { readLoop(); });
}

FileChangeMonitor::~FileChangeMonitor() {
    UnregisterCOREInterface(this);
    self_.reset();
    if (reader_.joinable()) {
        const uint64_t one = 1;
        [[maybe_unused]] ssize_t n = write(wakeFd_, &one, sizeof one);
        reader_.join();
    }
    if (inotifyFd_ >= 0) close(inotifyFd_);
    if (wakeFd_ >= 0) close(wakeFd_);
}

FileWatchHandle FileChangeMonitor::AddWatch(const MSTR& path, FileChangeCallback callback,
                                            void* param) {
    if (!callback || path.empty()) {
        ReportSDKError(L"File change monitor: a watch needs a path and a callback");
        return 0;
    }
    if (inotifyFd_ < 0) {
        ReportSDKError(L"File change monitor: not running, cannot watch '" + path + L"'");
        return 0;
    }
    std::error_code ec;
    std::filesystem::path file = std::filesystem::absolute(std::filesystem::path(path), ec);
    file = file.lexically_normal();
    if (ec || !file.has_filename()) {
        ReportSDKError(L"File change monitor: '" + path + L"' does not name a file");
        return 0;
    }
    const std::filesystem::path folder = file.parent_path();
    const int wd = inotify_add_watch(inotifyFd_, folder.c_str(), kChangeEvents | IN_ONLYDIR);
    if (wd < 0) {
        ReportSDKError(L"File change monitor: cannot watch the folder of '" + path + L"' (" +
                       ErrnoText() + L")");
        return 0;
    }
    std::lock_guard lock(mutex_);
    const FileWatchHandle handle = nextHandle_++;
    watches_.emplace(handle,
                     Watch{path, folder, file.filename().string(), wd, callback, param, false});
    ++folderUsers_[wd];
    return handle;
}

bool FileChangeMonitor::RemoveWatch(FileWatchHandle handle) {
    std::lock_guard lock(mutex_);
    auto it = watches_.find(handle);
    if (it == watches_.end()) return false;
    const int wd = it->second.folderWatch;
    watches_.erase(it);
    if (--folderUsers_[wd] == 0) {
        folderUsers_.erase(wd);
        inotify_rm_watch(inotifyFd_, wd);
    }
    return true;
}

int FileChangeMonitor::WatchCount() const {
    std::lock_guard lock(mutex_);
    return static_cast<int>(watches_.size());
}

void FileChangeMonitor::readLoop() {
    alignas(inotify_event) char buffer[16 * 1024];
    pollfd fds[2] = {{inotifyFd_, POLLIN, 0}, {wakeFd_, POLLIN, 0}};
    for (;;) {
        if (poll(fds, 2, -1) < 0) {
            if (errno == EINTR) continue;
            return;
        }
        if (fds[1].revents) return;
        if (!(fds[0].revents & POLLIN)) continue;
        for (;;) {
            const ssize_t n = read(inotifyFd_, buffer, sizeof buffer);
            if (n <= 0) break;
            for (ssize_t at = 0; at < n;) {
                const auto* ev = reinterpret_cast<const inotify_event*>(buffer + at);
                if (ev->len > 0 && (ev->mask & kChangeEvents)) dispatch(ev->wd, ev->name);
                at += static_cast<ssize_t>(sizeof(inotify_event) + ev->len);
            }
        }
    }
}

void FileChangeMonitor::dispatch(int folderWatch, const std::string& name) {
    std::lock_guard lock(mutex_);
    for (auto& [handle, watch] : watches_) {
        if (watch.folderWatch != folderWatch || watch.fileName != name || watch.queued) continue;
        watch.queued = true;
        std::weak_ptr<FileChangeMonitor*> alive = self_;
        PostToMainThread([alive, h = handle] {
            if (auto self = alive.lock()) (*self)->deliver(h);
        });
    }
}

void FileChangeMonitor::deliver(FileWatchHandle handle) {
    FileChangeCallback callback = nullptr;
    void* param = nullptr;
    MSTR path;
    {
        std::lock_guard lock(mutex_);
        auto it = watches_.find(handle);
        if (it == watches_.end()) return;
        it->second.queued = false;
        callback = it->second.callback;
        param = it->second.param;
        path = it->second.path;
    }
    if (enabled_.load()) callback(path, param);
}

} // namespace TrelmSDK
