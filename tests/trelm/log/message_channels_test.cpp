#include <trelm/log/log_output.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <fstream>
#include <sstream>
#include <thread>
#include <unistd.h>

using namespace TrelmSDK;

namespace {

class TempLogFolder {
public:
    TempLogFolder()
        : path_(std::filesystem::temp_directory_path() /
                ("trelm-log-test-" + std::to_string(::getpid()))) {
        std::filesystem::remove_all(path_);
        std::filesystem::create_directories(path_);
    }
    ~TempLogFolder() {
        LogOutput::Instance().SetLogFile({});
        std::error_code ec;
        std::filesystem::remove_all(path_, ec);
    }
    const std::filesystem::path& path() const { return path_; }

private:
    std::filesystem::path path_;
};

std::vector<std::string> readLines(const std::filesystem::path& file) {
    std::ifstream in(file);
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

// Captures the echo for one test and switches it off afterwards.
class EchoCapture {
public:
    explicit EchoCapture(MessageSeverity minimum) {
        LogOutput::Instance().SetEchoWriter(
            [this](const std::string& line) { lines.push_back(line); });
        LogOutput::Instance().SetEcho(true, minimum);
    }
    ~EchoCapture() {
        LogOutput::Instance().SetEcho(false);
        LogOutput::Instance().SetEchoWriter(nullptr);
    }
    std::vector<std::string> lines;
};

} // namespace

TEST(SystemLog, EntriesKeepTypeTitleAndSeverity) {
    auto& log = GetSystemLog();
    const auto before = log.Messages().LastSequence();
    log.LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex",
                 "OSO corruption mitigation kicked in after compiler.");
    log.LogEntry(SYSLOG_ERROR, NO_DIALOG, "OSLTex", "bad");
    log.LogEntry(SYSLOG_INFO, NO_DIALOG, "OSLTex", "fyi");
    log.LogEntry(SYSLOG_DEBUG, NO_DIALOG, "OSLTex", "trace");
    const auto fresh = log.Messages().Since(before);
    ASSERT_EQ(fresh.size(), 4u);
    EXPECT_EQ(fresh[0].type, SYSLOG_WARN);
    EXPECT_EQ(fresh[0].title, "OSLTex");
    EXPECT_EQ(fresh[0].severity, MessageSeverity::Warning);
    EXPECT_EQ(fresh[0].channel, "system");
    EXPECT_EQ(fresh[0].source, -1);
    EXPECT_EQ(fresh[1].severity, MessageSeverity::Error);
    EXPECT_EQ(fresh[2].severity, MessageSeverity::Info);
    EXPECT_EQ(fresh[3].severity, MessageSeverity::Debug);
}

TEST(SystemLog, TextIsPlainNeverAFormat) {
    const auto before = GetSystemLog().Messages().LastSequence();
    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex", "100% %s %n done");
    EXPECT_EQ(GetSystemLog().Messages().Since(before).at(0).text, "100% %s %n done");
}

TEST(SystemLog, WideTextArrivesAsUtf8) {
    const auto before = GetSystemLog().Messages().LastSequence();
    GetSystemLog().LogEntry(SYSLOG_INFO, NO_DIALOG, std::wstring_view(L"Tïtle"),
                            std::wstring_view(L"Gr\u00fc\u00dfe \u2192 \U0001F600"));
    const auto m = GetSystemLog().Messages().Since(before).at(0);
    EXPECT_EQ(m.title, "T\xC3\xAFtle");
    EXPECT_EQ(m.text, "Gr\xC3\xBC\xC3\x9F"
                      "e \xE2\x86\x92 \xF0\x9F\x98\x80");
}

TEST(SystemLog, DialogHandlerRunsOnlyForDialogEntries) {
    std::vector<std::string> shown;
    GetSystemLog().SetDialogHandler([&](const LogMessage& m) { shown.push_back(m.text); });
    GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "t", "quiet");
    GetSystemLog().LogEntry(SYSLOG_ERROR, DISPLAY_DIALOG, "t", "loud");
    GetSystemLog().SetDialogHandler(nullptr);
    GetSystemLog().LogEntry(SYSLOG_ERROR, DISPLAY_DIALOG, "t", "nobody listens");
    EXPECT_EQ(shown, (std::vector<std::string>{"loud"}));
}

TEST(SystemLog, DebugPrintIsADebugEntry) {
    const auto before = GetSystemLog().Messages().LastSequence();
    DebugPrint(L"OSLTex::EvalColor - sym was a nullptr");
    const auto m = GetSystemLog().Messages().Since(before).at(0);
    EXPECT_EQ(m.type, SYSLOG_DEBUG);
    EXPECT_EQ(m.text, "OSLTex::EvalColor - sym was a nullptr");
}

TEST(RenderMessageManager, RecordsSourceTypeAndSystemLogTypeWithoutCopyingToTheSystemLog) {
    auto& window = GetRenderMessageManager();
    const auto systemBefore = GetSystemLog().Messages().LastSequence();
    const auto before = window.Messages().LastSequence();
    window.LogMessage(kSource_MaterialEditor, kType_Warning, SYSLOG_WARN, "careful");
    window.LogMessage(kSource_ProductionRender, kType_Fatal, SYSLOG_ERROR, L"severe");
    window.LogMessage(kSource_MaterialEditor, kType_Debug, SYSLOG_DEBUG, "dbg");
    window.LogMessage(kSource_MaterialEditor, kType_Info, SYSLOG_INFO, "info");
    window.LogMessage(kSource_MaterialEditor, kType_Error, SYSLOG_ERROR, "err");
    const auto fresh = window.Messages().Since(before);
    ASSERT_EQ(fresh.size(), 5u);
    EXPECT_EQ(fresh[0].source, 1);
    EXPECT_EQ(fresh[0].type, 4u);
    EXPECT_EQ(fresh[0].systemLogType, 2u);
    EXPECT_EQ(fresh[0].severity, MessageSeverity::Warning);
    EXPECT_EQ(fresh[1].severity, MessageSeverity::Fatal);
    EXPECT_EQ(fresh[1].text, "severe");
    EXPECT_EQ(fresh[2].severity, MessageSeverity::Debug);
    EXPECT_EQ(fresh[3].severity, MessageSeverity::Info);
    EXPECT_EQ(fresh[4].severity, MessageSeverity::Error);
    EXPECT_EQ(GetSystemLog().Messages().LastSequence(), systemBefore);

    const auto editor = window.MessagesOf(kSource_MaterialEditor);
    ASSERT_FALSE(editor.empty());
    for (const auto& m : editor) EXPECT_EQ(m.source, kSource_MaterialEditor);
}

TEST(RenderMessageManager, ReachableThroughTheCoreInterface) {
    EXPECT_EQ(GetCOREInterface(IRENDERMESSAGEMANAGER_INTERFACE_ID),
              static_cast<FPInterface*>(&GetRenderMessageManager()));
    EXPECT_EQ(GetRenderMessageManager().GetID(), Interface_ID(0x794E519B, 0x3A74408A));
}

TEST(LogOutput, LinesAreSingleRecordsWithIndentedContinuations) {
    LogMessage m;
    m.channel = "render";
    m.source = 1;
    m.severity = MessageSeverity::Error;
    m.text = "Exception x occurred attempting to compile this code:\nshader a() {}\n...\n";
    EXPECT_EQ(LogOutput::FormatLine(m, false),
              "[render] error (source 1): Exception x occurred attempting to compile this code:\n"
              "    shader a() {}\n    ...");
    m.channel = "system";
    m.source = -1;
    m.title = "OSLTex";
    m.text = "w";
    m.severity = MessageSeverity::Warning;
    EXPECT_EQ(LogOutput::FormatLine(m, false), "[system] warning OSLTex: w");
}

TEST(LogOutput, EchoShowsMessagesFromTheChosenSeverityUp) {
    EchoCapture echo(MessageSeverity::Warning);
    GetSystemLog().LogEntry(SYSLOG_INFO, NO_DIALOG, "OSLTex", "not shown");
    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex", "shown");
    GetRenderMessageManager().LogMessage(kSource_MaterialEditor, kType_Error, SYSLOG_ERROR, "also");
    EXPECT_EQ(echo.lines, (std::vector<std::string>{"[system] warning OSLTex: shown",
                                                    "[render] error (source 1): also"}));
    EXPECT_TRUE(LogOutput::Instance().EchoEnabled());
}

TEST(LogOutput, EchoIsOffUnlessAsked) {
    std::vector<std::string> lines;
    LogOutput::Instance().SetEchoWriter([&](const std::string& line) { lines.push_back(line); });
    SetMessageEcho(false);
    GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "t", "silent");
    LogOutput::Instance().SetEchoWriter(nullptr);
    EXPECT_TRUE(lines.empty());
}

TEST(LogOutput, AppendsBothChannelsToTheLogFile) {
    TempLogFolder tmp;
    const auto file = tmp.path() / "logs" / "trelm.log";
    std::ofstream(tmp.path() / "seed.log") << "";
    ASSERT_TRUE(LogOutput::Instance().SetLogFile(file));
    EXPECT_EQ(LogOutput::Instance().LogFile(), file);
    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex", "first");
    GetRenderMessageManager().LogMessage(kSource_MaterialEditor, kType_Info, SYSLOG_INFO,
                                         "two\nlines");
    LogOutput::Instance().SetLogFile({});
    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex", "not in the file");

    // Appending: a second session adds to the same file.
    ASSERT_TRUE(LogOutput::Instance().SetLogFile(file));
    GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "OSLTex", "third");
    LogOutput::Instance().SetLogFile({});

    const auto lines = readLines(file);
    ASSERT_EQ(lines.size(), 4u);
    EXPECT_NE(lines[0].find("[system] warning OSLTex: first"), std::string::npos);
    EXPECT_NE(lines[1].find("[render] info (source 1): two"), std::string::npos);
    EXPECT_EQ(lines[2], "    lines");
    EXPECT_NE(lines[3].find("[system] error OSLTex: third"), std::string::npos);
    // Lines start with a date and time.
    EXPECT_EQ(lines[0][4], '-');
    EXPECT_EQ(lines[0][13], ':');
}

TEST(LogOutput, UnopenableFileIsRefusedAndTheOldOneKept) {
    TempLogFolder tmp;
    const auto good = tmp.path() / "good.log";
    std::ofstream(tmp.path() / "blocker") << "x";
    ASSERT_TRUE(LogOutput::Instance().SetLogFile(good));
    std::string error;
    EXPECT_FALSE(LogOutput::Instance().SetLogFile(tmp.path() / "blocker" / "x.log", &error));
    EXPECT_NE(error.find("blocker"), std::string::npos);
    EXPECT_EQ(LogOutput::Instance().LogFile(), good);
    GetSystemLog().LogEntry(SYSLOG_INFO, NO_DIALOG, "t", "still logged");
    LogOutput::Instance().SetLogFile({});
    EXPECT_EQ(readLines(good).size(), 1u);
}

TEST(LogOutput, ConcurrentLoggingWritesWholeLines) {
    TempLogFolder tmp;
    const auto file = tmp.path() / "concurrent.log";
    ASSERT_TRUE(LogOutput::Instance().SetLogFile(file));
    constexpr int kThreads = 6, kPerThread = 300;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back([t] {
            for (int i = 0; i < kPerThread; ++i) {
                const std::string text =
                    "thread " + std::to_string(t) + " message " + std::to_string(i);
                if (i % 2)
                    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "OSLTex", text);
                else
                    GetRenderMessageManager().LogMessage(kSource_MaterialEditor, kType_Warning,
                                                         SYSLOG_WARN, text);
            }
        });
    for (auto& thread : threads) thread.join();
    LogOutput::Instance().SetLogFile({});

    const auto lines = readLines(file);
    ASSERT_EQ(lines.size(), static_cast<std::size_t>(kThreads * kPerThread));
    std::vector<int> next(kThreads, 0);
    for (const auto& line : lines) {
        const auto at = line.find("thread ");
        ASSERT_NE(at, std::string::npos) << line;
        std::istringstream rest(line.substr(at + 7));
        int t = -1, i = -1;
        std::string word;
        rest >> t >> word >> i;
        ASSERT_TRUE(t >= 0 && t < kThreads) << line;
        EXPECT_EQ(word, "message");
        EXPECT_EQ(i, next[t]++) << "lines of one thread out of order";
        EXPECT_TRUE(rest.eof() || rest.peek() == EOF) << line;
    }
}
