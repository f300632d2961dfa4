#!/usr/bin/env bash
# Runs a program of the guide and compares what it prints with the page's words.
#
#     program.sh PROGRAM NAME BITS FOLDER    NAME.out, or NAME.BITS.out, says what; FOLDER has its plug-ins
#
# The times of log lines are those of NAME.out.
set -euo pipefail
export LC_ALL=C
unset DEBUG_STATIC

expected=$2.out
[ -e "$expected" ] || expected=$2.$3.out
times() { sed -E 's/^=> .{24}(,.*),[0-9]+$/=> Thu Jan  1 00:00:00 1970\1,0/'; }

LD_LIBRARY_PATH=$4${LD_LIBRARY_PATH:+:$LD_LIBRARY_PATH} timeout 60 "$1" </dev/null 2>/dev/null | times | diff -u "$expected" -
