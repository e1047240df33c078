// The OSO-to-HLSL generator: one compiled shader becomes one HLSL function whose signature lists
// the shader's inputs and outputs and whose body translates every instruction.
#pragma once

#include "hlsl_gen_globals.h"
#include "hlsl_info.h"
#include "oso_data.h"

#include <ostream>
#include <string>
#include <vector>

namespace oslo {

// Translates the OSO text into the function `name`. With an output text the result is written
// there (include list as a leading comment, signature, body); a failed translation leaves it
// unchanged. Without one the function would be registered with the host's shader generator,
// which this build does not provide yet, so that call returns false.
bool GenerateHLSL(const std::string& name, const std::string& osoText, _hlsl_info& info,
                  std::string* output);

bool GenerateBody(const OSOData& oso, std::string& body, HLSLGenGlobals& globals,
                  const std::string& name, _hlsl_info& info);

std::string GenerateSignature(const OSOData& oso, const std::string& name, HLSLGenGlobals& globals);

bool GenerateSection(const CodeSection& section, const OSOData& oso, int depth,
                     HLSLGenGlobals& globals, std::ostream& out, _hlsl_info& info);

// Writes and pops the pending control-flow events that belong before instruction `index`.
void CloseBlocks(int index, BlockStack& blocks, int& depth, std::ostream& out);

bool ConvertInstruction(OpConverterParams& params);

void DeclareSymbols(const std::map<std::string, OSOSymbol>& symbols, HLSLGenGlobals& globals,
                    int depth, std::ostream& out);

// The include entries that the features of a translation ask for, in bit order.
std::vector<std::string> IncludeList(const HLSLGenGlobals& globals);

} // namespace oslo
