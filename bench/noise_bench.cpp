// Noise throughput through the public shading API: a 256x256 grid shaded with four octaves of
// Perlin noise, colour noise and colour cell noise, once without and once with derivatives of
// the noise (which switches the noise to its Dual2 evaluation). No texture lookup is part of it.
#include <OSL/oslexec.h>

#include <benchmark/benchmark.h>

#include <cstring>
#include <string>

namespace {

using namespace OSL;

// Cout = noise(q4) * fbm(P) + cellnoise(q4) with fbm four octaves of snoise; the second output,
// slope, is Dx(fbm) when the `slope` variant is used.
const char* kNoiseOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader noisebench
oparam	color	Cout	0 0 0		%read{2147483647,-1} %write{18,18}
oparam	float	slope	0		%read{2147483647,-1} %write{19,19}
global	point	P	%read{0,0} %write{2147483647,-1} %derivs
local	point	q	%read{1,16} %write{0,11} %derivs
local	float	n	%read{2,14} %write{1,13} %derivs
local	float	sum	%read{6,19} %write{2,14} %derivs
local	color	cn	%read{17,18} %write{15,17}
local	color	cc	%read{18,18} %write{16,16}
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
	DERIV_OP
	end
)";

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
        group = ss.ShaderGroupBegin("");
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
