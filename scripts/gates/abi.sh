# shellcheck shell=bash
# What programs that were linked before rely on, at both word sizes.
abi() {
    local preset status=0 tests=
    pass "x86 x86_64" -L '^abi$' || status=1
    [ $status -eq 0 ] || return 1
    for preset in x86 x86_64; do
        tests+="; $preset: $(said $preset abi.exports_are_the_listed_ones) symbols as listed,"
        tests+=" 0 differences in $(said $preset abi.types_are_those_of_the_baseline)"
    done
    tests+="; layout of $(said x86 abi.classes_have_their_layout_asserted) and"
    tests+=" $(said x86 abi.virtual_tables_have_their_length) virtual tables asserted"
    echo "abi: $tests"
}
