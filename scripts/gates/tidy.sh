# shellcheck shell=bash
# What clang-tidy says about the library and the example. It reads how they are compiled with clang++,
# whose options it knows, and without a compiler launcher, which it would take for the compiler.
tidy() {
    local units findings
    env -u CMAKE_CXX_COMPILER_LAUNCHER cmake --preset clang -B build/tidy -DKEL_BUILD_TESTS=OFF >/dev/null
    mapfile -t units < <(find kel examples -name '*.cpp' | sort)
    printf '%s\0' "${units[@]}" |
        xargs -0 -n 4 -P "$(nproc)" clang-tidy --quiet -p build/tidy >build/tidy.log 2>/dev/null || true
    findings=$(grep -cE '(warning|error): ' build/tidy.log || true)
    grep -E '(warning|error): ' build/tidy.log || true
    echo "tidy: $findings findings in ${#units[@]} files"
    [ "$findings" -eq 0 ]
}
