# shellcheck shell=bash
# For gates that start the test programs themselves: all tests of a program in one process.

# Builds preset $1; tells something only when that fails.
build() {
    { cmake --preset "$1" && cmake --build --preset "$1" --parallel "$(nproc)"; } >"build/$1.build.log" 2>&1 || {
        cat "build/$1.build.log"
        return 1
    }
}

# Runs test program $1 in its folder with the arguments that follow, for forty minutes at most: several
# times what the longest takes. What it says goes to the file <program>.log in the folder $logs; repeats
# what failed.
run_program() {
    local program=$1 log status=0
    log=$PWD/$logs/$(basename "$1").log
    shift
    (cd "$(dirname "$program")" && timeout 40m "./$(basename "$program")" --gtest_brief=1 "$@") </dev/null >"$log" 2>&1 ||
        status=$?
    [ $status -ne 0 ] || return 0
    if [ $status -eq 124 ]; then echo "$program did not end:"; else echo "$program failed:"; fi
    grep -aE '^\[  FAILED|seed of|Failure$|terminate called|ERROR|error:' "$log" | tail -n 40
    tail -n 3 "$log"
    return 1
}

# Runs the test programs of preset $1, but those whose names match $2, with the arguments that follow,
# as many at a time as there are processors. The sweeps over every call and every allocation that may
# fail are left out: they repeat everything by themselves, and take long. Sets $ran to the number of tests that passed, and of all,
# in all rounds together.
run_programs() {
    local preset=$1 without="test_matrix(_[a-z]+)?|$2" status=0
    shift 2
    # shellcheck disable=SC2154  # scripts/check sets it
    export logs=build/$gate.programs
    rm -rf "$logs"
    mkdir -p "$logs"
    export -f run_program
    # shellcheck disable=SC2016  # the inner shell expands it
    find "build/$preset/tests" -type f -executable -name 'test_*' -print0 | grep -zvE "/($without)\$" | sort -z |
        xargs -0 -P "$(nproc)" -I {} bash -c 'run_program "$@"' - {} "$@" || status=1
    # shellcheck disable=SC2034  # for the caller
    ran=$(cat "$logs"/*.log | awk '
        /tests? from .* ran\./ { all += $2 }
        /^\[  PASSED  \]/ { passed += $4 }
        /^\[  SKIPPED \] [0-9]+ test/ { passed += $4 }
        END { print passed + 0 " of " all + 0 }')
    return $status
}
