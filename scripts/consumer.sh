#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Uses the library as a native developer would, from a finished build (default: build):
#   1. installs it into a temporary prefix and checks the SONAME and that nothing points into the
#      build tree;
#   2. builds and runs a separate CMake project that finds it with find_package;
#   3. builds and runs a C program with `pkg-config --cflags --libs KovaFastTrack`;
#   4. compiles the C snippet of README.md exactly as it is shown there;
#   5. builds and runs a CMake project that adds the source tree with add_subdirectory.
# Usage: scripts/consumer.sh [BUILD_DIR]
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
build=$(cd "${1:-$root/build}" && pwd)
jobs=${KOVA_JOBS:-$(nproc)}
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
prefix=$work/prefix
cc=${CC:-cc}
cflags=(-std=c11 -Wall -Wextra -Werror)

echo "== consumer: install into $prefix"
cmake --install "$build" --prefix "$prefix" >"$work/install.log" || { cat "$work/install.log"; exit 1; }
lib=$(find "$prefix" -name 'libKovaFastTrack.so.*.*' -type f)
[ -n "$lib" ] || { echo "no versioned libKovaFastTrack.so installed"; exit 1; }
readelf -d "$lib" | grep -q 'SONAME.*\[libKovaFastTrack\.so\.1\]' ||
    { echo "SONAME is not libKovaFastTrack.so.1"; readelf -d "$lib" | grep SONAME; exit 1; }
if readelf -d "$lib" | grep -E 'R(UN)?PATH' | grep -qF "$build"; then
    echo "installed library has a run path into the build tree"; readelf -d "$lib" | grep PATH; exit 1
fi
[ -f "$prefix/share/java/kova.jar" ] || { echo "share/java/kova.jar missing"; exit 1; }
[ -f "$prefix/share/doc/KovaFastTrack/LICENSE" ] || { echo "LICENSE not installed"; exit 1; }
javap=${JAVA_HOME:+$JAVA_HOME/bin/}javap
"$javap" -cp "$prefix/share/java/kova.jar" com.corvane.audio.Kova | grep -q 'native long init(' ||
    { echo "kova.jar lacks com.corvane.audio.Kova"; exit 1; }

echo "== consumer: find_package(KovaFastTrack)"
cmake -S "$root/tests/consumer/find_package" -B "$work/find_package" -DCMAKE_PREFIX_PATH="$prefix" \
    -DCMAKE_C_FLAGS="${cflags[*]}" >"$work/fp.log" 2>&1 || { cat "$work/fp.log"; exit 1; }
cmake --build "$work/find_package" >>"$work/fp.log" 2>&1 || { cat "$work/fp.log"; exit 1; }
mkdir -p "$work/run-fp"
"$work/find_package/stroke" "$work/run-fp"

echo "== consumer: pkg-config"
export PKG_CONFIG_PATH=$(dirname "$(find "$prefix" -name KovaFastTrack.pc)")
libdir=$(pkg-config --variable=libdir KovaFastTrack)
# shellcheck disable=SC2046 # the flags are meant to be split
"$cc" "${cflags[@]}" -o "$work/stroke-pc" "$root/tests/consumer/stroke.c" \
    $(pkg-config --cflags --libs KovaFastTrack) -Wl,-rpath,"$libdir"
mkdir -p "$work/run-pc"
version=$("$work/stroke-pc" "$work/run-pc" | tee /dev/stderr | sed -n 's/^version //p')
[ "$version" = "$(pkg-config --modversion KovaFastTrack)" ] ||
    { echo "header version $version differs from the package's $(pkg-config --modversion KovaFastTrack)"; exit 1; }

echo "== consumer: the README's C snippet"
# The first ```c block of README.md, as shown there.
awk '/^```c$/ {on = 1; next} on && /^```$/ {exit} on {print}' "$root/README.md" >"$work/readme.c"
[ -s "$work/readme.c" ] || { echo "README.md has no \`\`\`c block"; exit 1; }
# shellcheck disable=SC2046
"$cc" "${cflags[@]}" -o "$work/readme" "$work/readme.c" $(pkg-config --cflags --libs KovaFastTrack) \
    -Wl,-rpath,"$libdir"
echo "README snippet: compiled and linked ($(wc -l <"$work/readme.c") lines)"

echo "== consumer: add_subdirectory"
cmake -S "$root/tests/consumer/add_subdirectory" -B "$work/add_subdirectory" -DKOVA_SOURCE_DIR="$root" \
    -DCMAKE_BUILD_TYPE=RelWithDebInfo -DCMAKE_C_FLAGS="${cflags[*]}" >"$work/as.log" 2>&1 ||
    { cat "$work/as.log"; exit 1; }
cmake --build "$work/add_subdirectory" -j "$jobs" --target stroke >>"$work/as.log" 2>&1 ||
    { tail -n 60 "$work/as.log"; exit 1; }
mkdir -p "$work/run-as"
"$work/add_subdirectory/stroke" "$work/run-as"
echo "== consumer: find_package, pkg-config, README snippet and add_subdirectory all pass"
