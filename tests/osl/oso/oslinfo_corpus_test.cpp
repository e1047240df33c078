// Every reference OSO of the conformance corpus must give exactly the reference oslinfo report.
#include <OSL/oslinfo.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <sstream>

namespace fs = std::filesystem;

namespace {

std::vector<fs::path> corpus_oso_files() {
    std::vector<fs::path> files;
    const fs::path suite = fs::path(TESSEL_SHARED_DIR) / "osl-conformance" / "testsuite";
    std::error_code ec;
    for (const auto& entry : fs::recursive_directory_iterator(suite, ec))
        if (entry.path().extension() == ".oso" &&
            entry.path().parent_path().filename() == "oso-ref")
            files.push_back(entry.path());
    std::sort(files.begin(), files.end());
    return files;
}

std::string read_file(const fs::path& p) {
    std::ifstream in(p, std::ios::binary);
    std::ostringstream s;
    s << in.rdbuf();
    return s.str();
}

// The first line where the two texts differ, for a readable failure.
std::string first_difference(const std::string& got, const std::string& want) {
    std::istringstream g(got), w(want);
    std::string gl, wl;
    for (int line = 1;; ++line) {
        const bool gok = (bool)std::getline(g, gl), wok = (bool)std::getline(w, wl);
        if (!gok && !wok) return "texts differ only in the final line break";
        if (!gok || !wok || gl != wl)
            return "line " + std::to_string(line) + ": got [" + (gok ? gl : "<end>") + "] want [" +
                   (wok ? wl : "<end>") + "]";
    }
}

TEST(OslinfoCorpus, VerboseReportMatchesReferenceForEveryOso) {
    const auto files = corpus_oso_files();
    ASSERT_GT(files.size(), 700u) << "conformance corpus not found under " << TESSEL_SHARED_DIR;
    int compared = 0, mismatched = 0;
    for (const fs::path& oso : files) {
        fs::path expected = oso;
        expected.replace_extension(".oslinfo.txt");
        if (!fs::exists(expected)) continue;
        std::ostringstream out;
        OSL::OSLInfoOptions opts;
        opts.verbose = true;
        OSL::print_oslinfo(out, oso.string(), opts);
        const std::string want = read_file(expected);
        ++compared;
        if (out.str() != want) {
            ++mismatched;
            ADD_FAILURE() << oso << ": " << first_difference(out.str(), want);
        }
    }
    EXPECT_GT(compared, 700);
    EXPECT_EQ(mismatched, 0) << "of " << compared;
}

} // namespace
