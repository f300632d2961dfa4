#!/usr/bin/env bash
# Reads the built library and holds it to what its users rely on; one function a test.
#
#     elf.sh TEST LIBRARY [ARGUMENT...]
#
# `elf.sh exported LIBRARY` prints the exported symbols, sorted: the form of exports-32.txt and
# exports-64.txt. `elf.sh described LIBRARY` prints the types and functions that users see, as abidw
# reads them from the debug information: the form of types-32.abi.gz and types-64.abi.gz.
set -euo pipefail
export LC_ALL=C

top=$(cd "$(dirname "$0")/../.." && pwd -P)  # as the debug information spells it
library=$2
readelf --file-header "$library" >/dev/null  # what cannot be read lacks every bad thing

# Prints what the dynamic section says under tag $1.
dynamic() {
    readelf --dynamic --wide "$library" | sed -n "s/^ *0x[0-9a-f]* ($1) *//p"
}

# Fails with the text $1 unless the command that follows succeeds.
claim() {
    local text=$1
    shift
    "$@" >/dev/null || {
        echo "$(basename "$library"): $text"
        return 1
    }
}

# Fails with the text $1 and the lines $2 unless there are none.
claim_none() { claim "$1 ${2//$'\n'/ }" [ -z "$2" ]; }

has_dynamic_flag() { dynamic FLAGS_1 | grep -w "$1"; }
lacks_dynamic_tag() { [ -z "$(dynamic "$1")" ]; }

# Every symbol but the instantiations of the standard library's templates: those are copies that
# any program may carry, and which of them a compiler leaves behind is its own business.
exported() {
    nm --dynamic --defined-only --without-symbol-versions --format=posix "$library" |
        awk '!/^_Z(N|NK|TI|TS|TV|TT)?St/ && !/^_Z(N|NK)9__gnu_cxx/ { print $1 }' | sort
}

exports_are_the_listed_ones() {
    if ! exported | diff "$1" - >exports.diff; then
        echo "exported symbols: < listed in $(basename "$1"), > found"
        sed -n '/^[<>]/p' exports.diff | c++filt
        return 1
    fi
    wc -l <"$1"
}

# The packages tell since which version a symbol has been there, for each symbol of $1.
package_symbols_are_the_listed_ones() {
    sed -n 's/^ \([^ (]*\)@Base .*/\1/p' "$2" | diff "$1" -
}

public_headers() { find "$top/kel" \( -name '*.h' -o -name '*.inc' \) ! -path '*/internal/*' | sort; }

# A type that no public header defines is the library's own business.
described() {
    local header headers=()
    for header in $(public_headers); do
        headers+=(--header-file "$header")
    done
    abidw --no-show-locs --no-corpus-path --no-comp-dir-path --type-id-style hash \
        --drop-private-types --exported-interfaces-only "${headers[@]}" "$library" | sed "s|path='$top/|path='|"
}

# abidiff tells what differs between the baseline $1 and the library, harmless or not.
types_are_those_of_the_baseline() {
    gzip -dc "$1" >baseline.abi
    described >described.abi
    abidiff --harmless --no-default-suppression baseline.abi described.abi
    echo "$(sed -n "s/^.*<class-decl \(name='[^']*' size-in-bits\).*/\1/p" described.abi | sort -u | wc -l) classes"
}

# The file $1 says how many words each table of virtual operations has: two more than operations, and
# several of such tables in a row for a class with a virtual base.
virtual_tables_have_their_length() {
    local bytes=$(($2 / 8)) name size
    nm --dynamic --defined-only --format=posix "$library" | sed -n 's/^_ZTV\([^ ]*\) .* \([0-9a-f]*\)$/\1 \2/p' |
        while read -r name size; do
            echo "$((0x$size / bytes)) $(c++filt --types "$name")"
        done | sort -k 2 | diff "$1" -
    wc -l <"$1"
}

# Each class of a public header is named in $1, whose assertions the compiler holds.
classes_have_their_layout_asserted() {
    local class classes
    # shellcheck disable=SC2046  # a list of words
    classes=$(sed -nE '/##/d; s/^ *(class|struct) KEL_API ([A-Z_]+(\("[a-z]+"\))? )?(KEL[A-Za-z]+::)?([A-Za-z_]+).*/\5/p' \
        $(public_headers))
    for class in $classes; do
        claim "$class has no assertion in $(basename "$1")" grep -E "^SIZE\(([A-Za-z_]+::)?$class," "$1"
    done
    echo "$(wc -w <<<"$classes") classes"
}

soname_carries_the_major_version() {
    claim "SONAME is not libkel.so.1" grep -Fx "Library soname: [libkel.so.1]" <(dynamic SONAME)
}

needs_only_the_c_and_cpp_libraries() {
    claim_none "also needs" \
        "$(dynamic NEEDED | grep -vE '\[(libc|libm|libgcc_s|libstdc\+\+|ld-linux[-a-z0-9]*)\.so' || true)"
}

code_has_no_relocations() {
    claim "has text relocations" lacks_dynamic_tag TEXTREL
}

carries_no_run_path() {
    claim "has an RPATH" lacks_dynamic_tag RPATH
    claim "has a RUNPATH" lacks_dynamic_tag RUNPATH
}

is_never_unloaded() {
    claim "lacks the flag NODELETE" has_dynamic_flag NODELETE
}

is_bound_when_loaded() {
    claim "lacks the flag NOW" has_dynamic_flag NOW
}

relocated_data_becomes_read_only() {
    claim "has no RELRO segment" grep -w GNU_RELRO <(readelf --segments --wide "$library")
}

stack_is_not_executable() {
    claim "has an executable stack" grep -E 'GNU_STACK .* RW +0x' <(readelf --segments --wide "$library")
}

no_segment_is_writable_and_executable() {
    claim_none "has writable and executable segments:" \
        "$(readelf --segments --wide "$library" | grep -E 'LOAD .* RWE ' || true)"
}

stack_is_guarded() {
    claim "does not use stack canaries" grep -wE '__stack_chk_fail(_local)?' <(nm --dynamic --undefined-only "$library")
}

calls_are_fortified() {
    claim "calls no fortified function" grep -E '__[a-z]+_chk' <(nm --dynamic --undefined-only "$library")
}

# What the library takes from the C library is interposed by the test program $1, so that tests can
# make it fail, or is listed in $2 with the reason why not.
calls_have_a_seam_or_a_reason() {
    local calls seams reasons
    calls=$(nm --dynamic --undefined-only --format=posix "$library" | sed -n 's/^\(.*\)@GLIBC_.*/\1/p' | sort -u)
    seams=$(nm --dynamic --defined-only --format=posix "$1" | cut -d' ' -f1 | sort -u)
    reasons=$(cut -d' ' -f1 "$2" | sort)
    claim_none "has calls with neither seam nor reason" \
        "$(comm -23 <(echo "$calls") <(echo "$seams") | comm -23 - <(echo "$reasons"))"
    claim_none "has a seam and a reason for" "$(comm -12 <(echo "$seams") <(echo "$reasons"))"
    echo "$(wc -l <<<"$calls") calls, $(wc -l <<<"$reasons") reasons"
}

# The build tool tells how it compiles: every unit of the library, with every flag.
units_are_compiled_hardened() {
    local build=$1 commands flag
    shift
    commands=$(ninja -C "$build" -t commands "$(basename "$(readlink -f "$library")")" | grep -E ' -c [^ ]*/kel/[a-z_/]+\.cpp$')
    for flag in "$@"; do
        claim_none "compiled without $flag:" "$(grep -v -e " $flag " <<<"$commands" | sed 's/.* //')"
    done
    echo "$(wc -l <<<"$commands") units, $# flags"
}

# The first $1 object files that follow are the units with a static initialiser, the rest have none.
only_the_listed_units_have_initialisers() {
    local expected=$1 unit has
    shift
    for unit in "$@"; do
        has=$(readelf --sections --wide "$unit" | grep -c -m 1 '\.init_array' || true)
        claim "$(basename "$unit" .o) has $has initialisers" [ "$has" -eq $((expected > 0)) ]
        expected=$((expected - (expected > 0)))
    done
    echo "$# units"
}

"$1" "${@:3}"
