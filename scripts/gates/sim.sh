# shellcheck shell=bash
# Connections and listeners in a simulated system, against what should happen. A seed that differs is
# printed with both stories; kel_simulation --seed NUMBER repeats it.
sim() {
    local seeds=1000000 seconds=60
    [ "${1:-}" != release ] || { seeds=50000000; seconds=600; }
    cmake --preset x86 >build/x86.configure.log
    cmake --build --preset x86 --target kel_simulation --parallel "$(nproc)"
    build/x86/tests/faults/simulation/kel_simulation --seeds "$seeds" --hours 100 --within "$seconds" \
        --processes "$(nproc)" </dev/null
}
