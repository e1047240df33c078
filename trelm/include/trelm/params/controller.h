// Controllers: objects that give an animatable parameter its value over time.
#pragma once

#include <trelm/core/math_types.h>
#include <trelm/core/reference_target.h>

#include <variant>

namespace TrelmSDK {

// The value a controller produces. Float controllers drive float, world, integer and boolean
// parameters; point controllers drive point parameters; point4 controllers also drive colours.
using ControlValue = std::variant<float, Point2, Point3, Point4>;

// The base of all controllers. The super class ID names the value kind (CTRL_FLOAT_CLASS_ID,
// CTRL_POINT2_CLASS_ID, CTRL_POINT3_CLASS_ID, CTRL_POINT4_CLASS_ID). GetValue may run on render
// threads (it must not change the controller); everything else runs on the main thread.
class Control : public ReferenceTarget {
public:
    // The value at t; valid is narrowed to the interval around t in which the value holds.
    virtual ControlValue GetValue(TimeValue t, Interval& valid) = 0;
    // Sets the value at t (keyframe controllers set a key there, undoably); false when the
    // controller does not take values (expressions) or v is of another kind.
    virtual bool SetValue(TimeValue t, const ControlValue& v) = 0;
    virtual bool IsAnimated() { return false; }
    virtual bool IsKeyable() { return false; }
    virtual int NumKeys() { return 0; }
};

// The controller super class that may drive a parameter of paramType, or 0 when none may.
SClass_ID ControllerSuperClassFor(int paramType);
// The ControlValue alternative a controller of superClass produces, or -1.
int ControlValueIndexFor(SClass_ID superClass);

} // namespace TrelmSDK

using TrelmSDK::Control;
