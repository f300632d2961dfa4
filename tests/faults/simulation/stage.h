// Puts the library into a world: the interposed calls are answered by it.
//
//   Stage      one in a process; the machine it stands for cannot change, as the library keeps what it
//              learnt of it
//
//     Stage stage(machine_of(0));
//     stage.act(task);                                       // stage.story() is the result
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_STAGE_H
#define KEL_TESTS_FAULTS_SIMULATION_STAGE_H

#include "tests/faults/simulation/world.h"

namespace kel {
namespace sim {

class Stage {
public:
    // Has the library find out its own name and address.
    explicit Stage(const Machine& machine);
    ~Stage();
    Stage(const Stage&) = delete;
    Stage& operator=(const Stage&) = delete;

    // Whether the library knows the machine as it should.
    bool knows_itself() const { return _knows_itself; }

    // Makes the task's call into the library. The task's machine must be this one.
    void act(const Task& task);

    Story& story() { return _world.story(); }

private:
    World _world;
    bool _knows_itself = false;
};

}  // namespace sim
}  // namespace kel

#endif
