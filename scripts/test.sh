#!/usr/bin/env bash
# Runs every test suite: installs what is missing, builds, then runs CTest on a plain build and on
# an AddressSanitizer + UndefinedBehaviorSanitizer build.
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
cd "$root"
jobs=${KOVA_JOBS:-$(nproc)}

scripts/setup.sh

run_suite() {
    local dir=$1
    shift
    echo "== $dir: configure and build"
    cmake -S . -B "$dir" -DCMAKE_BUILD_TYPE=RelWithDebInfo "$@" >/dev/null
    cmake --build "$dir" -j "$jobs" >"$dir.build.log" 2>&1 || { tail -n 60 "$dir.build.log"; exit 1; }
    echo "== $dir: test"
    (cd "$dir" && ctest --output-on-failure -j "$jobs" --timeout 600)
}

run_suite build
run_suite build-asan -DKOVA_SANITIZE=address,undefined -DKOVA_BUILD_BENCH=OFF -DKOVA_BUILD_TOOLS=OFF
echo "== all suites passed"
