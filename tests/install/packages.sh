#!/usr/bin/env bash
# Builds and runs README's program against the packages that are installed on this system, for both
# architectures in each of the ways.
#
#     packages.sh README
set -euo pipefail

readme=$1
here=$(cd "$(dirname "$0")" && pwd)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# shellcheck source=tests/install/readme.sh
. "$here/readme.sh"
readme_block cpp "$readme" >"$work/program.cpp"
readme_block text "$readme" >"$work/expected.txt"
test -s "$work/expected.txt"

# Runs the program $1 and says in the words $2 what has been shown.
check() {
    "$1" | diff "$work/expected.txt" -
    echo "packages: $2"
}

# Runs a command that says something only when it fails.
quietly() {
    "$@" >"$work/log" 2>&1 || {
        cat "$work/log"
        return 1
    }
}

# Asks CMake for kel::$3 as a $1-bit program; the package has to be that of the folder $2.
with_cmake() {
    local build=$work/$1-$3
    quietly cmake -S "$here/find_package" -B "$build" -G Ninja -DCONSUMER_SOURCE="$work/program.cpp" \
        -DCMAKE_BUILD_TYPE=Release -DCMAKE_CXX_FLAGS="-m$1" -DCONSUMER_LIBRARY="kel::$3"
    quietly cmake --build "$build"
    grep -q "^kel_DIR:PATH=/usr/lib/$2/cmake/kel\$" "$build/CMakeCache.txt"
    check "$build/consumer" "$1 bit, find_package, kel::$3"
}

for bits in 32:i386-linux-gnu 64:x86_64-linux-gnu; do
    folder=${bits#*:}
    bits=${bits%:*}
    with_cmake "$bits" "$folder" kel
    with_cmake "$bits" "$folder" kel_static
    for kind in shared static; do
        export PKG_CONFIG_LIBDIR=/usr/lib/$folder/pkgconfig
        quietly "$here/pkg_config/build.sh" $kind "$work/program" "$work/program.cpp" g++ "-m$bits"
        check "$work/program" "$bits bit, pkg-config, $kind"
        quietly "$here/plain/build.sh" $kind "$work/program" "$work/program.cpp" /usr "/usr/lib/$folder" g++ "-m$bits"
        check "$work/program" "$bits bit, plain flags, $kind"
    done
done
