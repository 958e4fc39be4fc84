#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Checks that the API reference names every exported symbol: each C or C++ function and global
# of the export list must be a documented member in Doxygen's XML index, and each Java entry
# point a native method of the Java class (whose comments javac checks with -Xdoclint:all).
# Usage: check_api_docs.sh DOXYGEN_XML_INDEX EXPORT_LIST JAVA_CLASS_SOURCE
set -euo pipefail
index=$1
list=$2
java=$3
documented=$(mktemp)
trap 'rm -f "$documented"' EXIT
# <member refid="..." kind="function"><name>kova_init</name></member>
grep -oE '<member refid="[^"]*" kind="(function|variable)"><name>[^<]+</name>' "$index" |
    sed -E 's/.*<name>([^<]+)<\/name>/\1/' | sort -u >"$documented"
missing=0
total=0
while read -r symbol; do
    total=$((total + 1))
    case $symbol in
    Java_com_corvane_audio_Kova_*)
        # JNI encodes an underscore in the Java name as _1.
        method=${symbol#Java_com_corvane_audio_Kova_}
        method=${method//_1/_}
        grep -qE "native [a-z]+ $method\(" "$java" || { echo "not in the Java class: $symbol"; missing=1; }
        ;;
    JNI_OnLoad | JNI_OnUnload) ;; # called by the VM; described on the main page
    *)
        name=$symbol
        # C++ linkage: _Z<length><name><parameters>
        if [[ $symbol =~ ^_Z([0-9]+)(.*)$ ]]; then
            name=${BASH_REMATCH[2]:0:${BASH_REMATCH[1]}}
        fi
        grep -qxF "$name" "$documented" || { echo "not in the API reference: $symbol"; missing=1; }
        ;;
    esac
done < <(grep -v -E '^\s*(#|$)' "$list")
[ "$missing" = 0 ] || exit 1
echo "api docs: all $total exported symbols documented"
