// The process's renderer services object.
#include "runtime/trelm_render_services.h"

TrelmRenderServices& TrelmRenderServices::Instance() {
    // Outlives the shading system, which keeps a pointer to it until module unload.
    static TrelmRenderServices* services = new TrelmRenderServices;
    return *services;
}
