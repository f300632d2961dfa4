// The answers of the interposed calls while a library plays in a world.
//
//   playing           whose answers they are
//   script_names      the resolver, the own name and the interfaces answer
//   script_sockets    sockets, waits and the clock answer
//   drop_lists        frees what the library left of the resolver's lists
//
//     playing = {&world, &machine};
//     script_names();
//     { Armed armed; ...; }                                  // the world is asked
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_SCRIPTS_H
#define KEL_TESTS_FAULTS_SIMULATION_SCRIPTS_H

#include "tests/faults/simulation/world.h"

namespace kel {
namespace sim {

// The world and the machine that answer. The world is null while the library learns its own name.
struct Playing {
    World* world;
    const Machine* machine;
};
extern Playing playing;

void script_names();
void script_sockets();
void drop_lists();

}  // namespace sim
}  // namespace kel

#endif
