// Class descriptors of the controllers the SDK provides, listed in the class directory.
#include <trelm/core/class_directory.h>
#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

namespace TrelmSDK {

namespace {
template <class T>
class ControllerClassDesc : public ClassDesc {
public:
    ControllerClassDesc(const MCHAR* name, SClass_ID sc, Class_ID id)
        : name_(name), sc_(sc), id_(id) {}
    bool IsPublic() override { return true; }
    Animatable* Create(bool) override { return new T(); }
    const MCHAR* ClassName() override { return name_; }
    const MCHAR* InternalName() override { return name_; }
    SClass_ID SuperClassID() override { return sc_; }
    Class_ID ClassID() override { return id_; }
    const MCHAR* Category() override { return L"Controllers"; }

private:
    const MCHAR* name_;
    SClass_ID sc_;
    Class_ID id_;
};
} // namespace

namespace detail {
void AddBuiltInClasses(ClassDirectory& dir) {
    static ControllerClassDesc<ExprFloatControl> expr(L"Float_Expression", CTRL_FLOAT_CLASS_ID,
                                                      EXPR_FLOAT_CONTROL_CLASS_ID);
    static ControllerClassDesc<LinearFloatControl> linFloat(L"Linear_Float", CTRL_FLOAT_CLASS_ID,
                                                            LININTERP_FLOAT_CLASS_ID);
    static ControllerClassDesc<LinearPoint2Control> linP2(L"Linear_Point2", CTRL_POINT2_CLASS_ID,
                                                          LININTERP_POINT2_CLASS_ID);
    static ControllerClassDesc<LinearPoint3Control> linP3(L"Linear_Point3", CTRL_POINT3_CLASS_ID,
                                                          LININTERP_POINT3_CLASS_ID);
    static ControllerClassDesc<LinearPoint4Control> linP4(L"Linear_Point4", CTRL_POINT4_CLASS_ID,
                                                          LININTERP_POINT4_CLASS_ID);
    for (ClassDesc* cd : {static_cast<ClassDesc*>(&expr), static_cast<ClassDesc*>(&linFloat),
                          static_cast<ClassDesc*>(&linP2), static_cast<ClassDesc*>(&linP3),
                          static_cast<ClassDesc*>(&linP4)})
        dir.AddClass(cd);
}
} // namespace detail

} // namespace TrelmSDK
