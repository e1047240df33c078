// Per-thread numeric locale switching, plus the reference-counted C++ global locale.
#include <trelm/core/locale_guard.h>

#include <locale>
#include <mutex>
#include <optional>
#include <string>

namespace TrelmSDK {

namespace {

// The C++ global locale before the first live guard changed it; guarded by globalMutex.
std::mutex globalMutex;
int globalGuards = 0;
std::optional<std::locale> savedGlobal;
// Installing a named C++ global locale also sets the C global locale; this is what it was.
std::string savedCGlobal;

void acquireGlobal() {
    std::lock_guard lock(globalMutex);
    if (globalGuards++ > 0) return;
    std::locale current;
    if (current == std::locale::classic()) return;
    savedGlobal = current;
    const char* cGlobal = setlocale(LC_ALL, nullptr);
    savedCGlobal = cGlobal ? cGlobal : "";
    std::locale::global(std::locale(current, std::locale::classic(), std::locale::numeric));
}

void releaseGlobal() {
    std::lock_guard lock(globalMutex);
    if (--globalGuards > 0 || !savedGlobal) return;
    std::locale::global(*savedGlobal);
    savedGlobal.reset();
    if (!savedCGlobal.empty()) setlocale(LC_ALL, savedCGlobal.c_str());
}

} // namespace

LocaleGuard::LocaleGuard(const char* numericLocale) {
    // The new thread locale starts as a copy of the current one with only LC_NUMERIC replaced.
    const locale_t current = uselocale(static_cast<locale_t>(nullptr));
    const locale_t base = duplocale(current);
    if (!base) return;
    threadLocale_ = newlocale(LC_NUMERIC_MASK, numericLocale ? numericLocale : "C", base);
    if (!threadLocale_) {
        freelocale(base);
        return;
    }
    previous_ = uselocale(threadLocale_);
    acquireGlobal();
    holdsGlobal_ = true;
}

LocaleGuard::~LocaleGuard() {
    if (!threadLocale_) return;
    uselocale(previous_);
    freelocale(threadLocale_);
    if (holdsGlobal_) releaseGlobal();
}

} // namespace TrelmSDK
