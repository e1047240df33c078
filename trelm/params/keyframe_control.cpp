// Linear keyframe controllers for floats and points.
#include <trelm/core/hold.h>
#include <trelm/core/remap_dir.h>
#include <trelm/params/keyframe_control.h>

#include <algorithm>

namespace TrelmSDK {

namespace {
template <class T>
struct Traits;
template <>
struct Traits<float> {
    static constexpr Class_ID kClass = LININTERP_FLOAT_CLASS_ID;
    static constexpr SClass_ID kSuper = CTRL_FLOAT_CLASS_ID;
    static constexpr const MCHAR* kName = L"Linear Float";
    static float Zero() { return 0.0f; }
};
template <>
struct Traits<Point2> {
    static constexpr Class_ID kClass = LININTERP_POINT2_CLASS_ID;
    static constexpr SClass_ID kSuper = CTRL_POINT2_CLASS_ID;
    static constexpr const MCHAR* kName = L"Linear Point2";
    static Point2 Zero() { return Point2(0, 0); }
};
template <>
struct Traits<Point3> {
    static constexpr Class_ID kClass = LININTERP_POINT3_CLASS_ID;
    static constexpr SClass_ID kSuper = CTRL_POINT3_CLASS_ID;
    static constexpr const MCHAR* kName = L"Linear Point3";
    static Point3 Zero() { return Point3(0, 0, 0); }
};
template <>
struct Traits<Point4> {
    static constexpr Class_ID kClass = LININTERP_POINT4_CLASS_ID;
    static constexpr SClass_ID kSuper = CTRL_POINT4_CLASS_ID;
    static constexpr const MCHAR* kName = L"Linear Point4";
    static Point4 Zero() { return Point4(0, 0, 0, 0); }
};
} // namespace

// Undo record of a key change: the whole key list before and after.
template <class T>
class LinearKeyControl<T>::KeysRestore : public RestoreObj {
public:
    KeysRestore(LinearKeyControl* c, Keys before, Keys after)
        : c_(c), before_(std::move(before)), after_(std::move(after)) {
        c_->HoldLock();
    }
    ~KeysRestore() override { c_->HoldUnlock(); }
    void Restore(bool) override { Apply(before_); }
    void Redo() override { Apply(after_); }
    int Size() override { return static_cast<int>((before_.size() + after_.size()) * sizeof(T)); }
    MSTR Description() const override { return L"Key change"; }
    bool RefersTo(const void* object) const override { return object == c_; }

private:
    void Apply(const Keys& keys) {
        c_->keys_ = keys;
        c_->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    }
    LinearKeyControl* c_;
    Keys before_, after_;
};

template <class T>
Class_ID LinearKeyControl<T>::ClassID() const {
    return Traits<T>::kClass;
}

template <class T>
SClass_ID LinearKeyControl<T>::SuperClassID() const {
    return Traits<T>::kSuper;
}

template <class T>
void LinearKeyControl<T>::GetClassName(MSTR& s, bool) const {
    s = Traits<T>::kName;
}

template <class T>
T LinearKeyControl<T>::Evaluate(TimeValue t) const {
    if (keys_.empty()) return Traits<T>::Zero();
    if (t <= keys_.front().first) return keys_.front().second;
    if (t >= keys_.back().first) return keys_.back().second;
    auto hi = std::upper_bound(keys_.begin(), keys_.end(), t,
                               [](TimeValue x, const auto& k) { return x < k.first; });
    auto lo = hi - 1;
    const float u = static_cast<float>(t - lo->first) / static_cast<float>(hi->first - lo->first);
    return lo->second * (1.0f - u) + hi->second * u;
}

template <class T>
ControlValue LinearKeyControl<T>::GetValue(TimeValue t, Interval& valid) {
    if (keys_.size() > 1) {
        // Constant before the first key and after the last; changing everywhere in between.
        if (t <= keys_.front().first)
            valid &= Interval(TIME_NegInfinity, keys_.front().first);
        else if (t >= keys_.back().first)
            valid &= Interval(keys_.back().first, TIME_PosInfinity);
        else
            valid &= Interval(t, t);
    }
    return Evaluate(t);
}

template <class T>
bool LinearKeyControl<T>::SetValue(TimeValue t, const ControlValue& v) {
    const T* value = std::get_if<T>(&v);
    if (!value) return false;
    SetKey(t, *value);
    return true;
}

template <class T>
void LinearKeyControl<T>::SetKey(TimeValue t, const T& v) {
    Keys keys = keys_;
    auto it = std::lower_bound(keys.begin(), keys.end(), t,
                               [](const auto& k, TimeValue x) { return k.first < x; });
    if (it != keys.end() && it->first == t) {
        if (it->second == v) return;
        it->second = v;
    } else {
        keys.insert(it, {t, v});
    }
    ReplaceKeys(std::move(keys));
}

template <class T>
bool LinearKeyControl<T>::DeleteKeyAtTime(TimeValue t) {
    Keys keys = keys_;
    auto it = std::find_if(keys.begin(), keys.end(), [t](const auto& k) { return k.first == t; });
    if (it == keys.end()) return false;
    keys.erase(it);
    ReplaceKeys(std::move(keys));
    return true;
}

template <class T>
void LinearKeyControl<T>::DeleteAllKeys() {
    if (!keys_.empty()) ReplaceKeys({});
}

template <class T>
void LinearKeyControl<T>::ReplaceKeys(Keys keys) {
    if (theHold.Holding()) theHold.Put(new KeysRestore(this, keys_, keys));
    keys_ = std::move(keys);
    NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
}

template <class T>
ReferenceTarget* LinearKeyControl<T>::Clone(RemapDir& remap) {
    auto* c = new LinearKeyControl<T>();
    c->keys_ = keys_;
    BaseClone(this, c, remap);
    return c;
}

template class LinearKeyControl<float>;
template class LinearKeyControl<Point2>;
template class LinearKeyControl<Point3>;
template class LinearKeyControl<Point4>;

} // namespace TrelmSDK
