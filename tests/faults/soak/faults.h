// One call in a hundred fails.
//
//   set_up_faults      from here on, for armed threads
//   by_chance          true once in a hundred times
//   faults_made        how many calls failed so far
//   lists_held         lists of the resolver that were handed out and not released
//   plan_lost_memory   one of the next allocations fails
//
//     set_up_faults();
//     { Armed armed; ...; }                                  // any system call in here may fail
//
// Calls that the library does not survive the failure of never fail: locking, unlocking and thread
// attributes. Names are answered here, so that nobody asks a name server, and sleeps are over at once.
// Any thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SOAK_FAULTS_H
#define KEL_TESTS_FAULTS_SOAK_FAULTS_H

namespace kel {
namespace soak {

void set_up_faults();
bool by_chance();
unsigned long faults_made();
long lists_held();
void plan_lost_memory();

}  // namespace soak
}  // namespace kel

#endif
