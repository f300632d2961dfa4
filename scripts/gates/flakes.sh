# shellcheck shell=bash
# Whether the tests always tell the same.

# Tests wait for what they wait for, and never for time to pass. Prints each call that lets time pass,
# but for the tests of the call itself, those that answer it in virtual time, and polls for what
# another process does that end within 50 ms.
sleeps() {
    grep -rnE '\b(sleep_for|sleep_until|usleep|nanosleep|thrd_sleep)\b|[^A-Za-z_.>"]sleep *\(|\bpoll\((nullptr|NULL|0),|\bselect\(0,' \
        tests examples --include='*.cpp' --include='*.h' |
        grep -vE '^tests/os/time_test\.cpp:|^tests/faults/.*(world|script|Portable::)' |
        grep -vE '\bpoll\(nullptr, 0, ([0-9]|[1-4][0-9]|50)\)' || true
    grep -rnE '^[^#]*\bsleep +[0-9]' tests scripts/test --include='*.sh' --include=test || true
}

# Twenty rounds in all. In the first ones each test is a process of its own, as in every other run; in
# the rest those of a program follow each other, which shows what one leaves behind for the next.
flakes() {
    local rounds=20 fresh=2 round status=0 found ran figures=''
    found=$(sleeps)
    [ -z "$found" ] || echo "$found"
    for ((round = 1; round <= fresh; ++round)); do
        pass x86 --schedule-random || status=1
        figures+="$(passed x86), "
    done
    run_programs x86 none --gtest_shuffle --gtest_repeat=$((rounds - fresh)) || status=1
    echo "flakes: $rounds rounds, each in another order, tests passed: ${figures}then $ran in $((rounds - fresh)) rounds;" \
        "$(grep -c . <<<"$found" || true) sleeps"
    [ -z "$found" ] && return $status
}
