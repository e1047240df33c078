// Runs conformance cases through `tessel shade` with the reference compiler's OSO (so that the
// shading system is measured on its own) and compares with the reference outputs.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

namespace fs = std::filesystem;

namespace {

// Cases whose every command the shading system handles today; each must keep passing.
const char* const kPassingCases[] = {
#include "conformance_passing.inc"
};

std::string runCommand(const std::string& cmd, int& status) {
    std::string out;
    FILE* p = popen(cmd.c_str(), "r");
    if (!p) {
        status = -1;
        return out;
    }
    char buf[4096];
    while (size_t n = fread(buf, 1, sizeof buf, p)) out.append(buf, n);
    status = pclose(p);
    return out;
}

void writeScript(const fs::path& path, const std::string& text) {
    std::ofstream(path) << text;
    fs::permissions(path, fs::perms::owner_all | fs::perms::group_read | fs::perms::others_read);
}

TEST(ShadeConformance, ReferenceOsoCasesMatchReferenceOutputs) {
    const fs::path tessel = fs::path(TESSEL_BINARY_DIR) / "bin" / "tessel";
    const fs::path runner = fs::path(TESSEL_SHARED_DIR) / "osl-conformance" / "run.py";
    if (!fs::exists(tessel)) GTEST_SKIP() << "the tessel CLI is not built in " << TESSEL_BINARY_DIR;
    if (!fs::exists(runner)) GTEST_SKIP() << "no conformance suite at " << runner;
    int status = 0;
    runCommand("python3 --version && oiiotool --version", status);
    if (status != 0) GTEST_SKIP() << "python3 or oiiotool is missing";

    const fs::path tools =
        fs::temp_directory_path() / ("tessel-shade-conf-" + std::to_string(getpid()));
    fs::create_directories(tools);
    // The "compiler" hands out the reference OSO and console text of each case.
    writeScript(tools / "oslc", R"(#!/bin/sh
out=""; prev=""
for a; do
  case $a in *.osl) f=$a;; esac
  if [ "$prev" = "-o" ]; then out=$a; fi
  prev=$a
done
b=$(basename "$f" .osl)
[ -n "$out" ] || out=$b.oso
if [ -f "data/oso-ref/$b.oso" ]; then cp "data/oso-ref/$b.oso" "$out"; fi
sed -e "s#oso-ref/##" -e "/^(compile failed)$/d" "data/oso-ref/$b.oslc.txt"
[ -f "data/oso-ref/$b.oso" ]
)");
    writeScript(tools / "oslinfo", R"(#!/bin/sh
for a; do case $a in -*) ;; *) f=$a;; esac; done
cat "data/oso-ref/$(basename "$f" .oso).oslinfo.txt"
)");
    std::string cases;
    for (const char* c : kPassingCases) cases += std::string(" ") + c;
    const std::string cmd = "python3 " + runner.string() + " --shade '" + tessel.string() +
                            " shade' --compile " + (tools / "oslc").string() + " --info " +
                            (tools / "oslinfo").string() + " --jobs 2 --timeout 60 --cases" +
                            cases + " 2>&1";
    const std::string out = runCommand(cmd, status);
    fs::remove_all(tools);
    std::istringstream lines(out);
    std::string line;
    std::vector<std::string> failures;
    while (std::getline(lines, line))
        if (line.rfind("FAIL ", 0) == 0 || line.rfind("SKIP ", 0) == 0) failures.push_back(line);
    EXPECT_TRUE(failures.empty()) << out;
    EXPECT_NE(out.find(std::to_string(std::size(kPassingCases)) + " passed, 0 failed"),
              std::string::npos)
        << out;
}

} // namespace
