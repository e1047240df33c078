// The renderer's hooks into the shading system: transformations, attributes, user data,
// textures, trace and messages. Every virtual has the behaviour of OSL 1.12 by default, so a
// renderer overrides only what it provides.
#pragma once

#include <OSL/oslconfig.h>

namespace OSL {

class RendererServices;
class ShadingContext;
struct ShaderGlobals;

typedef const void* TransformationPtr;

// Hooks called when a closure is built; the shading system passes them on registration.
typedef void (*PrepareClosureFunc)(RendererServices*, int id, void* data);
typedef void (*SetupClosureFunc)(RendererServices*, int id, void* data);

class RendererServices {
public:
    typedef TextureSystem::TextureHandle TextureHandle;
    typedef TextureSystem::Perthread TexturePerthread;

    // Options of a trace() call, filled from the shader's keyword arguments.
    struct TraceOpt {
        float mindist = 0.0f;
        float maxdist = 1.0e30f;
        bool shade = false;
        ustring traceset;
    };

    // texsys: the texture system that the default texture calls use; with none they use the
    // shading system's (set through texturesys_set by the shading system).
    RendererServices(TextureSystem* texsys = nullptr);
    virtual ~RendererServices() = default;

    virtual int supports(string_view feature) const;

    virtual bool get_matrix(ShaderGlobals* sg, Matrix44& result, TransformationPtr xform,
                            float time);
    virtual bool get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, TransformationPtr xform,
                                    float time);
    virtual bool get_matrix(ShaderGlobals* sg, Matrix44& result, TransformationPtr xform);
    virtual bool get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, TransformationPtr xform);
    virtual bool get_matrix(ShaderGlobals* sg, Matrix44& result, ustring from, float time);
    virtual bool get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, ustring to, float time);
    virtual bool get_matrix(ShaderGlobals* sg, Matrix44& result, ustring from);
    virtual bool get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, ustring to);

    virtual bool transform_points(ShaderGlobals* sg, ustring from, ustring to, float time,
                                  const Vec3* Pin, Vec3* Pout, int npoints,
                                  TypeDesc::VECSEMANTICS vectype);

    virtual bool get_attribute(ShaderGlobals* sg, bool derivatives, ustring object, TypeDesc type,
                               ustring name, void* val);
    virtual bool get_array_attribute(ShaderGlobals* sg, bool derivatives, ustring object,
                                     TypeDesc type, ustring name, int index, void* val);
    virtual bool get_userdata(bool derivatives, ustring name, TypeDesc type, ShaderGlobals* sg,
                              void* val);

    virtual TextureHandle* get_texture_handle(ustring filename, ShadingContext* context,
                                              const TextureOpt* options = nullptr);
    virtual bool good(TextureHandle* texture_handle);
    virtual bool is_udim(TextureHandle* texture_handle);

    virtual bool texture(ustring filename, TextureHandle* texture_handle,
                         TexturePerthread* texture_thread_info, TextureOpt& options,
                         ShaderGlobals* sg, float s, float t, float dsdx, float dtdx, float dsdy,
                         float dtdy, int nchannels, float* result, float* dresultds,
                         float* dresultdt, ustring* errormessage);
    virtual bool texture3d(ustring filename, TextureHandle* texture_handle,
                           TexturePerthread* texture_thread_info, TextureOpt& options,
                           ShaderGlobals* sg, const Vec3& P, const Vec3& dPdx, const Vec3& dPdy,
                           const Vec3& dPdz, int nchannels, float* result, float* dresultds,
                           float* dresultdt, float* dresultdr, ustring* errormessage);
    virtual bool environment(ustring filename, TextureHandle* texture_handle,
                             TexturePerthread* texture_thread_info, TextureOpt& options,
                             ShaderGlobals* sg, const Vec3& R, const Vec3& dRdx, const Vec3& dRdy,
                             int nchannels, float* result, float* dresultds, float* dresultdt,
                             ustring* errormessage);
    virtual bool get_texture_info(ustring filename, TextureHandle* texture_handle,
                                  TexturePerthread* texture_thread_info,
                                  ShadingContext* shading_context, int subimage, ustring dataname,
                                  TypeDesc datatype, void* data, ustring* errormessage);
    virtual bool get_texture_info(ustring filename, TextureHandle* texture_handle, float s, float t,
                                  TexturePerthread* texture_thread_info,
                                  ShadingContext* shading_context, int subimage, ustring dataname,
                                  TypeDesc datatype, void* data, ustring* errormessage);

    virtual int pointcloud_search(ShaderGlobals* sg, ustring filename, const Vec3& center,
                                  float radius, int max_points, bool sort, size_t* out_indices,
                                  float* out_distances, int derivs_offset);
    virtual int pointcloud_get(ShaderGlobals* sg, ustring filename, const size_t* indices,
                               int count, ustring attr_name, TypeDesc attr_type, void* out_data);
    virtual bool pointcloud_write(ShaderGlobals* sg, ustring filename, const Vec3& pos,
                                  int nattribs, const ustring* names, const TypeDesc* types,
                                  const void** data);

    virtual bool trace(TraceOpt& options, ShaderGlobals* sg, const Vec3& P, const Vec3& dPdx,
                       const Vec3& dPdy, const Vec3& R, const Vec3& dRdx, const Vec3& dRdy);
    virtual bool getmessage(ShaderGlobals* sg, ustring source, ustring name, TypeDesc type,
                            void* val, bool derivatives);

    virtual TextureSystem* texturesys() const;

protected:
    TextureSystem* m_texturesys;

    friend class ShadingSystemImpl;
};

} // namespace OSL
