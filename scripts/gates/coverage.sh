# shellcheck shell=bash
# What of the library its own tests run. A line or branch that nothing can reach stands in
# tests/coverage_exclusions.txt with the reason.

# Prints what no test of build folder $1 reached, and the figures. At least $2 % of the branches are wanted.
covered() {
    local rules=tests/coverage_exclusions.txt trace=$1/coverage.json report=$1/coverage.txt lines branches excluded status=0
    excluded=$(scripts/gates/coverage.py "$1" $rules 2>&1 >"$trace") || {
        echo "$excluded"
        return 1
    }
    gcovr --root . --add-tracefile "$trace" --print-summary --fail-under-line 100 --fail-under-branch "$2" \
        --output "$report" >"$report.summary" || status=1
    gcovr --root . --add-tracefile "$trace" --branches --output "$report.branches"
    awk '/^kel/ && $4 != "100%" && $3 != $2' "$report" "$report.branches"
    lines=$(awk '$1 == "lines:" { print $2 }' "$report.summary")
    branches=$(awk '$1 == "branches:" { print $2 }' "$report.summary")
    echo "coverage: lines ${lines/\%/ %}, branches ${branches/\%/ %}, $excluded; $ran tests passed"
    return $status
}

# The servers of the examples are killed in the middle of things, their counts as well.
coverage() {
    local ran least=98
    [ "${1:-}" != release ] || least=100
    build coverage
    find build/coverage -name '*.gcda' -delete
    run_programs coverage test_examples || return 1
    covered build/coverage $least
}
