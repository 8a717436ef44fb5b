#!/usr/bin/env bash
# The exported names of liborvel.so equal the list kept in tests/exports.txt.
#   exports_test.sh LIBRARY [--update]
set -euo pipefail
list="$(dirname "$0")/exports.txt"
names() { nm -D --defined-only -C "$1" | cut -d' ' -f3- | grep -v '^ORVEL_0$' | sed 's/@@ORVEL_0$//' | LC_ALL=C sort -u; }
if [ "${2:-}" = --update ]; then
    names "$1" >"$list"
else
    diff -u "$list" <(names "$1")
    echo "$(wc -l <"$list") exported names, all as listed"
fi
