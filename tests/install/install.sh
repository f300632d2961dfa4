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

# shellcheck source=tests/install/readme.sh
. "$here/readme.sh"

tree() {
    rm -rf "$root"
    cmake --install "$build" --prefix "$root"
    readme_block cpp "$top/README.md" >"$program"
    readme_block text "$top/README.md" >"$expected"
    test -s "$program"
    test -s "$expected"
}

headers_are_the_public_ones() {
    local ours=$work/headers.txt
    { (cd "$top" && find kel \( -name '*.h' -o -name '*.inc' \) ! -path '*/internal/*') && echo kel/version.h; } |
        sort >"$ours"
    (cd "$root/include" && find . -type f) | sed 's|^\./||' | sort | diff "$ours" -
}

# Builds the CMake project in the folder $1 of this one with the options that follow, and checks what
# its program prints. Tests run side by side, so each has a build folder of its own.
configure() {
    rm -rf "${work:?}/$test"
    cmake -S "$here/$1" -B "$work/$test" -G Ninja -DCMAKE_BUILD_TYPE=Release -DCONSUMER_SOURCE="$program" \
        -DCMAKE_CXX_COMPILER="$compiler" "${@:2}"
}

build() {
    configure "$1" -DCMAKE_CXX_FLAGS="${flags[*]}" "${@:2}"
    cmake --build "$work/$test"
    check "$work/$test/consumer"
}

# Fails unless the program $1 prints what README says. The environment may name a library folder.
check() { LD_LIBRARY_PATH=${2:-} "$1" | diff "$expected" -; }

# Fails when the program $1 needs the shared library.
contains_the_library() {
    if readelf --dynamic --wide "$1" | grep -F 'libkel.so'; then
        echo "$(basename "$1") needs the shared library"
        return 1
    fi
}

library_folder() { dirname "$(find "$root" -name libkel.so)"; }

# ---- find_package ----

cmake_package_builds_the_readme_program() {
    build find_package -DCMAKE_PREFIX_PATH="$root" -DCONSUMER_LIBRARY=kel::kel
}

cmake_package_links_the_archive() {
    build find_package -DCMAKE_PREFIX_PATH="$root" -DCONSUMER_LIBRARY=kel::kel_static
    contains_the_library "$work/$test/consumer"
}

# The library asks to stay loaded; a plug-in that contains it does not lose that.
archive_makes_a_plug_in_that_stays() {
    build find_package -DCMAKE_PREFIX_PATH="$root" -DCONSUMER_LIBRARY=kel::kel_static -DCONSUMER_PLUG_IN=ON
    contains_the_library "$work/$test/libplug_in.so"
    readelf --dynamic --wide "$work/$test/libplug_in.so" | grep NODELETE
}

build_folder_is_a_cmake_package() {
    build find_package -Dkel_DIR="$build" -DCONSUMER_LIBRARY=kel::kel
    grep -F "kel_DIR:UNINITIALIZED=$build" "$work/$test/CMakeCache.txt" ||
        grep -F "kel_DIR:PATH=$build" "$work/$test/CMakeCache.txt"
}

# Fails unless find_package refuses the installed tree with the text $1, given the options that follow.
refuses() {
    if configure find_package -DCMAKE_PREFIX_PATH="$root" -DCONSUMER_LIBRARY=kel::kel "${@:2}" >"$work/$test.log" 2>&1; then
        echo "the installed library was accepted"
        return 1
    fi
    grep "$1" "$work/$test.log"
}

cmake_package_refuses_the_other_word_size() {
    refuses "version: 1.* (${bits}bit)" -DCMAKE_CXX_FLAGS="-m$((96 - bits))"
}

# Makes the folder $1 a CMake package like $package, but for programs of $2 bits and with the configuration $3.
stand_in() {
    mkdir -p "$1"
    echo "$3" >"$1/kel-config.cmake"
    sed "s/\"$((bits / 8))\"/\"$(($2 / 8))\"/" "$package/kel-config-version.cmake" >"$1/kel-config-version.cmake"
}

# Both word sizes in one prefix, in the folders that README gives them; the other one cannot be used.
cmake_package_of_the_right_word_size_is_found() {
    local two=$work/two package own=lib other=lib/x86_64-linux-gnu
    [ "$bits" -eq 32 ] || { own=lib/x86_64-linux-gnu other=lib; }
    package=$(dirname "$(find "$root" -name kel-config.cmake)")
    rm -rf "$two"
    stand_in "$two/$own/cmake/kel" "$bits" "include($package/kel-config.cmake)"
    stand_in "$two/$other/cmake/kel" $((96 - bits)) 'message(FATAL_ERROR "the other word size was taken")'
    build find_package -DCMAKE_PREFIX_PATH="$two" -DCONSUMER_LIBRARY=kel::kel
}

cmake_package_refuses_another_major_version() {
    refuses 'version: 1' -DCMAKE_CXX_FLAGS="${flags[*]}" -DCONSUMER_VERSION=2.0
}

# ---- pkg-config ----

# Builds and runs the program with what kel.pc of the tree $2 says, as a $1 one.
build_with_pkg_config() {
    local built=$work/$test
    PKG_CONFIG_PATH=$(dirname "$(find "$2" -name kel.pc)")
    export PKG_CONFIG_PATH
    pkg-config --modversion kel
    "$here/pkg_config/build.sh" "$1" "$built" "$program" "$compiler" "${flags[@]}"
    check "$built" "$(pkg-config --variable=libdir kel)"
}

pkg_config_builds_the_readme_program() { build_with_pkg_config shared "$root"; }

pkg_config_links_the_archive() {
    build_with_pkg_config static "$root"
    contains_the_library "$work/$test"
}

pkg_config_follows_a_moved_tree() {
    rm -rf "$work/moved"
    cp -a "$root" "$work/moved"
    build_with_pkg_config shared "$work/moved"
    pkg-config --cflags --libs kel | tee "$work/moved.flags"
    ! grep -F "$root" "$work/moved.flags"
}

# ---- plain flags ----

build_plainly() {
    local folder
    folder=$(library_folder)
    "$here/plain/build.sh" "$1" "$work/$test" "$program" "$root" "$folder" "$compiler" "${flags[@]}"
    check "$work/$test" "$folder"
}

plain_flags_build_the_readme_program() { build_plainly shared; }

plain_flags_link_the_archive() {
    build_plainly static
    contains_the_library "$work/$test"
}

# ---- a part of another project ----

build_as_a_part() {
    build subdirectory -DKEL_SOURCE_DIR="$top" "$@"
}

# The project decides: word size, what is built and tested, what is installed.
subdirectory_is_part_of_another_project() {
    build_as_a_part -DCONSUMER_LIBRARY=kel::kel
    cmake --install "$work/$test" --prefix "$work/$test.root"
    (cd "$work/$test.root" && find . -type f) | diff <(echo ./bin/consumer) -
    (cd "$work/$test" && ctest -N) | grep 'Total Tests: 1$'
    [ ! -e "$work/$test/kel/examples" ]
    [ ! -e "$work/$test/kel/libkel.a" ]
}

subdirectory_can_be_fetched() {
    build_as_a_part -DCONSUMER_LIBRARY=kel::kel -DBY_FETCHING=ON
}

subdirectory_links_the_archive() {
    build_as_a_part -DCONSUMER_LIBRARY=kel::kel_static
    contains_the_library "$work/$test/consumer"
}

subdirectory_refuses_a_word_size_that_is_not_the_projects() {
    if configure subdirectory -DKEL_SOURCE_DIR="$top" -DCONSUMER_LIBRARY=kel::kel -DKEL_WORD_SIZE=$((96 - bits)) \
        -DCMAKE_CXX_FLAGS="-m$bits" >"$work/$test.log" 2>&1; then
        echo "a word size of $((96 - bits)) was accepted in a $bits-bit project"
        return 1
    fi
    grep "compiler makes $bits-bit programs" "$work/$test.log"
}

"$test"
