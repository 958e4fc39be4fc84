#!/usr/bin/env bash
# The browser studio: the engine compiled to WebAssembly with emscripten, and the page around it.
#   scripts/studio.sh            build into build-studio/site/ and serve it on 127.0.0.1 (prints
#                                the address; KOVA_STUDIO_PORT, default 8780)
#   scripts/studio.sh --build    only build
#   scripts/studio.sh --test     build, then run the browser tests in headless Chromium
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
cd "$root"
mode=${1:-serve}
jobs=${KOVA_JOBS:-$(nproc)}
out=build-studio
site=$out/site

# Debian's emscripten finds its node modules there whichever node is on PATH.
export NODE_PATH=/usr/share/nodejs${NODE_PATH:+:$NODE_PATH}
python=/usr/bin/python3 # Debian's, with python3-selenium

scripts/setup.sh

build() {
    echo "== studio: WebAssembly build"
    emcmake cmake -S studio -B "$out/wasm" -DCMAKE_BUILD_TYPE=Release >"$out.wasm.log" 2>&1 ||
        { tail -n 40 "$out.wasm.log"; exit 1; }
    cmake --build "$out/wasm" -j "$jobs" >>"$out.wasm.log" 2>&1 || { tail -n 40 "$out.wasm.log"; exit 1; }
    rm -rf "$site"
    mkdir -p "$site"
    cp studio/web/* "$out/wasm/kova_engine.js" "$out/wasm/kova_engine.wasm" "$site/"
    echo "studio: built $site"
}

case "$mode" in
--build)
    mkdir -p "$out"
    build
    ;;
--test)
    mkdir -p "$out"
    build
    echo "== studio: native library for the reference"
    cmake -S . -B "$out/native" -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKOVA_BUILD_TESTS=OFF \
        -DKOVA_BUILD_TOOLS=ON -DKOVA_BUILD_BENCH=OFF -DKOVA_BUILD_JAVA=OFF >"$out.native.log" 2>&1 ||
        { tail -n 40 "$out.native.log"; exit 1; }
    cmake --build "$out/native" -j "$jobs" --target KovaFastTrack kova >>"$out.native.log" 2>&1 ||
        { tail -n 40 "$out.native.log"; exit 1; }
    echo "== studio: browser tests (headless Chromium)"
    # Bounded, so a browser that hangs fails the stage instead of stalling it.
    timeout --kill-after=10 600 "$python" studio/tests/browser_test.py --site "$site" --artifacts "$out/test" \
        --library "$out/native/libKovaFastTrack.so" --kova "$out/native/tools/kova"
    ;;
serve)
    mkdir -p "$out"
    build
    exec "$python" studio/serve.py "$site" "${KOVA_STUDIO_PORT:-8780}"
    ;;
*)
    echo "usage: scripts/studio.sh [--build | --test]" >&2
    exit 2
    ;;
esac
