# shellcheck shell=bash
# Memory and descriptors at 32 bit, as valgrind sees them: each test program in one process or in a
# few, without a list of suppressions.

# Programs whose tests start other programs, which valgrind does not follow.
starts_others='test_(startup|examples|services_driver)'

# Tests that would take all the time, with millions of operations or gigabytes that are looked at byte
# by byte, one that uses up the descriptors, of which valgrind keeps some for itself, and one that asks for
# more memory than there are addresses, which valgrind counts as an error.
not_for_memcheck='-DictionaryModel.*'
not_for_memcheck+=':QuotedString.WithoutAnEndFillsTheLargestRoomThatThereIs'
not_for_memcheck+=':Pipe.WithNoDescriptorsLeftThrowsNoResourcesWithEmfile'
not_for_memcheck+=':Strings.AllocOfMoreThanTheAddressSpaceThrowsBadAlloc'

# Programs that take minutes, in so many parts: the scenarios of which every call and every allocation fails, and
# what strangers may send.
parts_of() { case $1 in */test_matrix* | */test_streams) echo 8 ;; *) echo 1 ;; esac }

# Runs part $2 of the $3 parts of test program $1. What valgrind says goes to $logs/*.valgrind, what the
# tests say beside it. The program's own operator new is left to it, as tests make it fail. Children that end in
# the middle of a test are watched but tell nothing at their end.
under_memcheck() {
    local name log
    name=$(basename "$1")
    log=$PWD/$logs/$name.$2
    (cd "$(dirname "$1")" && GTEST_SHARD_INDEX=$2 GTEST_TOTAL_SHARDS=$3 \
        valgrind --tool=memcheck --soname-synonyms=somalloc=nouserintercepts \
        --leak-check=full --show-leak-kinds=definite --errors-for-leak-kinds=definite --track-fds=yes \
        --child-silent-after-fork=yes --num-callers=30 --log-file="$log.valgrind" \
        "./$name" --gtest_brief=1 --gtest_filter="$not_for_memcheck") </dev/null >"$log.tests" 2>&1 ||
        grep -aE "FAILED|Failure" "$log.tests" || echo "part $2 of $name did not come to its end"
}

# The sum of the numbers that the expression $1 finds in the files $2.
sum_of() {
    local expression=$1
    shift
    sed -nE "s/.*$expression.*/\1/p" "$@" | awk '{ sum += $1 } END { print sum + 0 }'
}

# Descriptors that are open at the end and were not at the beginning, in the files $@.
left_open() {
    awk '/ Open (file descriptor|AF_)/ { ++open } /<inherited from parent>/ { --open } END { print open + 0 }' "$@"
}

# What valgrind said where the expression $1 matches.
around() {
    { grep -ahE -A 12 "$1" "$logs"/*.valgrind || true; } | cut -c 1-160 | sed -n 1,200p
}

# Watches the test programs whose names match $1 and do not match $2.
watch_memory() {
    local programs program part parts failed errors tests passed left
    build x86 || return 1
    # shellcheck disable=SC2154  # scripts/check sets it
    logs=build/$gate
    rm -rf "$logs"
    mkdir -p "$logs"
    export not_for_memcheck logs
    export -f under_memcheck
    mapfile -t programs < <(find build/x86/tests -type f -executable -name 'test_*' |
        grep -E "/($1)\$" | grep -vE "/($2)\$" | sort)
    # The long ones first. Each line is a program, a part and their number.
    # shellcheck disable=SC2016  # the inner shell expands it
    failed=$(for program in "${programs[@]}"; do
        parts=$(parts_of "$program")
        for ((part = 0; part < parts; ++part)); do echo "$program $part $parts"; done
    done | sort -k 3,3nr | xargs -L 1 -P "$(nproc)" bash -c 'under_memcheck "$@"' -)
    [ -z "$failed" ] || echo "$failed"
    tests=$(sum_of '\] ([0-9]+) tests? from .* ran\.' "$logs"/*.tests)
    passed=$(sum_of '  PASSED  \] ([0-9]+) test' "$logs"/*.tests)
    errors=$(sum_of 'ERROR SUMMARY: ([0-9]+) errors' "$logs"/*.valgrind)
    left=$(left_open "$logs"/*.valgrind)
    [ "$errors" -eq 0 ] || around '^==[0-9]+== (Invalid|Conditional|Use of|Syscall|Mismatched|Argument|[0-9,]+ .* definitely)'
    [ "$left" -eq 0 ] || around ' Open (file descriptor|AF_)'
    echo "$gate: $passed of $tests tests passed in ${#programs[@]} programs, $errors errors and definite leaks," \
        "$left descriptors left open"
    [ -z "$failed" ] && [ "$errors" -eq 0 ] && [ "$left" -eq 0 ]
}

faulty='test_matrix(_[a-z]+)?'
memcheck() { watch_memory 'test_.*' "$starts_others|$faulty"; }
memcheck_faults() { watch_memory "$faulty" "$starts_others"; }
