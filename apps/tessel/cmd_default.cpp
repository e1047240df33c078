// `tessel default`: the job the README runs. Until the module can render, it is the self-check:
// it exercises the libraries the build links and writes a small report and image.
#include "command_registry.h"

#include <trelm/config/config_manager.h>
#include <trelm/config/path_config.h>
#include <trelm/core/locale_guard.h>
#include <trelm/core/main_thread.h>
#include <trelm/core/time.h>
#include <trelm/log/log_output.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/imagebufalgo.h>
#include <OpenImageIO/oiioversion.h>
#include <QtCore/qglobal.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {

// The host services the module leans on: a configuration file in a scratch folder that gets its
// defaults and keeps a user's change, numbered directories, both message channels with the log
// file, the main-thread queue fed from another thread, and the "C" number format. Returns the
// report lines, or an empty list after printing what failed.
std::vector<std::string> checkHostServices(const std::filesystem::path& outDir) {
    using namespace TrelmSDK;
    std::vector<std::string> report;
    auto fail = [](const std::string& what) {
        std::cerr << "tessel: self-check of the host services failed: " << what << "\n";
        return std::vector<std::string>();
    };

    std::string scratchTemplate =
        (std::filesystem::temp_directory_path() / "tessel-selfcheck-XXXXXX").string();
    if (!mkdtemp(scratchTemplate.data())) return fail("cannot create a scratch folder");
    const std::filesystem::path scratch = scratchTemplate;
    struct Cleanup {
        std::filesystem::path folder;
        ~Cleanup() {
            std::error_code ec;
            std::filesystem::remove_all(folder, ec);
        }
    } cleanup{scratch};

    const auto iniFile = scratch / "trelm.ini";
    {
        ConfigManager config(iniFile);
        ConfigSection oiio = config.Section("OpenImageIO");
        if (oiio.ReadInt("max_open_files", 100) != 100 ||
            oiio.ReadFloat("max_memory_MB", 16384.0f) != 16384.0f)
            return fail("configuration defaults not returned");
        if (!oiio.HasKey("max_memory_MB")) return fail("configuration default not written back");
    }
    {
        std::ofstream edit(iniFile, std::ios::app);
        edit << "; changed by the user\n[OSL]\nViewportUDIMMaxCount = 16\n";
    }
    {
        ConfigManager nextRun(iniFile);
        if (nextRun.ReadInt("OSL", "ViewportUDIMMaxCount", 64) != 16)
            return fail("a value the user set was not kept");
        if (nextRun.GetFloat("OpenImageIO", "max_memory_MB") != 16384.0f)
            return fail("configuration file not read back");
    }
    report.push_back("config " + iniFile.filename().string() +
                     " defaults written, user value kept");

    IPathConfigMgr paths;
    paths.SetRoot(scratch / "root");
    if (!std::filesystem::is_directory(paths.GetDir(37)) || paths.GetDir(20) != scratch / "root")
        return fail("path configuration did not make its directories");
    report.push_back("paths directory 37 is <root>/" + paths.GetDir(37).filename().string());

    const auto logFile = outDir / "selfcheck.log";
    std::error_code ec;
    std::filesystem::remove(logFile, ec);
    std::string logError;
    if (!LogOutput::Instance().SetLogFile(logFile, &logError)) return fail(logError);
    const auto systemBefore = GetSystemLog().Messages().LastSequence();
    const auto renderBefore = GetRenderMessageManager().Messages().LastSequence();
    std::thread([] {
        GetRenderMessageManager().LogMessage(kSource_MaterialEditor, kType_Info, SYSLOG_INFO,
                                             "self-check message from a worker thread");
        GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "tessel", "self-check warning entry");
    }).join();
    LogOutput::Instance().SetLogFile({});
    if (GetSystemLog().Messages().Since(systemBefore).size() != 1 ||
        GetRenderMessageManager().Messages().Since(renderBefore).size() != 1)
        return fail("messages not kept in memory");
    std::ifstream logIn(logFile);
    int logLines = 0;
    for (std::string line; std::getline(logIn, line);) ++logLines;
    if (logLines != 2) return fail("log file holds " + std::to_string(logLines) + " lines, not 2");
    report.push_back("log " + logFile.string());

    auto& tasks = MainThreadTaskManager::Instance();
    tasks.BindToCurrentThread();
    std::vector<int> order;
    std::thread([&order] {
        for (int i = 0; i < 3; ++i) PostToMainThread([&order, i] { order.push_back(i); });
    }).join();
    if (tasks.Pump() != 3 || order != std::vector<int>{0, 1, 2})
        return fail("main-thread tasks did not run in order");
    report.push_back("main-thread tasks 3 run in order");

    char number[32];
    {
        LocaleGuard guard;
        std::snprintf(number, sizeof number, "%.2f", 0.5);
    }
    if (std::string(number) != "0.50")
        return fail("numbers under the C locale read " + std::string(number));
    report.push_back("C locale number " + std::string(number));
    return report;
}

int runSelfCheck(const std::filesystem::path& outDir) {
    std::error_code ec;
    std::filesystem::create_directories(outDir, ec);
    if (ec) {
        std::cerr << "tessel: cannot create " << outDir << ": " << ec.message() << "\n";
        return 1;
    }

    // A 64x64 UV ramp written through OpenImageIO proves image output works.
    OIIO::ImageSpec spec(64, 64, 3, OIIO::TypeDesc::UINT8);
    OIIO::ImageBuf ramp(spec);
    const float topLeft[] = {0, 0, 0}, topRight[] = {1, 0, 0};
    const float bottomLeft[] = {0, 1, 0}, bottomRight[] = {1, 1, 0};
    OIIO::ImageBufAlgo::fill(ramp, topLeft, topRight, bottomLeft, bottomRight);
    const auto image = outDir / "selfcheck.png";
    if (!ramp.write(image.string())) {
        std::cerr << "tessel: cannot write " << image << ": " << ramp.geterror() << "\n";
        return 1;
    }

    const std::vector<std::string> services = checkHostServices(outDir);
    if (services.empty()) return 1;

    const auto report = outDir / "selfcheck.txt";
    std::ofstream out(report);
    out << "tessel " << TESSEL_VERSION_STRING << "\n"
        << "OpenImageIO " << OIIO_VERSION_STRING << "\n"
        << "Qt " << QT_VERSION_STR << "\n"
        << "ticks per frame " << TrelmSDK::GetTicksPerFrame() << "\n"
        << "image " << image.string() << "\n";
    for (const auto& line : services) out << line << "\n";
    if (!out) {
        std::cerr << "tessel: cannot write " << report << "\n";
        return 1;
    }
    std::cout << "Self-check passed. Result: " << std::filesystem::absolute(report).string()
              << "\n";
    return 0;
}

const tessel_cli::CommandRegistrar registrar{
    "default", "Run the default job (the self-check) and write its result",
    [](CLI::App& sub) -> std::function<int()> {
        auto outDir = std::make_shared<std::string>("out");
        sub.add_option("--output-dir", *outDir, "Folder for the results")->capture_default_str();
        return [outDir] { return runSelfCheck(*outDir); };
    }};

} // namespace
