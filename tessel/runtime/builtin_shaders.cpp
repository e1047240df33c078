// OSL source of the built-in shaders.
#include "runtime/builtin_shaders.h"

const char* const kTrelmTexmapSource = R"(shader trelm_Texmap
(
    string attrib = "",
    output color Col=0,
    output float Flt=0,
    output int Int=0
)
{
    getattribute(attrib, Col);
    Flt = luminance(Col);
    Int = int(Flt);
}
)";

const char* const kTrelmRootSource = R"(shader trelm_Root
(
    color Input = 0.5,
    float BumpAmount = 0.5,
    output vector NormalPerturb = 0,
    output color  EvalColor = 0
)
{
    EvalColor = Input;
    float BumpF = (Input[0]+Input[1]+Input[2]) / 3.0;
    normal OriginalNormal = normalize(calculatenormal(P));
    normal ModifiedNormal = normalize(calculatenormal(P + (BumpF * N)));
    NormalPerturb = transform("camera", vector(ModifiedNormal - OriginalNormal)) * BumpAmount;
}
)";
