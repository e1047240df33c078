// Parameter block storage, typed access, tables, controllers and their undo records.
#include <trelm/core/hold.h>
#include <trelm/core/remap_dir.h>
#include <trelm/core/sdk_errors.h>
#include <trelm/params/iparam_block2.h>

#include <algorithm>
#include <cmath>
#include <optional>

namespace TrelmSDK {

namespace {
// Types whose values are stored alike, so a block re-described from one to the other keeps them.
int StorageKind(int type) {
    switch (BaseType(type)) {
    case TYPE_WORLD:
        return TYPE_FLOAT;
    case TYPE_BOOL:
        return TYPE_INT;
    case TYPE_FILENAME:
        return TYPE_STRING;
    default:
        return BaseType(type);
    }
}

bool SameStorage(int a, int b) {
    return IsTabType(a) == IsTabType(b) && StorageKind(a) == StorageKind(b);
}

bool HoldsReference(int type) {
    return BaseType(type) == TYPE_TEXMAP;
}

ControlValue ToControlValue(const PB2Value& v, int type) {
    switch (BaseType(type)) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
        return v.Get<float>();
    case TYPE_INT:
    case TYPE_BOOL:
        return static_cast<float>(v.Get<int>());
    case TYPE_POINT2:
        return v.Get<Point2>();
    case TYPE_POINT3:
        return v.Get<Point3>();
    case TYPE_POINT4:
        return v.Get<Point4>();
    case TYPE_FRGBA: {
        const AColor& c = v.Get<AColor>();
        return Point4(c.r, c.g, c.b, c.a);
    }
    default:
        return 0.0f;
    }
}

PB2Value FromControlValue(const ControlValue& c, int type) {
    switch (BaseType(type)) {
    case TYPE_FLOAT:
    case TYPE_WORLD:
        if (auto* f = std::get_if<float>(&c)) return PB2Value(*f);
        break;
    case TYPE_INT:
        if (auto* f = std::get_if<float>(&c)) return PB2Value(static_cast<int>(std::lround(*f)));
        break;
    case TYPE_BOOL:
        if (auto* f = std::get_if<float>(&c)) return PB2Value(std::lround(*f) != 0);
        break;
    case TYPE_POINT2:
        if (auto* p = std::get_if<Point2>(&c)) return PB2Value(*p);
        break;
    case TYPE_POINT3:
        if (auto* p = std::get_if<Point3>(&c)) return PB2Value(*p);
        break;
    case TYPE_POINT4:
        if (auto* p = std::get_if<Point4>(&c)) return PB2Value(*p);
        break;
    case TYPE_FRGBA:
        if (auto* p = std::get_if<Point4>(&c)) return PB2Value(AColor(p->x, p->y, p->z, p->w));
        break;
    default:
        break;
    }
    return ZeroValue(type);
}

// A stored value read as the caller's type.
template <class T>
std::optional<T> ConvertOut(const PB2Value& v);

template <>
std::optional<float> ConvertOut<float>(const PB2Value& v) {
    if (v.Holds<float>()) return v.Get<float>();
    if (v.Holds<int>()) return static_cast<float>(v.Get<int>());
    return std::nullopt;
}
template <>
std::optional<int> ConvertOut<int>(const PB2Value& v) {
    if (v.Holds<int>()) return v.Get<int>();
    if (v.Holds<float>()) return static_cast<int>(std::lround(v.Get<float>()));
    return std::nullopt;
}
template <>
std::optional<bool> ConvertOut<bool>(const PB2Value& v) {
    if (auto i = ConvertOut<int>(v)) return *i != 0;
    return std::nullopt;
}
template <>
std::optional<Point2> ConvertOut<Point2>(const PB2Value& v) {
    if (v.Holds<Point2>()) return v.Get<Point2>();
    return std::nullopt;
}
template <>
std::optional<Point3> ConvertOut<Point3>(const PB2Value& v) {
    PB2Value c = CoerceValue(v, TYPE_POINT3);
    if (c.IsEmpty()) return std::nullopt;
    return c.Get<Point3>();
}
template <>
std::optional<Point4> ConvertOut<Point4>(const PB2Value& v) {
    PB2Value c = CoerceValue(v, TYPE_POINT4);
    if (c.IsEmpty()) return std::nullopt;
    return c.Get<Point4>();
}
template <>
std::optional<AColor> ConvertOut<AColor>(const PB2Value& v) {
    PB2Value c = CoerceValue(v, TYPE_FRGBA);
    if (c.IsEmpty()) return std::nullopt;
    return c.Get<AColor>();
}
template <>
std::optional<Matrix3> ConvertOut<Matrix3>(const PB2Value& v) {
    if (v.Holds<Matrix3>()) return v.Get<Matrix3>();
    return std::nullopt;
}
template <>
std::optional<MSTR> ConvertOut<MSTR>(const PB2Value& v) {
    if (v.Holds<MSTR>()) return v.Get<MSTR>();
    return std::nullopt;
}
template <>
std::optional<ReferenceTarget*> ConvertOut<ReferenceTarget*>(const PB2Value& v) {
    if (v.Holds<ReferenceTarget*>()) return v.Get<ReferenceTarget*>();
    return std::nullopt;
}
template <>
std::optional<Texmap*> ConvertOut<Texmap*>(const PB2Value& v) {
    if (v.Holds<ReferenceTarget*>()) return dynamic_cast<Texmap*>(v.Get<ReferenceTarget*>());
    return std::nullopt;
}
template <>
std::optional<PB2Value> ConvertOut<PB2Value>(const PB2Value& v) {
    return v;
}
} // namespace

// Undo record of one element's stored value.
class ParamRestore : public RestoreObj {
public:
    ParamRestore(IParamBlock2* pb, ParamID id, int tab, PB2Value before, PB2Value after)
        : pb_(pb), id_(id), tab_(tab), before_(std::move(before)), after_(std::move(after)) {
        pb_->HoldLock();
    }
    ~ParamRestore() override { pb_->HoldUnlock(); }
    void Restore(bool) override { pb_->StoreValueUnrecorded(id_, tab_, before_); }
    void Redo() override { pb_->StoreValueUnrecorded(id_, tab_, after_); }
    MSTR Description() const override { return L"Parameter change"; }
    bool RefersTo(const void* object) const override { return object == pb_; }

private:
    IParamBlock2* pb_;
    ParamID id_;
    int tab_;
    PB2Value before_, after_;
};

// Undo record of a table's elements (count, values, controllers and maps) before and after.
class TableRestore : public RestoreObj {
public:
    using Elements = std::vector<IParamBlock2::Element>;
    TableRestore(IParamBlock2* pb, ParamID id, int type, Elements before, Elements after)
        : pb_(pb), id_(id), type_(type), before_(std::move(before)), after_(std::move(after)) {
        pb_->HoldLock();
        for (auto* list : {&before_, &after_})
            for (auto& e : *list)
                if (auto* t = Target(e)) t->HoldLock();
    }
    ~TableRestore() override {
        for (auto* list : {&after_, &before_})
            for (auto& e : *list)
                if (auto* t = Target(e)) t->HoldUnlock();
        pb_->HoldUnlock();
    }
    void Restore(bool) override { Apply(before_); }
    void Redo() override { Apply(after_); }
    MSTR Description() const override { return L"Table change"; }
    bool RefersTo(const void* object) const override {
        if (object == pb_) return true;
        for (auto* list : {&before_, &after_})
            for (auto& e : *list)
                if (Target(e) == object) return true;
        return false;
    }

private:
    ReferenceTarget* Target(const IParamBlock2::Element& e) const {
        if (HoldsReference(type_))
            return e.value.Holds<ReferenceTarget*>() ? e.value.Get<ReferenceTarget*>() : nullptr;
        return e.controller;
    }
    void Apply(const Elements& elements) {
        pb_->ReplaceElements(id_, elements);
        pb_->Changed(id_, -1);
    }
    IParamBlock2* pb_;
    ParamID id_;
    int type_;
    Elements before_, after_;
};

IParamBlock2* CreateParameterBlock2(ParamBlockDesc2* desc, ReferenceMaker* owner) {
    if (!desc) {
        ReportSDKError(L"CreateParameterBlock2: no descriptor given");
        return nullptr;
    }
    return new IParamBlock2(desc, owner);
}

IParamBlock2::IParamBlock2(ParamBlockDesc2* desc, ReferenceMaker* owner)
    : desc_(desc), owner_(owner) {
    Sync();
}

IParamBlock2::~IParamBlock2() = default;

void IParamBlock2::GetClassName(MSTR& s, bool) const {
    s = L"ParamBlock2";
}

BlockID IParamBlock2::ID() const {
    return desc_->ID();
}

void IParamBlock2::Sync() const {
    if (seenRevision_ == desc_->Revision()) return;
    auto* self = const_cast<IParamBlock2*>(this);
    std::vector<Param> next;
    next.reserve(desc_->Count());
    std::vector<bool> used(params_.size(), false);
    for (int i = 0; i < desc_->Count(); ++i) {
        const ParamDef& def = desc_->GetParamDefByIndex(i);
        auto old = std::find_if(params_.begin(), params_.end(),
                                [&](const Param& p) { return p.id == def.ID; });
        if (old != params_.end() && SameStorage(old->type, def.type)) {
            used[old - params_.begin()] = true;
            Param kept = std::move(*old);
            kept.type = def.type;
            next.push_back(std::move(kept));
            continue;
        }
        const int n = def.IsTab() ? def.tab_size : 1;
        next.push_back(Param{def.ID, def.type, std::vector<Element>(n, MakeDefault(def))});
    }
    std::vector<Param> dropped;
    for (size_t i = 0; i < params_.size(); ++i)
        if (!used[i]) dropped.push_back(std::move(params_[i]));
    params_ = std::move(next);
    seenRevision_ = desc_->Revision();
    for (Param& p : dropped)
        for (Element& e : p.elements) {
            ReferenceTarget* t = HoldsReference(p.type) && e.value.Holds<ReferenceTarget*>()
                                     ? e.value.Get<ReferenceTarget*>()
                                     : e.controller;
            if (t) self->UnlinkTarget(t);
        }
}

IParamBlock2::Element IParamBlock2::MakeDefault(const ParamDef& def) const {
    return Element{def.def, nullptr};
}

IParamBlock2::Param* IParamBlock2::FindParam(ParamID id) const {
    Sync();
    for (Param& p : params_)
        if (p.id == id) return &p;
    return nullptr;
}

IParamBlock2::Param* IParamBlock2::Locate(ParamID id, int tabIndex, const char* what) const {
    Param* p = FindParam(id);
    if (p && tabIndex >= 0 && tabIndex < static_cast<int>(p->elements.size())) return p;
    // Only a failed lookup pays for its message.
    const MSTR where = L"IParamBlock2 '" + desc_->InternalName() + L"' " + FromUTF8(what) + L": ";
    if (!p) {
        ReportSDKError(where + L"no parameter with ID " + std::to_wstring(id));
        return nullptr;
    }
    ReportSDKError(where + L"parameter " + std::to_wstring(id) + L", index " +
                   std::to_wstring(tabIndex) + L": " + kTabRangeError);
    return nullptr;
}

int IParamBlock2::GetParameterType(ParamID id) const {
    const ParamDef* d = desc_->GetParamDef(id);
    return d ? d->type : -1;
}

MSTR IParamBlock2::GetLocalName(ParamID id, int tabIndex) const {
    return desc_->GetLocalName(id, owner_, tabIndex);
}

// ---- writing ----------------------------------------------------------------------------------

bool IParamBlock2::Write(ParamID id, TimeValue t, PB2Value v, int tabIndex, bool callSetHandler) {
    Param* p = Locate(id, tabIndex, "SetValue");
    if (!p) return false;
    const ParamDef& def = *desc_->GetParamDef(id);
    auto wrongType = [&] {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' SetValue: parameter " +
                       std::to_wstring(id) + L" ('" + def.int_name +
                       L"') cannot take a value of this type");
        return false;
    };
    PB2Value value = CoerceValue(v, def.type);
    if (value.IsEmpty()) return wrongType();
    if (callSetHandler && def.accessor) {
        def.accessor->Set(value, owner_, id, tabIndex, t);
        value = CoerceValue(value, def.type);
        if (value.IsEmpty()) return wrongType();
    }
    Element& e = p->elements[tabIndex];
    if (HoldsReference(def.type)) {
        ReferenceTarget* target = value.Get<ReferenceTarget*>();
        if (target && !dynamic_cast<Texmap*>(target)) return wrongType();
        if (e.value.Get<ReferenceTarget*>() == target) return true;
        if (ReplaceReference(ElementRefIndex(id, tabIndex), target) != REF_SUCCEED) return false;
    } else if (e.controller) {
        // The controller tells this block, which passes the change on to the owner.
        if (!e.controller->SetValue(t, ToControlValue(value, def.type))) {
            ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' SetValue: parameter " +
                           std::to_wstring(id) +
                           L" is driven by a controller that takes no values");
            return false;
        }
        return true;
    } else {
        if (e.value == value) return true;
        if (theHold.Holding()) theHold.Put(new ParamRestore(this, id, tabIndex, e.value, value));
        e.value = std::move(value);
    }
    Changed(id, tabIndex);
    return true;
}

void IParamBlock2::StoreValueUnrecorded(ParamID id, int tabIndex, const PB2Value& v) {
    Param* p = FindParam(id);
    if (!p || tabIndex < 0 || tabIndex >= static_cast<int>(p->elements.size())) return;
    p->elements[tabIndex].value = v;
    Changed(id, tabIndex);
}

void IParamBlock2::Changed(ParamID id, int tabIndex) {
    lastNotifyID_ = id;
    lastNotifyTab_ = tabIndex;
    NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    if (!suppressUI_) RefreshUI(id, tabIndex);
}

bool IParamBlock2::SetValue(ParamID id, TimeValue t, float v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, int v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, bool v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const Point2& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const Point3& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const Point4& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const AColor& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const Matrix3& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const MCHAR* v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const MSTR& v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, ReferenceTarget* v, int tabIndex) {
    return Write(id, t, PB2Value(v), tabIndex, true);
}
bool IParamBlock2::SetValue(ParamID id, TimeValue t, const PB2Value& v, int tabIndex) {
    return Write(id, t, v, tabIndex, true);
}

// ---- reading ----------------------------------------------------------------------------------

bool IParamBlock2::Read(ParamID id, TimeValue t, PB2Value& v, Interval& valid, int tabIndex) {
    Param* p = Locate(id, tabIndex, "GetValue");
    if (!p) return false;
    const ParamDef& def = *desc_->GetParamDef(id);
    const Element& e = p->elements[tabIndex];
    if (e.controller) {
        Interval iv = FOREVER;
        v = FromControlValue(e.controller->GetValue(t, iv), def.type);
        valid &= iv;
    } else {
        v = e.value;
    }
    if (def.accessor) def.accessor->Get(v, owner_, id, tabIndex, t, valid);
    return true;
}

template <class T>
bool IParamBlock2::ReadAs(ParamID id, TimeValue t, T& out, Interval& valid, int tabIndex) {
    PB2Value v;
    if (!Read(id, t, v, valid, tabIndex)) return false;
    std::optional<T> converted = ConvertOut<T>(v);
    if (!converted) {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' GetValue: parameter " +
                       std::to_wstring(id) + L" cannot be read as the requested type");
        return false;
    }
    out = std::move(*converted);
    return true;
}

bool IParamBlock2::GetValue(ParamID id, TimeValue t, float& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, int& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, bool& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, Point2& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, Point3& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, Point4& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, AColor& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, Matrix3& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, MSTR& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, Texmap*& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, ReferenceTarget*& v, Interval& valid,
                            int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}
bool IParamBlock2::GetValue(ParamID id, TimeValue t, PB2Value& v, Interval& valid, int tabIndex) {
    return ReadAs(id, t, v, valid, tabIndex);
}

namespace {
template <class T>
T ReadOr(IParamBlock2& pb, ParamID id, TimeValue t, int tabIndex, T fallback) {
    Interval valid = FOREVER;
    T v = fallback;
    return pb.GetValue(id, t, v, valid, tabIndex) ? v : fallback;
}
} // namespace

float IParamBlock2::GetFloat(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, 0.0f);
}
int IParamBlock2::GetInt(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, 0);
}
Point2 IParamBlock2::GetPoint2(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, Point2(0, 0));
}
Point3 IParamBlock2::GetPoint3(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, Point3(0, 0, 0));
}
Point4 IParamBlock2::GetPoint4(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, Point4(0, 0, 0, 0));
}
AColor IParamBlock2::GetAColor(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, AColor(0, 0, 0, 1));
}
Color IParamBlock2::GetColor(ParamID id, TimeValue t, int tabIndex) {
    AColor c = GetAColor(id, t, tabIndex);
    return Color(c.r, c.g, c.b);
}
Matrix3 IParamBlock2::GetMatrix3(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, Matrix3());
}
MSTR IParamBlock2::GetStr(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr(*this, id, t, tabIndex, MSTR());
}
Texmap* IParamBlock2::GetTexmap(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr<Texmap*>(*this, id, t, tabIndex, nullptr);
}
ReferenceTarget* IParamBlock2::GetReferenceTarget(ParamID id, TimeValue t, int tabIndex) {
    return ReadOr<ReferenceTarget*>(*this, id, t, tabIndex, nullptr);
}

bool IParamBlock2::GetStoredValue(ParamID id, int tabIndex, PB2Value& v) const {
    const Param* p = Locate(id, tabIndex, "GetStoredValue");
    if (!p) return false;
    v = p->elements[tabIndex].value;
    return true;
}

bool IParamBlock2::StoreValue(ParamID id, int tabIndex, const PB2Value& v) {
    Param* p = Locate(id, tabIndex, "StoreValue");
    if (!p) return false;
    PB2Value value = CoerceValue(v, p->type);
    if (value.IsEmpty() || HoldsReference(p->type)) {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' StoreValue: parameter " +
                       std::to_wstring(id) +
                       L" cannot store this value (maps are stored through references)");
        return false;
    }
    p->elements[tabIndex].value = std::move(value);
    return true;
}

// ---- tables -----------------------------------------------------------------------------------

int IParamBlock2::Count(ParamID id) const {
    const Param* p = FindParam(id);
    return p ? static_cast<int>(p->elements.size()) : -1;
}

bool IParamBlock2::SetCount(ParamID id, int n) {
    Param* p = FindParam(id);
    if (!p) return Locate(id, 0, "SetCount") != nullptr;
    if (n < 0 || !IsTabType(p->type)) {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' SetCount: parameter " +
                       std::to_wstring(id) +
                       (n < 0 ? L": a count cannot be negative" : L" is not a table"));
        return false;
    }
    if (n == static_cast<int>(p->elements.size())) return true;
    std::vector<Element> after = p->elements;
    after.resize(n, MakeDefault(*desc_->GetParamDef(id)));
    if (theHold.Holding()) theHold.Put(new TableRestore(this, id, p->type, p->elements, after));
    ReplaceElements(id, std::move(after));
    Changed(id, -1);
    return true;
}

bool IParamBlock2::Insert(ParamID id, int start, int num) {
    Param* p = FindParam(id);
    if (!p) return Locate(id, 0, "Insert") != nullptr;
    const int n = static_cast<int>(p->elements.size());
    if (!IsTabType(p->type) || num < 0 || start < 0 || start > n) {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' Insert: parameter " +
                       std::to_wstring(id) + L": " + kTabRangeError);
        return false;
    }
    if (num == 0) return true;
    std::vector<Element> after = p->elements;
    after.insert(after.begin() + start, num, MakeDefault(*desc_->GetParamDef(id)));
    if (theHold.Holding()) theHold.Put(new TableRestore(this, id, p->type, p->elements, after));
    ReplaceElements(id, std::move(after));
    Changed(id, -1);
    return true;
}

bool IParamBlock2::Delete(ParamID id, int start, int num) {
    Param* p = FindParam(id);
    if (!p) return Locate(id, 0, "Delete") != nullptr;
    const int n = static_cast<int>(p->elements.size());
    if (!IsTabType(p->type) || num < 0 || start < 0 || start + num > n) {
        ReportSDKError(L"IParamBlock2 '" + desc_->InternalName() + L"' Delete: parameter " +
                       std::to_wstring(id) + L": " + kTabRangeError);
        return false;
    }
    if (num == 0) return true;
    std::vector<Element> after = p->elements;
    after.erase(after.begin() + start, after.begin() + start + num);
    if (theHold.Holding()) theHold.Put(new TableRestore(this, id, p->type, p->elements, after));
    ReplaceElements(id, std::move(after));
    Changed(id, -1);
    return true;
}

void IParamBlock2::ReplaceElements(ParamID id, std::vector<Element> elements) {
    Param* p = FindParam(id);
    if (!p) return;
    auto target = [&](const Element& e) -> ReferenceTarget* {
        if (HoldsReference(p->type))
            return e.value.Holds<ReferenceTarget*>() ? e.value.Get<ReferenceTarget*>() : nullptr;
        return e.controller;
    };
    // Link the new targets before unlinking the old, so targets in both stay alive.
    for (const Element& e : elements)
        if (auto* t = target(e)) LinkTarget(t);
    std::vector<Element> old = std::move(p->elements);
    p->elements = std::move(elements);
    for (const Element& e : old)
        if (auto* t = target(e)) UnlinkTarget(t);
}

// ---- controllers ------------------------------------------------------------------------------

Control* IParamBlock2::GetController(ParamID id, int tabIndex) {
    Param* p = Locate(id, tabIndex, "GetController");
    return p ? p->elements[tabIndex].controller : nullptr;
}

bool IParamBlock2::SetController(ParamID id, int tabIndex, Control* c, bool preserveFrame0Value) {
    Param* p = Locate(id, tabIndex, "SetController");
    if (!p) return false;
    const ParamDef& def = *desc_->GetParamDef(id);
    const MSTR where = L"IParamBlock2 '" + desc_->InternalName() + L"' SetController: parameter " +
                       std::to_wstring(id);
    const SClass_ID kind = ControllerSuperClassFor(def.type);
    if (!def.IsAnimatable() || kind == 0) {
        ReportSDKError(where + L" is not animatable");
        return false;
    }
    if (c && c->SuperClassID() != kind) {
        ReportSDKError(where + L": the controller's kind does not suit the parameter's type");
        return false;
    }
    Element& e = p->elements[tabIndex];
    if (e.controller == c) return true;
    if (c && preserveFrame0Value && c->IsKeyable() && c->NumKeys() == 0)
        c->SetValue(0, ToControlValue(e.value, def.type));
    if (ReplaceReference(ElementRefIndex(id, tabIndex), c) != REF_SUCCEED) return false;
    Changed(id, tabIndex);
    return true;
}

bool IParamBlock2::RemoveController(ParamID id, int tabIndex, TimeValue t) {
    Param* p = Locate(id, tabIndex, "RemoveController");
    if (!p) return false;
    Element& e = p->elements[tabIndex];
    if (!e.controller) return true;
    const ParamDef& def = *desc_->GetParamDef(id);
    Interval iv = FOREVER;
    PB2Value current = FromControlValue(e.controller->GetValue(t, iv), def.type);
    if (!(current == e.value)) {
        if (theHold.Holding()) theHold.Put(new ParamRestore(this, id, tabIndex, e.value, current));
        e.value = current;
    }
    if (ReplaceReference(ElementRefIndex(id, tabIndex), nullptr) != REF_SUCCEED) return false;
    Changed(id, tabIndex);
    return true;
}

// ---- resetting and re-describing --------------------------------------------------------------

bool IParamBlock2::Reset(ParamID id, int tabIndex) {
    Param* p = FindParam(id);
    if (!p) return Locate(id, 0, "Reset") != nullptr;
    const ParamDef& def = *desc_->GetParamDef(id);
    const int n = static_cast<int>(p->elements.size());
    if (tabIndex >= n || tabIndex < -1) return Locate(id, tabIndex, "Reset") != nullptr;
    bool ok = true;
    for (int k = tabIndex < 0 ? 0 : tabIndex; k < (tabIndex < 0 ? n : tabIndex + 1); ++k) {
        Control* c = FindParam(id)->elements[k].controller;
        if (c && !c->IsKeyable()) continue; // computed values have no default to go back to
        ok = Write(id, 0, def.def, k, true) && ok;
    }
    return ok;
}

void IParamBlock2::ResetAll(bool updateUI, bool callSetHandlers) {
    suppressUI_ = true;
    for (int i = 0; i < desc_->Count(); ++i) {
        const ParamDef& def = desc_->GetParamDefByIndex(i);
        if (HoldsReference(def.type)) continue;
        Param* p = FindParam(def.ID);
        for (int k = 0; p && k < static_cast<int>(p->elements.size()); ++k) {
            Control* c = p->elements[k].controller;
            if (c && !c->IsKeyable()) continue;
            Write(def.ID, 0, def.def, k, callSetHandlers);
            p = FindParam(def.ID);
        }
    }
    suppressUI_ = false;
    if (updateUI) RefreshUI();
}

bool IParamBlock2::Redescribe(ParamBlockDesc2* desc) {
    if (!desc) {
        ReportSDKError(L"IParamBlock2 Redescribe: no descriptor given");
        return false;
    }
    // Undo records address elements by the old layout.
    theHold.Purge(this);
    desc_ = desc;
    seenRevision_ = ~0u;
    Sync();
    Changed(-1, -1);
    return true;
}

// ---- maps -------------------------------------------------------------------------------------

void IParamBlock2::AddMap(IParamMap2* map) {
    if (map && std::find(maps_.begin(), maps_.end(), map) == maps_.end()) maps_.push_back(map);
}

void IParamBlock2::RemoveMap(IParamMap2* map) {
    std::erase(maps_, map);
}

IParamMap2* IParamBlock2::GetMap(int i) const {
    return i >= 0 && i < NumMaps() ? maps_[i] : nullptr;
}

void IParamBlock2::RefreshUI(ParamID id, int tabIndex) {
    const auto maps = maps_; // a panel may detach itself while refreshing
    for (auto* m : maps) m->Invalidate(id, tabIndex);
}

// ---- references -------------------------------------------------------------------------------

int IParamBlock2::NumRefs() {
    Sync();
    int n = 0;
    for (const Param& p : params_) n += static_cast<int>(p.elements.size());
    return n;
}

int IParamBlock2::ElementRefIndex(ParamID id, int tabIndex) const {
    Sync();
    int base = 0;
    for (const Param& p : params_) {
        const int n = static_cast<int>(p.elements.size());
        if (p.id == id) return tabIndex >= 0 && tabIndex < n ? base + tabIndex : -1;
        base += n;
    }
    return -1;
}

RefTargetHandle IParamBlock2::GetReference(int i) {
    Sync();
    for (Param& p : params_) {
        const int n = static_cast<int>(p.elements.size());
        if (i < n) {
            if (i < 0) return nullptr;
            const Element& e = p.elements[i];
            if (HoldsReference(p.type))
                return e.value.Holds<ReferenceTarget*>() ? e.value.Get<ReferenceTarget*>()
                                                         : nullptr;
            return e.controller;
        }
        i -= n;
    }
    return nullptr;
}

void IParamBlock2::SetReference(int i, RefTargetHandle target) {
    Sync();
    for (Param& p : params_) {
        const int n = static_cast<int>(p.elements.size());
        if (i < n) {
            if (i < 0) return;
            Element& e = p.elements[i];
            if (HoldsReference(p.type)) {
                e.value = PB2Value(target);
            } else if (!target) {
                e.controller = nullptr;
            } else if (auto* c = dynamic_cast<Control*>(target)) {
                e.controller = c;
            }
            return;
        }
        i -= n;
    }
}

RefResult IParamBlock2::NotifyRefChanged(const Interval&, RefTargetHandle hTarget, PartID&,
                                         RefMessage message, bool) {
    if (message == REFMSG_TARGET_DELETED) return REF_SUCCEED;
    for (const Param& p : params_) {
        for (size_t k = 0; k < p.elements.size(); ++k) {
            const Element& e = p.elements[k];
            ReferenceTarget* t = HoldsReference(p.type) && e.value.Holds<ReferenceTarget*>()
                                     ? e.value.Get<ReferenceTarget*>()
                                     : e.controller;
            if (t == hTarget) {
                lastNotifyID_ = p.id;
                lastNotifyTab_ = static_cast<int>(k);
                if (message == REFMSG_CHANGE && !suppressUI_) RefreshUI(p.id, lastNotifyTab_);
                return REF_SUCCEED;
            }
        }
    }
    return REF_SUCCEED;
}

void IParamBlock2::RefAdded(ReferenceMaker* rm) {
    if (!owner_ && rm && !rm->HoldsWeakReferences()) owner_ = rm;
}

ReferenceTarget* IParamBlock2::Clone(RemapDir& remap) {
    auto* pb = new IParamBlock2(desc_, nullptr);
    remap.AddEntry(this, pb);
    Sync();
    pb->params_ = params_;
    pb->seenRevision_ = seenRevision_;
    for (Param& p : pb->params_)
        for (Element& e : p.elements) {
            e.controller = nullptr;
            if (HoldsReference(p.type)) e.value = PB2Value(static_cast<ReferenceTarget*>(nullptr));
        }
    // The clone's wiring is part of making it, not a change to undo.
    theHold.Suspend();
    for (int i = 0; i < NumRefs(); ++i)
        if (ReferenceTarget* t = GetReference(i)) pb->ReplaceReference(i, remap.CloneRef(t));
    theHold.Resume();
    BaseClone(this, pb, remap);
    return pb;
}

} // namespace TrelmSDK
