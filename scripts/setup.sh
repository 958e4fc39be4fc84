#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Installs, once, the Debian packages listed in scripts/packages.txt. Safe to run again.
# Entries of the form NAME:ARCH (e.g. android-liblog-dev:arm64) are taken from a foreign
# architecture; that architecture is enabled in dpkg first, once.
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
mapfile -t wanted < <(grep -v -E '^\s*(#|$)' "$here/packages.txt" | sed 's/\s*#.*//; s/\s*$//')
missing=()
for pkg in "${wanted[@]}"; do
    dpkg-query -W -f='${Status}' "$pkg" 2>/dev/null | grep -q 'install ok installed' || missing+=("$pkg")
done
if [ ${#missing[@]} -eq 0 ]; then
    echo "setup: all ${#wanted[@]} packages present"
    exit 0
fi
sudo=""
[ "$(id -u)" -eq 0 ] || sudo="sudo"
native=$(dpkg --print-architecture)
for pkg in "${missing[@]}"; do
    case "$pkg" in
    *:*)
        arch=${pkg##*:}
        if [ "$arch" != "$native" ] && ! dpkg --print-foreign-architectures | grep -qx "$arch"; then
            echo "setup: enabling architecture $arch"
            $sudo dpkg --add-architecture "$arch"
        fi
        ;;
    esac
done
echo "setup: installing ${missing[*]}"
$sudo apt-get update -qq
DEBIAN_FRONTEND=noninteractive $sudo apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
echo "setup: done"
