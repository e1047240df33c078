// The report of the `oslinfo` tool (our `tessel info`): a compiled shader's type, name,
// parameters with their defaults, and metadata, as text. Not part of OSL's library API.
#pragma once

#include <OSL/oslconfig.h>

#include <ostream>
#include <string>

namespace OSL {

struct OSLInfoOptions {
    bool verbose = false;   ///< `-v`: one line per default value, and the metadata
    std::string searchpath; ///< `-p`: colon-separated folders to look for shaders in
    std::string oneparam;   ///< `--param`: report only this parameter (and no header)
};

/// Writes the report for one shader (an .oso file name or a shader name, as OSLQuery::open takes
/// it) to `out`. A shader that cannot be opened gets the line `ERROR opening shader "NAME" (...)`
/// and a false result.
bool print_oslinfo(std::ostream& out, const std::string& shadername, const OSLInfoOptions& opts);

} // namespace OSL
