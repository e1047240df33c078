// OSOData: symbols, defaults, code sections and the global instruction indices of jumps.
#include <viewport/oso_data.h>

#include <gtest/gtest.h>

namespace {

const char* kTwoSections = R"(OpenShadingLanguage 1.00
shader test
param	int	a	1 2 3
param	string	s	"first"
oparam	float	r	0
code a
	assign	r $const1
	assign	r $const1
	assign	r $const1
code ___main___
	assign	r $const1
	assign	r $const1
	if	$const2 6 7
	assign	r $const1
	end
)";

TEST(OSOData, IntegerDefaultsAreStoredAsFloats) {
    oslo::OSOData oso;
    ASSERT_TRUE(oso.parse_memory(kTwoSections));
    ASSERT_EQ(oso.symbols.count("a"), 1u);
    EXPECT_EQ(oso.symbols.at("a").floatDefaults, (std::vector<float>{1.0f, 2.0f, 3.0f}));
    EXPECT_EQ(oso.symbols.at("a").symtype, oslo::kParam);
    EXPECT_EQ(oso.symbols.at("r").symtype, oslo::kOutputParam);
}

TEST(OSOData, SectionsGetGlobalFirstIndices) {
    oslo::OSOData oso;
    ASSERT_TRUE(oso.parse_memory(kTwoSections));
    ASSERT_EQ(oso.sections.size(), 2u);
    EXPECT_EQ(oso.sections.at("a").firstOpIndex, 0);
    EXPECT_EQ(oso.sections.at("a").instructions.size(), 3u);
    const oslo::CodeSection& main = oso.sections.at("___main___");
    EXPECT_EQ(main.firstOpIndex, 3);
    ASSERT_EQ(main.instructions.size(), 5u);
    // The "if" jumps to global index 6: the fourth instruction of ___main___.
    const oslo::Instruction& branch = main.instructions[2];
    EXPECT_EQ(branch.opcode, "if");
    EXPECT_EQ(branch.args, (std::vector<std::string>{"$const2"}));
    EXPECT_EQ(branch.jumps, (std::vector<int>{6, 7}));
    EXPECT_EQ(main.instructions[branch.jumps[0] - main.firstOpIndex].opcode, "assign");
    EXPECT_EQ(main.instructions[3].args, (std::vector<std::string>{"r", "$const1"}));
    EXPECT_EQ(main.instructions[4].opcode, "end");
    EXPECT_EQ(main.instructions[4].label, -1);
}

TEST(OSOData, SymbolListKeepsDeclarationOrderAndMapSortsByName) {
    oslo::OSOData oso;
    ASSERT_TRUE(oso.parse_memory(kTwoSections));
    ASSERT_EQ(oso.symbolList.size(), 3u);
    EXPECT_EQ(oso.symbolList[0].name, "a");
    EXPECT_EQ(oso.symbolList[1].name, "s");
    EXPECT_EQ(oso.symbolList[2].name, "r");
    std::vector<std::string> names;
    for (const auto& entry : oso.symbols) names.push_back(entry.first);
    EXPECT_EQ(names, (std::vector<std::string>{"a", "r", "s"}));
}

TEST(OSOData, OnlyTheLastStringDefaultSurvives) {
    oslo::OSOData oso;
    oso.symbol(OSL::SymTypeConst, OSL::TypeSpec(OIIO::TypeDesc::TypeString), "$const1");
    oso.symdefault("first");
    oso.symdefault("second");
    oso.codemarker("___main___");
    EXPECT_EQ(oso.symbols.at("$const1").stringDefault, "second");
}

TEST(OSOData, InstructionsOutsideSectionsAreCountedButNotStored) {
    oslo::OSOData oso;
    oso.instruction(-1, "nop");
    oso.instruction_end();
    oso.instruction(-1, "nop");
    oso.instruction_end();
    oso.codemarker("___main___");
    oso.instruction(4, "end");
    oso.instruction_end();
    oso.codeend();
    ASSERT_EQ(oso.sections.size(), 1u);
    EXPECT_EQ(oso.sections.at("___main___").firstOpIndex, 2);
    ASSERT_EQ(oso.sections.at("___main___").instructions.size(), 1u);
    EXPECT_EQ(oso.sections.at("___main___").instructions[0].label, 4);
}

TEST(OSOData, LastSymbolIsStoredOnlyWhenCodeStarts) {
    oslo::OSOData withoutCode;
    withoutCode.symbol(OSL::SymTypeLocal, OSL::TypeSpec(OIIO::TypeDesc::TypeFloat), "x");
    withoutCode.symbol(OSL::SymTypeLocal, OSL::TypeSpec(OIIO::TypeDesc::TypeFloat), "y");
    EXPECT_EQ(withoutCode.symbols.count("x"), 1u);
    EXPECT_EQ(withoutCode.symbols.count("y"), 0u);

    withoutCode.codemarker("___main___");
    EXPECT_EQ(withoutCode.symbols.count("y"), 1u);
}

TEST(OSOData, RepeatedNamesOverwriteTheMapButNotTheList) {
    oslo::OSOData oso;
    oso.symbol(OSL::SymTypeLocal, OSL::TypeSpec(OIIO::TypeDesc::TypeFloat), "x");
    oso.symdefault(1.0f);
    oso.symbol(OSL::SymTypeLocal, OSL::TypeSpec(OIIO::TypeDesc::TypeInt), "x");
    oso.symdefault(7);
    oso.codemarker("___main___");
    EXPECT_EQ(oso.symbolList.size(), 2u);
    EXPECT_TRUE(oso.symbols.at("x").type.is_int());
    EXPECT_EQ(oso.symbols.at("x").floatDefaults, (std::vector<float>{7.0f}));
}

TEST(OSOData, TextThatDoesNotParseFails) {
    oslo::OSOData oso;
    EXPECT_FALSE(oso.parse_memory("this is not OSO"));
}

} // namespace
