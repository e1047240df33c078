// A map linked to a .osl file: loading it, watching it with the host's monitor, and the rules by
// which a changed file is reloaded. Real files in a scratch folder, the real monitor.
#include "map/linked_file_watcher.h"
#include "map_test_host.h"

namespace fs = std::filesystem;

namespace {

std::string Versioned(const std::string& name, const std::string& version,
                      const std::string& inputs) {
    const std::string meta = version.empty() ? "" : " [[ string version = \"" + version + "\" ]]";
    return "shader " + name + meta + "(" + inputs + ", output color Out = 0) { Out = color(1); }\n";
}

// Counts deliveries for one file; a probe watch added after the map's sees the same change in the
// same delivery batch, after the map's own delivery has run.
struct Probe {
    int seen = 0;
    static void Count(const MSTR&, void* param) { ++static_cast<Probe*>(param)->seen; }
};

class LinkedFileTest : public ::testing::Test {
protected:
    void SetUp() override {
        MapTestRoot();
        std::string pattern = (fs::temp_directory_path() / "tessel-linked-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        dir = pattern;
        file = dir / "linked.osl";
    }
    void TearDown() override {
        if (probeHandle) monitor().RemoveWatch(probeHandle);
        std::error_code ec;
        fs::remove_all(dir, ec);
    }
    static TrelmSDK::FileChangeMonitor& monitor() {
        return TrelmSDK::FileChangeMonitor::Instance();
    }

    // Links the map to the file with auto-update on, as a user would.
    void Link(MapHolder& map) {
        map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, true);
        map->FixedBlock()->SetValue(kOSLPath, 0, file.wstring());
        probeHandle = monitor().AddWatch(file.wstring(), &Probe::Count, &probe);
        ASSERT_NE(probeHandle, 0u);
    }
    // Writes the file and waits until the change was delivered (to the map as well).
    void Change(const std::string& text) {
        const int before = probe.seen;
        WriteTextFile(file, text);
        ASSERT_TRUE(PumpUntil([&] { return probe.seen > before; }));
    }

    fs::path dir, file;
    Probe probe;
    TrelmSDK::FileWatchHandle probeHandle = 0;
};

} // namespace

TEST_F(LinkedFileTest, LinkingLoadsTheFileAsOneUndoStepAndArmsTheWatcher) {
    WriteTextFile(file, Versioned("linked", "1.0", "float Gain = 0.5"));
    MapHolder map;
    theHold.ClearStacks();
    Link(map);
    EXPECT_EQ(map->GetShaderName(), L"linked");
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "1.0", "float Gain = 0.5")));
    EXPECT_EQ(map->FixedBlock()->GetInt(kOSLAutoUpdate), 1);
    EXPECT_NE(map->WatchHandle(), 0u);
    EXPECT_EQ(map->WatchedKey(), map->Key());
    EXPECT_GE(theHold.NumUndoSteps(), 1);
    EXPECT_FALSE(theHold.UndoName().empty());

    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, false);
    EXPECT_EQ(map->WatchHandle(), 0u);
}

TEST_F(LinkedFileTest, ANewerVersionWrittenToDiskIsLoaded) {
    WriteTextFile(file, Versioned("linked", "1.2", "float Gain = 0.5"));
    MapHolder map;
    Link(map);
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(pb->IndextoID(pb->GetDesc()->NameToIndex(L"Gain")), 0, 0.75f);

    Change(Versioned("linked", "1.10", "float Gain = 0.5, float Added = 2"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "1.10", "float Gain = 0.5, float Added = 2")));
    pb = map->ShaderBlock();
    EXPECT_NE(pb->GetDesc()->NameToIndex(L"Added"), -1);
    EXPECT_FLOAT_EQ(pb->GetFloat(pb->IndextoID(pb->GetDesc()->NameToIndex(L"Gain"))), 0.75f);
    EXPECT_EQ(map->FixedBlock()->GetInt(kOSLAutoUpdate), 1) << "a reload keeps auto-update on";
    EXPECT_NE(map->WatchHandle(), 0u);

    // A file without version metadata replaced by one with a version is loaded too.
    Change(Versioned("linked", "", "float Gain = 0.5"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "1.10", "float Gain = 0.5, float Added = 2")))
        << "an unversioned file counts as lower than 1.10";
}

TEST_F(LinkedFileTest, AFileDeclaringAnotherShaderIsNotLoaded) {
    const std::string original = Versioned("linked", "1.0", "float Gain = 0.5");
    WriteTextFile(file, original);
    MapHolder map;
    Link(map);
    Change(Versioned("someone_else", "2.0", "float Gain = 0.5"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(original));
    EXPECT_EQ(map->GetShaderName(), L"linked");
}

TEST_F(LinkedFileTest, ALowerVersionIsNotLoaded) {
    const std::string original = Versioned("linked", "2.1", "float Gain = 0.5");
    WriteTextFile(file, original);
    MapHolder map;
    Link(map);
    Change(Versioned("linked", "2.0.9", "float Gain = 0.25"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(original));
    Change(Versioned("linked", "2.1", "float Gain = 0.3"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "2.1", "float Gain = 0.3")))
        << "an equal version is not lower";
}

TEST_F(LinkedFileTest, AChangedFileThatDoesNotCompileIsReportedAndNotLoaded) {
    const std::string original = Versioned("linked", "", "float Gain = 0.5");
    WriteTextFile(file, original);
    MapHolder map;
    Link(map);
    MessageProbe messages;
    Change("shader linked(float Gain = 0.5, output color Out = 0) { Out = ; }\n");
    EXPECT_TRUE(
        messages.Saw("Error compiling " + file.string() + "\nFile will not be auto-loaded.\n"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(original));
}

TEST_F(LinkedFileTest, NothingIsReloadedWithAutoUpdateOffOrTheMonitorDisabled) {
    const std::string original = Versioned("linked", "1", "float Gain = 0.5");
    WriteTextFile(file, original);
    MapHolder map;
    Link(map);
    // While the monitor is disabled its deliveries are dropped: run them before enabling it.
    auto& queue = TrelmSDK::MainThreadTaskManager::Instance();
    monitor().SetEnabled(false);
    WriteTextFile(file, Versioned("linked", "2", "float Gain = 0.5"));
    for (int i = 0; i < 25; ++i) queue.WaitAndPump(std::chrono::milliseconds(20));
    EXPECT_EQ(probe.seen, 0);
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(original));
    monitor().SetEnabled(true);
    Change(Versioned("linked", "3", "float Gain = 0.5"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "3", "float Gain = 0.5")));

    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, false);
    Change(Versioned("linked", "4", "float Gain = 0.5"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode),
              TrelmSDK::FromUTF8(Versioned("linked", "3", "float Gain = 0.5")));
}

TEST_F(LinkedFileTest, AMissingOrUnreadablePathIsReportedAndChangesNothing) {
    MapHolder map;
    const MSTR code = map->FixedBlock()->GetStr(kOSLCode);
    IParamBlock2* block = map->ShaderBlock();
    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, true);

    MessageProbe missing;
    map->FixedBlock()->SetValue(kOSLPath, 0, (dir / "absent.osl").wstring());
    EXPECT_TRUE(missing.Saw("Cannot read the shader file"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), code);
    EXPECT_EQ(map->ShaderBlock(), block);
    EXPECT_EQ(map->WatchHandle(), 0u) << "a path that names no file is not watched";

    MessageProbe folder;
    map->FixedBlock()->SetValue(kOSLPath, 0, dir.wstring());
    EXPECT_TRUE(folder.Saw("Cannot read the shader file"));
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), code);
    EXPECT_EQ(map->WatchHandle(), 0u);

    EXPECT_FALSE(ReadShaderFile(L"").has_value());
    EXPECT_FALSE(ReadShaderFile(dir.wstring()).has_value());
    EXPECT_EQ(ResolveLinkedShaderPath((dir / "absent.osl").wstring()), L"");
}

TEST_F(LinkedFileTest, AnEmptyFileIsRetriedThenIgnored) {
    const std::string original = Versioned("linked", "", "float Gain = 0.5");
    WriteTextFile(file, original);
    MapHolder map;
    Link(map);
    Change("");
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(original));
    EXPECT_EQ(map->GetShaderName(), L"linked");
}

TEST(ShaderVersions, CompareAsDottedNumbers) {
    EXPECT_LT(CompareShaderVersions("1.9", "1.10"), 0);
    EXPECT_GT(CompareShaderVersions("2", "1.99.99"), 0);
    EXPECT_EQ(CompareShaderVersions("1.2", "1.2"), 0);
    EXPECT_LT(CompareShaderVersions("1.2", "1.2.1"), 0);
    EXPECT_LT(CompareShaderVersions("", "0.1"), 0);
    EXPECT_LT(CompareShaderVersions("beta", "1"), 0);
    EXPECT_EQ(CompareShaderVersions("3.1-rc1", "3.1"), 0);
}
