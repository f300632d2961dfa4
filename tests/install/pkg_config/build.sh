#!/usr/bin/env bash
# A project that asks pkg-config for the library; PKG_CONFIG_PATH tells where it is.
#
#     build.sh shared|static PROGRAM SOURCE COMPILER [FLAG...]
set -euo pipefail

kind=$1
program=$2
source=$3
shift 3

# A program that is static altogether takes the archive and wants what the archive needs.
options=()
[ "$kind" = shared ] || options=(--static)
flags=$(pkg-config "${options[@]}" --cflags --libs kel)
[ "$kind" = shared ] || flags+=" -static"
# shellcheck disable=SC2086  # the flags are words
"$@" "$source" $flags -o "$program"
