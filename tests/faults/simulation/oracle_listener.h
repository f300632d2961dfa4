// The oracle's tale of a listener.
//
//   tell_listener    tells it with `teller`
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_ORACLE_LISTENER_H
#define KEL_TESTS_FAULTS_SIMULATION_ORACLE_LISTENER_H

#include "tests/faults/simulation/teller.h"

namespace kel {
namespace sim {

void tell_listener(Teller& teller);

}  // namespace sim
}  // namespace kel

#endif
