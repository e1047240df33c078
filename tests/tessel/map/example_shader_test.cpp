// The map's example shader compiled through the registry: its description and block layout.
#include "compile/compiled_shader_registry.h"
#include "map/example_shader.h"
#include "map_test_host.h"

#include <gtest/gtest.h>

TEST(ExampleShader, CompilesToFiveParametersTwoOutputsAndTheirEntries) {
    MapTestRoot();
    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    const SourceKey key = SourceKeyOf(kExampleShader);
    ASSERT_TRUE(registry.Compile(kExampleShader, nullptr, L"Example.osl"));
    ASSERT_TRUE(registry.Contains(key));
    EXPECT_EQ(registry.RecordedShaderName(key), "Example");

    const auto names = registry.Names(key);
    const auto labels = registry.Labels(key);
    ASSERT_EQ(names.size(), 10u);
    EXPECT_EQ(std::vector<MSTR>(names.begin(), names.begin() + 5),
              (std::vector<MSTR>{L"Input_A", L"Input_B", L"Mixer", L"Out", L"Mix"}));
    EXPECT_EQ(std::vector<MSTR>(labels.begin(), labels.begin() + 5),
              (std::vector<MSTR>{L"A", L"B", L"Mixer", L"Out", L"Mix"}));
    EXPECT_EQ(std::vector<MSTR>(names.begin() + 5, names.end()),
              (std::vector<MSTR>{L"Input_A_map", L"Input_B_map", L"Mixer_map", L"", L""}));
    EXPECT_EQ(registry.MapLabels(key), (std::vector<MSTR>{L"A Map", L"B Map", L"Mixer Map"}));
    EXPECT_EQ(registry.OutputNames(key), (std::vector<MSTR>{L"Out", L"Mix"}));
    EXPECT_EQ(registry.OutputIndex(key, 0), 3);
    EXPECT_EQ(registry.OutputIndex(key, 1), 4);
    EXPECT_EQ(registry.OutputIndex(key, 2), -1);
    EXPECT_EQ(registry.MetadataValue(key, "", "URL"), "https://tessel.dev/docs/example");
    EXPECT_EQ(registry.MetadataValue(key, "Mixer", "max"), "1");
    EXPECT_EQ(registry.MetadataValue(key, "Mixer", "nothing"), "");
    EXPECT_EQ(registry.MetadataValue(key, "Nobody", "max"), "");

    auto desc = registry.Find(key);
    ASSERT_NE(desc, nullptr);
    EXPECT_EQ(desc->Count(), 6);
    for (int id : {0, 1}) {
        const ParamDef* c = desc->GetParamDef(static_cast<ParamID>(id));
        ASSERT_NE(c, nullptr);
        EXPECT_EQ(c->type, 23);
        EXPECT_EQ(c->flags, 0x9);
        EXPECT_EQ(c->def.Get<TrelmSDK::AColor>(), TrelmSDK::AColor(0.5f, 0.5f, 0.5f, 1.0f));
        EXPECT_FLOAT_EQ(c->range_low, -1e6f);
        EXPECT_FLOAT_EQ(c->range_high, 1e6f);
    }
    const ParamDef* mixer = desc->GetParamDef(2);
    ASSERT_NE(mixer, nullptr);
    EXPECT_EQ(mixer->type, 0);
    EXPECT_FLOAT_EQ(mixer->def.Get<float>(), 0.5f);
    EXPECT_EQ(mixer->range_low, 0.0f);
    EXPECT_EQ(mixer->range_high, 1.0f);
    EXPECT_EQ(mixer->ctrl_type, 0);
    EXPECT_EQ(mixer->edit_type, 1);
    EXPECT_FLOAT_EQ(mixer->scale, 0.01f);
    EXPECT_EQ(desc->GetParamDef(3), nullptr);
    EXPECT_EQ(desc->GetParamDef(4), nullptr);
    for (int k = 0; k < 3; ++k) {
        const ParamDef* map = desc->GetParamDef(static_cast<ParamID>(5 + k));
        ASSERT_NE(map, nullptr);
        EXPECT_EQ(map->type, 15);
        EXPECT_EQ(map->sub_texmap, k);
    }
    EXPECT_EQ(desc->GetLocalName(5), L"A Map");
}
