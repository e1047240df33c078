// _hlsl_info: what the caller hands to one viewport translation (UDIM tiles, colour management)
// and what it gets back (instruction counts, accuracy and messages).
#pragma once

#include <map>
#include <string>
#include <vector>

namespace oslo {

struct _hlsl_info {
    int opCount = 0;
    // Instructions translated only approximately or not at all.
    int unsupportedCount = 0;
    // Share of supported instructions, in percent.
    int accuracy = 0;
    // Message text to the number of times it was reported.
    std::map<std::string, int> messages;

    // Inputs filled by the caller before the translation.
    // Texture-parameter name to its UDIM tile numbers as text ("1001", "1002", ...).
    std::map<std::string, std::vector<std::string>> udimTiles;
    // Viewport colour management of texture lookups.
    bool colorManagement = false;
    // The colour-management HLSL pieces (conversion functions and apply_color_management),
    // joined behind "predefine:" when a lookup needs them.
    std::vector<std::string> colorManagementHLSL;
};

// Counts one more report of a message.
void RecordMessage(_hlsl_info& info, const std::string& text);

// Counts one more unsupported instruction together with its message.
void RecordUnsupported(_hlsl_info& info, const std::string& text);

} // namespace oslo
