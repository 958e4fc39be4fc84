#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Runs every test suite and reliability gate:
#   1. setup: installs what is missing;
#   2. plain build + CTest, then valgrind's leak check over the allocation-failure suite and a
#      20-second soak of several instances streaming at once;
#   3. AddressSanitizer + UndefinedBehaviorSanitizer build + CTest, with leak detection and
#      float-to-integer overflow checks (GCC leaves float-cast-overflow out of "undefined");
#   4. ThreadSanitizer build of the threaded suites (output stream, registry, Java layer, soak);
#   5. libFuzzer targets (clang): replay of the seed corpora and saved regressions, then a bounded
#      fuzzing run per target;
#   6. AArch64 cross build, its tests under qemu-user, and the source-set file exchange between
#      x86-64 and AArch64 (scripts/aarch64.sh);
#   7. consumer: install into a temporary prefix, then find_package, pkg-config, the README's C
#      snippet and add_subdirectory (scripts/consumer.sh);
#   8. docs: the API reference (kova_docs: Doxygen, warnings are errors, every export named);
#   9. studio: the engine built to WebAssembly and its page tested in headless Chromium against
#      the native library (scripts/studio.sh --test).
# Environment: KOVA_JOBS (parallel jobs), KOVA_SOAK_SECONDS (default 20), KOVA_FUZZ_SECONDS
# (per target, default 60), KOVA_SKIP (space-separated stage names to skip: valgrind soak tsan
# fuzz aarch64 consumer docs studio).
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
cd "$root"
jobs=${KOVA_JOBS:-$(nproc)}
skip=" ${KOVA_SKIP:-} "
timings=()

stage_start=$SECONDS
stage_done() {
    timings+=("$(printf '%-34s %5d s' "$1" $((SECONDS - stage_start)))")
    stage_start=$SECONDS
}
skipped() { [[ "$skip" == *" $1 "* ]] && { echo "== $1: skipped (KOVA_SKIP)"; return 0; }; return 1; }

scripts/setup.sh
stage_done "setup"

# Every source file carries its licence line (checked only in a git checkout).
if git rev-parse --git-dir >/dev/null 2>&1; then
    unlicensed=$(git ls-files -- '*.c' '*.cpp' '*.h' '*.java' '*.js' '*.py' '*.sh' '*.cmake' \
        '*CMakeLists.txt' | xargs grep -L 'SPDX-License-Identifier' || true)
    [ -z "$unlicensed" ] || { echo "no SPDX-License-Identifier line in:"; echo "$unlicensed"; exit 1; }
fi

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
stage_done "plain build + ctest"

if ! skipped consumer; then
    scripts/consumer.sh build
    stage_done "consumer: install, find_package, pkg-config, add_subdirectory"
fi

if ! skipped docs; then
    echo "== docs: API reference"
    rm -rf build/docs/api/html # so the check runs and reports again
    cmake --build build --target kova_docs >build/docs.log 2>&1 || { tail -n 60 build/docs.log; exit 1; }
    grep -E '^api docs:' build/docs.log
    stage_done "docs: Doxygen API reference"
fi

if ! skipped valgrind; then
    echo "== valgrind: leak check over every allocation failure path"
    valgrind --leak-check=full --errors-for-leak-kinds=definite,indirect --error-exitcode=1 -q \
        build/tests/alloc_failure_test --gtest_brief=1 >build/valgrind.log 2>&1 ||
        { grep -v '^kova' build/valgrind.log | tail -n 80; exit 1; }
    grep -E '^\[ *(PASSED|FAILED)' build/valgrind.log
    stage_done "valgrind leak check"
fi

if ! skipped soak; then
    echo "== soak: ${KOVA_SOAK_SECONDS:-20} s of instances streaming strokes"
    KOVA_SOAK_SECONDS=${KOVA_SOAK_SECONDS:-20} build/tests/soak_test --gtest_brief=1 >build/soak.log 2>&1 ||
        { grep -v '^kova' build/soak.log | tail -n 60; exit 1; }
    grep -E '^soak:' build/soak.log
    stage_done "soak"
fi

# LeakSanitizer runs at the exit of every test process: a leak fails the test.
export ASAN_OPTIONS=detect_leaks=1
export UBSAN_OPTIONS=print_stacktrace=1
run_suite build-asan -DKOVA_SANITIZE=address,undefined,float-cast-overflow -DKOVA_BUILD_BENCH=OFF \
    -DKOVA_BUILD_TOOLS=OFF
unset ASAN_OPTIONS UBSAN_OPTIONS
stage_done "asan/ubsan build + ctest"

if ! skipped tsan; then
    # The suites where threads meet: the output stream and its device thread, the instance
    # registry and its lock, the Java-facing layer, the soak of several instances, and any
    # other suite that starts threads.
    echo "== build-rel-tsan: threaded suites under ThreadSanitizer"
    dir=build-rel-tsan
    cmake -S . -B "$dir" -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKOVA_SANITIZE=thread \
        -DKOVA_BUILD_JAVA=OFF -DKOVA_BUILD_TOOLS=OFF -DKOVA_BUILD_BENCH=OFF >/dev/null
    # tests/jni and tests/soak, plus any other suite that starts threads itself.
    mapfile -t tsan_targets < <({ ls tests/jni/*_test.cpp tests/soak/*_test.cpp 2>/dev/null
        grep -rlE --include='*_test.cpp' 'std::thread|std::async|pthread_create' tests; } |
        xargs -n1 basename | sed 's/\.cpp$//' | sort -u)
    cmake --build "$dir" -j "$jobs" --target "${tsan_targets[@]}" >"$dir.build.log" 2>&1 ||
        { tail -n 60 "$dir.build.log"; exit 1; }
    # Every test of those suites runs (KOVA_TSAN_PATTERN narrows them to a ctest -R regex). The
    # fuzz replays are not built here: they start no threads and run in the other builds.
    (cd "$dir" && TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1" \
        ctest --output-on-failure -j "$jobs" --timeout 900 -E 'NOT_BUILT|exports_match_list|fuzz_replay_' \
        ${KOVA_TSAN_PATTERN:+-R "$KOVA_TSAN_PATTERN"})
    stage_done "tsan build + threaded suites"
fi

if ! skipped fuzz; then
    echo "== build-rel-fuzz: libFuzzer targets"
    dir=build-rel-fuzz
    CC=clang CXX=clang++ cmake -S . -B "$dir" -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKOVA_BUILD_FUZZ=ON \
        -DKOVA_BUILD_TESTS=OFF -DKOVA_BUILD_JAVA=OFF -DKOVA_BUILD_TOOLS=OFF -DKOVA_BUILD_BENCH=OFF \
        >/dev/null
    cmake --build "$dir" -j "$jobs" --target kova_fuzz_all >"$dir.build.log" 2>&1 ||
        { tail -n 60 "$dir.build.log"; exit 1; }
    fuzz_seconds=${KOVA_FUZZ_SECONDS:-60}
    # The targets write a scratch file or three per input: in memory where the machine has it,
    # since on disk that costs more in the kernel than the library's work on the file.
    fuzz_tmp=${TMPDIR:-/tmp}
    [ -w /dev/shm ] && fuzz_tmp=/dev/shm
    # target:largest input to generate. File inputs are chunked (fuzz/file_script.h) and PCM
    # inputs give lengths, so short inputs reach every slot limit.
    for entry in srcset_file:16384 pcm_load:8192 generate:2048; do
        IFS=: read -r target max_len <<<"$entry"
        bin=$dir/fuzz/kova_fuzz_$target
        work=$dir/corpus/$target
        artifacts=$dir/artifacts/$target
        mkdir -p "$work" "$artifacts"
        replay=("fuzz/corpus/$target")
        [ -d "fuzz/regressions/$target" ] && replay+=("fuzz/regressions/$target")
        # Every seed and every saved crash input must pass, then the target is fuzzed.
        TMPDIR=$fuzz_tmp "$bin" -runs=0 -close_fd_mask=1 -rss_limit_mb=3072 "${replay[@]}" >"$dir/replay-$target.log" 2>&1 ||
            { grep -v '^kova' "$dir/replay-$target.log" | tail -n 60; exit 1; }
        TMPDIR=$fuzz_tmp "$bin" -max_total_time="$fuzz_seconds" -close_fd_mask=1 -max_len="$max_len" -timeout=25 \
            -rss_limit_mb=3072 -print_final_stats=1 -artifact_prefix="$artifacts/" \
            "$work" "${replay[@]}" >"$dir/fuzz-$target.log" 2>&1 ||
            { grep -v '^kova' "$dir/fuzz-$target.log" | tail -n 60
              echo "fuzz: $target failed; reproducer in $artifacts (see fuzz/regressions)"; exit 1; }
        execs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$dir/fuzz-$target.log")
        echo "fuzz: $target: $execs executions in $fuzz_seconds s, no failure"
    done
    stage_done "fuzz build + replay + fuzzing"
fi

if ! skipped aarch64; then
    scripts/aarch64.sh build
    stage_done "aarch64 cross build + qemu tests"
fi

if ! skipped studio; then
    KOVA_JOBS=$jobs scripts/studio.sh --test
    stage_done "studio wasm build + browser tests"
fi

echo "== stage times"
printf '%s\n' "${timings[@]}"
echo "== all suites passed"
