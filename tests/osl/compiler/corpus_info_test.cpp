// Compiles a sample of the conformance shaders in-process and checks that the oslinfo report of
// our OSO is the reference compiler's, word for word (parameters, types, defaults, metadata,
// struct fields). corpus_compare.py runs the same check over the whole corpus through the CLI.
#include <OSL/oslcomp.h>
#include <OSL/oslinfo.h>

#include <gtest/gtest.h>

#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

struct Quiet : OSL::ErrorHandler {
    std::string first;
    void operator()(int code, const std::string& msg) override {
        if ((code == EH_ERROR || code == EH_SEVERE) && first.empty()) first = msg;
    }
};

std::string readText(const fs::path& p) {
    std::ifstream in(p, std::ios::binary);
    std::stringstream ss;
    ss << in.rdbuf();
    return ss.str();
}

// Every shader the reference compiled, as (case folder, shader base name), in sorted order.
std::vector<std::pair<fs::path, std::string>> corpusShaders() {
    std::vector<std::pair<fs::path, std::string>> out;
    fs::path suite = fs::path(TESSEL_SHARED_DIR) / "osl-conformance" / "testsuite";
    std::error_code ec;
    if (!fs::is_directory(suite, ec)) return out;
    for (const auto& c : fs::directory_iterator(suite)) {
        fs::path ref = c.path() / "oso-ref";
        if (!fs::is_directory(ref, ec)) continue;
        for (const auto& f : fs::directory_iterator(ref)) {
            if (f.path().extension() != ".oso") continue;
            std::string base = f.path().stem().string();
            if (fs::exists(c.path() / (base + ".osl"))) out.push_back({c.path(), base});
        }
    }
    std::sort(out.begin(), out.end());
    return out;
}

TEST(CorpusInfo, SampledShadersReportAsTheReference) {
    auto shaders = corpusShaders();
    if (shaders.empty()) GTEST_SKIP() << "no conformance corpus beside the sources";
    fs::path tmp = fs::temp_directory_path() / ("tessel-corpus-info-" + std::to_string(::getpid()));
    fs::create_directories(tmp);
    // One shader in five keeps the test quick while touching every kind of case.
    int checked = 0;
    for (size_t i = 0; i < shaders.size(); i += 5) {
        const auto& [dir, base] = shaders[i];
        std::string name = dir.filename().string() + "/" + base;
        fs::path oso = tmp / (dir.filename().string() + "." + base + ".oso");
        Quiet eh;
        OSL::OSLCompiler compiler(&eh);
        bool ok = compiler.compile((dir / (base + ".osl")).string(),
                                   {"-o", oso.string(), "-I" + dir.string()});
        EXPECT_TRUE(ok) << name << ": " << eh.first;
        if (!ok) continue;
        std::ostringstream ours;
        OSL::OSLInfoOptions opts;
        opts.verbose = true;
        ASSERT_TRUE(OSL::print_oslinfo(ours, oso.string(), opts)) << name;
        EXPECT_EQ(ours.str(), readText(dir / "oso-ref" / (base + ".oslinfo.txt"))) << name;
        ++checked;
    }
    std::error_code ec;
    fs::remove_all(tmp, ec);
    EXPECT_GT(checked, 100);
}

} // namespace
