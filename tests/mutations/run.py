#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Mutation check: applies each mutation of mutations.txt in turn to a scratch copy of the
checkout, builds, runs the test suites and reports which tests caught it. By hand, not in CI:

    tests/mutations/run.py [--build DIR] [--only M03,M07] [--jobs N]

A mutation that no test catches is reported as SURVIVED and the script exits 1. The scratch copy
is a git worktree of HEAD plus the uncommitted changes of this checkout, so the checkout itself is
never modified."""
import argparse
import os
import re
import shutil
import subprocess
import sys
import time

HERE = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.abspath(os.path.join(HERE, "..", ".."))


def parse(path):
    """Blocks of '## ID title', then 'file:', 'from:', 'to:' lines (from/to may repeat to make
    several edits; each 'from' must occur exactly once in its file)."""
    muts, cur = [], None
    for raw in open(path, encoding="utf-8"):
        line = raw.rstrip("\n")
        if line.startswith("## "):
            ident, _, title = line[3:].partition(" ")
            cur = {"id": ident, "title": title.strip(), "edits": []}
            muts.append(cur)
        elif cur is not None and line.startswith("file:"):
            cur["edits"].append([line[5:].strip(), None, None])
        elif cur is not None and line.startswith("from:"):
            cur["edits"][-1][1] = line[5:].strip()
        elif cur is not None and line.startswith("to:"):
            cur["edits"][-1][2] = line[3:].strip()
    for m in muts:
        for f, a, b in m["edits"]:
            if not (f and a is not None and b is not None):
                sys.exit(f"{m['id']}: each edit needs file, from and to")
    return muts


def find_span(text, needle):
    """The one place where `needle` stands, white space folded; None unless exactly one."""
    pattern = r"\s+".join(re.escape(tok) for tok in needle.split())
    hits = list(re.finditer(pattern, text))
    return hits[0].span() if len(hits) == 1 else None


def run(cmd, cwd, log):
    with open(log, "a") as out:
        return subprocess.run(cmd, cwd=cwd, stdout=out, stderr=subprocess.STDOUT).returncode


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--build", default="/tmp/kova-mutations")
    ap.add_argument("--only", default="")
    ap.add_argument("--jobs", default=str(os.cpu_count() or 2))
    args = ap.parse_args()
    muts = parse(os.path.join(HERE, "mutations.txt"))
    if args.only:
        keep = set(args.only.split(","))
        muts = [m for m in muts if m["id"] in keep]

    tree = os.path.join(args.build, "tree")
    build = os.path.join(args.build, "build")
    log = os.path.join(args.build, "log.txt")
    os.makedirs(args.build, exist_ok=True)
    if os.path.exists(tree):
        subprocess.run(["git", "worktree", "remove", "--force", tree], cwd=ROOT)
        shutil.rmtree(tree, ignore_errors=True)
    subprocess.run(["git", "worktree", "add", "--detach", "-f", tree, "HEAD"], cwd=ROOT,
                   check=True, stdout=subprocess.DEVNULL)
    diff = subprocess.run(["git", "diff", "HEAD", "--binary"], cwd=ROOT, check=True,
                          capture_output=True).stdout
    if diff:
        subprocess.run(["git", "apply", "--whitespace=nowarn"], cwd=tree, input=diff, check=True)

    started = time.time()
    print(f"baseline build in {build}")
    if run(["cmake", "-S", tree, "-B", build, "-DCMAKE_BUILD_TYPE=RelWithDebInfo",
            "-DKOVA_BUILD_BENCH=OFF"], tree, log) or \
            run(["cmake", "--build", build, "-j", args.jobs], tree, log):
        sys.exit(f"baseline build failed, see {log}")
    if run(["ctest", "-j", args.jobs, "--timeout", "300"], build, log):
        sys.exit(f"baseline tests fail, see {log}")

    survived = []
    for m in muts:
        t0 = time.time()
        saved = {}
        ok = True
        for f, a, b in m["edits"]:
            path = os.path.join(tree, f)
            if path not in saved:
                saved[path] = open(path, encoding="utf-8").read()
            cur = open(path, encoding="utf-8").read()
            span = find_span(cur, a)
            if span is None:
                print(f"{m['id']}: STALE ('{a}' is not exactly once in {f})")
                ok = False
                break
            open(path, "w", encoding="utf-8").write(cur[:span[0]] + b + cur[span[1]:])
        if ok:
            if run(["cmake", "--build", build, "-j", args.jobs], tree, log):
                verdict = "caught by the build"
            else:
                failed_log = os.path.join(build, "Testing", "Temporary", "LastTestsFailed.log")
                if os.path.exists(failed_log):
                    os.remove(failed_log)
                rc = run(["ctest", "-j", args.jobs, "--timeout", "120"], build, log)
                caught = []
                if os.path.exists(failed_log):
                    caught = [l.split(":", 1)[1].strip() for l in open(failed_log) if ":" in l]
                if rc and caught:
                    verdict = f"caught by {len(caught)}: " + ", ".join(caught[:6]) + \
                              (" ..." if len(caught) > 6 else "")
                else:
                    verdict = "SURVIVED"
                    survived.append(m["id"])
            print(f"{m['id']} {m['title']}: {verdict} ({time.time() - t0:.0f} s)", flush=True)
        else:
            survived.append(m["id"])
        for path, text in saved.items():
            open(path, "w", encoding="utf-8").write(text)

    run(["cmake", "--build", build, "-j", args.jobs], tree, log)  # leave the scratch build clean
    print(f"{len(muts) - len(survived)} of {len(muts)} mutations caught in "
          f"{(time.time() - started) / 60:.1f} min")
    if survived:
        print("not caught or stale: " + " ".join(survived))
        sys.exit(1)


if __name__ == "__main__":
    main()
