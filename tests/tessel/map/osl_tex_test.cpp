// A fresh map: its references, blocks, names, the fixed block layout and the class descriptor.
#include "map/example_shader.h"
#include "map/pb_shader_accessor.h"
#include "map_test_host.h"

#include <trelm/core/class_directory.h>
#include <trelm/core/notifications.h>

namespace {

class OSLTexTest : public ::testing::Test {
protected:
    void SetUp() override { MapTestRoot(); }
};

// A block owner that is not a map.
class PlainOwner : public ReferenceTarget {};

} // namespace

TEST_F(OSLTexTest, FreshMapHasTwoBlocksThreeReferencesAndNamedSubAnims) {
    MapHolder map;
    EXPECT_EQ(map->NumRefs(), 3);
    EXPECT_EQ(map->GetReference(0), nullptr);
    ASSERT_NE(map->FixedBlock(), nullptr);
    ASSERT_NE(map->ShaderBlock(), nullptr);
    EXPECT_EQ(map->GetReference(1), map->FixedBlock());
    EXPECT_EQ(map->GetReference(2), map->ShaderBlock());
    EXPECT_EQ(map->GetReference(3), nullptr);
    EXPECT_EQ(map->NumParamBlocks(), 2);
    EXPECT_EQ(map->GetParamBlock(0), map->FixedBlock());
    EXPECT_EQ(map->GetParamBlock(1), map->ShaderBlock());
    EXPECT_EQ(map->GetParamBlock(7), map->ShaderBlock());
    EXPECT_EQ(map->GetParamBlockByID(0), map->FixedBlock());
    EXPECT_EQ(map->GetParamBlockByID(1), map->ShaderBlock());

    EXPECT_EQ(map->NumSubs(), 3);
    for (bool localized : {false, true}) {
        EXPECT_EQ(map->SubAnimName(0, localized), L"OSL Code");
        EXPECT_EQ(map->SubAnimName(1, localized), L"Tessel Map Parameters");
        EXPECT_EQ(map->SubAnimName(2, localized), L"");
    }
    EXPECT_EQ(map->SubAnim(0), map->FixedBlock());
    EXPECT_EQ(map->SubAnim(1), map->ShaderBlock());
    EXPECT_EQ(map->SubAnim(2), nullptr);

    EXPECT_TRUE(map->OwnsParamBlockDesc(FixedBlockDesc()));
    EXPECT_TRUE(map->OwnsParamBlockDesc(map->ShaderBlock()->GetDesc()));
    EXPECT_FALSE(map->OwnsParamBlockDesc(nullptr));
    EXPECT_EQ(map->ShaderBlock()->GetDesc(), map->CurrentDesc().get());

    EXPECT_TRUE(map->ValidityInterval().Empty());
    EXPECT_EQ(map->SavedFormat(), 0);
    EXPECT_EQ(map->OutputNames(), (std::vector<MSTR>{L"Out", L"Mix"}));
    EXPECT_NE(map->ShadingSystem(), nullptr);
}

TEST_F(OSLTexTest, FixedBlockHasTheExactLayout) {
    ParamBlockDesc2* d = FixedBlockDesc();
    EXPECT_EQ(d->ID(), 0);
    EXPECT_EQ(d->InternalName(), L"params");
    EXPECT_EQ(d->Flags(), 0x402);
    EXPECT_EQ(d->RefNo(), 1);
    EXPECT_EQ(d->ClassDescriptor(), GetOSLTexDesc());
    EXPECT_EQ(d->Count(), 5);
    struct Row {
        ParamID id;
        const wchar_t* name;
        int type, flags, localName;
    };
    const Row rows[] = {{2, L"OSLPath", 9, 0, 5},
                        {3, L"OSLCode", 8, 0, 13},
                        {5, L"OSLAutoUpdate", 4, 0, 20},
                        {6, L"OSLShaderName", 8, 0x8002, 21},
                        {7, L"OSLPresetName", 8, 0, 30}};
    for (const Row& r : rows) {
        SCOPED_TRACE(r.id);
        const ParamDef* def = d->GetParamDef(r.id);
        ASSERT_NE(def, nullptr);
        EXPECT_EQ(def->int_name, r.name);
        EXPECT_EQ(def->type, r.type);
        EXPECT_EQ(def->flags, r.flags);
        EXPECT_EQ(def->local_name, r.localName);
        EXPECT_FALSE(d->GetLocalName(r.id).empty());
        EXPECT_NE(d->GetLocalName(r.id), r.name); // a resource string, not the internal name
    }
    for (ParamID unused : {0, 1, 4}) EXPECT_EQ(d->GetParamDef(unused), nullptr);
    EXPECT_EQ(d->GetParamDef(6)->accessor, &PBShaderAccessor::Instance());

    MapHolder map;
    IParamBlock2* pb = map->FixedBlock();
    EXPECT_EQ(pb->GetStr(kOSLPath), L"");
    EXPECT_EQ(pb->GetStr(kOSLCode), TrelmSDK::FromUTF8(kExampleShader));
    EXPECT_EQ(pb->GetInt(kOSLAutoUpdate), 0);
    EXPECT_EQ(pb->GetStr(kOSLPresetName), L"");
}

TEST_F(OSLTexTest, ExampleShaderHasItsMetadataAndInputs) {
    const std::string text = kExampleShader;
    EXPECT_NE(text.find("shader Example\n"), std::string::npos);
    EXPECT_NE(text.find("string URL =\"https://tessel.dev/docs/example\""), std::string::npos);
    EXPECT_NE(text.find("\tfloat Mixer   = 0.5 [[ float min = 0.0, float max = 1.0 ]],\n"),
              std::string::npos);
    EXPECT_NE(text.find("\tMix = mix(Input_A, Input_B, Mixer); // Mix\n"), std::string::npos);
    EXPECT_EQ(text.find('\r'), std::string::npos);
}

TEST_F(OSLTexTest, ShaderNameReadsExampleForAMapAndQuestionMarkElsewhere) {
    MapHolder map;
    EXPECT_EQ(map->FixedBlock()->GetStr(kOSLShaderName), L"Example");
    EXPECT_EQ(map->GetShaderName(), L"Example");

    PlainOwner owner;
    IParamBlock2* foreign = CreateParameterBlock2(FixedBlockDesc(), &owner);
    ASSERT_NE(foreign, nullptr);
    EXPECT_EQ(foreign->GetStr(kOSLShaderName), L"?");
    foreign->DeleteMe();
}

TEST_F(OSLTexTest, ShaderBlockEntriesAreNamedByLabel) {
    MapHolder map;
    IParamBlock2* sb = map->ShaderBlock();
    EXPECT_EQ(sb->GetLocalName(1), L"B");
    EXPECT_EQ(sb->GetLocalName(6), L"B Map");
    EXPECT_EQ(sb->GetLocalName(0), L"A");
    EXPECT_EQ(sb->GetLocalName(2), L"Mixer");
    EXPECT_EQ(sb->GetLocalName(7), L"Mixer Map");
}

TEST_F(OSLTexTest, ClassNameFollowsAutoUpdateAndTheShaderLabel) {
    MapHolder map;
    MSTR name;
    map->GetClassName(name);
    EXPECT_EQ(name, L"osl: Example");
    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, true);
    map->GetClassName(name);
    EXPECT_EQ(name, L"OSL: Example");

    map.SetCode("shader Labelled [[ string label = \"Pretty Name\" ]] "
                "(float k = 1, output color c = 0) { c = k; }\n");
    map->FixedBlock()->SetValue(kOSLAutoUpdate, 0, true);
    map->GetClassName(name);
    EXPECT_EQ(name, L"OSL: Pretty Name");
    EXPECT_EQ(map->GetShaderName(), L"Labelled");
}

TEST_F(OSLTexTest, LoadingFlagFollowsNotifications9And10) {
    MapHolder map;
    EXPECT_FALSE(map->IsLoading());
    BroadcastNotification(9);
    EXPECT_TRUE(map->IsLoading());
    BroadcastNotification(10);
    EXPECT_FALSE(map->IsLoading());
    OSLTex* loaded = static_cast<OSLTex*>(GetOSLTexDesc()->Create(true));
    EXPECT_TRUE(loaded->IsLoading());
    loaded->DeleteMe();
}

TEST_F(OSLTexTest, PublishesItsScriptInterface) {
    MapHolder map;
    auto* iface = dynamic_cast<TrelmSDK::OSL::ITesselMapInterface*>(
        map->GetInterface(TrelmSDK::OSL::TESSEL_MAP_INTERFACE_ID));
    ASSERT_NE(iface, nullptr);
    EXPECT_EQ(iface->GetShaderName(), L"Example");
    EXPECT_EQ(iface->GetOSL(), TrelmSDK::FromUTF8(kExampleShader));
    EXPECT_EQ(iface->GetOSO().rfind(L"OpenShadingLanguage 1.00", 0), 0u);
    EXPECT_EQ(iface->GetShaderParamBlock(), map->ShaderBlock());
    EXPECT_EQ(map->GetInterface(Interface_ID(1, 2)), nullptr);
}

TEST_F(OSLTexTest, ClassDescriptorIsListedAndCreatesMaps) {
    OSLTexClassDesc* cd = GetOSLTexDesc();
    EXPECT_TRUE(cd->IsPublic());
    EXPECT_TRUE(cd->OkToCreate());
    EXPECT_STREQ(cd->NonLocalizedClassName(), L"Tessel Map");
    EXPECT_STREQ(cd->InternalName(), L"TesselMap");
    EXPECT_NE(cd->ClassName(), nullptr);
    EXPECT_NE(cd->Category(), nullptr);
    EXPECT_EQ(cd->SuperClassID(), 0xC10u);
    EXPECT_EQ(cd->ClassID(), Class_ID(0x7F9A7B9D, 0x6FCDF00D));
    EXPECT_EQ(GetClassDirectory().FindClass(0xC10, Class_ID(0x7F9A7B9D, 0x6FCDF00D)), cd);
    EXPECT_TRUE(RegisterOSLTexClass()); // a second registration changes nothing
    EXPECT_EQ(GetClassDirectory().FindClassByInternalName(L"TesselMap"), cd);

    Animatable* made = CreateInstance(0xC10, Class_ID(0x7F9A7B9D, 0x6FCDF00D));
    auto* map = dynamic_cast<OSLTex*>(made);
    ASSERT_NE(map, nullptr);
    EXPECT_EQ(map->ClassID(), cd->ClassID());
    EXPECT_EQ(map->SuperClassID(), 0xC10u);
    map->DeleteMe();
}
