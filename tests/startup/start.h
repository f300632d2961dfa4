// Starts one of the programs of tests/startup/programs in a fresh process.
//
//     const Outcome o = start({"describe", "addresses"}, {"DEBUG_STATIC=1"});
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STARTUP_START_H
#define KEL_TESTS_STARTUP_START_H

#include <string>
#include <vector>

#include "tests/support/child.h"

namespace kel {
namespace test {

// `command[0]` is the program's short name; `environment` is what run_program takes.
inline Outcome start(std::vector<std::string> command, const std::vector<std::string>& environment = {}) {
    command[0] = std::string(KEL_STARTUP_PROGRAMS) + "/startup_" + command[0];
    return run_program(command, environment);
}

}  // namespace test
}  // namespace kel

#endif
