# shellcheck shell=bash
# Whether the tests notice when the library becomes wrong; tests/mutants/README.md tells how.
mutants() {
    cmake --preset x86 >build/x86.configure.log
    cmake --build --preset x86 --parallel "$(nproc)"
    tests/mutants/mutants.py build/x86
}
