#!/usr/bin/env bash
# Lets libFuzzer drive the targets of a build, as many at once as there are processors, and prints the
# runs of each and of all, and the findings.
#
#     fuzz/run.sh build/fuzz -max_total_time=60               all of them, a minute each
#     fuzz/run.sh build/fuzz -runs=1000000 scalar address     those that are named
#
# A target stops at its first finding. What it leaves stays in the build: in fuzz/findings the input that
# ended it, in fuzz/logs its output, in fuzz/found the inputs with which the next run goes on.
#
#     build/fuzz/fuzz/fuzz_scalar build/fuzz/fuzz/findings/scalar/crash-...    runs one of them again
#
# Exit status 0 when there is no finding.
set -euo pipefail
sources=$(cd "$(dirname "$0")" && pwd)
build=$(cd "$1/fuzz" && pwd)
limit=$2
shift 2
targets=("$@")
[ $# -gt 0 ] || mapfile -t targets < <(find "$sources/corpus" -mindepth 1 -maxdepth 1 -printf '%f\n' | sort)

# The programs bring their own options; those of another gate would slow them down.
unset ASAN_OPTIONS UBSAN_OPTIONS

# Inputs that are long enough to lead everywhere, and no longer.
longest_input() {
    case $1 in
        dictionary) echo 32 ;;
        exception) echo 96 ;;
        *) echo 64 ;;
    esac
}

drive() {
    local target=$1 dictionary=$sources/dict/$1.dict options=()
    [ ! -e "$dictionary" ] || options=("-dict=$dictionary")
    rm -rf "$build/findings/$target"
    mkdir -p "$build/findings/$target" "$build/found/$target" "$build/logs"
    "$build/fuzz_$target" "$limit" "${options[@]}" "-max_len=$(longest_input "$target")" -entropic=0 \
        -timeout=20 -print_final_stats=1 "-artifact_prefix=$build/findings/$target/" \
        "$build/found/$target" "$sources/corpus/$target" >"$build/logs/$target.log" 2>&1 </dev/null &&
        return
    echo "$target: a finding, see $build/logs/$target.log" >&2
    touch "$build/findings/$target/stopped"
}

# The runs of target $1, those up to a finding included.
runs_of() {
    sed -n -e 's/^stat::number_of_executed_units: //p' -e 's/^#\([0-9]*\).*/\1/p' "$build/logs/$1.log" | tail -n 1
}

for target in "${targets[@]}"; do
    while [ "$(jobs -r | wc -l)" -ge "$(nproc)" ]; do
        wait -n
    done
    drive "$target" &
done
wait

all=0 findings=0 figures=()
for target in "${targets[@]}"; do
    runs=$(runs_of "$target")
    all=$((all + ${runs:-0}))
    [ ! -e "$build/findings/$target/stopped" ] || findings=$((findings + 1))
    figures+=("$target ${runs:-0}")
done
printf '%s; %d runs in all, %d findings\n' "$(printf '%s, ' "${figures[@]}" | sed 's/, $//')" "$all" "$findings"
[ "$findings" -eq 0 ]
