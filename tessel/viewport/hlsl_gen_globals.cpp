// The converter table and the OSL globals the viewport knows, built once per translation.
#include "hlsl_gen_globals.h"

#include "precompute_function.h"

namespace oslo {

HLSLGenGlobals::HLSLGenGlobals(_hlsl_info& info_) : info(info_) {
    AddArithmeticConverters(converters);
    AddControlFlowConverters(converters);
    AddColorConverters(converters);
    AddSpaceConverters(converters);
    AddNoiseConverters(converters);
    AddAttributeConverters(converters);
    AddTextureConverters(converters, info);
    AddUnsupportedConverters(converters);
    precomputeBuilders = PrecomputeBuilders();

    globalVars = {
        {"P", "state.position"},         {"N", "state.normal"},
        {"I", "state.direction"},        {"Ng", "state.geom_normal"},
        {"u", "state.tex_coord[0].x"},   {"v", "state.tex_coord[0].y"},
        {"dPdu", "ddx(state.position)"}, {"dPdv", "(-ddy(state.position))"},
    };
}

} // namespace oslo
