#!/usr/bin/env python3
"""Times `tessel shade` on the conformance corpus's own grids and shaders (the reference
compiler's OSO, so both shading systems run identical bytecode) and prints points per second.

With --testshade PATH the same commands also run through OSL's testshade, side by side; figures
measured elsewhere can be kept in shade_grid_reference.json ({"case": seconds}) and are shown
in the reference column when testshade is not at hand.

    bench/shade_grid_compare.py --tessel build/bin/tessel [--testshade PATH] [--threads N]
                                [--repeat N]
"""
import argparse
import json
import os
import shutil
import subprocess
import sys
import tempfile
import time

HERE = os.path.dirname(os.path.abspath(__file__))
SUITE = os.path.join(HERE, "..", "..", "shared", "osl-conformance", "testsuite")

# (case, shader, grid, extra arguments): noise of every kind, colour and a texture lookup. The
# noise cases share one shader that has no reference OSO; ours is compiled for them.
GRIDS = [
    ("pnoise", "test", (512, 512), []),
    ("noise-simplex", "testnoise", (512, 512), ["-param", "noisename", "simplex"]),
    ("noise-gabor", "testnoise", (512, 512), ["-param", "noisename", "gabor"]),
    ("noise-reg", "testnoise", (512, 512), ["-param", "noisename", "perlin"]),
    ("noise-cell", "testnoise", (512, 512),
     ["-param", "noisename", "cell", "-param", "offset", "0.0", "-param", "scale", "1.0"]),
    ("hashnoise", "test", (512, 512), []),
    ("wavelength_color", "test", (1000, 64), []),
    ("texture-swirl", "swirl", (512, 512), ["--center", "--param", "swirl", "2.0"]),
]


def time_command(cmd, cwd, repeat):
    best = None
    for _ in range(repeat):
        start = time.perf_counter()
        done = subprocess.run(cmd, cwd=cwd, stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
        elapsed = time.perf_counter() - start
        if done.returncode != 0:
            return None, done.stdout.decode(errors="replace")
        best = elapsed if best is None else min(best, elapsed)
    return best, ""


def main():
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument("--tessel", required=True)
    ap.add_argument("--testshade")
    ap.add_argument("--threads", type=int, default=1)
    ap.add_argument("--repeat", type=int, default=3)
    args = ap.parse_args()

    recorded = {}
    recorded_path = os.path.join(HERE, "shade_grid_reference.json")
    if os.path.exists(recorded_path):
        with open(recorded_path) as f:
            recorded = {k: v for k, v in json.load(f).items() if isinstance(v, (int, float))}

    print(f"{'case':<18}{'grid':>11}{'tessel s':>10}{'points/s':>12}{'reference s':>13}{'ratio':>8}")
    failed = False
    for case, shader, (w, h), extra in GRIDS:
        case_dir = os.path.join(SUITE, case)
        with tempfile.TemporaryDirectory() as top:
            # Shaders name textures as ../common/textures/..., as in the suite.
            os.symlink(os.path.join(SUITE, "common"), os.path.join(top, "common"))
            work = os.path.join(top, case)
            os.mkdir(work)
            oso_dir = os.path.join(case_dir, "oso-ref")
            for name in os.listdir(oso_dir) if os.path.isdir(oso_dir) else []:
                if name.endswith(".oso"):
                    shutil.copy(os.path.join(oso_dir, name), work)
            if not os.path.exists(os.path.join(work, shader + ".oso")):
                source = os.path.join(SUITE, "common", "shaders", shader + ".osl")
                subprocess.run([os.path.abspath(args.tessel), "compile", source, "-o",
                                os.path.join(work, shader + ".oso")], stdout=subprocess.DEVNULL)
            grid = ["-g", str(w), str(h), "-t", str(args.threads), "-od", "uint8"]
            out = ["-o", "Cout", "out.tif"]
            ours, log = time_command([os.path.abspath(args.tessel), "shade"] + grid + extra +
                                     out + [shader], work, args.repeat)
            if ours is None:
                print(f"{case:<18} FAILED\n{log}")
                failed = True
                continue
            ref = recorded.get(case)
            if args.testshade:
                ref, _ = time_command([args.testshade] + grid + extra + out + [shader], work,
                                      args.repeat)
        points = w * h
        ref_text = f"{ref:13.3f}" if ref else f"{'-':>13}"
        ratio = f"{ours / ref:8.2f}" if ref else f"{'-':>8}"
        print(f"{case:<18}{f'{w}x{h}':>11}{ours:10.3f}{points / ours:12.0f}{ref_text}{ratio}")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
