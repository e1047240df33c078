#include <trelm/core/class_directory.h>
#include <trelm/core/sdk_errors.h>
#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

using namespace TrelmSDK;

namespace {
class TestObject : public ReferenceTarget {
public:
    SClass_ID SuperClassID() const override { return TEXMAP_CLASS_ID; }
};

class TestClassDesc : public ClassDesc {
public:
    TestClassDesc(Class_ID id, const MCHAR* category) : id_(id), category_(category) {}
    bool IsPublic() override { return true; }
    Animatable* Create(bool loading) override {
        lastLoading = loading;
        return new TestObject();
    }
    bool OkToCreate() override { return allow; }
    const MCHAR* ClassName() override { return L"Test Object"; }
    const MCHAR* InternalName() override { return L"TestObject"; }
    SClass_ID SuperClassID() override { return TEXMAP_CLASS_ID; }
    Class_ID ClassID() override { return id_; }
    const MCHAR* Category() override { return category_; }
    bool lastLoading = true;
    bool allow = true;

private:
    Class_ID id_;
    const MCHAR* category_;
};

struct ErrorCapture {
    std::vector<MSTR> errors;
    SDKErrorHandler previous;
    ErrorCapture() {
        previous = SetSDKErrorHandler([this](const MSTR& e) { errors.push_back(e); });
    }
    ~ErrorCapture() { SetSDKErrorHandler(previous); }
};
} // namespace

TEST(ClassDirectory, ListsBuiltInControllers) {
    ClassDirectory& dir = GetClassDirectory();
    EXPECT_NE(dir.FindClass(CTRL_FLOAT_CLASS_ID, EXPR_FLOAT_CONTROL_CLASS_ID), nullptr);
    EXPECT_NE(dir.FindClass(CTRL_POINT3_CLASS_ID, LININTERP_POINT3_CLASS_ID), nullptr);
    EXPECT_EQ(dir.FindClass(TEXMAP_CLASS_ID, EXPR_FLOAT_CONTROL_CLASS_ID), nullptr)
        << "a class is known by super class and class ID together";
    Animatable* a = CreateInstance(CTRL_FLOAT_CLASS_ID, Class_ID(0x2015, 0));
    ASSERT_NE(a, nullptr);
    EXPECT_NE(a->GetInterface(Interface_ID(0x15B3E322, 0x6A176AA5)), nullptr);
    static_cast<ReferenceTarget*>(a)->DeleteMe();
}

TEST(ClassDirectory, AddsFindsAndRefusesDuplicates) {
    ErrorCapture capture;
    ClassDirectory& dir = GetClassDirectory();
    TestClassDesc first(Class_ID(0x7F9A0001, 0x1), L"Maps: Test");
    TestClassDesc clash(Class_ID(0x7F9A0001, 0x1), L"Maps: Other");
    TestClassDesc second(Class_ID(0x7F9A0001, 0x2), L"Maps: Test");
    const int before = dir.Count();
    const unsigned generation = dir.Generation();
    ASSERT_TRUE(dir.AddClass(&first));
    EXPECT_FALSE(dir.AddClass(&clash));
    EXPECT_EQ(capture.errors.size(), 1u);
    ASSERT_TRUE(dir.AddClass(&second));
    EXPECT_EQ(dir.Count(), before + 2);
    EXPECT_NE(dir.Generation(), generation);
    EXPECT_EQ(dir.GetClassAt(before), &first);
    EXPECT_EQ(dir.GetClassAt(dir.Count()), nullptr);
    EXPECT_EQ(dir.FindClass(TEXMAP_CLASS_ID, Class_ID(0x7F9A0001, 0x2)), &second);
    EXPECT_EQ(dir.FindClassByInternalName(L"TestObject"), &first);
    EXPECT_EQ(dir.ClassesInCategory(L"Maps: Test").size(), 2u);
    EXPECT_GE(dir.ClassesOfSuperClass(TEXMAP_CLASS_ID).size(), 2u);

    Animatable* made = CreateInstance(TEXMAP_CLASS_ID, Class_ID(0x7F9A0001, 0x2));
    ASSERT_NE(made, nullptr);
    EXPECT_FALSE(second.lastLoading);
    made->DeleteThis();
    second.allow = false;
    EXPECT_EQ(CreateInstance(TEXMAP_CLASS_ID, Class_ID(0x7F9A0001, 0x2)), nullptr);
    EXPECT_EQ(CreateInstance(TEXMAP_CLASS_ID, Class_ID(0x7F9A0001, 0x9)), nullptr);

    EXPECT_TRUE(dir.RemoveClass(&first));
    EXPECT_TRUE(dir.RemoveClass(&second));
    EXPECT_FALSE(dir.RemoveClass(&second));
    EXPECT_EQ(dir.Count(), before);
}

TEST(ClassDesc, OffersInterfacesById) {
    struct Iface : FPInterface {
        Interface_ID GetID() const override { return Interface_ID(0x5537445B, 0x70A97E02); }
    } iface;
    TestClassDesc cd(Class_ID(1, 2), L"");
    cd.AddInterface(&iface);
    cd.AddInterface(&iface);
    EXPECT_EQ(cd.NumInterfaces(), 1);
    EXPECT_EQ(cd.GetInterface(Interface_ID(0x5537445B, 0x70A97E02)), &iface);
    EXPECT_EQ(cd.GetInterface(Interface_ID(1, 1)), nullptr);
    EXPECT_EQ(cd.GetInterfaceAt(3), nullptr);
}

TEST(CoreInterfaces, RegisteredByIdAndRemovedOnlyByTheirOwner) {
    struct Iface : FPInterface {
        Interface_ID id;
        explicit Iface(Interface_ID i) : id(i) {}
        Interface_ID GetID() const override { return id; }
    } a(Interface_ID(0x794E519B, 0x3A74408A)), b(Interface_ID(0x794E519B, 0x3A74408A));
    RegisterCOREInterface(&a);
    EXPECT_EQ(GetCOREInterface(Interface_ID(0x794E519B, 0x3A74408A)), &a);
    RegisterCOREInterface(&b);
    UnregisterCOREInterface(&a);
    EXPECT_EQ(GetCOREInterface(Interface_ID(0x794E519B, 0x3A74408A)), &b);
    UnregisterCOREInterface(&b);
    EXPECT_EQ(GetCOREInterface(Interface_ID(0x794E519B, 0x3A74408A)), nullptr);
}
