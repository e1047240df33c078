// Helpers shared by the shading-system tests: OSO snippets, a message-collecting error handler,
// and a fixture that builds one-layer groups, shades single points and reads back the results.
#pragma once

#include <OSL/oslexec.h>
#include <OpenImageIO/imageio.h>

#include <gtest/gtest.h>

#include <cstring>
#include <initializer_list>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

namespace runtime_test {

// Collects everything the shading system reports, by kind.
class CollectingHandler final : public OSL::ErrorHandler {
public:
    void operator()(int code, const std::string& msg) override {
        std::lock_guard<std::mutex> lock(mutex);
        if ((code & 0xffff0000) == EH_ERROR)
            errors += msg + "\n";
        else if ((code & 0xffff0000) == EH_WARNING)
            warnings += msg + "\n";
        else
            messages += msg;
    }
    std::mutex mutex;
    std::string errors, warnings, messages;
};

inline OSL::ShaderGlobals globalsAt(float u, float v) {
    OSL::ShaderGlobals sg;
    std::memset(static_cast<void*>(&sg), 0, sizeof sg);
    sg.u = u;
    sg.v = v;
    sg.dudx = 0.1f;
    sg.dvdy = 0.1f;
    sg.P = OSL::Vec3(u, v, 1.0f);
    sg.dPdx = OSL::Vec3(0.1f, 0.0f, 0.0f);
    sg.dPdy = OSL::Vec3(0.0f, 0.1f, 0.0f);
    sg.N = sg.Ng = OSL::Vec3(0.0f, 0.0f, 1.0f);
    return sg;
}

// An instance value given before a layer's shader; `lockgeom` false lets it change per point.
struct Param {
    const char* name;
    OSL::TypeDesc type;
    const void* value;
    bool lockgeom = true;
};

// A shading system reporting to `handler` (and asking `renderer`, when given), the shaders it
// was given loaded, and one context to shade with: the base of the tests' fixtures.
class ShadingFixture : public ::testing::Test {
protected:
    using Shaders = std::initializer_list<std::pair<const char*, const char*>>;

    explicit ShadingFixture(Shaders shaders,
                            std::unique_ptr<OSL::RendererServices> services = nullptr)
        : renderer(std::move(services)), ss(renderer.get(), nullptr, &handler) {
        for (const auto& [name, oso] : shaders)
            EXPECT_TRUE(ss.LoadMemoryCompiledShader(name, oso)) << name << handler.errors;
        thread = ss.create_thread_info();
        ctx = ss.get_context(thread);
    }
    ~ShadingFixture() override {
        ss.release_context(ctx);
        ss.destroy_thread_info(thread);
    }

    // A group of one layer running `shader` with the given instance values.
    OSL::ShaderGroupRef single(const char* shader, const std::vector<Param>& params = {},
                               const char* layer = "layer", const char* group = "") {
        OSL::ShaderGroupRef g = ss.ShaderGroupBegin(group);
        for (const Param& p : params) ss.Parameter(*g, p.name, p.type, p.value, p.lockgeom);
        EXPECT_TRUE(ss.Shader(*g, "surface", shader, layer));
        EXPECT_TRUE(ss.ShaderGroupEnd(*g));
        return g;
    }

    // Shades `g` once with globalsAt(u, v).
    bool execute(OSL::ShaderGroup& g, float u = 0.5f, float v = 0.5f) {
        OSL::ShaderGlobals sg = globalsAt(u, v);
        return ss.execute(*ctx, g, 0, sg);
    }

    // Where the context holds `symbol` of `g`; null, and a failure, when there is no such symbol.
    template <typename T>
    const T* value(OSL::ShaderGroup& g, const char* symbol) {
        const OSL::ShaderSymbol* sym = ss.find_symbol(g, OSL::ustring(symbol));
        EXPECT_NE(sym, nullptr) << symbol;
        return sym ? static_cast<const T*>(ss.symbol_address(*ctx, sym)) : nullptr;
    }

    // Shades `g` once at (u, v) and returns the value of `symbol` (T() when it has none).
    template <typename T>
    T run(OSL::ShaderGroup& g, const char* symbol, float u = 0.5f, float v = 0.5f) {
        EXPECT_TRUE(execute(g, u, v));
        const T* p = value<T>(g, symbol);
        EXPECT_NE(p, nullptr) << symbol;
        return p ? *p : T();
    }

    std::unique_ptr<OSL::RendererServices> renderer;
    CollectingHandler handler;
    OSL::ShadingSystem ss;
    OSL::PerThreadInfo* thread = nullptr;
    OSL::ShadingContext* ctx = nullptr;
};

// out = a + b, with a = 1 and b = 2 by default.
inline const char* kAddOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader add
param	float	a	1		%read{0,0} %write{2147483647,-1}
param	float	b	2		%read{0,0} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{0,0}
code ___main___
	add		out a b 	%argrw{"wrr"}
	end
)";

// Prints a line each time it runs; out = u * k; col = color(u, v, k).
inline const char* kUpstreamOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader upstream
param	float	k	2		%read{1,2} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{1,1}
oparam	color	col	0 0 0		%read{2147483647,-1} %write{2,2}
global	float	u	%read{1,2} %write{2147483647,-1}
global	float	v	%read{2,2} %write{2147483647,-1}
const	string	$const1	"upstream ran\n"		%read{0,0} %write{2147483647,-1}
code ___main___
	printf		$const1 	%argrw{"r"}
	mul		out u k 	%argrw{"wrr"}
	color		col u v k 	%argrw{"wrrr"}
	end
)";

// result = x + 1 unless usecolor is set; then prints c.
inline const char* kDownstreamOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader downstream
param	float	x	10		%read{2,2} %write{2147483647,-1}
param	color	c	5 5 5		%read{3,3} %write{2147483647,-1}
param	int	usecolor	0		%read{0,0} %write{2147483647,-1}
oparam	float	result	0		%read{2147483647,-1} %write{2,2}
temp	int	$tmp1	%read{1,1} %write{0,0}
const	int	$const0	0		%read{0,0} %write{2147483647,-1}
const	float	$const1	1		%read{2,2} %write{2147483647,-1}
const	string	$const2	"c = %g\n"		%read{3,3} %write{2147483647,-1}
code ___main___
	eq		$tmp1 usecolor $const0 	%argrw{"wrr"}
	if		$tmp1 3 3 	%argrw{"r"}
	add		result x $const1 	%argrw{"wrr"}
	printf		$const2 c 	%argrw{"rr"}
	end
)";

// d = Dx(u * u), w = filterwidth(u), a = area(P).
inline const char* kDerivsOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader derivs
oparam	float	d	0		%read{2147483647,-1} %write{1,1}
oparam	float	w	0		%read{2147483647,-1} %write{2,2}
oparam	float	a	0		%read{2147483647,-1} %write{3,3}
global	float	u	%read{0,2} %write{2147483647,-1}
global	point	P	%read{3,3} %write{2147483647,-1}
temp	float	$tmp1	%read{1,1} %write{0,0}
code ___main___
	mul		$tmp1 u u 	%argrw{"wrr"}
	Dx		d $tmp1 	%argrw{"wr"} %argderivs{1}
	filterwidth		w u 	%argrw{"wr"} %argderivs{1}
	area		a P 	%argrw{"wr"} %argderivs{1}
	end
)";

// sum = 0 + 1 + ... + (n - 1) with a for loop, stopping early at `stop` (break).
inline const char* kLoopOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader loop
param	int	n	10		%read{3,3} %write{2147483647,-1}
param	int	stop	100		%read{6,6} %write{2147483647,-1}
oparam	int	sum	0		%read{8,8} %write{1,8}
local	int	i	%read{3,9} %write{2,9}
const	int	$const0	0		%read{1,2} %write{2147483647,-1}
const	int	$const1	1		%read{9,9} %write{2147483647,-1}
temp	int	$tmp1	%read{4,4} %write{3,3}
temp	int	$tmp2	%read{7,7} %write{6,6}
code ___main___
	assign		sum $const0 	%argrw{"wr"}
	for		$tmp1 3 5 9 10 	%argrw{"r"}
	assign		i $const0 	%argrw{"wr"}
	lt		$tmp1 i n 	%argrw{"wrr"}
	nop
	eq		$tmp2 i stop 	%argrw{"wrr"}
	if		$tmp2 8 8 	%argrw{"r"}
	break
	add		sum sum i 	%argrw{"wrr"}
	add		i i $const1 	%argrw{"wrr"}
	end
)";

// Prints values with OSL's format rules.
inline const char* kPrintOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader printer
param	float	f	0.5		%read{0,0} %write{2147483647,-1}
param	int	i	42		%read{0,0} %write{2147483647,-1}
param	color	c	0.25 0.5 1		%read{0,0} %write{2147483647,-1}
param	string	s	"hello"		%read{0,0} %write{2147483647,-1}
param	float[3]	arr	1 2 3		%read{1,1} %write{2147483647,-1}
oparam	string	formatted	""		%read{2147483647,-1} %write{2,2}
const	string	$const1	"f=%g i=%d c=%g s=%s pct=%%\n"		%read{0,0} %write{2147483647,-1}
const	string	$const2	"arr=%.1f i=%5.2f\n"		%read{1,1} %write{2147483647,-1}
const	string	$const3	"[%d]"		%read{2,2} %write{2147483647,-1}
code ___main___
	printf		$const1 f i c s 	%argrw{"rrrrr"}
	printf		$const2 arr i 	%argrw{"rrr"}
	format		formatted $const3 i 	%argrw{"wrr"}
	end
)";

// Ci = 0.5 * emission(); with "flag" set, Ci = emission() + diffuse(N).
inline const char* kClosureOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
surface glow
param	int	flag	0		%read{2,2} %write{2147483647,-1}
global	normal	N	%read{3,3} %write{2147483647,-1}
global	closure color	Ci	%read{4,4} %write{1,4}
temp	closure color	$tmp1	%read{1,4} %write{0,0}
temp	closure color	$tmp2	%read{4,4} %write{3,3}
const	string	$const1	"emission"		%read{0,0} %write{2147483647,-1}
const	float	$const2	0.5		%read{1,1} %write{2147483647,-1}
const	string	$const3	"diffuse"		%read{3,3} %write{2147483647,-1}
code ___main___
	closure		$tmp1 $const1 	%argrw{"wr"}
	mul		Ci $tmp1 $const2 	%argrw{"wrr"}
	if		flag 5 5 	%argrw{"r"}
	closure		$tmp2 $const3 N 	%argrw{"wrr"}
	add		Ci $tmp1 $tmp2 	%argrw{"wrr"}
	end
)";

// A reference image of the conformance corpus ("CASE/ref/FILE"), as floats; not ok() when it
// cannot be read.
struct CorpusImage {
    int width = 0, height = 0, channels = 0;
    std::vector<float> pixels;

    explicit CorpusImage(const std::string& caseAndFile) {
        const std::string path =
            std::string(TESSEL_SHARED_DIR) + "/osl-conformance/testsuite/" + caseAndFile;
        auto in = OIIO::ImageInput::open(path);
        if (!in) return;
        const OIIO::ImageSpec& spec = in->spec();
        width = spec.width, height = spec.height, channels = spec.nchannels;
        pixels.resize(size_t(width) * size_t(height) * size_t(channels));
        if (!in->read_image(0, 0, 0, channels, OIIO::TypeDesc::FLOAT, pixels.data())) width = 0;
    }
    bool ok() const { return width > 0; }
    float at(int x, int y, int c) const { return pixels[(size_t(y) * width + x) * channels + c]; }
};

} // namespace runtime_test
