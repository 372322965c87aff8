#!/usr/bin/env bash
# The dynamic symbol table of a library must be exactly the exported interface
# listed (demangled, one per line) in the expectation file; anything more is a
# leak of internals, anything less a lost export.
#   check_exports.sh LIBRARY EXPECTED
set -euo pipefail
lib=$1 expected=$2
actual=$(nm -D --defined-only "$lib" | awk 'NF == 3 {print $3}' | sed 's/@.*//' | c++filt \
         | grep -v -x -E 'LIB[A-Z]+_[0-9]+' | LC_ALL=C sort -u)
want=$(grep -v -E '^\s*(#|$)' "$expected" | LC_ALL=C sort -u)
if [ "$actual" != "$want" ]; then
  echo "exported symbols of $(basename "$lib") differ from $(basename "$expected") (< expected, > actual):"
  diff <(echo "$want") <(echo "$actual") || true
  exit 1
fi
echo "$(echo "$actual" | wc -l) exported symbols, as expected"
