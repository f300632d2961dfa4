// Threads in scenarios: started in turn, so that the calls of a run always come in the same order.
//
//   run_threads_in_turn   pthread_create returns when the new thread, which is armed, has ended
//   Slot                  a per-thread object
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_THREADS_H
#define KEL_TESTS_FAULTS_MATRIX_THREADS_H

#include <kel/core/thread_local.h>

#include "tests/support/fault.h"

namespace kel {
namespace test {

struct ThreadStart {
    void* (*start)(void*);
    void* arg;
};

inline void* start_armed(void* arg) {
    const ThreadStart* const thread = static_cast<ThreadStart*>(arg);
    const Armed armed;
    return thread->start(thread->arg);
}

inline void run_threads_in_turn() {
    seams::pthread_create.script([](pthread_t*, const pthread_attr_t*, void* (*start)(void*), void* arg) {
        ThreadStart thread = {start, arg};
        pthread_t id;
        const int rc = seams::pthread_create.real(&id, nullptr, &start_armed, &thread);
        if (rc == 0) pthread_join(id, nullptr);
        return rc;
    });
}

class Slot : public KELThreadLocal {
public:
    explicit Slot(unsigned long slot) : KELThreadLocal(slot) {}
};

}  // namespace test
}  // namespace kel

#endif
