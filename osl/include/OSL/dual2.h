// Dual2, the value-with-two-derivatives type; kept as its own header for code that includes it
// by this name.
#pragma once

#include <OSL/dual.h>
