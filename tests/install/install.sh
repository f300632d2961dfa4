#!/usr/bin/env bash
# Installs the library and uses the installed tree; one function a test.
#
#     install.sh TEST BUILD_DIR WORD_SIZE COMPILER [FLAG...]
#
# The program is the first C++ block of README.md, what it has to print the first text block.
set -euo pipefail

test=$1
build=$2
bits=$3
compiler=$4
shift 4
flags=("-m$bits" "$@")

here=$(cd "$(dirname "$0")" && pwd)
top=$here/../..
work=$build/tests/install
root=$work/root
program=$work/program.cpp
expected=$work/expected.txt

# Prints the first block of README.md that is fenced as language $1.
readme_block() {
    awk -v fence="\`\`\`$1" '
        inside && $0 == "```" { exit }
        inside { print }
        $0 == fence { inside = 1 }' "$top/README.md"
}

tree() {
    rm -rf "$root"
    cmake --install "$build" --prefix "$root"
    readme_block cpp >"$program"
    readme_block text >"$expected"
    test -s "$program"
    test -s "$expected"
}

headers_are_the_public_ones() {
    local ours=$work/headers.txt
    { (cd "$top" && find kel \( -name '*.h' -o -name '*.inc' \) ! -path '*/internal/*') && echo kel/version.h; } |
        sort >"$ours"
    (cd "$root/include" && find . -type f) | sed 's|^\./||' | sort | diff "$ours" -
}

configure_consumer() {
    rm -rf "$1"
    cmake -S "$here/consumer" -B "$1" -G Ninja -DCMAKE_BUILD_TYPE=Release -DCONSUMER_SOURCE="$program" \
        -DCMAKE_PREFIX_PATH="$root" -DCMAKE_CXX_COMPILER="$compiler" -DCMAKE_CXX_FLAGS="$2"
}

cmake_package_builds_the_readme_program() {
    configure_consumer "$work/cmake" "${flags[*]}"
    cmake --build "$work/cmake"
    "$work/cmake/consumer" | diff "$expected" -
}

cmake_package_refuses_the_other_word_size() {
    if configure_consumer "$work/other" "-m$((96 - bits))" >"$work/other.log" 2>&1; then
        echo "a $((96 - bits))-bit project accepted the $bits-bit library"
        return 1
    fi
    grep "version: 1.* (${bits}bit)" "$work/other.log"
}

# Builds and runs the program with what kel.pc of the tree $1 says. Tests run side by side, so each
# has a program file of its own.
build_with_pkg_config() {
    local pc built=$work/$test
    pc=$(dirname "$(find "$1" -name kel.pc)")
    export PKG_CONFIG_PATH=$pc
    pkg-config --modversion kel
    # shellcheck disable=SC2046  # the flags are words
    "$compiler" "${flags[@]}" "$program" $(pkg-config --cflags --libs kel) -o "$built"
    LD_LIBRARY_PATH=$(pkg-config --variable=libdir kel) "$built" | diff "$expected" -
}

pkg_config_builds_the_readme_program() { build_with_pkg_config "$root"; }

pkg_config_follows_a_moved_tree() {
    rm -rf "$work/moved"
    cp -a "$root" "$work/moved"
    build_with_pkg_config "$work/moved"
    pkg-config --cflags --libs kel | tee "$work/moved.flags"
    ! grep -F "$root" "$work/moved.flags"
}

"$test"
