// The default behaviour of RendererServices: no transformations, attributes or messages of its
// own; texture calls go to the texture system, and their failures to the shader's error output.
#include "shading_context.h"
#include "texture_options.h"

#include <OSL/rendererservices.h>
#include <OSL/shaderglobals.h>

#include <OpenImageIO/texture.h>

namespace OSL {

RendererServices::RendererServices(TextureSystem* texsys) : m_texturesys(texsys) {}

int RendererServices::supports(string_view) const {
    return false;
}

bool RendererServices::get_matrix(ShaderGlobals*, Matrix44&, TransformationPtr, float) {
    return false;
}
bool RendererServices::get_inverse_matrix(ShaderGlobals* sg, Matrix44& result,
                                          TransformationPtr xform, float time) {
    if (!get_matrix(sg, result, xform, time)) return false;
    result.invert();
    return true;
}
bool RendererServices::get_matrix(ShaderGlobals*, Matrix44&, TransformationPtr) {
    return false;
}
bool RendererServices::get_inverse_matrix(ShaderGlobals* sg, Matrix44& result,
                                          TransformationPtr xform) {
    if (!get_matrix(sg, result, xform)) return false;
    result.invert();
    return true;
}
bool RendererServices::get_matrix(ShaderGlobals*, Matrix44&, ustring, float) {
    return false;
}
bool RendererServices::get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, ustring to,
                                          float time) {
    if (!get_matrix(sg, result, to, time)) return false;
    result.invert();
    return true;
}
bool RendererServices::get_matrix(ShaderGlobals*, Matrix44&, ustring) {
    return false;
}
bool RendererServices::get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, ustring to) {
    if (!get_matrix(sg, result, to)) return false;
    result.invert();
    return true;
}

bool RendererServices::transform_points(ShaderGlobals*, ustring, ustring, float, const Vec3*, Vec3*,
                                        int, TypeDesc::VECSEMANTICS) {
    return false;
}

bool RendererServices::get_attribute(ShaderGlobals*, bool, ustring, TypeDesc, ustring, void*) {
    return false;
}
bool RendererServices::get_array_attribute(ShaderGlobals*, bool, ustring, TypeDesc, ustring, int,
                                           void*) {
    return false;
}
bool RendererServices::get_userdata(bool, ustring, TypeDesc, ShaderGlobals*, void*) {
    return false;
}

RendererServices::TextureHandle*
RendererServices::get_texture_handle(ustring filename, ShadingContext*, const TextureOpt*) {
    TextureSystem* ts = texturesys();
    return ts ? ts->get_texture_handle(filename) : nullptr;
}
bool RendererServices::good(TextureHandle* handle) {
    TextureSystem* ts = texturesys();
    return ts && handle && ts->good(handle);
}
bool RendererServices::is_udim(TextureHandle* handle) {
    TextureSystem* ts = texturesys();
    return ts && handle && ts->is_udim(handle);
}

namespace {

const ustring kUnknown("unknown");

// A failed call's message goes to the shader's errormessage output when it asked for one, and
// to the shading system's error handler (prefixed with the call) otherwise. A failure the
// texture system gives no reason for (a file already known to be missing) reports nothing,
// and "unknown" to an errormessage output.
void failed(TextureSystem* ts, ShadingContext* ctx, const char* call, ustring* errormessage) {
    const std::string err = ts ? ts->geterror() : std::string("no texture system");
    if (err.empty()) {
        if (errormessage) *errormessage = kUnknown;
    } else if (errormessage) {
        *errormessage = ustring(err);
    } else if (ctx) {
        reportContextError(*ctx, std::string("[RendererServices::") + call + "] " + err);
    }
}

ShadingContext* contextOf(ShaderGlobals* sg) {
    return sg ? sg->context : nullptr;
}

} // namespace

bool RendererServices::texture(ustring filename, TextureHandle* handle, TexturePerthread* thread,
                               TextureOpt& options, ShaderGlobals* sg, float s, float t, float dsdx,
                               float dtdx, float dsdy, float dtdy, int nchannels, float* result,
                               float* dresultds, float* dresultdt, ustring* errormessage) {
    TextureSystem* ts = texturesys();
    bool ok = false;
    if (ts)
        ok = handle ? ts->texture(handle, thread, options, s, t, dsdx, dtdx, dsdy, dtdy, nchannels,
                                  result, dresultds, dresultdt)
                    : ts->texture(filename, options, s, t, dsdx, dtdx, dsdy, dtdy, nchannels,
                                  result, dresultds, dresultdt);
    if (!ok) failed(ts, contextOf(sg), "texture", errormessage);
    return ok;
}

bool RendererServices::texture3d(ustring filename, TextureHandle* handle, TexturePerthread* thread,
                                 TextureOpt& options, ShaderGlobals* sg, const Vec3& P,
                                 const Vec3& dPdx, const Vec3& dPdy, const Vec3& dPdz,
                                 int nchannels, float* result, float* dresultds, float* dresultdt,
                                 float* dresultdr, ustring* errormessage) {
    TextureSystem* ts = texturesys();
    bool ok = false;
    if (ts)
        ok = handle ? ts->texture3d(handle, thread, options, P, dPdx, dPdy, dPdz, nchannels, result,
                                    dresultds, dresultdt, dresultdr)
                    : ts->texture3d(filename, options, P, dPdx, dPdy, dPdz, nchannels, result,
                                    dresultds, dresultdt, dresultdr);
    if (!ok) failed(ts, contextOf(sg), "texture3d", errormessage);
    return ok;
}

bool RendererServices::environment(ustring filename, TextureHandle* handle,
                                   TexturePerthread* thread, TextureOpt& options, ShaderGlobals* sg,
                                   const Vec3& R, const Vec3& dRdx, const Vec3& dRdy, int nchannels,
                                   float* result, float* dresultds, float* dresultdt,
                                   ustring* errormessage) {
    TextureSystem* ts = texturesys();
    bool ok = false;
    if (ts)
        ok = handle ? ts->environment(handle, thread, options, R, dRdx, dRdy, nchannels, result,
                                      dresultds, dresultdt)
                    : ts->environment(filename, options, R, dRdx, dRdy, nchannels, result,
                                      dresultds, dresultdt);
    if (!ok) failed(ts, contextOf(sg), "environment", errormessage);
    return ok;
}

bool RendererServices::get_texture_info(ustring filename, TextureHandle* handle,
                                        TexturePerthread* thread, ShadingContext* ctx, int subimage,
                                        ustring dataname, TypeDesc datatype, void* data,
                                        ustring* errormessage) {
    TextureSystem* ts = texturesys();
    bool ok = false;
    if (ts) {
        if (!handle) handle = ts->get_texture_handle(filename, thread);
        ok = handle ? ts->get_texture_info(handle, thread, subimage, dataname, datatype, data)
                    : ts->get_texture_info(filename, subimage, dataname, datatype, data);
    }
    if (!ok) failed(ts, ctx, "get_texture_info", errormessage);
    return ok;
}

// For a UDIM set, the answer is that of the tile under (s, t); where no tile is there, the
// set's own answer.
bool RendererServices::get_texture_info(ustring filename, TextureHandle* handle, float s, float t,
                                        TexturePerthread* thread, ShadingContext* ctx, int subimage,
                                        ustring dataname, TypeDesc datatype, void* data,
                                        ustring* errormessage) {
    TextureSystem* ts = texturesys();
    if (ts) {
        // Resolving a tile needs this thread's cache state; the texture system does not fetch
        // it itself there.
        if (!thread) thread = ts->get_perthread_info();
        if (!handle) handle = ts->get_texture_handle(filename, thread);
        if (handle && ts->is_udim(handle)) {
            if (TextureHandle* tile = ts->resolve_udim(handle, thread, s, t)) handle = tile;
        }
    }
    return get_texture_info(filename, handle, thread, ctx, subimage, dataname, datatype, data,
                            errormessage);
}

int RendererServices::pointcloud_search(ShaderGlobals*, ustring, const Vec3&, float, int, bool,
                                        size_t*, float*, int) {
    return 0;
}
int RendererServices::pointcloud_get(ShaderGlobals*, ustring, const size_t*, int, ustring, TypeDesc,
                                     void*) {
    return 0;
}
bool RendererServices::pointcloud_write(ShaderGlobals*, ustring, const Vec3&, int, const ustring*,
                                        const TypeDesc*, const void**) {
    return false;
}

bool RendererServices::trace(TraceOpt&, ShaderGlobals*, const Vec3&, const Vec3&, const Vec3&,
                             const Vec3&, const Vec3&, const Vec3&) {
    return false;
}
bool RendererServices::getmessage(ShaderGlobals*, ustring, ustring, TypeDesc, void*, bool) {
    return false;
}

TextureSystem* RendererServices::texturesys() const {
    return m_texturesys;
}

} // namespace OSL
