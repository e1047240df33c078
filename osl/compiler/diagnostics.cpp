// Formats compiler messages the way oslc does and hands them to the ErrorHandler.
#include "diagnostics.h"

#include <iostream>

namespace OSL::pvt {

static std::string location(const std::string& file, int line) {
    return (file.empty() ? std::string("<buffer>") : file) + ":" + std::to_string(line) + ": ";
}

void Diagnostics::emit(int code, const std::string& msg) {
    if (m_handler)
        (*m_handler)(code, msg);
    else
        std::cerr << msg << "\n";
}

void Diagnostics::error(const std::string& file, int line, const std::string& text) {
    ++m_errors;
    emit(ErrorHandler::EH_ERROR, location(file, line) + "error: " + text);
}

void Diagnostics::warning(const std::string& file, int line, const std::string& text) {
    if (m_nowarn.count({file, line})) return;
    if (warningsAreErrors) {
        error(file, line, text);
        return;
    }
    if (suppressWarnings) {
        return;
    }
    emit(ErrorHandler::EH_WARNING, location(file, line) + "warning: " + text);
}

void Diagnostics::info(const std::string& text) {
    if (!quiet) emit(ErrorHandler::EH_INFO, text);
}

} // namespace OSL::pvt
