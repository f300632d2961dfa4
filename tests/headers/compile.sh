#!/usr/bin/env bash
# Compiles one header alone, and twice over, for each standard; any warning fails.
#
#     compile.sh HEADER COMPILER OPTION... -- STANDARD...
set -euo pipefail

header=$1
shift
compile=()
while [ "$1" != -- ]; do
    compile+=("$1")
    shift
done
shift

warnings=(-Wall -Wextra -Wpedantic -Wshadow -Wold-style-cast -Werror)
if [ "${compile[0]}" = clang++ ]; then
    warnings+=(-Wthread-safety)
fi

for standard in "$@"; do
    echo "$header as $standard"
    printf '#include <%s>\n#include <%s>\n' "$header" "$header" |
        "${compile[@]}" "-std=$standard" "${warnings[@]}" -fsyntax-only -x c++ -
done
