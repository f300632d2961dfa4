// Detached threads, each with its environment, started one after the other.
//
//   Threads    starts them, a few at a time
//
//     Threads threads;
//     threads.start_a_crowd();
//     threads.start_until(end);                             // some may still be ending
//
// One thread starts them.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SOAK_THREADS_H
#define KEL_TESTS_FAULTS_SOAK_THREADS_H

#include <semaphore.h>

#include <atomic>
#include <chrono>

namespace kel {
namespace soak {

class Threads {
public:
    Threads();
    ~Threads();
    Threads(const Threads&) = delete;
    Threads& operator=(const Threads&) = delete;

    // Lets more threads have an environment at one time than the library keeps parked records, so that
    // from then on it keeps as many as it ever will.
    void start_a_crowd();

    void start_until(std::chrono::steady_clock::time_point end);

    // What the threads themselves count.
    struct Shared {
        sem_t room;
        sem_t arrived;  // posted by each of the crowd
        sem_t leave;    // waited for by each of the crowd
        std::atomic<unsigned long> with_environment{0};
        std::atomic<unsigned long> without_resources{0};
        std::atomic<unsigned long> escaped{0};  // ended by an exception
        std::atomic<unsigned long> wrong{0};    // the environment is not the thread's own
    };
    const Shared& shared() const { return _shared; }
    unsigned long started() const { return _started; }
    unsigned long refused() const { return _refused; }

private:
    void start_one();

    Shared _shared;
    unsigned long _started = 0;
    unsigned long _refused = 0;
};

}  // namespace soak
}  // namespace kel

#endif
