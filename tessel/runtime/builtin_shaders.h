// The two built-in shaders every shader group uses: the attribute getter that feeds a foreign
// host map into an OSL input, and the root layer that makes a map's colour and bump outputs.
#pragma once

inline constexpr const char* kTrelmTexmapName = "trelm_Texmap";
inline constexpr const char* kTrelmRootName = "trelm_Root";

extern const char* const kTrelmTexmapSource;
extern const char* const kTrelmRootSource;
