// The condition variable of the library.
//
//   KELCondition   waits with a KELMutex held, with or without a limit
//
//     KELMutex_var hold(_mutex, 1);
//     while (!_ready) _changed.wait(_mutex);   // a wake-up proves nothing: look again
//
// Any number of threads may wait with the same mutex. signal() and broadcast() may be called with
// or without it. The type of a limit chooses its unit: an unsigned long counts seconds, an unsigned
// long long counts milliseconds, and an int does not compile. Limits end by the real-time clock.
//
// Every wait is entered with the mutex held and ends with it held, by an exception too. A condition
// that the system refuses throws CORBA::NO_RESOURCES (minor = errno, COMPLETED_NO); a failing wait,
// signal or broadcast prints the name of the failed call and ends the process.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_CONDITION_H
#define KEL_CORE_CONDITION_H

#include <kel/config.h>
#include <kel/core/mutex.h>
#include <pthread.h>

class KEL_API KELCondition {
public:
    KELCondition();
    KELCondition(const KELCondition&) = delete;
    KELCondition& operator=(const KELCondition&) = delete;

    // No thread may be waiting any more: the system would wait for it.
    ~KELCondition();

    // Frees the mutex, waits for signal() or broadcast() and takes it again. May end by chance.
    void wait(KELMutex& m) KEL_REQUIRES(m);

    // Wait at most so long. 1: the time is over, or a signal handler interrupted the wait.
    // 0: woken by signal() or broadcast(), or by chance.
    unsigned char timedwait(KELMutex& m, unsigned long seconds) KEL_REQUIRES(m);
    unsigned char timedwait(KELMutex& m, unsigned long long milliseconds) KEL_REQUIRES(m);

    // The same, but throw CORBA::TIMEOUT where timedwait gives 1.
    void wait(KELMutex& m, unsigned long seconds) KEL_REQUIRES(m);
    void wait(KELMutex& m, unsigned long long milliseconds) KEL_REQUIRES(m);

    // Wakes one waiting thread, if there is one.
    void signal();

    // Wakes all waiting threads.
    void broadcast();

private:
    pthread_cond_t _condition;
};

#endif
