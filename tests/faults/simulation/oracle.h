// What should happen: the story of a task, told from the behaviour that the library promises and not
// from its code. It includes nothing of the library and calls none of it.
//
//   foretell    the story of a task
//   Turn        the decisions on the way, each of which some seed must reach
//
//     foretell(task, world, turns);                          // world.story() is the result
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_ORACLE_H
#define KEL_TESTS_FAULTS_SIMULATION_ORACLE_H

#include "tests/faults/simulation/world.h"

namespace kel {
namespace sim {

enum class Turn : unsigned {
#define KEL_TURN(name) name,
#include "tests/faults/simulation/turns.inc"
#undef KEL_TURN
    count
};

struct Turns {
    std::uint64_t taken[static_cast<unsigned>(Turn::count)] = {};

    void note(Turn turn) { ++taken[static_cast<unsigned>(turn)]; }
};

const char* name_of(Turn turn);

void foretell(const Task& task, World& world, Turns& turns);

// The IPv4 address under which a machine knows itself, which the library finds once and keeps.
bool own_v4(const Machine& machine, Ip& ip);

}  // namespace sim
}  // namespace kel

#endif
