// OSLQuery at the level the shader description uses it: struct parameters followed by their
// fields, sized and unsized arrays, defaults, metadata, closures, outputs, and failures.
#include <OSL/oslquery.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

using namespace OSL;

namespace {

const char* kShader =
    "OpenShadingLanguage 1.00\n"
    "# Compiled by oslc 1.12.13.0\n"
    "shader tex\t%meta{string,help,\"A test map\"} %meta{int,version,3} \n"
    "param\tstruct color4\ttint\t\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%struct{\"color4\"} %structfields{rgb,a} %structfieldtypes{\"cf\"} %structnfields{2}\n"
    "param\tcolor\ttint.rgb\t0.5 0.25 1\t\t%read{0,0} %write{2147483647,-1} %mystruct{tint} "
    "%mystructfield{0}\n"
    "param\tfloat\ttint.a\t1\t\t%read{0,0} %write{2147483647,-1} %mystruct{tint} "
    "%mystructfield{1}\n"
    "param\tstruct pair\tp\t\t\t%struct{\"pair\"} %structfields{a,b} %structfieldtypes{\"fi\"} "
    "%structnfields{2}\n"
    "param\tfloat\tp.a\t2\t\t%mystruct{p} %mystructfield{0}\n"
    "param\tint\tp.b\t0\t\t%mystruct{p} %mystructfield{1} %initexpr\n"
    "param\tfloat[]\tweights\t1 2 3\t\t%read{1,1} %write{2147483647,-1}\n"
    "param\tfloat[4]\tfour\t7 8\t\t%read{1,1} %write{2147483647,-1}\n"
    "param\tint\tmode\t2\t\t%meta{int,connectable,0} %meta{string,widget,\"mapper\"} "
    "%meta{string,options,\"A:0|B:1\"}\n"
    "param\tcolor\tbase\t0.8 0.8 0.8\t\t%meta{string,label,\"Base Colour\"} "
    "%meta{float[2],range,0,1}\n"
    "param\tstring\ttexname\t\"a.tx\"\t\t%meta{string,widget,\"filename\"}\n"
    "param\tint\tnodefault\t0\t\t%initexpr\n"
    "oparam\tcolor\tCout\t0 0 0\t\t%read{2147483647,-1} %write{2,2}\n"
    "oparam\tclosure color\tbsdf\t\t\t%read{2147483647,-1} %write{3,3}\n"
    "local\tfloat\tx\t%read{0,0} %write{0,0}\n"
    "temp\tcolor\t$tmp1\t%read{2,2} %write{1,1}\n"
    "code ___main___\n"
    "\tassign\t\tx tint.a \t%line{5}\n"
    "\tend\n";

TEST(OSLQuery, ReportsShaderNameTypeAndMetadata) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader)) << q.geterror();
    EXPECT_EQ(q.geterror(), "");
    EXPECT_EQ(q.shadername(), "tex");
    EXPECT_EQ(q.shadertype(), "shader");
    ASSERT_EQ(q.metadata().size(), 2u);
    EXPECT_EQ(q.metadata()[0].name, "help");
    EXPECT_EQ(q.metadata()[0].type, TypeDesc::TypeString);
    ASSERT_EQ(q.metadata()[0].sdefault.size(), 1u);
    EXPECT_EQ(q.metadata()[0].sdefault[0], "A test map");
    EXPECT_EQ(q.metadata()[1].idefault, std::vector<int>{3});
}

TEST(OSLQuery, Color4StructIsFollowedByItsFieldParameters) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    ASSERT_EQ(q.nparams(), 14u);
    const OSLQuery::Parameter* tint = q.getparam(0);
    ASSERT_NE(tint, nullptr);
    EXPECT_EQ(tint->name, "tint");
    EXPECT_TRUE(tint->isstruct);
    EXPECT_EQ(tint->structname, "color4");
    EXPECT_EQ(tint->fields, (std::vector<ustring>{ustring("rgb"), ustring("a")}));
    EXPECT_EQ(tint->type, TypeDesc::UNKNOWN);
    EXPECT_FALSE(tint->validdefault);
    EXPECT_FALSE(tint->isoutput);

    const OSLQuery::Parameter* rgb = q.getparam(1);
    EXPECT_EQ(rgb->name, "tint.rgb");
    EXPECT_EQ(rgb->type, TypeDesc::TypeColor);
    EXPECT_TRUE(rgb->validdefault);
    EXPECT_EQ(rgb->fdefault, (std::vector<float>{0.5f, 0.25f, 1.0f}));
    EXPECT_EQ(rgb->data, rgb->fdefault.data());
    const OSLQuery::Parameter* alpha = q.getparam(std::string("tint.a"));
    ASSERT_EQ(alpha, q.getparam(2));
    EXPECT_EQ(alpha->type, TypeDesc::TypeFloat);
    EXPECT_EQ(alpha->fdefault, std::vector<float>{1.0f});
}

TEST(OSLQuery, OtherStructsListTheirFieldsAsOwnParameters) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    const OSLQuery::Parameter* p = q.getparam(ustring("p"));
    ASSERT_NE(p, nullptr);
    EXPECT_TRUE(p->isstruct);
    EXPECT_EQ(p->structname, "pair");
    const OSLQuery::Parameter* a = q.getparam(ustring("p.a"));
    const OSLQuery::Parameter* b = q.getparam(ustring("p.b"));
    ASSERT_NE(a, nullptr);
    ASSERT_NE(b, nullptr);
    EXPECT_EQ(a, p + 1);
    EXPECT_EQ(b, p + 2);
    // An integer written for a float parameter is a float default.
    EXPECT_EQ(a->fdefault, std::vector<float>{2.0f});
    EXPECT_TRUE(a->idefault.empty());
    // A default computed by code is not a valid constant default.
    EXPECT_FALSE(b->validdefault);
}

TEST(OSLQuery, UnsizedArrayKeepsItsDefaultsAndSizedArrayIsPadded) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    const OSLQuery::Parameter* w = q.getparam(ustring("weights"));
    ASSERT_NE(w, nullptr);
    EXPECT_TRUE(w->varlenarray);
    EXPECT_EQ(w->type.arraylen, -1);
    EXPECT_EQ(w->type.elementtype(), TypeDesc::TypeFloat);
    EXPECT_EQ(w->fdefault, (std::vector<float>{1, 2, 3}));

    const OSLQuery::Parameter* four = q.getparam(ustring("four"));
    ASSERT_NE(four, nullptr);
    EXPECT_FALSE(four->varlenarray);
    EXPECT_EQ(four->type.arraylen, 4);
    EXPECT_EQ(four->fdefault, (std::vector<float>{7, 8, 0, 0}));
}

TEST(OSLQuery, ParameterMetadataDefaultsOutputsAndClosures) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    const OSLQuery::Parameter* mode = q.getparam(ustring("mode"));
    ASSERT_NE(mode, nullptr);
    EXPECT_EQ(mode->idefault, std::vector<int>{2});
    ASSERT_EQ(mode->metadata.size(), 3u);
    EXPECT_EQ(mode->metadata[0].name, "connectable");
    EXPECT_EQ(mode->metadata[0].type, TypeDesc::TypeInt);
    EXPECT_EQ(mode->metadata[0].idefault, std::vector<int>{0});
    EXPECT_EQ(mode->metadata[2].sdefault, std::vector<ustring>{ustring("A:0|B:1")});

    const OSLQuery::Parameter* base = q.getparam(ustring("base"));
    ASSERT_EQ(base->metadata.size(), 2u);
    EXPECT_EQ(base->metadata[0].sdefault, std::vector<ustring>{ustring("Base Colour")});
    EXPECT_EQ(base->metadata[1].type, TypeDesc(TypeDesc::FLOAT, 2));
    EXPECT_EQ(base->metadata[1].fdefault, (std::vector<float>{0, 1}));

    const OSLQuery::Parameter* tex = q.getparam(ustring("texname"));
    EXPECT_EQ(tex->sdefault, std::vector<ustring>{ustring("a.tx")});
    EXPECT_EQ(tex->data, tex->sdefault.data());
    EXPECT_FALSE(q.getparam(ustring("nodefault"))->validdefault);

    const OSLQuery::Parameter* cout = q.getparam(ustring("Cout"));
    EXPECT_TRUE(cout->isoutput);
    EXPECT_FALSE(cout->isclosure);
    const OSLQuery::Parameter* bsdf = q.getparam(ustring("bsdf"));
    EXPECT_TRUE(bsdf->isoutput);
    EXPECT_TRUE(bsdf->isclosure);
    EXPECT_EQ(bsdf->type, TypeDesc::PTR);

    // Locals and temporaries are not parameters.
    EXPECT_EQ(q.getparam(ustring("x")), nullptr);
    EXPECT_EQ(q.getparam(14), nullptr);
}

TEST(OSLQuery, ParameterCopiesPointDataAtTheirOwnDefaults) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    OSLQuery::Parameter copy = *q.getparam(ustring("weights"));
    EXPECT_EQ(copy.data, copy.fdefault.data());
    OSLQuery::Parameter moved(std::move(copy));
    EXPECT_EQ(moved.data, moved.fdefault.data());
    EXPECT_EQ(moved.fdefault.size(), 3u);
    OSLQuery::Parameter assigned;
    assigned = moved;
    EXPECT_EQ(assigned.data, assigned.fdefault.data());
    EXPECT_EQ(assigned.fdefault, moved.fdefault);
}

TEST(OSLQuery, OpensByShaderNameThroughTheSearchPath) {
    const auto dir = std::filesystem::temp_directory_path() / "oslquery_test_dir";
    std::filesystem::create_directories(dir);
    {
        std::ofstream out(dir / "tex.oso");
        out << kShader;
    }
    OSLQuery q;
    EXPECT_TRUE(q.open("tex", "/nonexistent_dir:" + dir.string())) << q.geterror();
    EXPECT_EQ(q.shadername(), "tex");
    EXPECT_EQ(q.nparams(), 14u);

    OSLQuery byfile((dir / "tex.oso").string());
    EXPECT_EQ(byfile.geterror(), "");
    EXPECT_EQ(byfile.nparams(), 14u);

    // A failed open replaces what was read before and says why.
    EXPECT_FALSE(q.open("missing_shader", dir.string()));
    EXPECT_EQ(q.nparams(), 0u);
    EXPECT_EQ(q.geterror(false), "File \"missing_shader\" could not be found.");
    EXPECT_NE(q.geterror(), "");
    EXPECT_EQ(q.geterror(), "");
    std::filesystem::remove_all(dir);
}

TEST(OSLQuery, MalformedBytecodeFailsWithTheParserMessage) {
    OSLQuery q;
    ASSERT_TRUE(q.open_bytecode(kShader));
    EXPECT_FALSE(q.open_bytecode("OpenShadingLanguage 1.00\nshader s\nparam\tfloat[\tx\n"));
    EXPECT_EQ(q.nparams(), 0u);
    EXPECT_EQ(q.shadername(), "");
    const std::string err = q.geterror();
    EXPECT_NE(err.find("<buffer>:3: error:"), std::string::npos) << err;

    EXPECT_FALSE(q.open_bytecode(""));
    EXPECT_NE(q.geterror(), "");
}

} // namespace
