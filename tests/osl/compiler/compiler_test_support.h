// Helpers shared by the compiler tests: an error handler that keeps what the compiler reports,
// and a one-call compile of OSL source held in memory.
#pragma once

#include <OSL/oslcomp.h>

#include <string>
#include <vector>

namespace compiler_test {

// Keeps the errors (severe ones included) and warnings the compiler reports, in order.
struct CollectingHandler : OSL::ErrorHandler {
    std::vector<std::string> errors, warnings;

    void operator()(int code, const std::string& msg) override {
        if (code == EH_ERROR || code == EH_SEVERE)
            errors.push_back(msg);
        else if (code == EH_WARNING)
            warnings.push_back(msg);
    }
    // The first error, or "" when there was none: for the message of a failed assertion.
    std::string firstError() const { return errors.empty() ? "" : errors.front(); }
};

// The OSO compiled from `src` (as "test.osl"), or "" when it does not compile.
inline std::string compileOrFail(const std::string& src, CollectingHandler& eh) {
    OSL::OSLCompiler c(&eh);
    std::string oso;
    if (!c.compile_buffer(src, oso, {}, "", "test.osl")) return "";
    return oso;
}

} // namespace compiler_test
