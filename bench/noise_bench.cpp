// Noise throughput through the public shading API: a 256x256 grid shaded with four octaves of
// Perlin noise, colour noise, colour cell noise and one filtered texture lookup (of an image the
// bench writes at start), once without and once with derivatives of the noise (which switches
// the noise to its Dual2 evaluation).
#include <OSL/oslexec.h>

#include <OpenImageIO/filesystem.h>
#include <OpenImageIO/imagebuf.h>

#include <benchmark/benchmark.h>

#include <cstring>
#include <string>

namespace {

using namespace OSL;

// Cout = noise(q4) * fbm(P) + cellnoise(q4) + texture(texname, u, v) with fbm four octaves of
// snoise; the second output, slope, is Dx(fbm) when the `slope` variant is used.
const char* kNoiseOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader noisebench
param	string	texname	""		%read{19,19} %write{2147483647,-1}
oparam	color	Cout	0 0 0		%read{20,20} %write{18,20}
oparam	float	slope	0		%read{2147483647,-1} %write{21,21}
global	point	P	%read{0,0} %write{2147483647,-1} %derivs
global	float	u	%read{19,19} %write{2147483647,-1} %derivs
global	float	v	%read{19,19} %write{2147483647,-1} %derivs
local	point	q	%read{1,16} %write{0,11} %derivs
local	float	n	%read{2,14} %write{1,13} %derivs
local	float	sum	%read{6,21} %write{2,14} %derivs
local	color	cn	%read{17,18} %write{15,17}
local	color	cc	%read{18,18} %write{16,16}
local	color	tc	%read{20,20} %write{19,19}
const	float	$c8	8		%read{0,0} %write{2147483647,-1}
const	float	$lac	2.03		%read{3,11} %write{2147483647,-1}
const	float	$g1	0.5		%read{5,5} %write{2147483647,-1}
const	float	$g2	0.25		%read{9,9} %write{2147483647,-1}
const	float	$g3	0.125		%read{13,13} %write{2147483647,-1}
code ___main___
	mul		q P $c8 	%argrw{"wrr"}
	snoise		n q 	%argrw{"wr"}
	assign		sum n 	%argrw{"wr"}
	mul		q q $lac 	%argrw{"wrr"}
	snoise		n q 	%argrw{"wr"}
	mul		n n $g1 	%argrw{"wrr"}
	add		sum sum n 	%argrw{"wrr"}
	mul		q q $lac 	%argrw{"wrr"}
	snoise		n q 	%argrw{"wr"}
	mul		n n $g2 	%argrw{"wrr"}
	add		sum sum n 	%argrw{"wrr"}
	mul		q q $lac 	%argrw{"wrr"}
	snoise		n q 	%argrw{"wr"}
	mul		n n $g3 	%argrw{"wrr"}
	add		sum sum n 	%argrw{"wrr"}
	noise		cn q 	%argrw{"wr"}
	cellnoise	cc q 	%argrw{"wr"}
	mul		cn cn sum 	%argrw{"wrr"}
	add		Cout cn cc 	%argrw{"wrr"}
	texture		tc texname u v 	%argrw{"wrrr"} %argderivs{2,3}
	add		Cout Cout tc 	%argrw{"wrr"}
	DERIV_OP
	end
)";

// A 256x256 colour gradient written once per run into the temporary folder; empty on failure.
std::string texturePath() {
    static const std::string path = [] {
        const std::string p =
            OIIO::Filesystem::temp_directory_path() + "/tessel_noise_bench_ramp.exr";
        OIIO::ImageBuf img(OIIO::ImageSpec(256, 256, 3, OIIO::TypeDesc::HALF));
        for (int y = 0; y < 256; ++y)
            for (int x = 0; x < 256; ++x) {
                const float px[3] = {x / 255.0f, y / 255.0f, 0.5f};
                img.setpixel(x, y, px, 3);
            }
        return img.write(p) ? p : std::string();
    }();
    return path;
}

struct Fixture {
    ShadingSystem ss;
    ShaderGroupRef group;
    bool ok = false;

    explicit Fixture(bool derivs) {
        std::string oso = kNoiseOso;
        const std::string marker = "DERIV_OP";
        oso.replace(oso.find(marker), marker.size(),
                    derivs ? "Dx\t\tslope sum \t%argrw{\"wr\"} %argderivs{1}"
                           : "assign\t\tslope sum \t%argrw{\"wr\"}");
        if (!ss.LoadMemoryCompiledShader("noisebench", oso)) return;
        const ustring tex(texturePath());
        if (tex.empty()) return;
        group = ss.ShaderGroupBegin("");
        ss.Parameter(*group, "texname", TypeString, &tex);
        ss.Shader(*group, "surface", "noisebench", "layer");
        ok = ss.ShaderGroupEnd(*group);
    }
};

void shadeGrid(benchmark::State& state, bool derivs) {
    static Fixture plain(false), withDerivs(true);
    Fixture& f = derivs ? withDerivs : plain;
    if (!f.ok) {
        state.SkipWithError("noise benchmark shader did not load");
        return;
    }
    const int res = 256;
    PerThreadInfo* ti = f.ss.create_thread_info();
    ShadingContext* ctx = f.ss.get_context(ti);
    ShaderGlobals sg;
    for (auto _ : state) {
        for (int y = 0; y < res; ++y)
            for (int x = 0; x < res; ++x) {
                std::memset(static_cast<void*>(&sg), 0, sizeof sg);
                sg.u = (float(x) + 0.5f) / float(res);
                sg.v = (float(y) + 0.5f) / float(res);
                sg.dudx = sg.dvdy = 1.0f / float(res);
                sg.P = Vec3(sg.u, sg.v, 1.0f);
                sg.dPdx = Vec3(sg.dudx, 0.0f, 0.0f);
                sg.dPdy = Vec3(0.0f, sg.dvdy, 0.0f);
                sg.N = sg.Ng = Vec3(0.0f, 0.0f, 1.0f);
                sg.raytype = 1;
                if (!f.ss.execute(*ctx, *f.group, 0, sg)) {
                    state.SkipWithError("shading failed");
                    break;
                }
            }
    }
    f.ss.release_context(ctx);
    f.ss.destroy_thread_info(ti);
    state.SetItemsProcessed(state.iterations() * res * res);
}

void BM_NoiseGrid256(benchmark::State& state) {
    shadeGrid(state, false);
}
BENCHMARK(BM_NoiseGrid256)->Unit(benchmark::kMillisecond);

void BM_NoiseGrid256WithDerivs(benchmark::State& state) {
    shadeGrid(state, true);
}
BENCHMARK(BM_NoiseGrid256WithDerivs)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
