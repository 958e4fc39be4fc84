#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Mutation check: applies each mutation of mutations.txt in turn to a scratch copy of the
checkout, builds, runs the test suites and reports which tests caught it. By hand, not in CI:

    tests/mutations/run.py [--build DIR] [--only M03,M07] [--jobs N] [--head] [--first]

A mutation that no test catches is reported as SURVIVED, one whose text is no longer in the code
as STALE, one that does not compile as INVALID; any of these makes the script exit 1. The scratch
copy holds the checkout's tracked and untracked (not ignored) files as they are on disk, so the
checkout itself is never modified and no git metadata is touched. Files whose content did not
change keep their time stamps, so a second run rebuilds only what changed. The full list of
catching tests per mutation, and the mutations each test program caught, go to DIR/report.txt."""
import argparse
import json
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
    ids = [m["id"] for m in muts]
    if len(ids) != len(set(ids)):
        sys.exit("mutation ids must be unique")
    for m in muts:
        if not m["edits"]:
            sys.exit(f"{m['id']}: no edit")
        for f, a, b in m["edits"]:
            if not (f and a and b is not None):
                sys.exit(f"{m['id']}: each edit needs file, from and to")
    return muts


def find_span(text, needle):
    """The one place where `needle` stands, white space folded; None unless exactly one."""
    pattern = r"\s+".join(re.escape(tok) for tok in needle.split())
    hits = list(re.finditer(pattern, text))
    return hits[0].span() if len(hits) == 1 else None


def run(cmd, cwd, log):
    with open(log, "a") as out:
        out.write(f"\n$ {' '.join(cmd)}\n")
        out.flush()
        return subprocess.run(cmd, cwd=cwd, stdout=out, stderr=subprocess.STDOUT).returncode


def sync_tree(tree, source):
    """Copies the files of the checkout at `source` into `tree`, leaving files with equal content
    untouched and removing files the checkout no longer has."""
    listed = subprocess.run(["git", "ls-files", "-z", "--cached", "--others", "--exclude-standard"],
                            cwd=source, check=True, capture_output=True).stdout
    wanted = {p for p in listed.decode().split("\0") if p and os.path.isfile(os.path.join(source, p))}
    for rel in wanted:
        src, dst = os.path.join(source, rel), os.path.join(tree, rel)
        data = open(src, "rb").read()
        if os.path.isfile(dst) and open(dst, "rb").read() == data:
            shutil.copymode(src, dst)
            continue
        os.makedirs(os.path.dirname(dst), exist_ok=True)
        shutil.copyfile(src, dst)  # a fresh time stamp, so the build sees the change
        shutil.copymode(src, dst)
    for base, _, files in os.walk(tree):
        for name in files:
            rel = os.path.relpath(os.path.join(base, name), tree)
            if rel not in wanted:
                os.remove(os.path.join(base, name))


def test_programs(build):
    """Test name -> name of the program (or command) that runs it."""
    out = subprocess.run(["ctest", "--show-only=json-v1"], cwd=build, capture_output=True,
                         text=True).stdout
    names = {}
    for t in json.loads(out or "{}").get("tests", []):
        cmd = t.get("command") or [t["name"]]
        prog = os.path.basename(cmd[0])
        if prog in ("java", "sh", "bash", "python3", "cmake") and len(cmd) > 1:
            prog = t["name"]
        names[t["name"]] = prog
    return names


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--build", default="/tmp/kova-mutations")
    ap.add_argument("--only", default="")
    ap.add_argument("--jobs", default=str(os.cpu_count() or 2))
    ap.add_argument("--first", action="store_true",
                    help="stop each mutation's test run at the first failure (faster; names one "
                         "catching test; a hang then costs one timeout)")
    ap.add_argument("--head", action="store_true",
                    help="check the last commit, not the files on disk")
    args = ap.parse_args()
    muts = parse(os.path.join(HERE, "mutations.txt"))
    if args.only:
        keep = set(args.only.split(","))
        muts = [m for m in muts if m["id"] in keep]

    tree = os.path.join(args.build, "tree")
    build = os.path.join(args.build, "build")
    log = os.path.join(args.build, "log.txt")
    os.makedirs(tree, exist_ok=True)
    open(log, "w").close()
    if args.head:
        # A throw-away checkout of HEAD (a detached worktree, removed again right after).
        head = os.path.join(args.build, "head")
        shutil.rmtree(head, ignore_errors=True)
        subprocess.run(["git", "worktree", "add", "--detach", "-f", head, "HEAD"], cwd=ROOT,
                       check=True, capture_output=True)
        try:
            sync_tree(tree, head)
        finally:
            subprocess.run(["git", "worktree", "remove", "--force", head], cwd=ROOT)
    else:
        sync_tree(tree, ROOT)

    started = time.time()
    print(f"baseline build in {build}", flush=True)
    if run(["cmake", "-S", tree, "-B", build, "-DCMAKE_BUILD_TYPE=RelWithDebInfo",
            "-DKOVA_BUILD_BENCH=OFF", "-DKOVA_BUILD_DOCS=OFF",
            "-DKOVA_TEST_TIMEOUT=60"], tree, log) or \
            run(["cmake", "--build", build, "-j", args.jobs], tree, log):
        sys.exit(f"baseline build failed, see {log}")
    if run(["ctest", "-j", args.jobs, "--timeout", "300"], build, log):
        sys.exit(f"baseline tests fail, see {log}")
    programs = test_programs(build)
    print(f"baseline done in {(time.time() - started) / 60:.1f} min", flush=True)

    failed, report, by_program = [], [], {}
    for m in muts:
        t0 = time.time()
        saved = {}
        verdict = None
        for f, a, b in m["edits"]:
            path = os.path.join(tree, f)
            if not os.path.isfile(path):
                verdict = f"STALE ({f} does not exist)"
                break
            if path not in saved:
                saved[path] = open(path, encoding="utf-8").read()
            cur = open(path, encoding="utf-8").read()
            span = find_span(cur, a)
            if span is None:
                verdict = f"STALE ('{a}' is not exactly once in {f})"
                break
            open(path, "w", encoding="utf-8").write(cur[:span[0]] + b + cur[span[1]:])
        caught = []
        if verdict is None:
            if run(["cmake", "--build", build, "-j", args.jobs], tree, log):
                # A mutation must be a program that builds; one that does not tests nothing.
                verdict = "INVALID (does not build)"
            else:
                failed_log = os.path.join(build, "Testing", "Temporary", "LastTestsFailed.log")
                if os.path.exists(failed_log):
                    os.remove(failed_log)
                # A minute is ample for any suite (the build's per-test limit is set to it
                # above); a hang (a missed unlock) times out.
                rc = run(["ctest", "-j", args.jobs, "--timeout", "60"] +
                         (["--stop-on-failure"] if args.first else []), build, log)
                if os.path.exists(failed_log):
                    caught = [l.split(":", 1)[1].strip() for l in open(failed_log) if ":" in l]
                if rc and caught:
                    verdict = f"caught by {len(caught)}: " + ", ".join(caught[:6]) + \
                              (" ..." if len(caught) > 6 else "")
                    for name in caught:
                        by_program.setdefault(programs.get(name, name), set()).add(m["id"])
        if verdict is None:
            verdict = "SURVIVED"
        if not caught:
            failed.append(m["id"])
        print(f"{m['id']} {m['title']}: {verdict} ({time.time() - t0:.0f} s)", flush=True)
        report.append(f"{m['id']} {m['title']}: " + (", ".join(caught) if caught else verdict))
        for path, text in saved.items():
            open(path, "w", encoding="utf-8").write(text)

    run(["cmake", "--build", build, "-j", args.jobs], tree, log)  # leave the scratch build clean
    minutes = (time.time() - started) / 60
    with open(os.path.join(args.build, "report.txt"), "w") as out:
        out.write("\n".join(report) + "\n\nMutations caught per test program:\n")
        for prog in sorted(by_program):
            out.write(f"{prog}: {' '.join(sorted(by_program[prog]))}\n")
        out.write(f"\n{len(muts) - len(failed)} of {len(muts)} caught in {minutes:.1f} min\n")
    print(f"{len(muts) - len(failed)} of {len(muts)} mutations caught in {minutes:.1f} min "
          f"(details in {os.path.join(args.build, 'report.txt')})")
    if failed:
        print("not caught, stale or invalid: " + " ".join(failed))
        sys.exit(1)


if __name__ == "__main__":
    main()
