#!/usr/bin/env bash
# Adds up what the tests of a sweep have counted, prints it in one line and holds it to the goal.
#
#     figures.sh fault FOLDER        the fault matrix
#     figures.sh oom FOLDER POINTS   the allocation sweeps, of at least POINTS points, and the run under a limit
#
# FOLDER has one file of each test: lines "count WHAT NUMBER", and lines that several tests may repeat.
# A row in the tables of outcomes that no run has needed is out of date and fails too.
set -euo pipefail
export LC_ALL=C

folder=$2
points=${3:-}

# The sum of the counts $1 in the files of suite $2.
sum() { cat "$folder/$2".* | awk -v what="$1" '$1 == "count" && $2 == what { n += $3 } END { print n + 0 }'; }

# How many different lines of kind $1 there are, by their first $2 words.
different() { cat "$folder"/FaultMatrix.* | awk -v kind="$1" '$1 == kind' | cut -d ' ' -f "-$2" | sort -u | wc -l; }

# Fails unless figure $2, which is called $1, is at least $3.
at_least() {
    [ "$2" -ge "$3" ] || {
        echo "$1: $2, and must be at least $3"
        missed=1
    }
}

# Says which rows of the tables were used by no run.
unused() {
    awk '
        $1 == "used" { used[$2] = 1 }
        $1 == "stated" { row[$2] = $0 }
        END { for (i in row) if (!(i in used)) print "no run needs the row " substr(row[i], 8) }' \
        "$folder"/FaultMatrix.* "$folder"/OutcomeTables.*
}

fault() {
    local functions rows scenarios runs pairs left tables
    functions=$(different row 2)
    rows=$(different row 3)
    scenarios=$(sum scenarios FaultMatrix)
    runs=$(sum runs FaultMatrix)
    pairs=$(sum pairs FaultMatrix)
    left=$(unused)
    tables=$(awk '$1 == "stated"' "$folder"/OutcomeTables.* | wc -l)
    at_least functions "$functions" 48
    at_least "rows of functions and errors" "$rows" 109
    at_least scenarios "$scenarios" 60
    at_least runs "$runs" 3000
    at_least pairs "$pairs" 1000
    [ -z "$left" ] || { echo "$left"; missed=1; }
    echo "fault: $functions functions, $rows rows, $scenarios scenarios, $runs runs and $pairs pairs," \
        "all as stated by $tables outcomes"
}

oom() {
    local new malloc=0 scenarios starved=0
    new=$(sum points OperatorNew)
    scenarios=$(sum scenarios OperatorNew)
    [ ! -e "$folder"/Malloc.PlainMutex ] || malloc=$(sum points Malloc)
    [ ! -e "$folder"/MemoryLimit.HoldsForAllScenariosOfMemory ] || starved=$(sum starved MemoryLimit)
    at_least scenarios "$scenarios" 60
    at_least points $((new + malloc)) "$points"
    echo "oom: $new points of operator new and $malloc of malloc in $scenarios scenarios, once and for ever;" \
        "$starved scenarios starved below 64 MiB"
}

missed=0
"$1"
[ "$missed" -eq 0 ]
