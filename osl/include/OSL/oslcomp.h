// The OSL compiler's public face: turns OSL source (a file or a buffer) into OSO text, sending its
// diagnostics to an ErrorHandler. Mirrors OSL 1.12's OSLCompiler.
#pragma once

#include <OSL/oslconfig.h>

#include <memory>
#include <string>
#include <vector>

namespace OSL {

namespace pvt {
class OSLCompilerImpl;
}

class OSLCOMPPUBLIC OSLCompiler {
public:
    OSLCompiler(ErrorHandler* errhandler = nullptr);
    ~OSLCompiler();
    OSLCompiler(const OSLCompiler&) = delete;
    OSLCompiler& operator=(const OSLCompiler&) = delete;

    /// Compile the file with the oslc-style options (-o, -I, -D, -U, -E, -O, -W..., -q).
    /// stdoslpath names a stdosl.h to use instead of the built-in one. True when it compiled.
    bool compile(string_view filename, const std::vector<std::string>& options,
                 string_view stdoslpath = string_view());

    /// Compile source held in memory, leaving the OSO text in osobuffer. Diagnostics name
    /// `filename`, or "<buffer>" when it is empty.
    bool compile_buffer(string_view sourcecode, std::string& osobuffer,
                        const std::vector<std::string>& options,
                        string_view stdoslpath = string_view(),
                        string_view filename = string_view());

    /// The file the last successful compile() wrote.
    string_view output_filename() const;

private:
    std::unique_ptr<pvt::OSLCompilerImpl> m_impl;
};

} // namespace OSL
