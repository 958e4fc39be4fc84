#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Hear and see a stroke: installs what is missing, builds the kova tool, and renders the built-in
# gesture (three strokes with pauses) through the built-in source set into out/stroke.wav and its
# picture out/stroke.png. Extra arguments go to `kova render`, e.g. scripts/demo.sh --gain 0.5
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
cd "$root"
jobs=${KOVA_JOBS:-$(nproc)}

scripts/setup.sh
mkdir -p build-demo
echo "demo: building the kova tool in build-demo/"
cmake -S . -B build-demo -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKOVA_BUILD_TESTS=OFF \
    -DKOVA_BUILD_BENCH=OFF -DKOVA_BUILD_JAVA=OFF >build-demo/demo.log 2>&1 || { tail -n 40 build-demo/demo.log; exit 1; }
cmake --build build-demo --target kova -j "$jobs" >>build-demo/demo.log 2>&1 || { tail -n 40 build-demo/demo.log; exit 1; }

mkdir -p out
build-demo/tools/kova render -o out/stroke.wav --png out/stroke.png "$@"
echo
echo "sound:   $root/out/stroke.wav"
echo "picture: $root/out/stroke.png"
