// Scenarios in a network that exists in the test only.
//
//   know_this_machine   lets the library find out who it is: kelhost, 192.0.2.7 and 2001:db8::7
//   NetScenario         hosts with made-up addresses; what act() leaves open is told
//   KEL_NET_SCENARIO    puts one on the list
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_NET_SCENARIO_H
#define KEL_TESTS_FAULTS_MATRIX_NET_SCENARIO_H

#include <string>

#include "tests/faults/matrix/scenario.h"
#include "tests/os/fake_net.h"

namespace kel {
namespace test {

// The library keeps its answers until the process ends.
void know_this_machine();

class NetScenario : public Scenario {
public:
    void prepare() final;
    std::string left_over() final;

protected:
    // What differs from one scenario to the next.
    virtual void set_up() {}

    // Takes the descriptor that act() got over from the library.
    void keep(int fd) { _kept = fd; }
    // A descriptor that act() uses and that stays open.
    int open_socket();

    FakeNet net;

private:
    int _kept = -1;
    int _own = -1;
};

#define KEL_NET_SCENARIO(Class) KEL_SCENARIO(Class).after(::kel::test::know_this_machine)

}  // namespace test
}  // namespace kel

#endif
