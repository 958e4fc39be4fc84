#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Compares the dynamic symbols a shared library defines with the expected list.
# Usage: check_exports.sh LIBRARY EXPECTED_LIST
set -euo pipefail
lib=$1
list=$2
nm_tool=${NM:-nm}
actual=$(mktemp)
expected=$(mktemp)
trap 'rm -f "$actual" "$expected"' EXIT
# Linker-made markers are not ours to list, nor the one-definition markers AddressSanitizer adds
# beside each exported global in an instrumented build.
"$nm_tool" -D --defined-only "$lib" | awk '{print $NF}' \
    | grep -v -E '^(_init|_fini|_edata|_end|__bss_start)$|^__odr_asan[._]' | sort -u >"$actual"
grep -v -E '^\s*(#|$)' "$list" | sort -u >"$expected"
if diff -u "$expected" "$actual" >/dev/null; then
    echo "exports: $(wc -l <"$actual") symbols, exactly as listed"
    exit 0
fi
echo "exports differ from $list ('-' missing from the library, '+' exported but not listed):"
diff -u "$expected" "$actual" | grep -E '^[-+][^-+]' || true
exit 1
