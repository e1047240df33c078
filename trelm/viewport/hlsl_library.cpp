// Lookup and assembly of the viewport HLSL library; the texts are the .hlsl/.h files beside this
// file, embedded at build time.
#include <trelm/viewport/hlsl_library.h>

#include "hlsl_library_data.h"

namespace TrelmSDK::Graphics::ksg {

std::string_view BaseLibrary() {
    return detail::kBaseLibrary;
}

std::string_view IncludeFile(std::string_view name) {
    if (name == "ksg_noise.h") return detail::kNoiseInclude;
    if (name == "ksg_util.h") return detail::kUtilInclude;
    return {};
}

std::string AssembleLibraryEntry(const std::vector<std::string>& includeList,
                                 std::string_view functionText, std::string& error) {
    constexpr std::string_view includePrefix = "include:";
    constexpr std::string_view predefinePrefix = "predefine:";
    std::string text(BaseLibrary());
    text += "\n";
    for (const std::string& entry : includeList) {
        const std::string_view view(entry);
        if (view.starts_with(includePrefix)) {
            const std::string_view name = view.substr(includePrefix.size());
            const std::string_view include = IncludeFile(name);
            if (include.empty()) {
                error = "Unknown viewport include '" + std::string(name) + "'";
                return {};
            }
            text += include;
            text += "\n";
        } else if (view.starts_with(predefinePrefix)) {
            text += view.substr(predefinePrefix.size());
            text += "\n";
        }
    }
    text += functionText;
    return text;
}

} // namespace TrelmSDK::Graphics::ksg
