// A shader group as it is being built and once ended: its layers (instances of masters with
// their parameter values), the connections between layers, its attributes, and the executable
// program made from it at ShaderGroupEnd.
#pragma once

#include "shader_master.h"

#include <OSL/oslexec.h>

#include <memory>
#include <string>
#include <vector>

namespace OSL {

struct Program;

// A parameter value given before Shader, or held by a layer, in the parameter's storage form.
struct InstanceValue {
    int symbol = -1; // index into the master's symbols
    TypeDesc type;   // the type the value was given with
    std::vector<char> data;
    bool lockgeom = true;
};

struct PendingParameter {
    ustring name;
    TypeDesc type;
    std::vector<char> data;
    bool lockgeom = true;
};

struct ShaderInstance {
    ShaderMasterRef master;
    ustring layername;
    ustring usage;
    std::vector<InstanceValue> values;

    const InstanceValue* valueFor(int symbol) const {
        for (const InstanceValue& v : values)
            if (v.symbol == symbol) return &v;
        return nullptr;
    }
};

// One end of a connection: a symbol, optionally one array element and/or one component.
struct ConnectedPart {
    int layer = -1;
    int symbol = -1;
    int arrayIndex = -1;
    int component = -1;
    TypeSpec type; // the type of the selected part
};

struct Connection {
    ConnectedPart src, dst;
};

class ShaderGroup {
public:
    ShaderGroup();
    ~ShaderGroup();

    ustring name;
    std::vector<ShaderInstance> layers;
    std::vector<Connection> connections;
    std::vector<PendingParameter> pending;
    std::vector<ustring> rendererOutputs;
    std::vector<ustring> entryLayers;
    bool ended = false;
    // Built at ShaderGroupEnd; read-only afterwards, shared by every thread that executes.
    std::unique_ptr<Program> program;
    std::string buildError;
    // What the group reads, computed at ShaderGroupEnd so that the "*_needed" attributes can
    // hand out pointers to these arrays, as renderers expect; read-only afterwards.
    struct Needs {
        std::vector<ustring> globals, attributes, scopes, textures, closures;
        bool unknownAttributes = false, unknownTextures = false, unknownClosures = false;
    } needs;

    int findLayer(ustring layername) const;
};

} // namespace OSL
