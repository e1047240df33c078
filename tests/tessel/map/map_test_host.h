// What the map tests share: a scratch host (directories, configuration, the main thread, the
// file-change monitor, the map class), maps that clean up after themselves, and message capture.
#pragma once

#include "map/osl_tex.h"
#include "map/osl_tex_class_desc.h"

#include <trelm/config/config_manager.h>
#include <trelm/config/path_config.h>
#include <trelm/core/file_change_monitor.h>
#include <trelm/core/hold.h>
#include <trelm/core/main_thread.h>
#include <trelm/log/render_message_manager.h>

#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <unistd.h>

inline const std::filesystem::path& MapTestRoot() {
    static const std::filesystem::path root = [] {
        std::string pattern =
            (std::filesystem::temp_directory_path() / "tessel-map-XXXXXX").string();
        const char* made = mkdtemp(pattern.data());
        std::filesystem::path dir = made ? std::filesystem::path(made)
                                         : std::filesystem::temp_directory_path() / "tessel-map";
        unsetenv("TRELM_OSL_OPT");
        IPathConfigMgr::GetPathConfigMgr()->SetRoot(dir / "root");
        TrelmSDK::GetConfigManager().SetFilePath(dir / "trelm.ini");
        TrelmSDK::MainThreadTaskManager::Instance().BindToCurrentThread();
        TrelmSDK::FileChangeMonitor::Instance();
        RegisterOSLTexClass();
        return dir;
    }();
    return root;
}

// A map made through the class descriptor, deleted (with the undo stacks emptied first, since
// their records keep blocks and maps alive) when the holder goes.
class MapHolder {
public:
    MapHolder() : map_(static_cast<OSLTex*>(GetOSLTexDesc()->Create(false))) {}
    ~MapHolder() {
        theHold.ClearStacks();
        map_->DeleteMe();
    }
    MapHolder(const MapHolder&) = delete;
    MapHolder& operator=(const MapHolder&) = delete;
    OSLTex* operator->() const { return map_; }
    OSLTex& operator*() const { return *map_; }
    OSLTex* get() const { return map_; }

    // Sets "OSLCode" as one user action (an undo step named "Edit").
    void SetCode(const std::string& code) const {
        theHold.Begin();
        map_->FixedBlock()->SetValue(kOSLCode, 0, TrelmSDK::FromUTF8(code));
        theHold.Accept(L"Edit");
    }

private:
    OSLTex* map_;
};

// Messages sent to the render message window since construction.
class MessageProbe {
public:
    MessageProbe() : start_(TrelmSDK::GetRenderMessageManager().Messages().LastSequence()) {}
    bool Saw(const std::string& text) const {
        for (const auto& m : TrelmSDK::GetRenderMessageManager().Messages().Since(start_))
            if (m.text.find(text) != std::string::npos) return true;
        return false;
    }

private:
    std::uint64_t start_;
};

inline void WriteTextFile(const std::filesystem::path& file, const std::string& text) {
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out << text;
}

// Pumps the main-thread queue until pred holds or about five seconds passed.
template <class Pred>
bool PumpUntil(Pred pred) {
    using namespace std::chrono_literals;
    const auto end = std::chrono::steady_clock::now() + 5s;
    while (!pred()) {
        if (std::chrono::steady_clock::now() > end) return false;
        TrelmSDK::MainThreadTaskManager::Instance().WaitAndPump(20ms);
    }
    return true;
}
