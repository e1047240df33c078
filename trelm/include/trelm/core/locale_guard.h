// The host's "C" locale guard: numbers are read and written with a decimal point while it lives,
// whatever the user's locale, and the previous locale is back on every exit path.
#pragma once

#include <locale.h>

namespace TrelmSDK {

// The guard switches LC_NUMERIC of the calling thread only (a per-thread locale), so render
// threads formatting numbers meanwhile are not affected. It also gives the C++ global locale the
// classic numeric facets while any guard is alive in the process (streams created then format
// with '.'); that part is process-wide and reference-counted, restored when the last guard ends.
// Guards nest, on one thread and across threads; a guard must end on the thread that made it.
class LocaleGuard {
public:
    explicit LocaleGuard(const char* numericLocale = "C");
    ~LocaleGuard();
    LocaleGuard(const LocaleGuard&) = delete;
    LocaleGuard& operator=(const LocaleGuard&) = delete;

    // False when the locale could not be created; the guard then changes nothing.
    bool Active() const { return threadLocale_ != nullptr; }

private:
    locale_t threadLocale_ = nullptr;
    locale_t previous_ = nullptr;
    bool holdsGlobal_ = false;
};

} // namespace TrelmSDK
