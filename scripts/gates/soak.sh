# shellcheck shell=bash
# Connections and threads in their hundreds of thousands while calls fail, and what they leave behind.
soak() {
    local seconds=45 least=100000
    [ "${1:-}" != release ] || { seconds=480; least=1000000; }
    cmake --preset x86 >build/x86.configure.log
    cmake --build --preset x86 --target kel_soak --parallel "$(nproc)"
    build/x86/tests/faults/soak/kel_soak --seconds "$seconds" --connections "$least" --threads "$least" \
        --resident 256 </dev/null
}
