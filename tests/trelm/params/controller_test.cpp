#include "params_test_objects.h"

#include <trelm/core/class_directory.h>
#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

#include <cmath>
#include <memory>

using namespace trelm_test;

namespace {
class ControllerTest : public EveryTypeBlockTest {
protected:
    void SetUp() override {
        SetFrameRate(30);
        EveryTypeBlockTest::SetUp();
    }
};

// The expression controller as plug-in code makes one: through the class directory and its
// interface, with error reports switched off while the expression is set.
Control* MakeExpression(const MSTR& text) {
    auto* c = static_cast<Control*>(CreateInstance(CTRL_FLOAT_CLASS_ID, Class_ID(0x2015, 0)));
    auto* expr = static_cast<IExprCtrl*>(c->GetInterface(Interface_ID(0x15B3E322, 0x6A176AA5)));
    const bool report = expr->GetReportErrors();
    expr->SetReportErrors(false);
    EXPECT_TRUE(expr->SetExpression(text));
    expr->SetReportErrors(report);
    return c;
}
} // namespace

TEST_F(ControllerTest, LinearKeysDriveAFloatOverTime) {
    auto* c = new LinearFloatControl();
    c->SetKey(0, 0.0f);
    c->SetKey(1600, 10.0f);
    ASSERT_TRUE(pb->SetController(kFloat, 0, c));
    EXPECT_EQ(pb->GetController(kFloat), c);

    Interval valid = FOREVER;
    float v = -1;
    ASSERT_TRUE(pb->GetValue(kFloat, 800, v, valid));
    EXPECT_FLOAT_EQ(v, 5.0f);
    EXPECT_EQ(valid, Interval(800, 800)) << "between keys the value holds for an instant";
    valid = FOREVER;
    ASSERT_TRUE(pb->GetValue(kFloat, 3200, v, valid));
    EXPECT_FLOAT_EQ(v, 10.0f);
    EXPECT_EQ(valid, Interval(1600, TIME_PosInfinity));
    valid = FOREVER;
    ASSERT_TRUE(pb->GetValue(kFloat, -100, v, valid));
    EXPECT_FLOAT_EQ(v, 0.0f);
    EXPECT_EQ(valid.End(), 0);
    EXPECT_TRUE(c->IsAnimated());

    // Writing a controlled parameter sets a key.
    const int changes = owner->changes;
    ASSERT_TRUE(pb->SetValue(kFloat, 800, 20.0f));
    EXPECT_EQ(c->NumKeys(), 3);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 800), 20.0f);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 400), 10.0f);
    EXPECT_EQ(owner->changes, changes + 1) << "the key change reaches the owner";
    EXPECT_EQ(owner->lastParam, kFloat);
}

TEST_F(ControllerTest, EveryAnimatableTypeWithAndWithoutControllers) {
    auto* ci = new LinearFloatControl();
    ci->SetKey(0, 0.0f);
    ci->SetKey(480, 10.0f);
    auto* cp3 = new LinearPoint3Control();
    cp3->SetKey(0, Point3(0, 0, 0));
    cp3->SetKey(480, Point3(2, 4, 6));
    auto* ccol = new LinearPoint4Control();
    ccol->SetKey(0, Point4(0, 0, 0, 1));
    ccol->SetKey(480, Point4(1, 1, 1, 1));
    auto* cp2 = new LinearPoint2Control();
    cp2->SetKey(0, Point2(0, 0));
    cp2->SetKey(480, Point2(1, -1));
    auto* cp4 = new LinearPoint4Control();
    cp4->SetKey(0, Point4(0, 0, 0, 0));
    cp4->SetKey(480, Point4(4, 4, 4, 4));
    auto* cw = new LinearFloatControl();
    cw->SetKey(0, 1.0f);
    cw->SetKey(480, 3.0f);
    auto* cb = new LinearFloatControl();
    cb->SetKey(0, 0.0f);
    cb->SetKey(480, 1.0f);
    ASSERT_TRUE(pb->SetController(kInt, 0, ci));
    ASSERT_TRUE(pb->SetController(kPoint3, 0, cp3));
    ASSERT_TRUE(pb->SetController(kColor, 0, ccol));
    ASSERT_TRUE(pb->SetController(kPoint2, 0, cp2));
    ASSERT_TRUE(pb->SetController(kPoint4, 0, cp4));
    ASSERT_TRUE(pb->SetController(kWorld, 0, cw));
    ASSERT_TRUE(pb->SetController(kBool, 0, cb));

    struct Case {
        TimeValue t;
        int i;
        Point3 p3;
        AColor col;
        Point2 p2;
        float w;
        int b;
    };
    const Case cases[] = {
        {0, 0, Point3(0, 0, 0), AColor(0, 0, 0, 1), Point2(0, 0), 1.0f, 0},
        {120, 3, Point3(0.5f, 1, 1.5f), AColor(0.25f, 0.25f, 0.25f, 1), Point2(0.25f, -0.25f), 1.5f,
         0},
        {360, 8, Point3(1.5f, 3, 4.5f), AColor(0.75f, 0.75f, 0.75f, 1), Point2(0.75f, -0.75f), 2.5f,
         1},
        {960, 10, Point3(2, 4, 6), AColor(1, 1, 1, 1), Point2(1, -1), 3.0f, 1},
    };
    for (const Case& k : cases) {
        EXPECT_EQ(pb->GetInt(kInt, k.t), k.i) << k.t;
        EXPECT_EQ(pb->GetPoint3(kPoint3, k.t), k.p3) << k.t;
        EXPECT_EQ(pb->GetAColor(kColor, k.t), k.col) << k.t;
        EXPECT_EQ(pb->GetPoint2(kPoint2, k.t), k.p2) << k.t;
        EXPECT_FLOAT_EQ(pb->GetFloat(kWorld, k.t), k.w) << k.t;
        EXPECT_EQ(pb->GetInt(kBool, k.t), k.b) << k.t;
        EXPECT_EQ(pb->GetPoint4(kPoint4, k.t), Point4(1, 1, 1, 1) * (k.w - 1) * 2) << k.t;
        // Uncontrolled neighbours stay constant at every time.
        EXPECT_EQ(pb->GetFloat(kFloat, k.t), 0.5f);
        EXPECT_EQ(pb->GetStr(kString, k.t), L"hello");
    }
}

TEST_F(ControllerTest, ControllersPerTableElement) {
    auto* c = new LinearFloatControl();
    c->SetKey(0, 0.0f);
    c->SetKey(4800, 100.0f);
    ASSERT_TRUE(pb->SetController(kFloatTab, 1, c));
    EXPECT_EQ(pb->GetController(kFloatTab, 0), nullptr);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloatTab, 2400, 1), 50.0f);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloatTab, 2400, 0), 1.0f);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloatTab, 2400, 2), 1.0f);
    auto* col = new LinearPoint4Control();
    col->SetKey(0, Point4(1, 0, 0, 1));
    col->SetKey(100, Point4(0, 0, 1, 1));
    ASSERT_TRUE(pb->SetController(kColorTab, 1, col));
    EXPECT_EQ(pb->GetAColor(kColorTab, 50, 1), AColor(0.5f, 0, 0.5f, 1));
    EXPECT_EQ(pb->GetAColor(kColorTab, 50, 0), AColor(1, 0, 0, 1));

    // Growing the table in front shifts the animated element with its controller.
    ASSERT_TRUE(pb->Insert(kFloatTab, 0, 1));
    EXPECT_EQ(pb->GetController(kFloatTab, 2), c);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloatTab, 2400, 2), 50.0f);
    // Removing it releases the controller.
    ASSERT_TRUE(pb->Delete(kFloatTab, 2, 1));
    EXPECT_EQ(pb->GetController(kFloatTab, 2), nullptr);
}

TEST_F(ControllerTest, FrameAndSecondExpressions) {
    ASSERT_TRUE(pb->SetController(kInt, 0, MakeExpression(L"F")));
    ASSERT_TRUE(pb->SetController(kFloat, 0, MakeExpression(L"S")));
    ASSERT_TRUE(pb->SetController(kFloatTab, 2, MakeExpression(L"F / 2 + S")));
    for (int frame : {0, 1, 15, 30, 75, -10}) {
        const TimeValue t = frame * GetTicksPerFrame();
        Interval valid = FOREVER;
        int f = -1;
        float s = -1;
        ASSERT_TRUE(pb->GetValue(kInt, t, f, valid));
        ASSERT_TRUE(pb->GetValue(kFloat, t, s, valid));
        EXPECT_EQ(f, frame);
        EXPECT_FLOAT_EQ(s, frame / 30.0f);
        EXPECT_EQ(valid, Interval(t, t)) << "time expressions hold for an instant";
        EXPECT_FLOAT_EQ(pb->GetFloat(kFloatTab, t, 2), frame / 2.0f + frame / 30.0f);
    }
    SetFrameRate(25);
    EXPECT_EQ(pb->GetInt(kInt, 4800), 25) << "frames follow the scene's frame rate";
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 4800), 1.0f);
    SetFrameRate(30);

    ErrorCapture capture;
    EXPECT_FALSE(pb->SetValue(kInt, 0, 5)) << "an expression takes no values";
    EXPECT_EQ(capture.errors.size(), 1u);
    pb->ResetAll();
    EXPECT_EQ(pb->GetInt(kInt, 160), 1) << "reset leaves computed values alone";
}

TEST_F(ControllerTest, ExpressionSyntaxAndErrors) {
    auto* c = new ExprFloatControl();
    EXPECT_EQ(c->GetExpression(), L"0");
    struct Case {
        const MCHAR* text;
        float at1s;
    };
    const Case cases[] = {
        {L"2 + 3 * 4", 14},
        {L"(2 + 3) * 4", 20},
        {L"-(1 + 2)^2", -9},
        {L"2^3^2", 512},
        {L"10 / 4 - 1", 1.5f},
        {L"T / 4800", 1},
        {L"max(F, 100) - min(S, 0)", 100},
        {L"abs(-F) + floor(2.7)", 32},
        {L"sin(pi / 2) + cos(0)", 2},
        {L"1.5e1 + .5", 15.5f},
        {L"sqrt(16) * ceil(0.2)", 4},
        {L"pow(2, 10)", 1024},
    };
    for (const Case& k : cases) {
        ASSERT_TRUE(c->SetExpression(k.text))
            << ToUTF8(k.text) << ": " << ToUTF8(c->GetLastError());
        EXPECT_FLOAT_EQ(c->Evaluate(4800), k.at1s) << ToUTF8(k.text);
    }
    EXPECT_TRUE(std::isinf(c->SetExpression(L"1/0") ? c->Evaluate(0) : 0.0f));
    Interval valid = FOREVER;
    c->SetExpression(L"3 * 2");
    EXPECT_EQ(std::get<float>(c->GetValue(100, valid)), 6.0f);
    EXPECT_TRUE(valid.IsInfinite()) << "no time variable: valid forever";
    EXPECT_FALSE(c->IsAnimated());

    ErrorCapture capture;
    for (const MCHAR* bad :
         {L"", L"1 +", L"(1", L"F F", L"G", L"foo(1)", L"min(1)", L"2 $ 3", L".", L"sin()"}) {
        EXPECT_FALSE(c->SetExpression(bad)) << ToUTF8(bad);
        EXPECT_FALSE(c->GetLastError().empty()) << ToUTF8(bad);
        EXPECT_EQ(c->GetExpression(), L"3 * 2") << "a bad expression keeps the previous one";
    }
    EXPECT_EQ(capture.errors.size(), 10u) << "reported while ReportErrors is on";
    c->SetReportErrors(false);
    EXPECT_FALSE(c->SetExpression(L"1 +"));
    EXPECT_EQ(capture.errors.size(), 10u);
    EXPECT_NE(c->GetLastError().find(L"ends too early"), MSTR::npos);
    c->DeleteThis();
}

TEST_F(ControllerTest, AssignmentRules) {
    ErrorCapture capture;
    auto* f = new LinearFloatControl();
    auto* p3 = new LinearPoint3Control();
    EXPECT_FALSE(pb->SetController(kString, 0, f)) << "strings are not animatable";
    EXPECT_FALSE(pb->SetController(kFloatTab, 0, p3)) << "a point controller on a float";
    EXPECT_FALSE(pb->SetController(kFilenameTab, 0, f));
    EXPECT_EQ(capture.errors.size(), 3u);
    EXPECT_EQ(pb->GetController(kFloatTab, 0), nullptr);

    // Seeding a fresh keyframe controller with the current value, and removing it again.
    pb->SetValue(kFloat, 0, 0.25f);
    ASSERT_TRUE(pb->SetController(kFloat, 0, f, true));
    EXPECT_EQ(f->NumKeys(), 1);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 999), 0.25f);
    f->SetKey(100, 1.0f);
    ASSERT_TRUE(pb->RemoveController(kFloat, 0, 100));
    EXPECT_EQ(pb->GetController(kFloat), nullptr);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 0), 1.0f) << "keeps the value it had at the given time";
    p3->DeleteThis();
}
