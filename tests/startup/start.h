// Starts one of the programs of tests/startup/programs in a fresh process.
//
//   start               runs it and collects what it leaves behind
//   round_environment   the environment of one of many rounds with busy threads
//
//     const Outcome o = start({"describe", "addresses"}, {"DEBUG_STATIC=1"});
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STARTUP_START_H
#define KEL_TESTS_STARTUP_START_H

#include <cstdlib>
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

// Without a trace, and but for the first round without a search for leaks: to stop sixteen busy threads
// takes the leak sanitizer five times as long as all the rest of a round.
inline std::vector<std::string> round_environment(int round) {
    if (round == 0) return {"DEBUG_STATIC"};
    const char* const options = std::getenv("ASAN_OPTIONS");
    return {"DEBUG_STATIC",
            std::string("ASAN_OPTIONS=") + (options != nullptr ? options : "") + ":detect_leaks=0"};
}

}  // namespace test
}  // namespace kel

#endif
