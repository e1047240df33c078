// Parameter blocks: the values of an object's parameters, laid out by a descriptor.
#pragma once

#include <trelm/core/texmap.h>
#include <trelm/params/controller.h>
#include <trelm/params/param_block_desc.h>
#include <trelm/params/param_map.h>

#include <vector>

namespace TrelmSDK {

// The values of one block. Every parameter holds one element, or a table of elements; an element
// is a value, and for animatable parameters optionally a controller that supplies the value over
// time. Texture-map elements are references to maps.
//
// Reading: GetValue(id, t, out, valid, tabIndex) converts between integer and float kinds and
// between points and colours; it narrows valid to the time the value holds (controllers), then
// lets the accessor adjust the value. Writing: SetValue runs the accessor's Set, stores the value
// (through the controller when there is one), records the change for undo while theHold is
// holding, tells the block's dependents (its owner) with REFMSG_CHANGE and refreshes the UI maps.
// A bad ID, index or value type is reported and changes nothing.
//
// References: slot i is the i-th element counted over all parameters in descriptor order; it
// holds the element's map (texture maps) or its controller (other types).
//
// Threads: written on the main thread. Render threads may read values while no one writes.
class IParamBlock2 : public ReferenceTarget {
public:
    ~IParamBlock2() override;

    Class_ID ClassID() const override { return Class_ID(PARAMETER_BLOCK2_CLASS_ID, 0); }
    SClass_ID SuperClassID() const override { return PARAMETER_BLOCK2_CLASS_ID; }
    void GetClassName(MSTR& s, bool localized = true) const override;

    BlockID ID() const;
    ParamBlockDesc2* GetDesc() const { return desc_; }
    ReferenceMaker* GetOwner() const { return owner_; }
    void SetOwner(ReferenceMaker* owner) { owner_ = owner; }

    int NumParams() const { return desc_->Count(); }
    ParamID IndextoID(int index) const { return desc_->IndextoID(index); }
    int IDtoIndex(ParamID id) const { return desc_->IDtoIndex(id); }
    const ParamDef* GetParamDef(ParamID id) const { return desc_->GetParamDef(id); }
    // The parameter's type (with TYPE_TAB), or -1 for an unknown ID.
    int GetParameterType(ParamID id) const;
    MSTR GetLocalName(ParamID id, int tabIndex = -1) const;

    // Typed writes.
    bool SetValue(ParamID id, TimeValue t, float v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, double v, int tabIndex = 0) {
        return SetValue(id, t, static_cast<float>(v), tabIndex);
    }
    bool SetValue(ParamID id, TimeValue t, int v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, bool v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const Point2& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const Point3& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const Point4& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const AColor& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const Matrix3& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const MCHAR* v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, const MSTR& v, int tabIndex = 0);
    bool SetValue(ParamID id, TimeValue t, ReferenceTarget* v, int tabIndex = 0);
    // Any value (as stored by accessors, copies between blocks).
    bool SetValue(ParamID id, TimeValue t, const PB2Value& v, int tabIndex = 0);

    // Typed reads; false (reported) for a bad ID, index or a type that does not convert.
    bool GetValue(ParamID id, TimeValue t, float& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, int& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, bool& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, Point2& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, Point3& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, Point4& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, AColor& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, Matrix3& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, MSTR& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, Texmap*& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, ReferenceTarget*& v, Interval& valid, int tabIndex = 0);
    bool GetValue(ParamID id, TimeValue t, PB2Value& v, Interval& valid, int tabIndex = 0);

    // Shorthands answering zero (identity, empty, none) when the read fails.
    float GetFloat(ParamID id, TimeValue t = 0, int tabIndex = 0);
    int GetInt(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Point2 GetPoint2(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Point3 GetPoint3(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Point4 GetPoint4(ParamID id, TimeValue t = 0, int tabIndex = 0);
    AColor GetAColor(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Color GetColor(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Matrix3 GetMatrix3(ParamID id, TimeValue t = 0, int tabIndex = 0);
    MSTR GetStr(ParamID id, TimeValue t = 0, int tabIndex = 0);
    Texmap* GetTexmap(ParamID id, TimeValue t = 0, int tabIndex = 0);
    ReferenceTarget* GetReferenceTarget(ParamID id, TimeValue t = 0, int tabIndex = 0);

    // The element's own stored value, bypassing its controller and the accessor: what a scene file
    // saves. StoreValue writes one back while loading: no accessor, undo record or notification.
    bool GetStoredValue(ParamID id, int tabIndex, PB2Value& v) const;
    bool StoreValue(ParamID id, int tabIndex, const PB2Value& v);

    // Tables. Count is 1 for a parameter that is not a table, -1 for an unknown ID. SetCount
    // keeps the first elements, fills new ones with the default and releases the maps and
    // controllers of dropped ones; undoable.
    int Count(ParamID id) const;
    bool SetCount(ParamID id, int n);
    bool Resize(ParamID id, int n) { return SetCount(id, n); }
    // Inserts num default elements before start / removes num elements from start.
    bool Insert(ParamID id, int start, int num);
    bool Delete(ParamID id, int start, int num);

    // Controllers (animatable parameters only; the controller's kind must suit the type).
    // Assigning keeps the controller's own animation; with preserveFrame0Value a keyable
    // controller without keys first gets a key at 0 with the current value. Undoable.
    Control* GetController(ParamID id, int tabIndex = 0);
    bool SetController(ParamID id, int tabIndex, Control* c, bool preserveFrame0Value = false);
    // Removes the controller, keeping its value at t as the stored value.
    bool RemoveController(ParamID id, int tabIndex = 0, TimeValue t = 0);

    // Back to the default: element tabIndex, or all elements (-1). Through SetValue, so undoable
    // and notified; controllers stay (keyframes get the default at time 0).
    bool Reset(ParamID id, int tabIndex = -1);
    // Every parameter except texture maps; updateUI refreshes the maps, callSetHandlers runs the
    // accessors' Set.
    void ResetAll(bool updateUI = true, bool callSetHandlers = true);

    // Re-describes this block with another descriptor. Elements whose ID exists in desc with a
    // type of the same storage kind and table-ness keep their values, controllers and maps;
    // the others are dropped, and parameters new to desc take their defaults. Not undoable.
    bool Redescribe(ParamBlockDesc2* desc);

    // The parameter (and element) of the last change this block notified, from SetValue or from a
    // controller or map it references.
    ParamID LastNotifyParamID() const { return lastNotifyID_; }
    ParamID LastNotifyParamID(int& tabIndex) const {
        tabIndex = lastNotifyTab_;
        return lastNotifyID_;
    }

    // UI maps refreshed on every change; not owned.
    void AddMap(IParamMap2* map);
    void RemoveMap(IParamMap2* map);
    int NumMaps() const { return static_cast<int>(maps_.size()); }
    IParamMap2* GetMap(int i = 0) const;
    void RefreshUI(ParamID id = -1, int tabIndex = -1);

    // References and change messages.
    int NumRefs() override;
    RefTargetHandle GetReference(int i) override;
    RefResult NotifyRefChanged(const Interval& changeInt, RefTargetHandle hTarget, PartID& partID,
                               RefMessage message, bool propagate) override;
    void RefAdded(ReferenceMaker* rm) override;
    ReferenceTarget* Clone(RemapDir& remap) override;

    // The reference slot of an element, or -1.
    int ElementRefIndex(ParamID id, int tabIndex) const;

protected:
    void SetReference(int i, RefTargetHandle target) override;

private:
    friend IParamBlock2* CreateParameterBlock2(ParamBlockDesc2* desc, ReferenceMaker* owner);
    friend class ParamRestore;
    friend class TableRestore;
    IParamBlock2(ParamBlockDesc2* desc, ReferenceMaker* owner);

    struct Element {
        PB2Value value;
        Control* controller = nullptr;
    };
    struct Param {
        ParamID id;
        int type;
        std::vector<Element> elements;
    };

    // Brings storage in line with the descriptor (which may have gained or lost parameters).
    void Sync() const;
    Param* FindParam(ParamID id) const;
    Param* Locate(ParamID id, int tabIndex, const char* what) const;
    Element MakeDefault(const ParamDef& def) const;
    bool Write(ParamID id, TimeValue t, PB2Value v, int tabIndex, bool callSetHandler);
    bool Read(ParamID id, TimeValue t, PB2Value& v, Interval& valid, int tabIndex);
    template <class T>
    bool ReadAs(ParamID id, TimeValue t, T& v, Interval& valid, int tabIndex);
    void StoreValueUnrecorded(ParamID id, int tabIndex, const PB2Value& v);
    void ReplaceElements(ParamID id, std::vector<Element> elements);
    void Changed(ParamID id, int tabIndex);

    ParamBlockDesc2* desc_;
    ReferenceMaker* owner_;
    mutable std::vector<Param> params_; // descriptor order
    mutable unsigned seenRevision_ = ~0u;
    std::vector<IParamMap2*> maps_;
    ParamID lastNotifyID_ = -1;
    int lastNotifyTab_ = -1;
    bool suppressUI_ = false; // ResetAll refreshes once at the end
};

// A new block laid out by desc and owned by owner (which should then reference it). None
// (reported) without a descriptor.
IParamBlock2* CreateParameterBlock2(ParamBlockDesc2* desc, ReferenceMaker* owner);

} // namespace TrelmSDK

using TrelmSDK::CreateParameterBlock2;
using TrelmSDK::IParamBlock2;
