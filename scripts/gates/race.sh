# shellcheck shell=bash
# Threads that get into each other's way. There is no list of suppressions.

# What the thread sanitizer watches: every test that runs code of the library but those that fail or
# drown it, which tell the same with and without it.
threaded='^(core|containers|exceptions|streams|os|services|race|examples|startup)$'

# The thread sanitizer at x86-64, which would wait a second at the end of each program for reports of
# threads that go on; there are hundreds of such programs. It cannot place its memory in addresses that
# are more random than 28 bits.
race() {
    local calm=() status=0 stress=build/x86_64-tsan/tests/stress reports
    [ "$(cat /proc/sys/vm/mmap_rnd_bits)" -le 28 ] || calm=(setarch --addr-no-randomize)
    export TSAN_OPTIONS=second_deadlock_stack=1:atexit_sleep_ms=50
    "${calm[@]}" scripts/test x86_64-tsan -- -L "$threaded" || status=1
    (cd $stress && "${calm[@]}" ./test_stress --gtest_repeat=20 --gtest_shuffle --gtest_brief=1) \
        </dev/null >build/race.tsan.log 2>&1 || status=1
    reports=$(cat build/x86_64-tsan/Testing/Temporary/LastTest.log build/race.tsan.log |
        grep -c '^WARNING: ThreadSanitizer' || true)
    [ $status -eq 0 ] || grep -A 40 '^WARNING: ThreadSanitizer' build/race.tsan.log | head -n 200 || true
    echo "race: thread sanitizer: $(passed x86_64-tsan) tests passed and the stress program" \
        "$(grep -c '  PASSED  ' build/race.tsan.log || true) of 20 times, $reports reports"
    [ $status -eq 0 ] && [ "$reports" -eq 0 ]
}

# drd at 32 bit. The library is compiled so that drd sees which accesses are atomic. A condition may be
# signalled without its mutex.
drd() {
    local status=0 stress=build/drd/tests/stress errors
    {
        cmake --preset x86 -B build/drd -DKEL_BUILD_EXAMPLES=OFF \
            -DCMAKE_CXX_FLAGS="-m32 -include $PWD/tests/stress/visible_atomics.h" &&
            cmake --build build/drd --target test_stress --parallel "$(nproc)"
    } >build/drd.build.log 2>&1 || {
        cat build/drd.build.log
        return 1
    }
    (cd $stress && valgrind --tool=drd --report-signal-unlocked=no --error-exitcode=9 --log-file=drd.log \
        ./test_stress --gtest_repeat=3 --gtest_brief=1) </dev/null >build/drd.log 2>&1 || status=1
    errors=$(sed -n 's/.*ERROR SUMMARY: \([0-9]*\) errors.*/\1/p' $stress/drd.log | tail -n 1)
    [ $status -eq 0 ] || head -n 200 $stress/drd.log
    echo "drd: the stress program $(grep -c '  PASSED  ' build/drd.log || true) of 3 times," \
        "${errors:-no count of} errors"
    [ $status -eq 0 ] && [ "$errors" -eq 0 ]
}
