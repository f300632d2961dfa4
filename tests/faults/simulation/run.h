// Acts and foretells many seeds, the machines in processes of their own, two at a time.
//
//   Figures    what a run counted
//   Run        which seeds
//   run        every seed of the run; what differs is printed
//   replay     one seed, with both stories
//
//     Figures figures;
//     if (!run({0, 1000000, 2}, figures)) return 1;
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_RUN_H
#define KEL_TESTS_FAULTS_SIMULATION_RUN_H

#include "tests/faults/simulation/oracle.h"

namespace kel {
namespace sim {

struct Figures {
    std::uint64_t seeds;
    std::uint64_t different;
    std::uint64_t calls;  // into the system
    std::uint64_t connects;
    std::uint64_t waits;
    std::uint64_t descriptors;
    double hours;  // virtual, no seed for more than one
    std::uint64_t endings[kinds_thrown];
    Turns turns;

    void add(const Figures& more);
    // How many of the oracle's decisions no seed reached; their names go to `out` when it is not null.
    unsigned turns_missed(std::ostream* out) const;
};

struct Run {
    std::uint64_t first;
    std::uint64_t count;
    unsigned processes;
};

// False when a seed differs or a process ends early; `figures` holds what was counted.
bool run(const Run& wanted, Figures& figures);

// Prints task and stories; false when they differ.
bool replay(std::uint64_t seed);

}  // namespace sim
}  // namespace kel

#endif
