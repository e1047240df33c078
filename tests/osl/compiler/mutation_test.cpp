// Malformed source must never crash or hang the compiler: corpus shaders are mutated with a
// fixed seed (bytes dropped, duplicated, swapped, truncated, junk inserted) and compiled; every
// rejected compile must say why.
#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <random>
#include <sstream>

namespace {

struct CountingHandler : OSL::ErrorHandler {
    int errors = 0;
    void operator()(int code, const std::string&) override {
        if (code == EH_ERROR || code == EH_SEVERE) ++errors;
    }
};

std::vector<std::string> corpusSources(size_t limit) {
    std::vector<std::string> out;
    std::filesystem::path suite =
        std::filesystem::path(TESSEL_SHARED_DIR) / "osl-conformance" / "testsuite";
    std::error_code ec;
    std::vector<std::filesystem::path> files;
    for (auto it = std::filesystem::recursive_directory_iterator(suite, ec);
         !ec && it != std::filesystem::recursive_directory_iterator(); it.increment(ec))
        if (it->path().extension() == ".osl") files.push_back(it->path());
    std::sort(files.begin(), files.end());
    for (size_t i = 0; i < files.size() && out.size() < limit;
         i += std::max<size_t>(1, files.size() / limit)) {
        std::ifstream in(files[i]);
        std::stringstream ss;
        ss << in.rdbuf();
        out.push_back(ss.str());
    }
    return out;
}

std::string mutate(std::string s, std::mt19937& rng) {
    static const std::string junk[] = {
        "(",     ")",  "{",  "}",      "[[",     "]]", ";",  ",",    "#define X X X\n",
        "#if\n", "\"", "/*", "struct", "output", "=",  "..", "\\\n", "#include \"x.h\"\n",
        "[",     "]",  "?",  "0x",     "1e",     "'"};
    if (s.empty()) return s;
    int edits = 1 + int(rng() % 4);
    for (int e = 0; e < edits && !s.empty(); ++e) {
        size_t pos = rng() % s.size();
        switch (rng() % 5) {
        case 0:
            s.erase(pos, 1 + rng() % 8);
            break;
        case 1:
            s.insert(pos, junk[rng() % (sizeof junk / sizeof junk[0])]);
            break;
        case 2:
            s.insert(pos, s.substr(rng() % s.size(), rng() % 40));
            break;
        case 3:
            std::swap(s[pos], s[rng() % s.size()]);
            break;
        default:
            s.resize(pos);
            break;
        }
    }
    return s;
}

TEST(CompilerRobustness, MutatedCorpusNeverCrashes) {
    auto sources = corpusSources(40);
    ASSERT_FALSE(sources.empty());
    std::mt19937 rng(12345);
    int rejected = 0;
    for (int round = 0; round < 6; ++round) {
        for (const auto& src : sources) {
            std::string m = mutate(src, rng);
            CountingHandler eh;
            OSL::OSLCompiler c(&eh);
            std::string oso;
            bool ok = c.compile_buffer(m, oso, {}, "", "mutant.osl");
            if (!ok) {
                ++rejected;
                EXPECT_GT(eh.errors, 0) << "rejected without a message:\n" << m;
            } else {
                EXPECT_EQ(oso.rfind("OpenShadingLanguage 1.00\n", 0), 0u);
            }
        }
    }
    EXPECT_GT(rejected, 0);
}

TEST(CompilerRobustness, DeepNestingIsRefusedNotOverflowed) {
    std::string deep =
        "shader t () { float x = " + std::string(5000, '(') + "1" + std::string(5000, ')') + "; }";
    CountingHandler eh;
    OSL::OSLCompiler c(&eh);
    std::string oso;
    EXPECT_FALSE(c.compile_buffer(deep, oso, {}));
    EXPECT_GT(eh.errors, 0);
}

} // namespace
