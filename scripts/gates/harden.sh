# shellcheck shell=bash
# What two independent readers say about the hardening of the library, beside the tests of our own.

# checksec looks at the built library of preset $1: one finding a line.
checksec_findings() {
    checksec --format=json --file="build/$1/libkel.so" |
        sed 's/^{ "[^"]*": {//' | grep -oE '"[a-z_-]+":"[^"]*"' | tr -d '"' | sort
}

# What is to be found; how many symbols there are and how many calls are fortified is only told.
hardened="canary:yes
fortify_source:yes
nx:yes
pie:dso
relro:full
rpath:no
runpath:no"

# blhc reads how the library of preset $1 is compiled and linked. It reads logs of package builds only,
# and knows one by its first line.
blhc_findings() {
    { echo "dpkg-buildpackage: info: source package kel" && ninja -C "build/$1" -t commands libkel.so; } \
        >"build/$1.blhc.log"
    blhc --all "build/$1.blhc.log"
}

harden() {
    local preset status=0 findings figures tests=
    pass "x86 x86_64" -L '^harden$' || status=1
    figures="harden: $tests"
    for preset in x86 x86_64; do
        findings=$(checksec_findings "$preset")
        diff <(echo "$hardened") <(grep -vE '^(symbols|fortified|fortify-able):' <<<"$findings") || status=1
        figures+="; $preset: ${findings//$'\n'/ }, "
        if blhc_findings "$preset"; then
            figures+="blhc clean"
        else
            status=1
            figures+="blhc not clean"
        fi
    done
    echo "$figures"
    return $status
}
