#!/usr/bin/env python3
"""Compiles every conformance shader the reference compiler accepted and compares our output with
the reference's: `tessel info -v` text against NAME.oslinfo.txt, and the multiset of op names per
shader against NAME.oso. Prints per-shader mismatches, the commonest op differences and totals.

    corpus_compare.py --tessel build/bin/tessel [--suite DIR] [--cases a b] [--diff] [--ops]
                      [--jobs N]
"""
import argparse
import collections
import concurrent.futures
import difflib
import glob
import os
import re
import subprocess
import sys
import tempfile


def oslc_args(case_dir):
    """The case's extra compiler options, as its run.py sets them (default -Wall)."""
    try:
        text = open(os.path.join(case_dir, "run.py")).read()
    except OSError:
        return "-Wall"
    m = re.search(r'^oslcargs\s*=\s*"([^"]*)"', text, re.M)
    return m.group(1) if m else "-Wall"


def op_names(oso_text):
    ops = []
    in_code = False
    for line in oso_text.splitlines():
        if line.startswith("code "):
            in_code = True
            continue
        if in_code and line.startswith("\t"):
            name = line.split()[0] if line.split() else ""
            if name:
                ops.append(name)
    return collections.Counter(ops)


def main():
    here = os.path.dirname(os.path.abspath(__file__))
    ap = argparse.ArgumentParser()
    ap.add_argument("--tessel", required=True)
    ap.add_argument("--suite", default=os.path.join(here, "../../../../shared/osl-conformance/testsuite"))
    ap.add_argument("--cases", nargs="*")
    ap.add_argument("--diff", action="store_true", help="print info diffs")
    ap.add_argument("--ops", action="store_true", help="print op differences per shader")
    ap.add_argument("--jobs", type=int, default=2)
    a = ap.parse_args()
    suite = os.path.abspath(a.suite)
    tessel = os.path.abspath(a.tessel)
    cases = a.cases or sorted(d for d in os.listdir(suite) if os.path.isdir(os.path.join(suite, d, "oso-ref")))
    tmp = tempfile.mkdtemp(prefix="corpus-")
    jobs = []
    for case in cases:
        cdir = os.path.join(suite, case)
        for ref in sorted(glob.glob(os.path.join(cdir, "oso-ref", "*.oso"))):
            base = os.path.splitext(os.path.basename(ref))[0]
            if os.path.exists(os.path.join(cdir, base + ".osl")):
                jobs.append((case, cdir, base, ref))

    def one(job):
        case, cdir, base, ref = job
        out = os.path.join(tmp, case + "." + base + ".oso")
        cmd = "%s compile %s -o %s %s.osl" % (tessel, oslc_args(cdir), out, base)
        r = subprocess.run(cmd, shell=True, cwd=cdir, capture_output=True, text=True, timeout=300)
        if r.returncode != 0 or not os.path.exists(out):
            return job, None, None
        info = subprocess.run([tessel, "info", "-v", out], capture_output=True, text=True,
                              timeout=300).stdout
        return job, info, open(out).read()

    total = len(jobs)
    compiled = info_ok = ops_ok = 0
    op_diff = collections.Counter()
    failed_compile = []
    info_bad = []
    with concurrent.futures.ThreadPoolExecutor(a.jobs) as ex:
        results = list(ex.map(one, jobs))
    for (case, cdir, base, ref), info, oso in results:
        if info is None:
            failed_compile.append("%s/%s" % (case, base))
            continue
        compiled += 1
        ref_info = open(os.path.join(cdir, "oso-ref", base + ".oslinfo.txt")).read()
        if info == ref_info:
            info_ok += 1
        else:
            info_bad.append("%s/%s" % (case, base))
            if a.diff:
                print("=== info %s/%s" % (case, base))
                sys.stdout.writelines(difflib.unified_diff(
                    ref_info.splitlines(True), info.splitlines(True), "ref", "ours", n=1))
        ours = op_names(oso)
        theirs = op_names(open(ref).read())
        if ours == theirs:
            ops_ok += 1
        else:
            d = collections.Counter(ours)
            d.subtract(theirs)
            diff = {k: v for k, v in d.items() if v}
            for k, v in diff.items():
                op_diff[(k, "extra" if v > 0 else "missing")] += abs(v)
            if a.ops:
                print("=== ops %s/%s %s" % (case, base, sorted(diff.items())))
    print("compile failures:", " ".join(failed_compile) or "none")
    print("info mismatches:", " ".join(info_bad) or "none")
    print("commonest op differences (ours vs reference):")
    for (name, kind), n in op_diff.most_common(25):
        print("  %-20s %-8s %d" % (name, kind, n))
    print("%d shaders, %d compiled, info agrees %d/%d, op names agree %d/%d" %
          (total, compiled, info_ok, compiled, ops_ok, compiled))


if __name__ == "__main__":
    main()
