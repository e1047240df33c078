// How symbols are written: names, constants, types and string hashes.
#include <viewport/hlsl_names.h>

#include <gtest/gtest.h>

#include <cstdlib>

namespace {

oslo::OSOSymbol Constant(OIIO::TypeDesc type, std::vector<float> values, std::string text = {}) {
    oslo::OSOSymbol symbol;
    symbol.type = OSL::TypeSpec(type);
    symbol.symtype = oslo::kConst;
    symbol.name = "$const1";
    symbol.floatDefaults = std::move(values);
    symbol.stringDefault = std::move(text);
    return symbol;
}

std::string Text(const oslo::OSOSymbol& symbol) {
    std::string text = "unset";
    EXPECT_TRUE(oslo::ConstantExpression(symbol, text));
    return text;
}

TEST(HLSLName, ReplacesDollarsAndDotsAndAppendsAnUnderscore) {
    EXPECT_EQ(oslo::HLSLName("$tmp3"), "_tmp3_");
    EXPECT_EQ(oslo::HLSLName("Color"), "Color_");
    EXPECT_EQ(oslo::HLSLName("a.b"), "a_b_");
    EXPECT_EQ(oslo::HLSLName("$const1.x.y"), "_const1_x_y_");
}

TEST(StringHash, IsTheLow32BitsOfFarmhash) {
    EXPECT_EQ(oslo::StringHash("gabor"), -552328819);
    EXPECT_EQ(oslo::HashText("gabor"), "-552328819");
    EXPECT_NE(oslo::StringHash("object"), oslo::StringHash("camera"));
    EXPECT_EQ(oslo::StringHash(""), oslo::StringHash(std::string()));
}

TEST(ConstantExpression, FormatsNumbersWithADecimalPoint) {
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeFloat, {2.0f})), "2.00000");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeFloat, {0.1f})), "0.100000");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeInt, {3.0f})), "3");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeInt, {-7.0f})), "-7");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeColor, {1.0f, 0.5f, 0.0f})),
              "float3(1.00000, 0.500000, 0.00000)");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeVector, {0.0f, 1e-9f, -2.0f})),
              "float3(0.00000, 1.00000e-09, -2.00000)");
}

TEST(ConstantExpression, ConstantsThatSixDigitsCannotHoldGetNine) {
    // Rounded to six digits these would read back as other floats, and hash noise of a slightly
    // different constant is an unrelated pattern.
    const float pi = 3.14159265358979f;
    const float cosine = 0.984807729721069336f;
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeFloat, {pi})), "3.14159274");
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeColor, {cosine, 0.25f, -pi})),
              "float3(0.984807730, 0.250000, -3.14159274)");
    for (float v : {pi, cosine, 1.0f / 3.0f, 1e-7f, 123456.789f}) {
        const std::string text = oslo::FloatLiteral(v, true);
        EXPECT_EQ(std::strtof(text.c_str(), nullptr), v) << text;
        const std::string plain = oslo::FloatLiteral(v, false);
        EXPECT_EQ(std::strtof(plain.c_str(), nullptr), v) << plain;
    }
    EXPECT_EQ(oslo::FloatLiteral(0.5f, false), "0.5");
}

TEST(ConstantExpression, MatrixHasSixteenValuesAndATrailingBlank) {
    std::vector<float> identity(16, 0.0f);
    for (int i = 0; i < 4; ++i) identity[i * 5] = 1.0f;
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeMatrix, identity)),
              "float4x4(1.00000, 0.00000, 0.00000, 0.00000, 0.00000, 1.00000, 0.00000, 0.00000, "
              "0.00000, 0.00000, 1.00000, 0.00000, 0.00000, 0.00000, 0.00000, 1.00000) ");
}

TEST(ConstantExpression, StringIsItsHashWithTheTextInAComment) {
    EXPECT_EQ(Text(Constant(OIIO::TypeDesc::TypeString, {}, "gabor")), "-552328819/*gabor*/");
}

TEST(ConstantExpression, RejectsMismatchedDefaultsAndOtherTypes) {
    std::string text = "unchanged";
    EXPECT_FALSE(oslo::ConstantExpression(Constant(OIIO::TypeDesc::TypeFloat, {}), text));
    EXPECT_FALSE(oslo::ConstantExpression(Constant(OIIO::TypeDesc::TypeFloat, {1, 2}), text));
    EXPECT_FALSE(oslo::ConstantExpression(Constant(OIIO::TypeDesc::TypeColor, {1, 2}), text));
    EXPECT_FALSE(oslo::ConstantExpression(Constant(OIIO::TypeDesc::TypeMatrix, {1}), text));
    EXPECT_FALSE(oslo::ConstantExpression(
        Constant(OIIO::TypeDesc(OIIO::TypeDesc::FLOAT, OIIO::TypeDesc::VEC2), {1, 2}), text));
    oslo::OSOSymbol closure = Constant(OIIO::TypeDesc::TypeColor, {1, 2, 3});
    closure.type = OSL::TypeSpec(OIIO::TypeDesc::TypeColor, true);
    EXPECT_FALSE(oslo::ConstantExpression(closure, text));
    EXPECT_EQ(text, "unchanged");
}

TEST(HLSLTypeName, MapsOSLTypes) {
    oslo::_hlsl_info info;
    oslo::HLSLGenGlobals globals(info);
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeDesc::TypeInt), globals), "int");
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeDesc::TypeString), globals), "int");
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeDesc::TypeFloat), globals), "float");
    for (auto type : {OIIO::TypeDesc::TypeColor, OIIO::TypeDesc::TypePoint,
                      OIIO::TypeDesc::TypeVector, OIIO::TypeDesc::TypeNormal})
        EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(type), globals), "float3");
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeDesc::TypeMatrix), globals), "float4x4");
    EXPECT_FALSE(globals.failed);
    EXPECT_TRUE(info.messages.empty());
}

TEST(HLSLTypeName, ClosuresAndOtherTypesFailTheTranslation) {
    oslo::_hlsl_info info;
    oslo::HLSLGenGlobals globals(info);
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeDesc::TypeColor, true), globals),
              "closure");
    EXPECT_TRUE(globals.failed);
    EXPECT_EQ(info.messages.at("'closure' not supported"), 1);

    oslo::_hlsl_info other;
    oslo::HLSLGenGlobals otherGlobals(other);
    EXPECT_EQ(oslo::HLSLTypeName(OSL::TypeSpec(OIIO::TypeFloat2), otherGlobals), "unsupported");
    EXPECT_TRUE(otherGlobals.failed);
    EXPECT_EQ(other.messages.at("Unsupported type"), 1);
}

TEST(VariableName, UnknownNamesAndGlobalsFail) {
    oslo::_hlsl_info info;
    oslo::HLSLGenGlobals globals(info);
    std::map<std::string, oslo::OSOSymbol> symbols;
    oslo::OSOSymbol time;
    time.name = "time";
    time.symtype = oslo::kGlobal;
    time.type = OSL::TypeSpec(OIIO::TypeDesc::TypeFloat);
    symbols["time"] = time;
    oslo::OSOSymbol p = time;
    p.name = "P";
    symbols["P"] = p;
    EXPECT_EQ(oslo::VariableName("P", symbols, globals), "state.position");
    EXPECT_FALSE(globals.failed);
    EXPECT_EQ(oslo::VariableName("time", symbols, globals), "");
    EXPECT_TRUE(globals.failed);
    EXPECT_EQ(info.messages.at("Unknown variable 'time'"), 1);
    EXPECT_EQ(oslo::VariableName("nowhere", symbols, globals), "");
    EXPECT_EQ(info.messages.at("Unknown variable 'nowhere'"), 1);
}

} // namespace
