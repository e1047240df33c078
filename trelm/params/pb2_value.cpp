// Zero values and conversions between the storage kinds of parameter types.
#include <trelm/params/pb2_value.h>

#include <cmath>

namespace TrelmSDK {

PB2Value ZeroValue(int type) {
    switch (BaseType(type)) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
        return PB2Value(0.0f);
    case TYPE_INT:
    case TYPE_BOOL:
        return PB2Value(0);
    case TYPE_POINT2:
        return PB2Value(Point2(0, 0));
    case TYPE_POINT3:
        return PB2Value(Point3(0, 0, 0));
    case TYPE_POINT4:
        return PB2Value(Point4(0, 0, 0, 0));
    case TYPE_FRGBA:
        return PB2Value(AColor(0, 0, 0, 1));
    case TYPE_MATRIX3:
        return PB2Value(Matrix3());
    case TYPE_STRING:
    case TYPE_FILENAME:
        return PB2Value(MSTR());
    case TYPE_TEXMAP:
        return PB2Value(static_cast<ReferenceTarget*>(nullptr));
    default:
        return {};
    }
}

PB2Value CoerceValue(const PB2Value& v, int type) {
    switch (BaseType(type)) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
        if (v.Holds<float>()) return v;
        if (v.Holds<int>()) return PB2Value(static_cast<float>(v.Get<int>()));
        return {};
    case TYPE_INT:
        if (v.Holds<int>()) return v;
        if (v.Holds<float>()) return PB2Value(static_cast<int>(std::lround(v.Get<float>())));
        return {};
    case TYPE_BOOL:
        if (v.Holds<int>()) return PB2Value(v.Get<int>() != 0);
        if (v.Holds<float>()) return PB2Value(std::lround(v.Get<float>()) != 0);
        return {};
    case TYPE_POINT2:
        if (v.Holds<Point2>()) return v;
        return {};
    case TYPE_POINT3:
        if (v.Holds<Point3>()) return v;
        if (v.Holds<AColor>()) {
            const AColor& c = v.Get<AColor>();
            return PB2Value(Point3(c.r, c.g, c.b));
        }
        return {};
    case TYPE_POINT4:
        if (v.Holds<Point4>()) return v;
        if (v.Holds<AColor>()) {
            const AColor& c = v.Get<AColor>();
            return PB2Value(Point4(c.r, c.g, c.b, c.a));
        }
        return {};
    case TYPE_FRGBA:
        if (v.Holds<AColor>()) return v;
        if (v.Holds<Point3>()) {
            const Point3& p = v.Get<Point3>();
            return PB2Value(AColor(p.x, p.y, p.z, 1.0f));
        }
        if (v.Holds<Point4>()) {
            const Point4& p = v.Get<Point4>();
            return PB2Value(AColor(p.x, p.y, p.z, p.w));
        }
        return {};
    case TYPE_MATRIX3:
        if (v.Holds<Matrix3>()) return v;
        return {};
    case TYPE_STRING:
    case TYPE_FILENAME:
        if (v.Holds<MSTR>()) return v;
        return {};
    case TYPE_TEXMAP:
        if (v.Holds<ReferenceTarget*>()) return v;
        return {};
    default:
        return {};
    }
}

} // namespace TrelmSDK
