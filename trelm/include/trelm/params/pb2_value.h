// One stored parameter value, of whichever type the parameter has.
#pragma once

#include <trelm/core/math_types.h>
#include <trelm/core/mstr.h>
#include <trelm/params/param_types.h>

#include <variant>

namespace TrelmSDK {

class ReferenceTarget;

// Values are held in the storage kind of their type: int for integers and booleans, float for
// floats and world units, AColor for colours, MSTR for strings and file names, a target pointer
// for texture maps. Accessors receive and may change a PB2Value.
class PB2Value {
public:
    using Storage = std::variant<std::monostate, int, float, Point2, Point3, Point4, AColor,
                                 Matrix3, MSTR, ReferenceTarget*>;

    PB2Value() = default;
    PB2Value(int v) : v_(v) {}
    PB2Value(bool v) : v_(v ? 1 : 0) {}
    PB2Value(float v) : v_(v) {}
    PB2Value(double v) : v_(static_cast<float>(v)) {}
    PB2Value(const Point2& v) : v_(v) {}
    PB2Value(const Point3& v) : v_(v) {}
    PB2Value(const Point4& v) : v_(v) {}
    PB2Value(const AColor& v) : v_(v) {}
    PB2Value(const Matrix3& v) : v_(v) {}
    PB2Value(const MSTR& v) : v_(v) {}
    PB2Value(const MCHAR* v) : v_(MSTR(v ? v : L"")) {}
    PB2Value(ReferenceTarget* v) : v_(v) {}

    bool IsEmpty() const { return std::holds_alternative<std::monostate>(v_); }
    template <class T>
    bool Holds() const {
        return std::holds_alternative<T>(v_);
    }
    // The value as T; T must be the kind held (check with Holds).
    template <class T>
    const T& Get() const {
        return std::get<T>(v_);
    }
    template <class T>
    T* GetIf() {
        return std::get_if<T>(&v_);
    }
    const Storage& storage() const { return v_; }
    bool operator==(const PB2Value& o) const { return v_ == o.v_; }

private:
    Storage v_;
};

// The value of type's storage kind that stands for "zero" (identity for matrices, empty text,
// no map, opaque black for colours).
PB2Value ZeroValue(int type);
// v converted to the storage kind of type: between integers and floats (rounded to nearest),
// between Point3, Point4, Color-like AColor; empty when no conversion exists.
PB2Value CoerceValue(const PB2Value& v, int type);

} // namespace TrelmSDK

using TrelmSDK::PB2Value;
