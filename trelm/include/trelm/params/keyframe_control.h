// Keyframed controllers with linear interpolation between keys.
#pragma once

#include <trelm/params/controller.h>

#include <utility>
#include <vector>

namespace TrelmSDK {

inline constexpr Class_ID LININTERP_FLOAT_CLASS_ID(0x2001, 0);
inline constexpr Class_ID LININTERP_POINT3_CLASS_ID(0x2002, 0);
inline constexpr Class_ID LININTERP_POINT2_CLASS_ID(0x2005, 0);
inline constexpr Class_ID LININTERP_POINT4_CLASS_ID(0x2006, 0);

// Keys (time, value) sorted by time. Between two keys the value is interpolated linearly; before
// the first and after the last it holds that key's value; with no key it is zero. Key changes are
// recorded for undo and tell dependents.
template <class T>
class LinearKeyControl : public Control {
public:
    LinearKeyControl() = default;

    Class_ID ClassID() const override;
    SClass_ID SuperClassID() const override;
    void GetClassName(MSTR& s, bool localized = true) const override;

    ControlValue GetValue(TimeValue t, Interval& valid) override;
    bool SetValue(TimeValue t, const ControlValue& v) override;
    bool IsAnimated() override { return keys_.size() > 1; }
    bool IsKeyable() override { return true; }
    int NumKeys() override { return static_cast<int>(keys_.size()); }

    // The value at t (validity ignored).
    T Evaluate(TimeValue t) const;
    // Sets (adds or replaces) the key at t.
    void SetKey(TimeValue t, const T& v);
    // Removes the key at t; false when there is none.
    bool DeleteKeyAtTime(TimeValue t);
    void DeleteAllKeys();
    TimeValue GetKeyTime(int i) const { return keys_[i].first; }
    const T& GetKeyValue(int i) const { return keys_[i].second; }

    ReferenceTarget* Clone(RemapDir& remap) override;

private:
    using Keys = std::vector<std::pair<TimeValue, T>>;
    class KeysRestore;
    void ReplaceKeys(Keys keys); // records the change when holding, then notifies

    Keys keys_;
};

using LinearFloatControl = LinearKeyControl<float>;
using LinearPoint2Control = LinearKeyControl<Point2>;
using LinearPoint3Control = LinearKeyControl<Point3>;
using LinearPoint4Control = LinearKeyControl<Point4>;

extern template class LinearKeyControl<float>;
extern template class LinearKeyControl<Point2>;
extern template class LinearKeyControl<Point3>;
extern template class LinearKeyControl<Point4>;

} // namespace TrelmSDK
