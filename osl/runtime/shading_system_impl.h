// The shading system's state behind the public ShadingSystem: loaded masters, registered
// closures, attributes and the group being built.
#pragma once

#include "shader_group.h"
#include "shading_context.h"

#include <OSL/oslexec.h>

#include <map>
#include <mutex>
#include <string>
#include <vector>

namespace OSL {

struct ClosureEntry {
    ustring name;
    int id = 0;
    std::vector<ClosureParam> params; // without the terminating entry
    int structSize = 0, structAlign = 1;
};

class ShadingSystemImpl {
public:
    ShadingSystemImpl(RendererServices* renderer, TextureSystem* texsys, ErrorHandler* err);
    ~ShadingSystemImpl();

    RendererServices* renderer = nullptr;
    TextureSystem* texsys = nullptr;
    bool ownsTexsys = false;
    ErrorHandler* err = nullptr;
    std::unique_ptr<RendererServices> ownRenderer;

    // Masters are loaded on the main thread; the lock keeps concurrent loads and Shader calls
    // from different threads consistent. Execution never touches it.
    mutable std::mutex mastersMutex;
    std::map<ustring, ShaderMasterRef> masters;

    std::vector<ClosureEntry> closures; // written by register_closure before groups are built
    std::vector<ustring> raytypes;

    // Attributes (written by attribute() on the main thread, read while building groups).
    int debug = 0, compileReport = 0, optimize = 2, lockgeom = 1, debugNan = 0, debugUninit = 0;
    int errorRepeats = 0, lazyLayers = 1, countLayerExecs = 0, greedyJit = 0;
    int lazyGlobals = 1, debugLayers = 0;
    // The optimiser's switches (see optimizer.h).
    int optConstantFold = 1, optElideUselessOps = 1, optMergeInstances = 1;
    int optMergeInstancesWithUserdata = 1, optWarnings = 0, optCoalesceTemps = 1;
    std::string searchpathShader;
    std::string commonspace = "common";
    std::string colorspace = "Rec709";

    ShaderGroupRef current;

    ShaderMasterRef findMaster(ustring name);
    const ClosureEntry* findClosure(ustring name) const;

    void error(const std::string& msg) const;
    void warning(const std::string& msg) const;
    void info(const std::string& msg) const;
    void message(const std::string& msg) const;

    bool execute(ShadingContext& ctx, ShaderGroup& group, ShaderGlobals& sg, bool run);
    // execute() in three steps, for renderers that run chosen layers themselves.
    bool executeInit(ShadingContext& ctx, ShaderGroup& group, ShaderGlobals& sg, bool run);
    bool executeLayer(ShadingContext& ctx, int layer);
    bool executeCleanup(ShadingContext& ctx);
};

} // namespace OSL
