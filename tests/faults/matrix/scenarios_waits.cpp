// Conditions and the reader-writer lock. Nobody else is there to wake a waiter, so the calls that wait
// are answered by scripts.
//
// SPDX-License-Identifier: MIT
#include <kel/core/condition.h>
#include <kel/core/rwlock.h>

#include "tests/faults/matrix/scenario.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

// --- conditions --------------------------------------------------------------------------------------

class ConditionWakes : public Scenario {
    void act() override {
        KELCondition condition;
        condition.signal();
        condition.broadcast();
    }
};
KEL_SCENARIO(ConditionWakes).and_retried();

class Waiting : public Scenario {
    void prepare() override {
        seams::pthread_cond_wait.script([](pthread_cond_t*, pthread_mutex_t*) { return 0; });
        seams::pthread_cond_timedwait.script(
            [](pthread_cond_t*, pthread_mutex_t*, const timespec*) { return 0; });
    }

protected:
    KELMutex _mutex;
    KELCondition _condition;
};

class WaitWithoutLimit : public Waiting {
    void act() override {
        KELMutex_var hold(_mutex, 1);
        _condition.wait(_mutex);
    }
};
KEL_SCENARIO(WaitWithoutLimit);

template <class Limit>
class TimedWait : public Waiting {
    void act() override {
        KELMutex_var hold(_mutex, 1);
        gives("%d", _condition.timedwait(_mutex, Limit{5}));
    }
};
using TimedWaitForSeconds = TimedWait<unsigned long>;
using TimedWaitForMilliseconds = TimedWait<unsigned long long>;
KEL_SCENARIO(TimedWaitForSeconds).giving("0");
KEL_SCENARIO(TimedWaitForMilliseconds).giving("0");

template <class Limit>
class ThrowingWait : public Waiting {
    void act() override {
        KELMutex_var hold(_mutex, 1);
        _condition.wait(_mutex, Limit{5});
    }
};
using ThrowingWaitForSeconds = ThrowingWait<unsigned long>;
using ThrowingWaitForMilliseconds = ThrowingWait<unsigned long long>;
KEL_SCENARIO(ThrowingWaitForSeconds);
KEL_SCENARIO(ThrowingWaitForMilliseconds);

// --- the reader-writer lock --------------------------------------------------------------------------

class LockIsMade : public Scenario {
    void act() override { KELRWLock lock; }
};
KEL_SCENARIO(LockIsMade).and_retried();

class ReadersShareTheLock : public Scenario {
    void act() override {
        KELRLock_var first(_lock);
        KELRLock_var second(_lock);
    }
    KELRWLock _lock;
};
KEL_SCENARIO(ReadersShareTheLock);

class WriterTakesTheLock : public Scenario {
    void act() override { KELWLock_var hold(_lock); }
    KELRWLock _lock;
};
KEL_SCENARIO(WriterTakesTheLock);

// Somebody holds the lock and gives it up when act() waits for it.
class LockThatIsHeld : public Scenario {
    void prepare() override {
        take_first();
        seams::pthread_cond_wait.script([this](pthread_cond_t*, pthread_mutex_t* m) {
            pthread_mutex_unlock(m);
            _lock.unlock();
            pthread_mutex_lock(m);
            return 0;
        });
    }

    virtual void take_first() = 0;

protected:
    KELRWLock _lock;
};

class ReaderWaitsForAWriter : public LockThatIsHeld {
    void take_first() override { _lock.write_lock(); }
    void act() override { KELRLock_var hold(_lock); }
};
KEL_SCENARIO(ReaderWaitsForAWriter);

class WriterWaitsForAReader : public LockThatIsHeld {
    void take_first() override { _lock.read_lock(); }
    void act() override { KELWLock_var hold(_lock); }
};
KEL_SCENARIO(WriterWaitsForAReader);

}  // namespace
