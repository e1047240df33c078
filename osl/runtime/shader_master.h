// A loaded shader ("master"): its symbols, default values and ops exactly as the OSO describes
// them. Groups instantiate masters as layers; masters are shared and never change once loaded.
#pragma once

#include <OSL/oslconfig.h>
#include <OSL/typespec.h>

#include <memory>
#include <string>
#include <vector>

namespace OSL {

// Metadata attached to a symbol or to the shader ([[ type name = value ]]).
struct ShaderMetadata {
    std::string type, name, value;
};

struct MasterSymbol {
    ustring name;
    SymType symtype = SymTypeLocal;
    TypeSpec type;
    std::vector<int> idefaults;
    std::vector<float> fdefaults;
    std::vector<ustring> sdefaults;
    int initBegin = -1, initEnd = -1; // the param's own code section, when it has one
    bool hasDerivsHint = false;
    bool initexpr = false;
    bool lockgeom = true;
    int firstRead = -1, lastRead = -1, firstWrite = -1, lastWrite = -1;
    // Struct members are flattened: a struct symbol has no storage, its fields follow as
    // symbols named "struct.field" whose structParent is the struct's index.
    int structParent = -1;
    std::vector<ustring> structFields;
    ustring structName;
    std::vector<ShaderMetadata> metadata;

    bool isParam() const { return symtype == SymTypeParam || symtype == SymTypeOutputParam; }
    bool isOutput() const { return symtype == SymTypeOutputParam; }
    bool isStruct() const { return type.is_structure_based(); }
};

struct MasterOp {
    ustring opname;
    int firstArg = 0, nargs = 0;
    int jump[4] = {-1, -1, -1, -1};
    uint32_t argWrite = 0;  // bit i: argument i is written
    uint32_t argRead = 0;   // bit i: argument i is read
    uint32_t argDerivs = 0; // bit i: argument i's derivatives are taken
    ustring sourcefile;
    int line = 0;
};

class ShaderMaster {
public:
    ustring name;       // the name it was loaded under
    ustring osoName;    // the name on the OSO's shader line
    ustring shadertype; // "surface", "shader", ...
    std::vector<MasterSymbol> symbols;
    std::vector<MasterOp> ops;
    std::vector<int> args; // symbol index per op argument
    int mainBegin = 0, mainEnd = 0;
    std::vector<ShaderMetadata> metadata;

    // Index of the named symbol or -1; parameters are found by their full (field) name.
    int findSymbol(ustring symname) const;
};

using ShaderMasterRef = std::shared_ptr<const ShaderMaster>;

// Parses OSO text into a master. On failure returns null and puts the reason in `error`.
ShaderMasterRef loadShaderMaster(string_view shadername, const std::string& osoText,
                                 std::string& error);

} // namespace OSL
