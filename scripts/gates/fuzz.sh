# shellcheck shell=bash
# What bytes from strangers can do: each target of fuzz/ is driven by libFuzzer, with address and
# undefined-behaviour sanitizers, and compares the library with a second reading of the same bytes.

fuzz() {
    local limit=-max_total_time=90 goal=20000000 figures runs status=0
    if [ "${1:-}" = release ]; then
        limit=-runs=25000000
        goal=200000000
    fi
    cmake --preset fuzz >build/fuzz.configure.log 2>&1 || {
        cat build/fuzz.configure.log >&2
        return 1
    }
    cmake --build --preset fuzz --target fuzz_targets --parallel "$(nproc)" || return 1
    figures=$(fuzz/run.sh build/fuzz "$limit") || status=1
    runs=${figures##*; }
    runs=${runs%% *}
    if [ "$runs" -lt "$goal" ]; then
        status=1
        figures+=", below $goal runs"
    fi
    echo "fuzz: $figures"
    return $status
}
