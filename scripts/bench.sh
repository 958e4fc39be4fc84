#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Builds the benchmarks in Release (build-bench/) and runs them: the native comparison benchmark
# (kova_bench, with repetitions; the summary tables at the end give medians and ratios) and the
# Java benchmark of gen_tofasttrack. Figures are noisy on a busy machine: check `uptime` first.
#
#   scripts/bench.sh                 # full run: 10 repetitions of 0.2 s each, medians
#   BENCH_REPS=1 scripts/bench.sh    # quick look
#   scripts/bench.sh --benchmark_filter=resample   # extra flags go to kova_bench
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
cd "$root"
build=${BENCH_BUILD_DIR:-build-bench}
reps=${BENCH_REPS:-10}
min_time=${BENCH_MIN_TIME:-0.2}
jobs=${KOVA_JOBS:-$(nproc)}

scripts/setup.sh
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release -DKOVA_BUILD_TESTS=OFF -DKOVA_BUILD_TOOLS=OFF \
    -DKOVA_BUILD_BENCH=ON >/dev/null
cmake --build "$build" --target kova_bench kova_bench_java -j "$jobs" >"$build/bench-build.log" 2>&1 ||
    { tail -n 40 "$build/bench-build.log"; exit 1; }

out="$build/bench-results.txt"
{
    echo "# Machine"
    lscpu | grep -E '^(Model name|CPU\(s\)|Thread\(s\) per core|CPU max MHz|L2 cache|L3 cache|Hypervisor vendor):' |
        sed 's/  */ /g'
    echo "Load before the run: $(uptime | sed 's/.*load average/load average/')"
    echo "Commit: $(git rev-parse --short HEAD 2>/dev/null || echo unknown)"
    echo
} | tee "$out"

# Repetitions run in random order, so that a change in the machine's load during the run spreads
# over the library and its peers alike instead of favouring whichever ran in the quiet moment.
"$build/bench/kova_bench" --benchmark_repetitions="$reps" --benchmark_min_time="$min_time" \
    --benchmark_enable_random_interleaving=true --benchmark_report_aggregates_only=true \
    --benchmark_color=false "$@" 2>&1 | tee -a "$out"

java_bin=java
for j in "${JAVA_HOME:-}/bin/java" /usr/lib/jvm/java-17-openjdk-*/bin/java; do
    if [ -x "$j" ]; then java_bin=$j; break; fi
done
echo | tee -a "$out"
echo "## Java: gen_tofasttrack per event (warmed-up JVM, wall time per call)" | tee -a "$out"
LD_LIBRARY_PATH="/usr/lib/$(gcc -print-multiarch)/android:$root/$build:$root/$build/host" \
    "$java_bin" -Dkova.library="$root/$build/libKovaFastTrack.so" -cp "$build/bench/classes" \
    KovaBench "${BENCH_JAVA_STROKES:-200}" 2>/dev/null | tee -a "$out"
echo "Load after the run: $(uptime | sed 's/.*load average/load average/')" | tee -a "$out"
echo "Results written to $out"
