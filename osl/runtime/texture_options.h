// The optional name/value arguments of texture, texture3d and environment: how they become an
// OpenImageIO TextureOpt and where their outputs (alpha, errormessage) go.
#pragma once

#include "program.h"

#include <OpenImageIO/texture.h>

#include <string>

namespace OSL {

struct ExecState;
class ShadingContext;

// What one optional argument does, from its name and the type of its value.
enum class TextureOption {
    Skip, // an empty name: ignored
    Width,
    SWidth,
    TWidth,
    RWidth,
    Blur,
    SBlur,
    TBlur,
    RBlur,
    Wrap,
    SWrap,
    TWrap,
    RWrap,
    Fill,
    Time,
    FirstChannel,
    Subimage,
    SubimageName,
    Interp,
    Alpha,
    ErrorMessage,
    MissingColor,
    MissingAlpha,
    Unknown
};

TextureOption classifyTextureOption(ustring name, const Operand& value);

// Where a lookup's option outputs go, and the storage TextureOpt::missingcolor points at.
struct TextureOptionOutputs {
    const Operand* alpha = nullptr;
    const Operand* errormessage = nullptr;
    float missingcolor[4] = {0.0f, 0.0f, 0.0f, 0.0f};
};

// Applies the pairs in args [first, nargs) of `in` to `opt` (which starts at its defaults).
// nchans is the channel count of the result: "missingalpha" is the channel after it. A 3D
// lookup also gets the r-direction width, blur and wrap from "width", "blur" and "wrap".
// Pairs whose name is unknown or whose value has the wrong type are skipped; they are
// reported once when the program is built (see checkTextureOptions).
void applyTextureOptions(const ExecState& st, const Instr& in, int first, bool is3d, int nchans,
                         TextureOpt& opt, TextureOptionOutputs& out);

// Describes the constant-named pairs of `in` that no lookup understands, one line each, for
// the build-time report; empty when every pair is understood.
std::string checkTextureOptions(const Program& prog, const Instr& in, int first, bool is3d,
                                const std::string& where);

// OpenImageIO's interpolation code for a name, or -1 when the name is not one.
int decodeTextureInterp(ustring name);

} // namespace OSL
