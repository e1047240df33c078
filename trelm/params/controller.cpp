// Which controllers may drive which parameter types.
#include <trelm/params/controller.h>
#include <trelm/params/param_types.h>

namespace TrelmSDK {

SClass_ID ControllerSuperClassFor(int paramType) {
    switch (BaseType(paramType)) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
    case TYPE_INT:
    case TYPE_BOOL:
        return CTRL_FLOAT_CLASS_ID;
    case TYPE_POINT2:
        return CTRL_POINT2_CLASS_ID;
    case TYPE_POINT3:
        return CTRL_POINT3_CLASS_ID;
    case TYPE_POINT4:
    case TYPE_FRGBA:
        return CTRL_POINT4_CLASS_ID;
    default:
        return 0;
    }
}

int ControlValueIndexFor(SClass_ID superClass) {
    switch (superClass) {
    case CTRL_FLOAT_CLASS_ID:
        return 0;
    case CTRL_POINT2_CLASS_ID:
        return 1;
    case CTRL_POINT3_CLASS_ID:
        return 2;
    case CTRL_POINT4_CLASS_ID:
        return 3;
    default:
        return -1;
    }
}

} // namespace TrelmSDK
