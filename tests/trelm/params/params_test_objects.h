// Objects shared by the parameter block tests: a map, an owner that logs messages, a class
// descriptor with a string table, a UI map that counts refreshes, and an error capture.
#pragma once

#include <trelm/core/hold.h>
#include <trelm/core/remap_dir.h>
#include <trelm/core/sdk_errors.h>
#include <trelm/params/class_desc2.h>
#include <trelm/params/iparam_block2.h>

#include <gtest/gtest.h>

#include <memory>
#include <vector>

namespace trelm_test {

using namespace TrelmSDK;

// A texture map returning a fixed colour; counts live instances.
class TestMap : public Texmap {
public:
    explicit TestMap(int* live = nullptr, float grey = 0.5f) : live_(live), grey_(grey) {
        if (live_) ++*live_;
    }
    ~TestMap() override {
        if (live_) --*live_;
    }
    AColor EvalColor(ShadeContext&) override { return AColor(grey_, grey_, grey_, 1); }
    ReferenceTarget* Clone(RemapDir& remap) override {
        auto* m = new TestMap(live_, grey_);
        BaseClone(this, m, remap);
        return m;
    }
    float grey() const { return grey_; }

private:
    int* live_;
    float grey_;
};

// Owns blocks in its slots and records what they tell it.
class Owner : public ReferenceTarget {
public:
    explicit Owner(int slots = 2) : slots_(slots, nullptr) {}
    int NumRefs() override { return static_cast<int>(slots_.size()); }
    RefTargetHandle GetReference(int i) override { return slots_[i]; }
    RefResult NotifyRefChanged(const Interval&, RefTargetHandle hTarget, PartID&,
                               RefMessage message, bool) override {
        if (message == REFMSG_CHANGE) {
            ++changes;
            lastTarget = hTarget;
            if (auto* pb = dynamic_cast<IParamBlock2*>(hTarget))
                lastParam = pb->LastNotifyParamID(lastTab);
        }
        return REF_SUCCEED;
    }
    IParamBlock2* Block(int i = 0) { return dynamic_cast<IParamBlock2*>(slots_[i]); }

    int changes = 0;
    RefTargetHandle lastTarget = nullptr;
    ParamID lastParam = -1;
    int lastTab = -1;

protected:
    void SetReference(int i, RefTargetHandle t) override { slots_[i] = t; }

private:
    std::vector<ReferenceTarget*> slots_;
};

// A class descriptor whose module has a string table, so local names resolve.
class TestClassDesc : public ClassDesc2 {
public:
    TestClassDesc() : module_(RegisterModuleInstance(L"trelm_params_tests")) {
        SetResourceStrings(module_, {{12, L"Shader Parameters"}, {13, L"Mix Amount"}});
    }
    bool IsPublic() override { return true; }
    Animatable* Create(bool) override { return new Owner(); }
    const MCHAR* ClassName() override { return L"Params Test"; }
    SClass_ID SuperClassID() override { return TEXMAP_CLASS_ID; }
    Class_ID ClassID() override { return Class_ID(0x7E570001, 0x1); }
    const MCHAR* Category() override { return L"Tests"; }
    HINSTANCE HInstance() override { return module_; }

private:
    HINSTANCE module_;
};

// Counts the refreshes a block asks of its panel.
struct CountingMap : IParamMap2 {
    int calls = 0;
    ParamID lastId = -2;
    int lastTab = -2;
    void Invalidate(ParamID id, int tabIndex) override {
        ++calls;
        lastId = id;
        lastTab = tabIndex;
    }
};

// Collects SDK error reports for the duration of a test.
struct ErrorCapture {
    std::vector<MSTR> errors;
    SDKErrorHandler previous;
    ErrorCapture() {
        previous = SetSDKErrorHandler([this](const MSTR& e) { errors.push_back(e); });
    }
    ~ErrorCapture() { SetSDKErrorHandler(previous); }
};

// Parameter IDs of the descriptor that covers every type.
enum : ParamID {
    kFloat = 0,
    kInt,
    kPoint3,
    kBool,
    kWorld,
    kString,
    kFilename,
    kMap,
    kMatrix,
    kPoint4,
    kColor,
    kPoint2,
    kFloatTab = 20,
    kIntTab,
    kPoint3Tab,
    kBoolTab,
    kWorldTab,
    kStringTab,
    kFilenameTab,
    kMapTab,
    kMatrixTab,
    kPoint4Tab,
    kColorTab,
    kPoint2Tab,
};

// Names map parameters by the label their owner gives them.
struct LabelAccessor : PBAccessor {
    MSTR GetLocalName(ReferenceMaker*, ParamID id, int) override {
        return L"Label " + std::to_wstring(id);
    }
};

inline Matrix3 TestMatrix() {
    return Matrix3(Point3(1, 0, 0), Point3(0, 2, 0), Point3(0, 0, 3), Point3(4, 5, 6));
}

// A descriptor with one parameter of every type and a table of every type, built from one
// tagged list.
inline ParamBlockDesc2* MakeEveryTypeDesc(ClassDesc2* cd, PBAccessor* accessor) {
    return new ParamBlockDesc2(
        1, L"every", 12, cd, P_AUTO_CONSTRUCT | P_VERSION, 3, 1,
        // scalars
        kFloat, L"Mixer", TYPE_FLOAT, P_ANIMATABLE, 13, p_default, 0.5f, p_range, 0.0f, 1.0f, p_ui,
        TYPE_SPINNER, EDITTYPE_FLOAT, 0.01f, p_end, kInt, L"Count", TYPE_INT, P_ANIMATABLE, 0,
        p_default, 3, p_range, -1000000, 1000000, p_ui, TYPE_INT_COMBOBOX, p_end, kPoint3,
        L"Offset", TYPE_POINT3, P_ANIMATABLE, 0, p_default, Point3(1, 2, 3), p_end, kBool,
        L"Enabled", TYPE_BOOL, P_ANIMATABLE, 0, p_default, true, p_ui, TYPE_SINGLECHECKBOX, p_end,
        kWorld, L"Width", TYPE_WORLD, P_ANIMATABLE, 0, p_default, 2.5f, p_ui, TYPE_SPINNER,
        EDITTYPE_UNIVERSE, 0.1f, 0xC0000019, p_end, kString, L"Label", TYPE_STRING, 0, 0, p_default,
        L"hello", p_end, kFilename, L"File", TYPE_FILENAME, 0, 0, p_default, L"", p_assetTypeID, 1,
        p_end, kMap, L"Mixer_map", TYPE_TEXMAP, P_SUBANIM | P_COMPUTED_NAME, 0, p_accessor,
        accessor, p_subtexno, 0, p_end, kMatrix, L"Xform", TYPE_MATRIX3, 0, 0, p_default,
        TestMatrix(), p_end, kPoint4, L"Quad", TYPE_POINT4, P_ANIMATABLE, 0, p_default,
        Point4(1, 2, 3, 4), p_end, kColor, L"Tint", TYPE_FRGBA, P_ANIMATABLE, 0, p_default,
        AColor(0.5f, 0.25f, 0.125f, 1), p_range, 0.0f, 1.0f, p_end, kPoint2, L"UV", TYPE_POINT2,
        P_ANIMATABLE, 0, p_default, Point2(0.25f, 0.75f), p_end,
        // tables
        kFloatTab, L"Knots", TYPE_FLOAT_TAB, 3, P_ANIMATABLE | P_VARIABLE_SIZE, 0, p_default, 1.0f,
        p_end, kIntTab, L"Modes", TYPE_INT_TAB, 2, P_ANIMATABLE, 0, p_default, 7, p_end, kPoint3Tab,
        L"Points", TYPE_POINT3_TAB, 2, P_ANIMATABLE, 0, p_default, Point3(0, 0, 1), p_end, kBoolTab,
        L"Flags", TYPE_BOOL_TAB, 1, 0, 0, p_end, kWorldTab, L"Lengths", TYPE_WORLD_TAB, 2,
        P_ANIMATABLE, 0, p_default, 10.0f, p_end, kStringTab, L"Names", TYPE_STRING_TAB, 2,
        P_VARIABLE_SIZE, 0, p_default, L"n", p_end, kFilenameTab, L"Files", TYPE_FILENAME_TAB, 1, 0,
        0, p_assetTypeID, 1, p_end, kMapTab, L"Maps", TYPE_TEXMAP_TAB, 2, 0, 0, p_end, kMatrixTab,
        L"Xforms", TYPE_MATRIX3_TAB, 1, 0, 0, p_end, kPoint4Tab, L"Quads", TYPE_POINT4_TAB, 1,
        P_ANIMATABLE, 0, p_end, kColorTab, L"Colors", TYPE_FRGBA_TAB, 2, P_ANIMATABLE, 0, p_default,
        AColor(1, 0, 0, 1), p_end, kPoint2Tab, L"UVs", TYPE_POINT2_TAB, 1, P_ANIMATABLE, 0, p_end,
        p_end);
}

// A fresh owner with one block of every parameter type, and empty undo stacks, per test.
class EveryTypeBlockTest : public ::testing::Test {
protected:
    void SetUp() override {
        theHold.ClearStacks();
        desc.reset(MakeEveryTypeDesc(&cd, &accessor));
        owner = new Owner(2);
        cd.MakeAutoParamBlocks(owner);
        pb = owner->Block(1);
        ASSERT_NE(pb, nullptr);
    }
    void TearDown() override {
        owner->DeleteMe();
        // Undo records may still hold blocks, which need their descriptor until they go.
        theHold.ClearStacks();
        desc.reset();
    }

    TestClassDesc cd;
    LabelAccessor accessor;
    std::unique_ptr<ParamBlockDesc2> desc;
    Owner* owner = nullptr;
    IParamBlock2* pb = nullptr;
};

} // namespace trelm_test
