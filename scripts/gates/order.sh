# shellcheck shell=bash
# Whether the library comes to life, and goes, in the same order however it is compiled.

# Builds the library and the two programs that show the order: compiler $1, optimisation $2, folder $3.
build_to_show_order() {
    {
        cmake -S . -B "$3" -G Ninja -DKEL_WORD_SIZE=32 -DCMAKE_CXX_COMPILER="$1" -DCMAKE_BUILD_TYPE=Debug \
            -DCMAKE_CXX_FLAGS_DEBUG="$2" -DKEL_BUILD_EXAMPLES=OFF &&
            cmake --build "$3" --target startup_describe startup_order --parallel "$(nproc)"
    } >"$3.log" 2>&1 || {
        cat "$3.log" >&2
        return 1
    }
}

# The report of the exception descriptions and the list of what is built and destroyed, by the programs
# of folder $1. An address becomes the number of its first mention, so that it still tells two things
# from each other.
shown_order() {
    { DEBUG_STATIC=1 "$1/startup_describe" && env -u DEBUG_STATIC "$1/startup_order"; } </dev/null |
        awk '{
            shown = ""
            while (match($0, /0x[0-9a-f]+/)) {
                address = substr($0, RSTART, RLENGTH)
                if (!(address in number)) number[address] = ++addresses
                shown = shown substr($0, 1, RSTART - 1) "address " number[address]
                $0 = substr($0, RSTART + RLENGTH)
            }
            print shown $0
        }'
}

order() {
    local compiler level folder first='' builds=0 blocks
    mkdir -p build/order
    for compiler in g++ clang++; do
        for level in -O0 -O2 -O3; do
            folder=build/order/$compiler$level
            build_to_show_order "$compiler" "$level" "$folder" || return 1
            shown_order "$folder/tests/startup" >"$folder.txt" || return 1
            [ -n "$first" ] || first=$folder.txt
            diff "$first" "$folder.txt" || {
                echo "order: $compiler $level shows another order than ${first#build/order/}"
                return 1
            }
            builds=$((builds + 1))
        done
    done
    blocks=$(grep -c '^Statically initializing class: ' "$first")
    echo "order: $blocks blocks of the trace and $(grep -cE '^(built|destroyed) ' "$first") constructions and" \
        "destructions, identical in $builds builds"
    [ "$blocks" -eq 41 ] && [ "$builds" -eq 6 ]
}
