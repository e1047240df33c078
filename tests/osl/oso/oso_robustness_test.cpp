// Damaged OSO must be rejected with a message, never crash or hang: every truncation of a
// corpus file before its final `end`, and a few thousand random mutations of corpus files.
#include <OSL/oslquery.h>
#include <OSL/osoreader.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <sstream>

namespace fs = std::filesystem;
using namespace OSL;

namespace {

class CountingErrors final : public ErrorHandler {
public:
    void operator()(int errcode, const std::string&) override {
        if (errcode >= EH_ERROR) ++errors;
    }
    int errors = 0;
};

// Reads everything, code included, and checks that jump targets and labels arrive as ints.
class FullReader final : public OSOReader {
public:
    using OSOReader::OSOReader;
    void instruction(int, const char* op) override { ops += op[0] != '\0'; }
    int ops = 0;
};

std::vector<std::string> corpus_texts() {
    std::vector<std::pair<fs::path, std::string>> files;
    const fs::path suite = fs::path(TESSEL_SHARED_DIR) / "osl-conformance" / "testsuite";
    std::error_code ec;
    for (const auto& entry : fs::recursive_directory_iterator(suite, ec)) {
        if (entry.path().extension() != ".oso") continue;
        std::ifstream in(entry.path(), std::ios::binary);
        std::ostringstream s;
        s << in.rdbuf();
        files.emplace_back(entry.path(), s.str());
    }
    std::sort(files.begin(), files.end());
    std::vector<std::string> texts;
    for (auto& f : files) texts.push_back(std::move(f.second));
    return texts;
}

const std::vector<std::string>& corpus() {
    static const std::vector<std::string> texts = corpus_texts();
    return texts;
}

// Where the final `end` instruction's name finishes: any shorter prefix is truncated OSO.
size_t end_of_final_end(const std::string& text) {
    const size_t at = text.rfind("\tend");
    return at == std::string::npos ? text.size() : at + 4;
}

// Parses with a full reader and a query; both must either succeed quietly or fail with errors.
void expect_consistent_outcome(const std::string& text, const std::string& what) {
    CountingErrors errors;
    FullReader reader(&errors);
    const bool ok = reader.parse_memory(text);
    if (ok)
        EXPECT_EQ(errors.errors, 0) << what;
    else
        EXPECT_GT(errors.errors, 0) << what;
    OSLQuery q;
    const bool qok = q.open_bytecode(text);
    EXPECT_EQ(qok, ok) << what;
    EXPECT_EQ(q.geterror().empty(), qok) << what;
}

TEST(OSORobustness, CorpusParsesCleanly) {
    ASSERT_GT(corpus().size(), 700u);
    for (const std::string& text : corpus()) {
        CountingErrors errors;
        FullReader reader(&errors);
        EXPECT_TRUE(reader.parse_memory(text));
        EXPECT_GT(reader.ops, 0);
        EXPECT_EQ(errors.errors, 0);
    }
}

TEST(OSORobustness, TruncatedTextIsAlwaysRejected) {
    std::mt19937 rng(12345);
    int checked = 0;
    for (size_t f = 0; f < corpus().size(); ++f) {
        const std::string& text = corpus()[f];
        const size_t limit = end_of_final_end(text);
        std::vector<size_t> cuts;
        if (f % 100 == 0) {
            // Every line boundary and every byte of the last lines of a few files.
            for (size_t i = 0; i < limit; ++i)
                if (text[i] == '\n' || i + 200 > limit) cuts.push_back(i);
        } else {
            for (int k = 0; k < 3; ++k) cuts.push_back(rng() % limit);
        }
        for (size_t cut : cuts) {
            CountingErrors errors;
            FullReader reader(&errors);
            const std::string truncated = text.substr(0, cut);
            EXPECT_FALSE(reader.parse_memory(truncated)) << "file " << f << " cut at " << cut;
            EXPECT_EQ(errors.errors, 1) << "file " << f << " cut at " << cut;
            ++checked;
        }
    }
    EXPECT_GT(checked, 2000);
}

std::string mutate(const std::string& text, std::mt19937& rng) {
    static const std::string alphabet = "\"%{}[]:#\\\n\t -+.$0123456789eEabcxyz,\r\x01\xff";
    std::string t = text;
    const size_t n = t.size();
    if (n == 0) return t;
    auto pos = [&] { return rng() % n; };
    switch (rng() % 7) {
    case 0:
        t[pos()] = alphabet[rng() % alphabet.size()];
        break;
    case 1:
        t.erase(pos(), 1 + rng() % 40);
        break;
    case 2:
        t.insert(pos(), 1, alphabet[rng() % alphabet.size()]);
        break;
    case 3: {
        const size_t from = pos();
        t.insert(pos(), t.substr(from, 1 + rng() % 80));
        break;
    }
    case 4:
        t[pos()] = (char)(rng() % 256);
        break;
    case 5: { // swap two lines
        const size_t a = t.find('\n', pos()), b = t.find('\n', pos());
        if (a != std::string::npos && b != std::string::npos && a != b) {
            const size_t lo = std::min(a, b) + 1, hi = std::max(a, b) + 1;
            const size_t lo_end = t.find('\n', lo);
            if (lo_end != std::string::npos && lo_end < hi) {
                std::string line = t.substr(lo, lo_end - lo + 1);
                t.erase(lo, line.size());
                t.insert(hi - line.size(), line);
            }
        }
        break;
    }
    default: { // replace a number with a big or odd one
        static const char* odd[] = {
            "2147483648", "-2147483649", "99999999999999999999", "1e39", "-0",
            "nan",        "[]",          "[999999999]",          "0x1f", ".",
            "-"};
        t.insert(pos(), odd[rng() % (sizeof(odd) / sizeof(odd[0]))]);
        break;
    }
    }
    return t;
}

TEST(OSORobustness, RandomMutationsNeverCrashAndFailuresAreReported) {
    std::mt19937 rng(777);
    int rejected = 0;
    constexpr int kMutations = 3000;
    for (int m = 0; m < kMutations; ++m) {
        const std::string& text = corpus()[rng() % corpus().size()];
        std::string damaged = mutate(text, rng);
        if (rng() % 4 == 0) damaged = mutate(damaged, rng);
        CountingErrors errors;
        FullReader reader(&errors);
        const bool ok = reader.parse_memory(damaged);
        rejected += !ok;
        if (m % 10 == 0)
            expect_consistent_outcome(damaged, "mutation " + std::to_string(m));
        else if (ok)
            EXPECT_EQ(errors.errors, 0);
        else
            EXPECT_GT(errors.errors, 0);
    }
    // Most damage is detectable; a test whose mutations never broke anything would prove nothing.
    EXPECT_GT(rejected, kMutations / 4);
}

} // namespace
