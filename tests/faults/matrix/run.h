// One run of a scenario with its faults, and everything that it left behind.
//
//   Seen           what a run gave, printed and left
//   run_here       in this process
//   run_in_child   in a process of its own: when it may end, and for scenarios that need a fresh one
//   run_as_needed  the one or the other
//   warm_up        what a process that runs scenarios does first
//
//     const Seen seen = run_here(definition, {{&seams::pipe, 2, EMFILE}});
//     EXPECT_EQ(seen.outcome, "throws CORBA::NO_RESOURCES 0x4f4d0018 NO");
//
// After each run the scenario runs once more with nothing failing, which must succeed.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_RUN_H
#define KEL_TESTS_FAULTS_MATRIX_RUN_H

#include <functional>
#include <string>
#include <vector>

#include "tests/faults/matrix/calls.h"
#include "tests/faults/matrix/scenario.h"

namespace kel {
namespace test {

struct Seen {
    std::string outcome;     // what act() gave or threw, or how it ended the process
    std::string shown;       // on standard output
    std::string printed;     // on standard error
    std::string left;        // what act() left open
    std::string before;      // the state before act()
    std::string after;       // and after it
    std::string problems;    // one a line: what no run may leave behind
    std::string again;       // the outcome of the run without faults that follows
    bool recursive = false;  // the mutex whose lock or unlock failed was a recursive one
    long blocks = 0;         // of operator new that are in use afterwards and were not before
    long system_blocks = 0;  // the same of malloc, where that is counted
    long counted = 0;        // what the plan counted
    std::vector<CallTrace::Call> calls;
};

// What fails: system calls, or what `start`, called right before act(), makes fail.
struct Plan {
    std::vector<Fault> faults;
    std::function<void()> start = nullptr;
    std::function<long()> count = nullptr;  // called right after act()
};

Seen run_here(const Definition& definition, const Plan& plan);
Seen run_in_child(const Definition& definition, const Plan& plan);
Seen run_as_needed(const Definition& definition, const Plan& plan, bool may_end);

void warm_up();

}  // namespace test
}  // namespace kel

#endif
