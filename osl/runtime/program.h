// The executable form of a shader group: every layer's ops flattened into one instruction list
// whose operands point straight at fixed offsets of a per-context heap, built once per group.
// Executing a sample then only walks instructions; nothing is looked up, allocated or locked.
#pragma once

#include "shader_group.h"

#include <OSL/oslclosure.h>
#include <OSL/oslexec.h>

#include <cstdint>
#include <string>
#include <vector>

namespace OSL {

class ShadingSystemImpl;
struct ExecState;
struct Instr;

// Where an op argument lives in the heap and how to read it.
struct Operand {
    uint32_t offset = 0; // of the value; derivatives follow the whole value when `derivs`
    uint32_t size = 0;   // bytes of the value (all elements)
    TypeDesc type;       // simple type, arrays included; closures are PTR
    uint16_t ncomp = 1;  // floats per element: 1, 3 or 16; 1 for int and string
    uint16_t arraylen = 0;
    bool derivs = false;
    bool isInt = false, isFloat = false, isString = false, isClosure = false, isMatrix = false;
    bool isConst = false;
    int symbol = -1; // index into Program::symbols, for messages
};

using Kernel = void (*)(ExecState&, const Instr&);

enum class Flow : uint8_t {
    Plain,
    If,
    For,
    While,
    DoWhile,
    FunctionCall,
    Return,
    Break,
    Continue,
    Exit,
    End
};

struct Instr {
    Kernel fn = nullptr;
    const Operand* args = nullptr;
    int nargs = 0;
    Flow flow = Flow::Plain;
    int jump[4] = {-1, -1, -1, -1};
    int layer = 0;
    int masterOp = 0;
    // Connected parameters this op reads: resolved (running upstream layers) before it runs.
    int useBegin = 0, useCount = 0;
    // Op-specific constant data chosen when the program is built (closure entry, raytype bit...).
    const void* aux = nullptr;
    int iaux = 0;
};

// A symbol as find_symbol returns it.
class ShaderSymbol {
public:
    ustring name;
    int layer = -1;
    int masterSymbol = -1;
    TypeDesc type;
    uint32_t offset = 0;
    bool hasStorage = false;
    bool derivs = false;
    uint64_t programSerial = 0; // storage is valid only in a context bound to this program
};

// A parameter whose value comes from the geometry (lockgeom=0): asked of the renderer's
// get_userdata each time the layer runs, keeping the default when the renderer has none.
struct UserdataParam {
    ustring name;
    Operand value;
};

struct ProgramLayer {
    ustring name;
    std::vector<UserdataParam> userdata;
    int mainBegin = 0, mainEnd = 0;
    std::vector<std::pair<int, int>> initRanges; // param init code to run at layer start
    uint32_t regionBegin = 0, regionEnd = 0;     // bytes of the heap reset at layer start
    bool runsEagerly = false;
    bool isEntry = false; // named as an entry layer: checks on every call whether it ran
    int firstSymbol = 0, symbolCount = 0;
};

// A parameter fed by connections; resolved at most once per execution.
struct ConnectedParam {
    int layer = -1;
    std::vector<int> sources; // indices into Program::copies
};

// One connection's copy, from an upstream output into a downstream parameter.
struct ConnectionCopy {
    int srcLayer = -1;
    Operand src, dst;
    int srcArrayIndex = -1, srcComponent = -1;
    int dstArrayIndex = -1, dstComponent = -1;
};

enum class GlobalId : uint8_t {
    P,
    I,
    N,
    Ng,
    u,
    v,
    dPdu,
    dPdv,
    Ps,
    time,
    dtime,
    dPdtime,
    Ci,
    Other
};

struct GlobalSlot {
    ustring name;
    GlobalId id = GlobalId::Other;
    uint32_t offset = 0;
    TypeDesc type;
    bool derivs = false;
};

struct Program {
    std::vector<Instr> instrs;
    std::vector<Operand> operands;
    std::vector<int> uses; // ConnectedParam indices, referenced by Instr::useBegin/useCount
    std::vector<ProgramLayer> layers;
    std::vector<ConnectedParam> connectedParams;
    std::vector<ConnectionCopy> copies;
    std::vector<ShaderSymbol> symbols;
    std::vector<GlobalSlot> globals;
    // The heap's starting contents: constants, defaults, zeros. Written when the program is
    // built and by ReParameter, which callers must not overlap with executions; executing
    // threads only read it.
    std::vector<char> initImage;
    uint32_t heapSize = 0;
    uint32_t ciOffset = 0;
    bool hasCi = false;
    uint64_t serial = 0; // unique per program, so contexts know when to rebind
    // The named entry layers in the order given; empty when the last layer is the entry.
    std::vector<int> entryOrder;
    bool traceLayers = false; // report entering and leaving layers with the shader output
    bool debugNan = false, debugUninit = false;
    // What the optimiser did: ops folded, ops dropped, layers merged into identical ones.
    int optFolded = 0, optRemoved = 0, optMergedLayers = 0;
    std::vector<std::vector<int>> reportedOps; // per layer, when debugUninit: see debug_checks.h
    const ShaderGroup* group = nullptr;
    ShadingSystemImpl* system = nullptr;
};

// Writes a parameter's starting value (the instance value when given, else the default) into
// its storage of type t.
void writeValue(char* dst, TypeDesc t, const MasterSymbol& s, const InstanceValue* iv);

// Builds the program of an ended group; on failure returns null with the reason in `error`.
std::unique_ptr<Program> buildProgram(ShadingSystemImpl& system, const ShaderGroup& group,
                                      std::string& error);

} // namespace OSL
