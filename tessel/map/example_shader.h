// The OSL text a new map starts with: the default of "OSLCode".
#pragma once

// Three inputs, two outputs; its URL metadata points at the module's documentation.
extern const char* const kExampleShader;
