// Where every stage of the compiler reports problems: counts errors, formats them as
// "FILE:LINE: error: TEXT", and forwards them to the caller's ErrorHandler.
#pragma once

#include <OSL/oslconfig.h>

#include <set>
#include <string>
#include <utility>

namespace OSL::pvt {

class Diagnostics {
public:
    explicit Diagnostics(ErrorHandler* handler) : m_handler(handler) {}

    void error(const std::string& file, int line, const std::string& text);
    void warning(const std::string& file, int line, const std::string& text);
    void info(const std::string& text);
    // `#pragma osl nowarn`: no warning (nor a -Werror error made from one) at this file and line.
    void suppressWarningsAt(const std::string& file, int line) { m_nowarn.insert({file, line}); }

    int errorCount() const { return m_errors; }
    bool warningsAreErrors = false;
    bool quiet = false;
    bool suppressWarnings = false;

private:
    void emit(int code, const std::string& msg);
    ErrorHandler* m_handler;
    int m_errors = 0;
    std::set<std::pair<std::string, int>> m_nowarn;
};

} // namespace OSL::pvt
