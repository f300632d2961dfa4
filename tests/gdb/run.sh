#!/usr/bin/env bash
# What gdb shows of the library's objects.
#
#     run.sh printers PROGRAM SCRIPT EXPECTED   the objects of PROGRAM, with the printers of SCRIPT sourced
#     run.sh installed PROGRAM BUILD            gdb finds the printers of an installed library by itself
#     run.sh absent SCRIPT                      without a program the commands say so
#
# Exit status 77 where the system forbids one program to watch another.
set -euo pipefail
export LC_ALL=C.UTF-8
unset DEBUG_STATIC DEBUGINFOD_URLS

folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
here=$(cd "$(dirname "$0")" && pwd)

debug() { gdb -nx -batch "$@" </dev/null >"$folder/output" 2>"$folder/errors" || true; }

forbidden() {
    debug -ex run "$1"
    grep -qiE 'ptrace: Operation not permitted|Could not trace the inferior' "$folder/output" "$folder/errors"
}

# Addresses and process numbers differ from run to run.
mask() {
    sed -nE -e '/^==/,$p' <"$folder/output" |
        sed -E -e 's/(user |over |at |@|\()0x[0-9a-f]{6,}/\10xADDRESS/g' -e 's/^0x[0-9a-f]+/0xADDRESS/' \
            -e 's/LWP [0-9]+/LWP N/' -e '/^\[Inferior/d'
}

printers() {
    debug -ex 'set auto-load no' -ex "source $2" -x "$here/look.gdb" "$1"
    if grep -q 'Traceback\|Python Exception' "$folder/output" "$folder/errors"; then
        cat "$folder/output" "$folder/errors"
        exit 1
    fi
    mask | diff -u "$3" - || {
        cat "$folder/errors"
        exit 1
    }
    echo "gdb: $(grep -c '^\$' "$3") objects and $(grep -c '^kel ' "$here/look.gdb") lists are shown as they should be"
}

# The library is the installed one, whatever the program was linked with.
installed() {
    local prefix=$folder/tree library
    cmake --install "$2" --prefix "$prefix" >/dev/null
    library=$(find "$prefix" -name 'libkel.so.*.*.*' ! -name '*-gdb.py' -type f)
    test -e "$prefix/share/gdb/auto-load$library-gdb.py"
    debug -iex "set auto-load safe-path $prefix" -iex "set auto-load scripts-directory $prefix/share/gdb/auto-load" \
        -ex "set environment LD_LIBRARY_PATH ${library%/*}" -ex 'break look' -ex run -ex up -ex 'print name' "$1"
    grep -q ' = "vesta"$' "$folder/output" || {
        cat "$folder/output" "$folder/errors"
        exit 1
    }
    echo "gdb: the printers are loaded with the library"
}

absent() {
    debug -ex 'set auto-load no' -ex "source $1" -ex 'kel threads' -ex 'kel locals' -ex 'kel exceptions'
    test "$(sort -u "$folder/output")" = 'The debug symbols of the library are not loaded.'
    test ! -s "$folder/errors"
}

case $1 in
    printers | installed)
        if forbidden "$2"; then
            echo "gdb: skipped, this system forbids to watch a program"
            exit 77
        fi
        ;;
esac
"$@"
