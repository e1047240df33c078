// The default behaviour of RendererServices: no transformations, attributes or messages of its
// own; texture calls go to the texture system.
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
void takeError(TextureSystem* ts, ustring* errormessage) {
    std::string err = ts->geterror();
    if (errormessage) *errormessage = err.empty() ? ustring("unknown texture error") : ustring(err);
}
} // namespace

bool RendererServices::texture(ustring filename, TextureHandle* handle, TexturePerthread* thread,
                               TextureOpt& options, ShaderGlobals*, float s, float t, float dsdx,
                               float dtdx, float dsdy, float dtdy, int nchannels, float* result,
                               float* dresultds, float* dresultdt, ustring* errormessage) {
    TextureSystem* ts = texturesys();
    if (!ts) return false;
    bool ok = handle ? ts->texture(handle, thread, options, s, t, dsdx, dtdx, dsdy, dtdy, nchannels,
                                   result, dresultds, dresultdt)
                     : ts->texture(filename, options, s, t, dsdx, dtdx, dsdy, dtdy, nchannels,
                                   result, dresultds, dresultdt);
    if (!ok) takeError(ts, errormessage);
    return ok;
}

bool RendererServices::texture3d(ustring filename, TextureHandle* handle, TexturePerthread* thread,
                                 TextureOpt& options, ShaderGlobals*, const Vec3& P,
                                 const Vec3& dPdx, const Vec3& dPdy, const Vec3& dPdz,
                                 int nchannels, float* result, float* dresultds, float* dresultdt,
                                 float* dresultdr, ustring* errormessage) {
    TextureSystem* ts = texturesys();
    if (!ts) return false;
    bool ok = handle ? ts->texture3d(handle, thread, options, P, dPdx, dPdy, dPdz, nchannels,
                                     result, dresultds, dresultdt, dresultdr)
                     : ts->texture3d(filename, options, P, dPdx, dPdy, dPdz, nchannels, result,
                                     dresultds, dresultdt, dresultdr);
    if (!ok) takeError(ts, errormessage);
    return ok;
}

bool RendererServices::environment(ustring filename, TextureHandle* handle,
                                   TexturePerthread* thread, TextureOpt& options, ShaderGlobals*,
                                   const Vec3& R, const Vec3& dRdx, const Vec3& dRdy, int nchannels,
                                   float* result, float* dresultds, float* dresultdt,
                                   ustring* errormessage) {
    TextureSystem* ts = texturesys();
    if (!ts) return false;
    bool ok = handle ? ts->environment(handle, thread, options, R, dRdx, dRdy, nchannels, result,
                                       dresultds, dresultdt)
                     : ts->environment(filename, options, R, dRdx, dRdy, nchannels, result,
                                       dresultds, dresultdt);
    if (!ok) takeError(ts, errormessage);
    return ok;
}

bool RendererServices::get_texture_info(ustring filename, TextureHandle* handle,
                                        TexturePerthread* thread, ShadingContext*, int subimage,
                                        ustring dataname, TypeDesc datatype, void* data,
                                        ustring* errormessage) {
    TextureSystem* ts = texturesys();
    if (!ts) return false;
    bool ok = handle ? ts->get_texture_info(handle, thread, subimage, dataname, datatype, data)
                     : ts->get_texture_info(filename, subimage, dataname, datatype, data);
    if (!ok) takeError(ts, errormessage);
    return ok;
}

bool RendererServices::get_texture_info(ustring filename, TextureHandle* handle, float, float,
                                        TexturePerthread* thread, ShadingContext* ctx, int subimage,
                                        ustring dataname, TypeDesc datatype, void* data,
                                        ustring* errormessage) {
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
