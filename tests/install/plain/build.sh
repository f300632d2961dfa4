#!/usr/bin/env bash
# A project that knows where the library is and asks nobody.
#
#     build.sh shared|static PROGRAM SOURCE ROOT LIBRARY_FOLDER COMPILER [FLAG...]
set -euo pipefail

kind=$1
program=$2
source=$3
include=$4/include
folder=$5
shift 5

library=kel
[ "$kind" = shared ] || library=:libkel.a
"$@" "-I$include" "$source" "-L$folder" "-l$library" -o "$program"
