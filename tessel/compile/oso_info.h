// OSOInfo: the description of one compiled shader (names, labels, types, outputs, metadata) and
// the host parameter block descriptor of its shader block.
#pragma once

#include "compile/pb_osl_accessor.h"
#include "compile/source_key.h"

#include <OSL/oslquery.h>
#include <trelm/params/param_block_desc.h>

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace TrelmSDK {
class ClassDesc2;
}

// Save formats of the shader block: the current one and the older ones scenes may carry.
inline constexpr int kShaderFormatCurrent = 20200;
inline constexpr int kShaderFormat20191 = 20191;
inline constexpr int kShaderFormat20190 = 20190;

// Output name used when a shader has no output at all.
inline constexpr const wchar_t* kNoValidOutput = L"NO VALID OUTPUT";

// Built once per compiled text (and per older save format) on the main thread or the start-up
// registration thread, then only read; shared between the registry, maps and panels.
struct OSOInfo {
    OSOInfo(std::string text, SourceKey key, int saveFormat);
    ~OSOInfo();
    OSOInfo(const OSOInfo&) = delete;
    OSOInfo& operator=(const OSOInfo&) = delete;

    SourceKey key;
    std::string osoText;
    std::shared_ptr<ParamBlockDesc2> blockDesc; // none when the query failed
    std::shared_ptr<PBOSLAccessor> accessor;
    std::vector<MSTR> outputNames;
    std::vector<MSTR> names;  // 2 x N: parameters, then their companion maps
    std::vector<MSTR> labels; // 2 x N, parallel to names
    std::vector<std::int32_t> outputIndices;
    std::vector<OSL::TypeDesc> types; // N, with struct folding applied
    std::vector<MSTR> mapNames;
    std::vector<MSTR> mapLabels;
    std::string shaderName;
    std::map<std::string, std::map<std::string, std::string>> metadata;
    int saveFormat;

private:
    void build();
    void addValueEntry(const OSL::OSLQuery::Parameter& p, const OSL::TypeDesc& t,
                       const OSL::OSLQuery::Parameter* fields, TrelmSDK::ParamID id,
                       PBAccessor* accessor);
};

// The class descriptor named as owner of shader block descriptors (the map class descriptor);
// none until the module sets it. Set on the main thread before descriptions are built.
void SetShaderBlockOwner(TrelmSDK::ClassDesc2* owner);
TrelmSDK::ClassDesc2* ShaderBlockOwner();

// Resource string number of the notice that a shader has no output.
inline constexpr int kNoOutputResourceString = 15;
// Resource string number of the shader block's local name.
inline constexpr int kShaderBlockResourceString = 12;
