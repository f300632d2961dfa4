// What a process holds while none of its workers runs.
//
//   Balance      descriptors, blocks, lists and memory
//   settle       waits until the threads of the process are those it began with
//   balance      what is held now
//
//     const int threads = idle_threads();
//     ...                                                    // start and end any number of threads
//     if (settle(threads)) held = balance();
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SOAK_BALANCE_H
#define KEL_TESTS_FAULTS_SOAK_BALANCE_H

namespace kel {
namespace soak {

struct Balance {
    int descriptors;
    long blocks;    // of operator new
    long lists;     // of the resolver
    long resident;  // KiB
};

// How many threads run when no worker does, one that a sanitizer keeps for itself included.
int idle_threads();

// False when other threads still run after ten seconds.
bool settle(int threads);

Balance balance();

}  // namespace soak
}  // namespace kel

#endif
