// Texture lookups from shaders: values, alpha, channels, wrap modes, missing files and their
// messages, derivatives, environment maps and gettextureinfo (UDIM sets included), against
// small images written for the test.
#include "../../../osl/runtime/program.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/imagebufalgo.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <filesystem>
#include <string>
#include <unistd.h>
#include <utility>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// C = texture(filename, s, t, "alpha", a, "wrap", wrap, "errormessage", err);
// f = texture(filename, s, t, "firstchannel", first);
const char* kLookupOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader lookup
param	string	filename	""		%read{0,1} %write{2147483647,-1}
param	float	s	0.5		%read{0,1} %write{2147483647,-1}
param	float	t	0.5		%read{0,1} %write{2147483647,-1}
param	string	wrap	"default"		%read{0,0} %write{2147483647,-1}
param	int	first	0		%read{1,1} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{0,0}
oparam	float	a	-1		%read{2147483647,-1} %write{0,0}
oparam	float	f	0		%read{2147483647,-1} %write{1,1}
oparam	string	err	"unset"		%read{2147483647,-1} %write{0,0}
const	string	$const1	"alpha"		%read{0,0} %write{2147483647,-1}
const	string	$const2	"wrap"		%read{0,0} %write{2147483647,-1}
const	string	$const3	"errormessage"		%read{0,0} %write{2147483647,-1}
const	string	$const4	"firstchannel"		%read{1,1} %write{2147483647,-1}
code ___main___
	texture		C filename s t $const1 a $const2 wrap $const3 err 	%argrw{"wrrrrwrrrw"} %argderivs{2,3}
	texture		f filename s t $const4 first 	%argrw{"wrrrrr"} %argderivs{2,3}
	end
)";

// C = texture(filename, u, v) with nothing to catch a failure.
const char* kPlainOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader plain
param	string	filename	""		%read{0,0} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{0,0}
global	float	u	%read{0,0} %write{2147483647,-1}
global	float	v	%read{0,0} %write{2147483647,-1}
code ___main___
	texture		C filename u v 	%argrw{"wrr"} %argderivs{2,3}
	end
)";

// C = texture(filename, u, v, "missingcolor", mc, "missingalpha", ma, "alpha", a).
const char* kMissingOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader missing
param	string	filename	""		%read{0,0} %write{2147483647,-1}
param	color	mc	1 0 0		%read{0,0} %write{2147483647,-1}
param	float	ma	0.75		%read{0,0} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{0,0}
oparam	float	a	0		%read{2147483647,-1} %write{0,0}
global	float	u	%read{0,0} %write{2147483647,-1}
global	float	v	%read{0,0} %write{2147483647,-1}
const	string	$const1	"missingcolor"		%read{0,0} %write{2147483647,-1}
const	string	$const2	"missingalpha"		%read{0,0} %write{2147483647,-1}
const	string	$const3	"alpha"		%read{0,0} %write{2147483647,-1}
code ___main___
	texture		C filename u v $const1 mc $const2 ma $const3 a 	%argrw{"wrrrrrrrrw"} %argderivs{2,3}
	end
)";

// C = texture(filename, u, v); dx = Dx(C); dy = Dy(C); and the same with the derivatives of
// the coordinates given explicitly, doubled: e = texture(filename, u, v, 2*Dx(u), 0, 0, 2*Dy(v)).
const char* kDerivsOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader texderivs
param	string	filename	""		%read{0,3} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{1,2} %write{0,0}
oparam	color	dx	0 0 0		%read{2147483647,-1} %write{1,1}
oparam	color	dy	0 0 0		%read{2147483647,-1} %write{2,2}
oparam	color	e	0 0 0		%read{2147483647,-1} %write{3,3}
global	float	u	%read{0,3} %write{2147483647,-1}
global	float	v	%read{0,3} %write{2147483647,-1}
const	float	$const1	0.2		%read{3,3} %write{2147483647,-1}
const	float	$const2	0		%read{3,3} %write{2147483647,-1}
code ___main___
	texture		C filename u v 	%argrw{"wrr"} %argderivs{2,3}
	Dx		dx C 	%argrw{"wr"} %argderivs{1}
	Dy		dy C 	%argrw{"wr"} %argderivs{1}
	texture		e filename u v $const1 $const2 $const2 $const1 	%argrw{"wrrrrrrr"} %argderivs{2,3}
	end
)";

// C = texture(filename, u, v, "bogus", 1).
const char* kBadOptionOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader badoption
param	string	filename	""		%read{0,0} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{0,0}
global	float	u	%read{0,0} %write{2147483647,-1}
global	float	v	%read{0,0} %write{2147483647,-1}
const	string	$const1	"bogus"		%read{0,0} %write{2147483647,-1}
const	float	$const2	1		%read{0,0} %write{2147483647,-1}
code ___main___
	texture		C filename u v $const1 $const2 	%argrw{"wrrrrr"} %argderivs{2,3}
	end
)";

// C = environment(filename, R, "missingcolor", mc); t = texture3d(filename, P, "missingcolor",
// mc).
const char* kEnvOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader env
param	string	filename	""		%read{0,1} %write{2147483647,-1}
param	vector	R	0 0 1		%read{0,0} %write{2147483647,-1}
param	color	mc	0.5 0.5 0.5		%read{0,1} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{0,0}
oparam	color	T	0 0 0		%read{2147483647,-1} %write{1,1}
global	point	P	%read{1,1} %write{2147483647,-1}
const	string	$const1	"missingcolor"		%read{0,1} %write{2147483647,-1}
code ___main___
	environment		C filename R $const1 mc 	%argrw{"wrrrr"} %argderivs{2}
	texture3d		T filename P $const1 mc 	%argrw{"wrrrr"} %argderivs{2}
	end
)";

// Answers of gettextureinfo for `filename`, for the UDIM set `udim` at (s, t), and for the
// missing file `missing`.
const char* kInfoOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader info
param	string	filename	""		%read{0,6} %write{2147483647,-1}
param	string	udim	""		%read{8,10} %write{2147483647,-1}
param	string	missing	""		%read{12,14} %write{2147483647,-1}
param	float	s	0.5		%read{8,8} %write{2147483647,-1}
param	float	t	0.5		%read{8,8} %write{2147483647,-1}
oparam	int[2]	res	0 0		%read{2147483647,-1} %write{0,0}
oparam	int	chans	0		%read{2147483647,-1} %write{2,2}
oparam	string	format	"none"		%read{2147483647,-1} %write{4,4}
oparam	float	untouched	7		%read{2147483647,-1} %write{6,6}
oparam	int[2]	tileres	0 0		%read{2147483647,-1} %write{8,8}
oparam	int	udimexists	-1		%read{2147483647,-1} %write{10,10}
oparam	int	exists	-1		%read{2147483647,-1} %write{12,12}
oparam	string	missingformat	"none"		%read{2147483647,-1} %write{14,14}
oparam	int[8]	ok	0 0 0 0 0 0 0 0		%read{2147483647,-1} %write{1,15}
temp	int	$tmp1	%read{1,15} %write{0,14}
const	string	$const1	"resolution"		%read{0,8} %write{2147483647,-1}
const	string	$const2	"channels"		%read{2,2} %write{2147483647,-1}
const	string	$const3	"textureformat"		%read{4,14} %write{2147483647,-1}
const	string	$const4	"nonsense"		%read{6,6} %write{2147483647,-1}
const	string	$const5	"exists"		%read{10,12} %write{2147483647,-1}
const	int	$const10	0		%read{1,1} %write{2147483647,-1}
const	int	$const11	1		%read{3,3} %write{2147483647,-1}
const	int	$const12	2		%read{5,5} %write{2147483647,-1}
const	int	$const13	3		%read{7,7} %write{2147483647,-1}
const	int	$const14	4		%read{9,9} %write{2147483647,-1}
const	int	$const15	5		%read{11,11} %write{2147483647,-1}
const	int	$const16	6		%read{13,13} %write{2147483647,-1}
const	int	$const17	7		%read{15,15} %write{2147483647,-1}
code ___main___
	gettextureinfo		$tmp1 filename $const1 res 	%argrw{"wrrw"}
	aassign		ok $const10 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 filename $const2 chans 	%argrw{"wrrw"}
	aassign		ok $const11 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 filename $const3 format 	%argrw{"wrrw"}
	aassign		ok $const12 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 filename $const4 untouched 	%argrw{"wrrw"}
	aassign		ok $const13 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 udim s t $const1 tileres 	%argrw{"wrrrrw"}
	aassign		ok $const14 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 udim $const5 udimexists 	%argrw{"wrrw"}
	aassign		ok $const15 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 missing $const5 exists 	%argrw{"wrrw"}
	aassign		ok $const16 $tmp1 	%argrw{"wrr"}
	gettextureinfo		$tmp1 missing $const3 missingformat 	%argrw{"wrrw"}
	aassign		ok $const17 $tmp1 	%argrw{"wrr"}
	end
)";

// The shading system shares OpenImageIO's texture cache with the whole process, which
// remembers files by name: every test uses names of its own.
std::string uniqueName(const std::string& stem) {
    static std::atomic<int> counter{0};
    return stem + "_" + std::to_string(getpid()) + "_" + std::to_string(counter++);
}

class TextureTest : public ShadingFixture {
protected:
    static void SetUpTestSuite() {
        dir = std::filesystem::temp_directory_path() / uniqueName("tessel_texture_test");
        std::filesystem::create_directories(dir);
        // 16 x 16 RGBA: red follows s and green follows t at texel centres; blue and alpha
        // are constant.
        OIIO::ImageBuf ramp(OIIO::ImageSpec(16, 16, 4, OIIO::TypeDesc::FLOAT));
        for (int y = 0; y < 16; ++y)
            for (int x = 0; x < 16; ++x) {
                const float px[4] = {(x + 0.5f) / 16.0f, (y + 0.5f) / 16.0f, 0.25f, 0.5f};
                ramp.setpixel(x, y, px);
            }
        rampFile = (dir / "ramp.exr").string();
        ASSERT_TRUE(ramp.write(rampFile));
        writeConstant((dir / "tile.1001.exr").string(), 8, {0.2f, 0.4f, 0.6f});
        writeConstant((dir / "tile.1002.exr").string(), 32, {0.6f, 0.4f, 0.2f});
        udimPattern = (dir / "tile.<UDIM>.exr").string();
        OIIO::ImageBuf sky(OIIO::ImageSpec(32, 16, 3, OIIO::TypeDesc::FLOAT));
        const float skyColor[3] = {0.3f, 0.6f, 0.9f};
        OIIO::ImageBufAlgo::fill(sky, skyColor);
        envFile = (dir / "sky.env.exr").string();
        ASSERT_TRUE(OIIO::ImageBufAlgo::make_texture(OIIO::ImageBufAlgo::MakeTxEnvLatl, sky,
                                                     envFile, OIIO::ImageSpec()));
    }
    static void TearDownTestSuite() {
        std::error_code ec;
        std::filesystem::remove_all(dir, ec);
    }
    static void writeConstant(const std::string& file, int res, std::initializer_list<float> c) {
        OIIO::ImageBuf buf(OIIO::ImageSpec(res, res, 3, OIIO::TypeDesc::FLOAT));
        OIIO::ImageBufAlgo::fill(buf, OIIO::cspan<float>(c.begin(), c.size()));
        ASSERT_TRUE(buf.write(file));
    }

    TextureTest()
        : ShadingFixture({{"lookup", kLookupOso},
                          {"plain", kPlainOso},
                          {"missing", kMissingOso},
                          {"texderivs", kDerivsOso},
                          {"badoption", kBadOptionOso},
                          {"env", kEnvOso},
                          {"info", kInfoOso}}) {}

    // A group of one shader with the given string, float and int parameters.
    ShaderGroupRef group(const char* shader,
                         std::initializer_list<std::pair<const char*, std::string>> strings,
                         std::initializer_list<std::pair<const char*, float>> floats = {},
                         std::initializer_list<std::pair<const char*, int>> ints = {}) {
        std::vector<ustring> names;
        names.reserve(strings.size());
        std::vector<Param> params;
        for (const auto& [name, value] : strings) {
            names.emplace_back(value);
            params.push_back({name, TypeString, &names.back()});
        }
        for (const auto& [name, value] : floats) params.push_back({name, TypeFloat, &value});
        for (const auto& [name, value] : ints) params.push_back({name, TypeInt, &value});
        return single(shader, params);
    }

    void run(ShaderGroup& g, float u = 0.5f, float v = 0.5f) { ASSERT_TRUE(execute(g, u, v)); }

    Color3 color(ShaderGroup& g, const char* symbol) { return *value<Color3>(g, symbol); }

    static std::filesystem::path dir;
    static std::string rampFile, udimPattern, envFile;
};

std::filesystem::path TextureTest::dir;
std::string TextureTest::rampFile, TextureTest::udimPattern, TextureTest::envFile;

TEST_F(TextureTest, ReadsColorAlphaAndLaterChannels) {
    ShaderGroupRef g =
        group("lookup", {{"filename", rampFile}}, {{"s", 0.3f}, {"t", 0.7f}}, {{"first", 1}});
    run(*g);
    const Color3 c = color(*g, "C");
    EXPECT_NEAR(c.x, 0.3f, 1e-3f);
    EXPECT_NEAR(c.y, 0.7f, 1e-3f);
    EXPECT_NEAR(c.z, 0.25f, 1e-4f);
    EXPECT_NEAR(*value<float>(*g, "a"), 0.5f, 1e-4f);
    EXPECT_NEAR(*value<float>(*g, "f"), 0.7f, 1e-3f) << "firstchannel 1 reads green";
    EXPECT_EQ(*value<ustring>(*g, "err"), ustring("")) << "a lookup that works clears the message";
    EXPECT_EQ(handler.errors, "");
}

TEST_F(TextureTest, WrapModesOutsideTheUnitSquare) {
    auto redAt = [&](const char* wrap, float s) {
        ShaderGroupRef g =
            group("lookup", {{"filename", rampFile}, {"wrap", wrap}}, {{"s", s}, {"t", 0.5f}});
        run(*g);
        return color(*g, "C").x;
    };
    EXPECT_NEAR(redAt("black", 1.25f), 0.0f, 1e-4f);
    EXPECT_NEAR(redAt("periodic", 1.25f), 0.25f, 1e-3f);
    EXPECT_NEAR(redAt("mirror", 1.25f), 0.75f, 1e-3f);
    EXPECT_NEAR(redAt("clamp", 1.25f), 15.5f / 16.0f, 1e-3f);
    EXPECT_NEAR(redAt("periodic", -0.75f), 0.25f, 1e-3f);
}

TEST_F(TextureTest, MissingFileGoesToTheErrorMessageOutput) {
    const std::string name = (dir / uniqueName("absent")).string() + ".exr";
    ShaderGroupRef g = group("lookup", {{"filename", name}});
    run(*g);
    const ustring err = *value<ustring>(*g, "err");
    EXPECT_NE(err.string().find(name), std::string::npos) << err;
    EXPECT_EQ(handler.errors, "") << "the shader asked for the message itself";
    EXPECT_EQ(color(*g, "C"), Color3(0.0f)) << "channels of a failed lookup are the fill value";
}

TEST_F(TextureTest, MissingFileIsReportedOnceWithoutErrorMessageOutput) {
    const std::string name = (dir / uniqueName("absent")).string() + ".tx";
    ShaderGroupRef g = group("plain", {{"filename", name}});
    run(*g);
    run(*g, 0.2f, 0.3f);
    EXPECT_EQ(handler.errors.find("[RendererServices::texture] "), 0u) << handler.errors;
    EXPECT_NE(handler.errors.find(name), std::string::npos) << handler.errors;
    EXPECT_EQ(std::count(handler.errors.begin(), handler.errors.end(), '\n'), 1) << handler.errors;
}

TEST_F(TextureTest, MissingColorAndAlphaStandInForAMissingFile) {
    const std::string name = (dir / uniqueName("absent")).string() + ".tx";
    ShaderGroupRef g = group("missing", {{"filename", name}});
    run(*g);
    EXPECT_EQ(color(*g, "C"), Color3(1.0f, 0.0f, 0.0f));
    EXPECT_FLOAT_EQ(*value<float>(*g, "a"), 0.75f);
    EXPECT_EQ(handler.errors, "") << "a missing colour makes a missing file no error";
}

TEST_F(TextureTest, MissingColorIsNotUsedForAFileThatExists) {
    ShaderGroupRef g = group("missing", {{"filename", rampFile}});
    run(*g, 0.3f, 0.6f);
    EXPECT_NEAR(color(*g, "C").x, 0.3f, 0.02f);
    EXPECT_NEAR(*value<float>(*g, "a"), 0.5f, 1e-3f);
}

TEST_F(TextureTest, DerivativesFollowTheCoordinates) {
    ShaderGroupRef g = group("texderivs", {{"filename", rampFile}});
    run(*g, 0.5f, 0.5f); // du/dx = 0.1, dv/dy = 0.1
    const Color3 dx = color(*g, "dx"), dy = color(*g, "dy");
    EXPECT_NEAR(dx.x, 0.1f, 0.01f) << "red follows s";
    EXPECT_NEAR(dx.y, 0.0f, 0.01f);
    EXPECT_NEAR(dy.x, 0.0f, 0.01f);
    EXPECT_NEAR(dy.y, 0.1f, 0.01f) << "green follows t";
    EXPECT_NEAR(dx.z, 0.0f, 1e-4f) << "blue is constant";
    // Wider explicit derivatives blur more but keep the value of a linear ramp.
    EXPECT_NEAR(color(*g, "e").x, 0.5f, 0.02f);
}

// Without derivative hints in the OSO, coordinates keep derivatives for the filter's footprint
// only when the call does not give the footprint itself.
TEST_F(TextureTest, CoordinatesCarryDerivativesOnlyWhenTheyGiveTheFootprint) {
    const char* oso = R"(OpenShadingLanguage 1.00
# Compiled by hand
shader footprint
param	string	filename	""
oparam	color	a	0 0 0
oparam	color	b	0 0 0
oparam	color	c	0 0 0
global	float	u
global	float	v
local	float	s1
local	float	t1
local	float	s2
local	float	t2
local	float	s3
local	float	t3
const	float	$two	2
const	float	$zero	0
const	string	$blur	"blur"
code ___main___
	mul		s1 u $two
	mul		t1 v $two
	mul		s2 u $two
	mul		t2 v $two
	mul		s3 u $two
	mul		t3 v $two
	texture		a filename s1 t1
	texture		b filename s2 t2 $zero $zero $zero $zero
	texture		c filename s3 t3 $blur $zero
	end
)";
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("footprint", oso)) << handler.errors;
    ShaderGroupRef g = group("footprint", {{"filename", rampFile}});
    run(*g);
    for (const char* name : {"s1", "t1", "s3", "t3"}) {
        const ShaderSymbol* sym = ss.find_symbol(*g, ustring(name));
        ASSERT_NE(sym, nullptr) << name;
        EXPECT_TRUE(sym->derivs) << name;
    }
    for (const char* name : {"s2", "t2"}) {
        const ShaderSymbol* sym = ss.find_symbol(*g, ustring(name));
        ASSERT_NE(sym, nullptr) << name;
        EXPECT_FALSE(sym->derivs) << name << " has explicit derivatives";
    }
}

TEST_F(TextureTest, UnknownOptionIsReportedAndTheLookupStillRuns) {
    ShaderGroupRef g = group("badoption", {{"filename", rampFile}});
    run(*g, 0.4f, 0.5f);
    EXPECT_NE(handler.errors.find("Unknown texture optional argument: \"bogus\", <float>"),
              std::string::npos)
        << handler.errors;
    EXPECT_NEAR(color(*g, "C").x, 0.4f, 0.02f);
}

TEST_F(TextureTest, EnvironmentReadsALatLongMap) {
    ShaderGroupRef g = group("env", {{"filename", envFile}});
    run(*g);
    const Color3 c = color(*g, "C");
    EXPECT_NEAR(c.x, 0.3f, 1e-3f);
    EXPECT_NEAR(c.y, 0.6f, 1e-3f);
    EXPECT_NEAR(c.z, 0.9f, 1e-3f);
}

TEST_F(TextureTest, EnvironmentAndVolumeLookupsOfAMissingFileUseTheMissingColor) {
    const std::string name = (dir / uniqueName("absent")).string() + ".vdb";
    ShaderGroupRef g = group("env", {{"filename", name}});
    run(*g);
    EXPECT_EQ(color(*g, "C"), Color3(0.5f));
    EXPECT_EQ(color(*g, "T"), Color3(0.5f));
    EXPECT_EQ(handler.errors, "");
}

TEST_F(TextureTest, GetTextureInfoAnswersAndLeavesUnknownsAlone) {
    const std::string missing = (dir / uniqueName("absent")).string() + ".tx";
    ShaderGroupRef g =
        group("info", {{"filename", rampFile}, {"udim", udimPattern}, {"missing", missing}},
              {{"s", 1.5f}, {"t", 0.5f}});
    run(*g);
    const int* ok = value<int>(*g, "ok");
    const int* res = value<int>(*g, "res");
    EXPECT_EQ(ok[0], 1);
    EXPECT_EQ(res[0], 16);
    EXPECT_EQ(res[1], 16);
    EXPECT_EQ(ok[1], 1);
    EXPECT_EQ(*value<int>(*g, "chans"), 4);
    EXPECT_EQ(ok[2], 1);
    EXPECT_EQ(*value<ustring>(*g, "format"), ustring("Plain Texture"));
    EXPECT_EQ(ok[3], 0) << "an unknown name is no answer";
    EXPECT_EQ(*value<float>(*g, "untouched"), 7.0f) << "and leaves the destination";
    EXPECT_EQ(ok[4], 1);
    const int* tile = value<int>(*g, "tileres");
    EXPECT_EQ(tile[0], 32) << "s = 1.5 lies in tile 1002";
    EXPECT_EQ(tile[1], 32);
    EXPECT_EQ(ok[5], 1);
    EXPECT_EQ(*value<int>(*g, "udimexists"), 1);
    EXPECT_EQ(ok[6], 1) << "existence is an answer even for a missing file";
    EXPECT_EQ(*value<int>(*g, "exists"), 0);
    EXPECT_EQ(ok[7], 0);
    EXPECT_EQ(*value<ustring>(*g, "missingformat"), ustring("none"));
    EXPECT_EQ(handler.errors.find("[RendererServices::get_texture_info] "), 0u) << handler.errors;
}

TEST_F(TextureTest, GetTextureInfoPicksTheUdimTileUnderTheCoordinates) {
    ShaderGroupRef g =
        group("info", {{"filename", rampFile}, {"udim", udimPattern}, {"missing", rampFile}},
              {{"s", 0.5f}, {"t", 0.5f}});
    run(*g);
    EXPECT_EQ(value<int>(*g, "tileres")[0], 8) << "s = 0.5 lies in tile 1001";
}

TEST_F(TextureTest, UdimLookupReadsTheTileUnderTheCoordinates) {
    ShaderGroupRef g = group("lookup", {{"filename", udimPattern}}, {{"s", 1.5f}, {"t", 0.5f}});
    run(*g);
    EXPECT_NEAR(color(*g, "C").x, 0.6f, 1e-3f);
    ShaderGroupRef g2 = group("lookup", {{"filename", udimPattern}}, {{"s", 0.5f}, {"t", 0.5f}});
    run(*g2);
    EXPECT_NEAR(color(*g2, "C").x, 0.2f, 1e-3f);
}

TEST_F(TextureTest, RendererServicesWithoutTextureSystemFailsWithAMessage) {
    RendererServices rs(nullptr);
    TextureOpt opt;
    float result[4] = {9, 9, 9, 9};
    ustring err;
    EXPECT_FALSE(rs.texture(ustring(rampFile), nullptr, nullptr, opt, nullptr, 0.5f, 0.5f, 0, 0, 0,
                            0, 4, result, nullptr, nullptr, &err));
    EXPECT_FALSE(err.empty());
    EXPECT_EQ(rs.get_texture_handle(ustring(rampFile), nullptr), nullptr);
    EXPECT_FALSE(rs.good(nullptr));
}

} // namespace
