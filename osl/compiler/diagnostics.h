// Where every stage of the compiler reports problems: counts errors, formats them as
// "FILE:LINE: error: TEXT", and forwards them to the caller's ErrorHandler.
#pragma once

#include <OSL/oslconfig.h>

#include <string>

namespace OSL::pvt {

class Diagnostics {
public:
    explicit Diagnostics(ErrorHandler* handler) : m_handler(handler) {}

    void error(const std::string& file, int line, const std::string& text);
    void warning(const std::string& file, int line, const std::string& text);
    void info(const std::string& text);

    int errorCount() const { return m_errors; }
    bool warningsAreErrors = false;
    bool quiet = false;
    bool suppressWarnings = false;

private:
    void emit(int code, const std::string& msg);
    ErrorHandler* m_handler;
    int m_errors = 0;
};

} // namespace OSL::pvt
