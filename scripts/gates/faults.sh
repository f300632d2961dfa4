# shellcheck shell=bash
# Everything that can fail fails: each call into the system in each scenario, and each allocation.
faults() {
    local preset status=0 figures='' tests=
    pass "x86 x86_64" -L '^(fault|oom)$' || status=1
    for preset in x86 x86_64; do
        figures+="; $preset: $(said "$preset" matrix.fault_figures); $(said "$preset" matrix.oom_figures)"
    done
    echo "faults: $tests$figures"
    return $status
}
