#include <trelm/core/locale_guard.h>

#include <gtest/gtest.h>

#include <clocale>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <langinfo.h>
#include <locale>
#include <mutex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <unistd.h>
#if defined(__SANITIZE_ADDRESS__)
#include <sanitizer/lsan_interface.h>
#endif

using TrelmSDK::LocaleGuard;

namespace {

// A numeric facet with a decimal comma, so the C++ side is testable without system locales.
struct CommaNumpunct : std::numpunct<char> {
    char do_decimal_point() const override { return ','; }
};

std::string streamed(double v) {
    std::ostringstream out;
    out << v;
    return out.str();
}

std::string printed(double v) {
    char buffer[32];
    std::snprintf(buffer, sizeof buffer, "%g", v);
    return buffer;
}

// Installs a decimal-comma C++ global locale for one test.
class CommaGlobal {
public:
    CommaGlobal()
        : old_(std::locale::global(std::locale(std::locale::classic(), new CommaNumpunct))) {}
    ~CommaGlobal() { std::locale::global(old_); }

private:
    std::locale old_;
};

// A locale with a decimal comma: an installed one, or else one built with localedef in a
// temporary folder (needs the charmaps of the "locales" package). Null when neither works.
locale_t makeCommaLocale() {
    for (const char* name : {"de_DE.UTF-8", "de_DE.utf8", "fr_FR.UTF-8", "fr_FR.utf8"})
        if (locale_t found = newlocale(LC_ALL_MASK, name, nullptr)) return found;

    const auto folder = std::filesystem::temp_directory_path() /
                        ("trelm-locale-test-" + std::to_string(::getpid()));
    std::filesystem::create_directories(folder);
    {
        std::ofstream source(folder / "comma.src");
        source << "LC_NUMERIC\ndecimal_point \"<U002C>\"\nthousands_sep \"\"\ngrouping -1\n"
                  "END LC_NUMERIC\n";
    }
    const std::string command = "localedef -c -f UTF-8 -i '" + (folder / "comma.src").string() +
                                "' '" + (folder / "tessel_comma").string() + "' >/dev/null 2>&1";
    locale_t made = nullptr;
    if (std::system(command.c_str()) != -1) {
        const char* old = std::getenv("LOCPATH");
        const std::string saved = old ? old : "";
        ::setenv("LOCPATH", folder.c_str(), 1);
#if defined(__SANITIZE_ADDRESS__)
        // glibc keeps the LOCPATH search list it builds here for good; not ours to free.
        __lsan_disable();
#endif
        made = newlocale(LC_ALL_MASK, "tessel_comma", nullptr);
#if defined(__SANITIZE_ADDRESS__)
        __lsan_enable();
#endif
        if (old)
            ::setenv("LOCPATH", saved.c_str(), 1);
        else
            ::unsetenv("LOCPATH");
    }
    std::error_code ec;
    std::filesystem::remove_all(folder, ec);
    return made;
}

} // namespace

TEST(LocaleGuard, StreamsUseADecimalPointInsideAndTheUsersLocaleAfter) {
    CommaGlobal comma;
    ASSERT_EQ(streamed(1.5), "1,5");
    {
        LocaleGuard guard;
        EXPECT_TRUE(guard.Active());
        EXPECT_EQ(streamed(1.5), "1.5");
    }
    EXPECT_EQ(streamed(1.5), "1,5");
}

TEST(LocaleGuard, RestoredAfterAnException) {
    CommaGlobal comma;
    const locale_t before = uselocale(static_cast<locale_t>(nullptr));
    try {
        LocaleGuard guard;
        EXPECT_NE(uselocale(static_cast<locale_t>(nullptr)), before);
        EXPECT_EQ(streamed(0.25), "0.25");
        throw std::runtime_error("compiler failed");
    } catch (const std::runtime_error&) {
    }
    EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), before);
    EXPECT_EQ(streamed(0.25), "0,25");
}

TEST(LocaleGuard, NestedGuardsRestoreInTurn) {
    CommaGlobal comma;
    const locale_t before = uselocale(static_cast<locale_t>(nullptr));
    {
        LocaleGuard outer;
        const locale_t inOuter = uselocale(static_cast<locale_t>(nullptr));
        {
            LocaleGuard inner;
            EXPECT_EQ(streamed(2.5), "2.5");
        }
        EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), inOuter);
        EXPECT_EQ(streamed(2.5), "2.5");
    }
    EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), before);
    EXPECT_EQ(streamed(2.5), "2,5");
}

TEST(LocaleGuard, OverlappingGuardsOnTwoThreadsRestoreTheGlobalLocaleOnce) {
    CommaGlobal comma;
    std::mutex m;
    std::condition_variable cv;
    int stage = 0;
    auto waitFor = [&](int s) {
        std::unique_lock lock(m);
        cv.wait(lock, [&] { return stage >= s; });
    };
    auto advance = [&] {
        std::lock_guard lock(m);
        ++stage;
        cv.notify_all();
    };
    std::string seenByB;
    // A enters, B enters, A leaves (B still guarded: still '.'), B leaves.
    std::thread a([&] {
        LocaleGuard guard;
        advance(); // 1
        waitFor(2);
    });
    std::thread b([&] {
        waitFor(1);
        LocaleGuard guard;
        advance(); // 2
        a.join();
        seenByB = streamed(3.5);
    });
    b.join();
    EXPECT_EQ(seenByB, "3.5");
    EXPECT_EQ(streamed(3.5), "3,5");
}

TEST(LocaleGuard, OnlyTheGuardingThreadsCLocaleChanges) {
    const locale_t before = uselocale(static_cast<locale_t>(nullptr));
    LocaleGuard guard;
    locale_t other = nullptr;
    std::thread([&] { other = uselocale(static_cast<locale_t>(nullptr)); }).join();
    EXPECT_EQ(other, LC_GLOBAL_LOCALE);
    EXPECT_NE(uselocale(static_cast<locale_t>(nullptr)), before);
}

TEST(LocaleGuard, ReplacesOnlyTheNumericCategory) {
    locale_t utf8 = newlocale(LC_ALL_MASK, "C.UTF-8", nullptr);
    if (!utf8) GTEST_SKIP() << "C.UTF-8 is not available";
    const locale_t previous = uselocale(utf8);
    {
        LocaleGuard guard;
        EXPECT_STREQ(nl_langinfo(CODESET), "UTF-8");
        EXPECT_STREQ(nl_langinfo(RADIXCHAR), ".");
    }
    EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), utf8);
    uselocale(previous);
    freelocale(utf8);
}

TEST(LocaleGuard, UnknownLocaleNameChangesNothing) {
    const locale_t before = uselocale(static_cast<locale_t>(nullptr));
    {
        LocaleGuard guard("no_such_locale.really");
        EXPECT_FALSE(guard.Active());
        EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), before);
    }
    EXPECT_EQ(uselocale(static_cast<locale_t>(nullptr)), before);
}

TEST(LocaleGuard, CFormattingUsesAPointUnderADecimalCommaLocale) {
    locale_t comma = makeCommaLocale();
    if (!comma) GTEST_SKIP() << "no locale with a decimal comma is installed or can be built";
    const locale_t previous = uselocale(comma);
    EXPECT_EQ(printed(1.5), "1,5");
    try {
        LocaleGuard guard;
        EXPECT_EQ(printed(1.5), "1.5");
        EXPECT_DOUBLE_EQ(std::strtod("2.25", nullptr), 2.25);
        throw std::logic_error("leave early");
    } catch (const std::logic_error&) {
    }
    EXPECT_EQ(printed(1.5), "1,5");
    uselocale(previous);
    freelocale(comma);
}
