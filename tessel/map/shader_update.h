// The update cycle of a map: compile its code, adopt the new description and rebuild the shader
// block, carrying values, controllers and connected maps over by parameter name and type.
#pragma once

#include "compile/source_key.h"

#include <trelm/params/iparam_block2.h>

#include <memory>

class OSLTex;

// Compiles the map's "OSLCode" when the registry lacks it and rebuilds the shader block when the
// description changed. True when the map has a usable description afterwards; on failure the
// previous block and description stay.
bool UpdateShader(OSLTex& map, bool loading);

// Replaces the map's shader block by a new one made from desc; undo is suspended meanwhile.
void RebuildShaderBlock(OSLTex& map, IParamBlock2* oldBlock, std::shared_ptr<ParamBlockDesc2> desc,
                        SourceKey key, bool skipValues);

// Copies controllers, connected maps and (unless skipValues) values from old to new for every
// parameter of new whose name and host type old has too. False when no copy pass ran.
bool CopyShaderParams(IParamBlock2* oldBlock, IParamBlock2* newBlock, bool skipValues);

// Fills the table parameters of block with the array defaults of the shader recorded for key.
void InitArrayDefaults(SourceKey key, IParamBlock2* block);

// Returns every input to its default, keeping connected maps and animation controllers.
void ResetShaderParams(OSLTex& map);
