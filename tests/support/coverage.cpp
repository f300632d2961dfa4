// Part of the test programs of a coverage build: a process that ends by _exit() writes its counters
// first. Those of the library are written too, as all parts of a process are listed together.
//
// SPDX-License-Identifier: MIT
#include <sys/syscall.h>
#include <unistd.h>

#include "tests/support/fault.h"

extern "C" void __gcov_dump();

extern "C" void _exit(int status) {
    const kel::test::Disarmed writing;
    __gcov_dump();
    for (;;) ::syscall(SYS_exit_group, status);
}
