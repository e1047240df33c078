// GetShadingSystem: the process's single OSL shading system, created and configured on first use,
// with its closures, texture-system settings and the built-in shaders.
#pragma once

#include <OSL/oslexec.h>

class CompiledShaderRegistry;
namespace TrelmSDK {
class ConfigManager;
}

// The shading system, created on the first call (main thread); later calls only return it.
OSL::ShadingSystem* GetShadingSystem(CompiledShaderRegistry& registry);

// Whether textures reload when their files change (configuration "OpenImageIO"/"autoFileUpdate").
// Written once while the shading system is created, read by the texture file watcher.
bool AutoFileUpdate();

// The "optimize" level: TRELM_OSL_OPT read with atoi when set, else 2.
int OptimizeLevelFromEnvironment();

// Writes the missing "OpenImageIO" keys with their defaults, then applies every key that reads
// back to the texture system (which may be none) and returns the autoFileUpdate value.
bool ApplyTextureConfiguration(TrelmSDK::ConfigManager& config, OIIO::TextureSystem* ts);

// Number of closures registered with the shading system, in registration order.
int RegisteredClosureCount();

// Runtime work of the registry's host notifications 57, 132 and 238.
void HandleRuntimeNotification(CompiledShaderRegistry& registry, int code, void* callParam);
