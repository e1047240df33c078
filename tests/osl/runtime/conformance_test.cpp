// Runs conformance cases through `tessel shade` and compares with the reference outputs: once with
// the reference compiler's OSO (the shading system on its own) and once with our own compiler.
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

// Cases the shading system passes with the reference compiler's OSO, and further cases that pass
// end to end with our own compiler (each case runs once, to keep the suite's time down); each
// must keep passing.
const char* const kReferenceOsoCases[] = {
#include "conformance_passing.inc"
};
const char* const kOwnCompilerCases[] = {
#include "conformance_own_passing.inc"
};

// The cases are dealt round-robin into shards so that CTest runs them side by side and a failure
// names a small set.
constexpr int kShards = 6;

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

struct RunOutcome {
    bool skipped = false;
    std::string skipReason;
    std::string output;
    size_t expected = 0;
};

// Runs the given cases through run.py: with `referenceOso` the "compiler" hands out the reference
// OSO and console text of each case, so only the shading system is measured.
RunOutcome runCases(const std::vector<std::string>& names, bool referenceOso) {
    RunOutcome r;
    r.expected = names.size();
    const fs::path tessel = fs::path(TESSEL_BINARY_DIR) / "bin" / "tessel";
    const fs::path runner = fs::path(TESSEL_SHARED_DIR) / "osl-conformance" / "run.py";
    int status = 0;
    runCommand("python3 --version && oiiotool --version", status);
    if (!fs::exists(tessel))
        r.skipReason = "the tessel CLI is not built in " TESSEL_BINARY_DIR;
    else if (!fs::exists(runner))
        r.skipReason = "no conformance suite at " + runner.string();
    else if (status != 0)
        r.skipReason = "python3 or oiiotool is missing";
    if (!r.skipReason.empty()) {
        r.skipped = true;
        return r;
    }

    std::string cases;
    for (const std::string& c : names) cases += " " + c;
    std::string cmd = "python3 " + runner.string() + " --jobs 1 --timeout 120";
    fs::path tools;
    if (referenceOso) {
        tools = fs::temp_directory_path() / ("tessel-shade-conf-" + std::to_string(getpid()));
        fs::create_directories(tools);
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
        cmd += " --shade '" + tessel.string() + " shade' --compile " + (tools / "oslc").string() +
               " --info " + (tools / "oslinfo").string();
    } else {
        cmd += " --tessel " + tessel.string();
    }
    cmd += " --cases" + cases + " 2>&1";
    r.output = runCommand(cmd, status);
    if (!tools.empty()) fs::remove_all(tools);
    return r;
}

template <size_t N>
std::vector<std::string> shardOf(const char* const (&all)[N], int shard) {
    std::vector<std::string> names;
    for (size_t i = shard; i < N; i += kShards) names.emplace_back(all[i]);
    return names;
}

void expectAllPass(const RunOutcome& r) {
    std::istringstream lines(r.output);
    std::string line;
    std::vector<std::string> failures;
    while (std::getline(lines, line))
        if (line.rfind("FAIL ", 0) == 0 || line.rfind("SKIP ", 0) == 0) failures.push_back(line);
    EXPECT_TRUE(failures.empty()) << r.output;
    EXPECT_NE(r.output.find(std::to_string(r.expected) + " passed, 0 failed"), std::string::npos)
        << r.output;
}

class ShadeConformance : public testing::TestWithParam<int> {};

TEST_P(ShadeConformance, ReferenceOsoMatchesReferenceOutputs) {
    const RunOutcome r = runCases(shardOf(kReferenceOsoCases, GetParam()), true);
    if (r.skipped) GTEST_SKIP() << r.skipReason;
    expectAllPass(r);
}

TEST_P(ShadeConformance, OwnCompilerMatchesReferenceOutputs) {
    const RunOutcome r = runCases(shardOf(kOwnCompilerCases, GetParam()), false);
    if (r.skipped) GTEST_SKIP() << r.skipReason;
    expectAllPass(r);
}

INSTANTIATE_TEST_SUITE_P(Shard, ShadeConformance, testing::Range(0, kShards));

} // namespace
