// The update cycle: what survives a code change, when the block is rebuilt, undo and reset.
#include "map/shader_update.h"
#include "map_test_host.h"

#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

using namespace TrelmSDK;

namespace {

class ShaderUpdateTest : public ::testing::Test {
protected:
    void SetUp() override { MapTestRoot(); }
};

// A shader with a float input Gain (default given), a colour Tint and one output; tag makes the
// text (and so the key) unique per test.
std::string Shader(const std::string& tag, const std::string& inputs) {
    return "// " + tag + "\nshader upd_" + tag + "(" + inputs +
           ", output color Out = 0) { Out = color(1); }\n";
}

ParamID IDOf(IParamBlock2* pb, const wchar_t* name) {
    const int index = pb->GetDesc()->NameToIndex(name);
    return index < 0 ? ParamID(-1) : pb->IndextoID(index);
}

// A texture map to connect: another Tessel Map.
OSLTex* NewMap() {
    return static_cast<OSLTex*>(GetOSLTexDesc()->Create(false));
}

} // namespace

TEST_F(ShaderUpdateTest, RenamingAnInputLosesItsValueChangingTheDefaultKeepsIt) {
    MapHolder map;
    map.SetCode(Shader("keep1", "float Gain = 0.5, float Other = 1"));
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(IDOf(pb, L"Gain"), 0, 0.25f);
    pb->SetValue(IDOf(pb, L"Other"), 0, 7.0f);

    map.SetCode(Shader("keep1", "float Gain = 0.9, float Other = 1"));
    pb = map->ShaderBlock();
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Gain")), 0.25f);
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Other")), 7.0f);

    map.SetCode(Shader("keep1", "float Gain2 = 0.9, float Other = 1"));
    pb = map->ShaderBlock();
    EXPECT_EQ(IDOf(pb, L"Gain"), -1);
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Gain2")), 0.9f);
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Other")), 7.0f);
}

TEST_F(ShaderUpdateTest, FloatBecomingColorDropsTheValue) {
    MapHolder map;
    map.SetCode(Shader("f2c", "float Amount = 0.5"));
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(IDOf(pb, L"Amount"), 0, 0.125f);
    map.SetCode(Shader("f2c", "color Amount = color(0.3, 0.4, 0.5)"));
    pb = map->ShaderBlock();
    EXPECT_EQ(pb->GetParameterType(IDOf(pb, L"Amount")), TYPE_FRGBA);
    EXPECT_EQ(pb->GetAColor(IDOf(pb, L"Amount")), AColor(0.3f, 0.4f, 0.5f, 1.0f));
}

TEST_F(ShaderUpdateTest, AMapOnTintMapStaysConnectedWhateverTintBecomes) {
    MapHolder map;
    OSLTex* upstream = NewMap();
    map.SetCode(Shader("tint", "color Tint = 0.5, float Gain = 1"));
    IParamBlock2* pb = map->ShaderBlock();
    ASSERT_TRUE(pb->SetValue(IDOf(pb, L"Tint_map"), 0, upstream));

    const char* edits[] = {"color Tint = 0.8, float Gain = 1", "float Gain = 1, color Tint = 0.8",
                           "float Tint = 0.1", "string Tint = \"x\", int More = 3"};
    for (const char* inputs : edits) {
        SCOPED_TRACE(inputs);
        map.SetCode(Shader("tint", inputs));
        pb = map->ShaderBlock();
        const ParamID id = IDOf(pb, L"Tint_map");
        ASSERT_NE(id, -1);
        EXPECT_EQ(pb->GetTexmap(id), upstream);
    }
    map.SetCode(Shader("tint", "float Other = 1"));
    EXPECT_EQ(IDOf(map->ShaderBlock(), L"Tint_map"), -1);
    theHold.ClearStacks();
    EXPECT_EQ(upstream->GetDependents().size(), 0u);
    upstream->DeleteMe();
}

TEST_F(ShaderUpdateTest, TimeValueInputsGetExpressionControllersOnEveryRebuild) {
    MapHolder map;
    for (int round = 0; round < 3; ++round) {
        SCOPED_TRACE(round);
        map.SetCode(Shader("time" + std::to_string(round),
                           "float Seconds = 0 [[ int timeValue = 1 ]], "
                           "int Frame = 0 [[ int timeValue = 1 ]], float Plain = 0"));
        IParamBlock2* pb = map->ShaderBlock();
        for (auto [name, expression] : {std::pair{L"Seconds", L"S"}, std::pair{L"Frame", L"F"}}) {
            Control* c = pb->GetController(IDOf(pb, name));
            ASSERT_NE(c, nullptr) << TrelmSDK::ToUTF8(name);
            EXPECT_EQ(c->ClassID(), TrelmSDK::EXPR_FLOAT_CONTROL_CLASS_ID);
            auto* expr =
                dynamic_cast<TrelmSDK::IExprCtrl*>(c->GetInterface(TrelmSDK::IID_EXPR_CONTROL));
            ASSERT_NE(expr, nullptr);
            EXPECT_EQ(expr->GetExpression(), expression);
            EXPECT_TRUE(expr->GetReportErrors()); // the setting is restored
        }
        EXPECT_EQ(pb->GetController(IDOf(pb, L"Plain")), nullptr);
        EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Seconds"), 2 * TrelmSDK::TICKS_PER_SECOND), 2.0f);
        EXPECT_EQ(pb->GetInt(IDOf(pb, L"Frame"), 10 * TrelmSDK::GetTicksPerFrame()), 10);
    }
}

TEST_F(ShaderUpdateTest, TheSameCodeDoesNotRebuildTheBlock) {
    MapHolder map;
    const std::string code = Shader("same", "float Gain = 0.5");
    map.SetCode(code);
    IParamBlock2* block = map->ShaderBlock();
    auto desc = map->CurrentDesc();
    map.SetCode(code);
    EXPECT_EQ(map->ShaderBlock(), block);
    EXPECT_TRUE(UpdateShader(*map, false));
    EXPECT_EQ(map->ShaderBlock(), block);
    EXPECT_EQ(map->CurrentDesc(), desc);

    // Back and forth: the second text's description is known, but the block follows it.
    map.SetCode(Shader("same2", "float Gain = 0.5"));
    EXPECT_NE(map->CurrentDesc(), desc);
    map.SetCode(code);
    EXPECT_EQ(map->CurrentDesc(), desc);
}

TEST_F(ShaderUpdateTest, AFailedCompilationKeepsTheOldBlock) {
    MapHolder map;
    map.SetCode(Shader("fail", "float Gain = 0.5"));
    IParamBlock2* block = map->ShaderBlock();
    block->SetValue(IDOf(block, L"Gain"), 0, 0.75f);
    const auto desc = map->CurrentDesc();
    const auto outputs = map->OutputNames();
    const SourceKey before = map->Key();

    MessageProbe probe;
    map.SetCode("shader broken(float Gain = 0.5, output color Out = 0) { Out = ; }\n");
    EXPECT_TRUE(probe.Saw("error")) << "the compiler's message reaches the handler";
    EXPECT_EQ(map->ShaderBlock(), block);
    EXPECT_EQ(map->CurrentDesc(), desc);
    EXPECT_EQ(map->OutputNames(), outputs);
    EXPECT_EQ(map->GetShaderName(), L"upd_fail");
    EXPECT_NE(map->Key(), before); // the key follows the code
    EXPECT_FLOAT_EQ(block->GetFloat(IDOf(block, L"Gain")), 0.75f);
    EXPECT_FALSE(UpdateShader(*map, false));
}

TEST_F(ShaderUpdateTest, UndoAndRedoOfACodeChangeRestoreBlockAndValues) {
    MapHolder map;
    theHold.ClearStacks();
    const std::string first = Shader("undo", "float Gain = 0.5, float Keep = 1");
    const std::string second = Shader("undo", "float Renamed = 0.5, float Keep = 1");
    map.SetCode(first);
    IParamBlock2* firstBlock = map->ShaderBlock();
    theHold.Begin();
    firstBlock->SetValue(IDOf(firstBlock, L"Gain"), 0, 0.125f);
    theHold.Accept(L"Gain");

    map.SetCode(second);
    IParamBlock2* secondBlock = map->ShaderBlock();
    ASSERT_NE(secondBlock, firstBlock);
    theHold.Begin();
    secondBlock->SetValue(IDOf(secondBlock, L"Keep"), 0, 4.0f);
    theHold.Accept(L"Keep");

    ASSERT_TRUE(theHold.Undo()); // Keep
    EXPECT_FLOAT_EQ(secondBlock->GetFloat(IDOf(secondBlock, L"Keep")), 1.0f);
    ASSERT_TRUE(theHold.Undo()); // the code change
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(first));
    EXPECT_EQ(map->ShaderBlock(), firstBlock);
    EXPECT_FLOAT_EQ(map->ShaderBlock()->GetFloat(IDOf(firstBlock, L"Gain")), 0.125f);
    EXPECT_EQ(map->Key(), SourceKeyOf(first));

    ASSERT_TRUE(theHold.Redo()); // the code change
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLCode), TrelmSDK::FromUTF8(second));
    EXPECT_EQ(map->ShaderBlock(), secondBlock);
    ASSERT_TRUE(theHold.Redo()); // Keep, written to the block the map holds again
    EXPECT_FLOAT_EQ(map->ShaderBlock()->GetFloat(IDOf(secondBlock, L"Keep")), 4.0f);
    EXPECT_EQ(map->Key(), SourceKeyOf(second));
    EXPECT_EQ(map->ShaderBlock()->GetDesc(), map->CurrentDesc().get());
}

TEST_F(ShaderUpdateTest, ACodeChangeOutsideAnUndoRecordStillRebuilds) {
    MapHolder map;
    map->FixedBlock()->SetValue(kOSLCode, 0,
                                TrelmSDK::FromUTF8(Shader("noundo", "float Gain = 0.5")));
    EXPECT_EQ(map->GetShaderName(), L"upd_noundo");
    EXPECT_NE(IDOf(map->ShaderBlock(), L"Gain"), -1);
}

TEST_F(ShaderUpdateTest, ResetReturnsInputsToDefaultsKeepingMapsAndControllers) {
    MapHolder map;
    OSLTex* upstream = NewMap();
    map.SetCode(Shader("reset", "float Gain = 0.5, color Tint = 0.25, float Animated = 0"));
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(IDOf(pb, L"Gain"), 0, 0.9f);
    pb->SetValue(IDOf(pb, L"Tint"), 0, AColor(1, 0, 0, 1));
    pb->SetValue(IDOf(pb, L"Tint_map"), 0, upstream);
    auto* keys = new TrelmSDK::LinearFloatControl;
    ASSERT_TRUE(pb->SetController(IDOf(pb, L"Animated"), 0, keys));

    ResetShaderParams(*map);
    pb = map->ShaderBlock();
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Gain")), 0.5f);
    EXPECT_EQ(pb->GetAColor(IDOf(pb, L"Tint")), AColor(0.25f, 0.25f, 0.25f, 1.0f));
    EXPECT_EQ(pb->GetTexmap(IDOf(pb, L"Tint_map")), upstream);
    EXPECT_EQ(pb->GetController(IDOf(pb, L"Animated")), keys);
    EXPECT_TRUE(map->ValidityInterval().Empty());

    theHold.ClearStacks();
    pb->SetValue(IDOf(pb, L"Tint_map"), 0, static_cast<ReferenceTarget*>(nullptr));
    upstream->DeleteMe();
}

TEST_F(ShaderUpdateTest, EditingAnInputMarksThePresetModifiedOnce) {
    MapHolder map;
    map.SetCode(Shader("preset", "float Gain = 0.5"));
    map->FixedBlock()->SetValue(kOSLPresetName, 0, L"Warm");
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(IDOf(pb, L"Gain"), 0, 0.2f); // not a user action: no undo record
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLPresetName), L"Warm");
    for (float v : {0.3f, 0.4f}) {
        theHold.Begin();
        pb->SetValue(IDOf(pb, L"Gain"), 0, v);
        theHold.Accept(L"Gain");
    }
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLPresetName), L"Warm*");

    map->FixedBlock()->SetValue(kOSLPresetName, 0, L"");
    theHold.Begin();
    pb->SetValue(IDOf(pb, L"Gain"), 0, 0.6f);
    theHold.Accept(L"Gain");
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLPresetName), L"");
}

TEST_F(ShaderUpdateTest, EditingTheCodeByHandSwitchesAutoUpdateOff) {
    MapHolder map;
    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, true);
    EXPECT_EQ(map->FixedBlock()->GetInt(kOSLAutoUpdate), 1);
    map.SetCode(Shader("byhand", "float Gain = 0.5"));
    EXPECT_EQ(map->FixedBlock()->GetInt(kOSLAutoUpdate), 0);
}

TEST_F(ShaderUpdateTest, ACodeChangeIsOneNamedUndoStep) {
    MapHolder map;
    theHold.ClearStacks();
    map.SetCode(Shader("steps", "float Gain = 0.5"));
    EXPECT_EQ(theHold.NumUndoSteps(), 1);
    EXPECT_EQ(theHold.UndoName(), L"Edit");
    theHold.ClearStacks();
    theHold.Begin();
    map->FixedBlock()->SetValue(kOSLCode, 0,
                                TrelmSDK::FromUTF8(Shader("steps2", "float Gain = 0.5")));
    theHold.Accept(L"Typed");
    EXPECT_EQ(theHold.NumUndoSteps(), 1);
}

TEST_F(ShaderUpdateTest, ALoadedBlockIsReadInItsSavedFormatAndRebuiltInTheCurrentOne) {
    MapHolder map;
    map.SetCode(Shader("loaded", "float Gain = 0.5, float Steps[] = {1, 2}"));
    IParamBlock2* pb = map->ShaderBlock();
    pb->SetValue(IDOf(pb, L"Gain"), 0, 0.3f);
    pb->SetValue(IDOf(pb, L"Steps"), 0, 9.0f, 0);

    // Format 20190 had no array inputs: the saved block cannot have held Steps.
    map->SetSavedFormat(20190);
    ASSERT_TRUE(UpdateShader(*map, true));
    pb = map->ShaderBlock();
    EXPECT_EQ(pb->GetDesc(), map->CurrentDesc().get());
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Gain")), 0.3f);
    ASSERT_EQ(pb->Count(IDOf(pb, L"Steps")), 2);
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Steps"), 0, 0), 1.0f);

    MessageProbe probe;
    map->SetSavedFormat(20300);
    ASSERT_TRUE(UpdateShader(*map, true));
    EXPECT_TRUE(probe.Saw("Save format for shader upd_loaded is newer than this trelm version!! "
                          "Potential loss of data!!\n"));
    pb = map->ShaderBlock();
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"Gain")), 0.3f);
}
