// The exception holder that each thread has.
//
// SPDX-License-Identifier: MIT
#include <cxxabi.h>
#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>
#include <kel/services/environment.h>
#include <semaphore.h>
#include <unistd.h>

#include <functional>
#include <iostream>
#include <new>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/support/child.h"
#include "tests/support/fault.h"
#include "tests/support/tasks.h"

namespace {

using namespace kel::test;

class Semaphore {
public:
    Semaphore() { sem_init(&_semaphore, 0, 0); }
    ~Semaphore() { sem_destroy(&_semaphore); }
    void post() { sem_post(&_semaphore); }
    void wait() {
        while (sem_wait(&_semaphore) != 0) {
        }
    }
    int value() {
        int n = 0;
        sem_getvalue(&_semaphore, &n);
        return n;
    }

private:
    sem_t _semaphore;
};

// An exception that posts a semaphore when it is destroyed.
class Witness : public CORBA_UserException {
public:
    explicit Witness(Semaphore& gone) : _gone(gone) {}
    Witness(const Witness&) = delete;
    ~Witness() override { _gone.post(); }
    void _raise() const override { throw CORBA_UNKNOWN(); }
    CORBA_Exception* _deep_copy() override { return new Witness(_gone); }

private:
    Semaphore& _gone;
};

// An exception that tells, when it is destroyed, whether its thread's environment is still registered.
class LookAround : public CORBA_UserException {
public:
    explicit LookAround(int& registered) : _registered(registered) {}
    LookAround(const LookAround&) = delete;
    ~LookAround() override {
        _registered = KELThreadLocal::instance(CurrentEnvironment::key_id()) != nullptr;
    }
    void _raise() const override { throw CORBA_UNKNOWN(); }
    CORBA_Exception* _deep_copy() override { return new LookAround(_registered); }

private:
    int& _registered;
};

// Runs a function in a thread of the library and deletes itself.
class Runner : public KELThread {
public:
    explicit Runner(std::function<void()> body) : KELThread(0), _body(std::move(body)) {}
    void begin() override {
        _body();
        delete this;
    }

private:
    std::function<void()> _body;
};

// Returns when `body` has run and the thread, which ends on its own, has cleaned up behind itself.
void in_kel_thread(const std::function<void()>& body) {
    Semaphore done;
    (new Runner([&] {
        body();
        done.post();
    }))->run();
    done.wait();
    EXPECT_TRUE(kel::test::others_end());
}

void in_thread(const std::function<void()>& body) { std::thread(body).join(); }

// The slot that the next kind of per-thread object gets.
std::uint32_t next_slot() {
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    return KELThreadLocal::_cnt;
}

// --- the holder --------------------------------------------------------------------------------------

TEST(Environment, HoldsNothingAtFirst) {
    const CORBA_Environment env;
    EXPECT_EQ(env.exception(), nullptr);
}

TEST(Environment, IsLaidOutAsAnExceptionHolder) {
    EXPECT_EQ(sizeof(CORBA_Environment), sizeof(CORBA_Exception_var));
    EXPECT_EQ(sizeof(CORBA_Environment), sizeof(void*));
    EXPECT_FALSE(std::is_polymorphic<CORBA_Environment>::value);
    CORBA_Environment env;
    CORBA_Exception* const e = new CORBA_UNKNOWN;
    env.exception(e);
    EXPECT_EQ(*reinterpret_cast<CORBA_Exception**>(&env), e);
}

TEST(Environment, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<CORBA_Environment>::value);
    EXPECT_FALSE(std::is_copy_assignable<CORBA_Environment>::value);
}

TEST(Environment, HoldsWhatItIsGiven) {
    CORBA_Environment env;
    CORBA_Exception* const e = new CORBA_UNKNOWN;
    env.exception(e);
    EXPECT_EQ(env.exception(), e);
}

TEST(Environment, ReleasesItsExceptionWhenDestroyed) {
    Semaphore gone;
    { CORBA_Environment().exception(new Witness(gone)); }
    EXPECT_EQ(gone.value(), 1);
}

TEST(Environment, ReleasesTheOldExceptionForANewOne) {
    Semaphore first, second;
    CORBA_Environment env;
    env.exception(new Witness(first));
    env.exception(new Witness(second));
    EXPECT_EQ(first.value(), 1);
    EXPECT_EQ(second.value(), 0);
}

TEST(Environment, KeepsAnExceptionThatItIsGivenAgain) {
    Semaphore gone;
    CORBA_Environment env;
    env.exception(new Witness(gone));
    env.exception(env.exception());
    EXPECT_EQ(gone.value(), 0);
    EXPECT_NE(env.exception(), nullptr);
}

TEST(Environment, ClearReleasesTheException) {
    Semaphore gone;
    CORBA_Environment env;
    env.exception(new Witness(gone));
    env.clear();
    EXPECT_EQ(gone.value(), 1);
    EXPECT_EQ(env.exception(), nullptr);
    env.clear();
}

TEST(Environment, HasTheMappedName) {
    EXPECT_TRUE((std::is_same<CORBA::Environment, CORBA_Environment>::value));
}

// --- nil and release ---------------------------------------------------------------------------------

TEST(Environment, NullIsNil) {
    EXPECT_EQ(CORBA::is_nil(nullptr), 1);
    EXPECT_EQ(CORBA::is_nil(static_cast<CORBA_Environment*>(nullptr)), 1);
}

TEST(Environment, AnEnvironmentIsNotNil) {
    CORBA_Environment env;
    EXPECT_EQ(CORBA::is_nil(&env), 0);
}

TEST(Environment, ReleasingNullDoesNothing) {
    CORBA::release(nullptr);
    CORBA::release(static_cast<CORBA_Environment*>(nullptr));
}

TEST(Environment, ReleaseDestroysTheExceptionAndFreesTheHolder) {
    Semaphore gone;
    const long before = AllocationPlan::live_blocks();
    CORBA_Environment* const env = new CORBA_Environment;
    env->exception(new Witness(gone));
    CORBA::release(env);
    EXPECT_EQ(gone.value(), 1);
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

// --- the thread's own --------------------------------------------------------------------------------

TEST(CurrentEnvironment, IsNeverNull) {
    EXPECT_NE(CORBA::current_environment(), nullptr);
    EXPECT_NE(CORBA_Environment::current_environment(), nullptr);
}

TEST(CurrentEnvironment, IsTheSameForOneThread) {
    CORBA_Environment* const env = CORBA::current_environment();
    EXPECT_EQ(CORBA::current_environment(), env);
    EXPECT_EQ(CORBA_Environment::current_environment(), env);
}

TEST(CurrentEnvironment, LiesInsideThePerThreadObject) {
    CurrentEnvironment* const object = CurrentEnvironment::instance();
    EXPECT_EQ(CORBA::current_environment(), object->environment());
    const char* const address = reinterpret_cast<const char*>(CORBA::current_environment());
    EXPECT_EQ(address, reinterpret_cast<const char*>(object) + sizeof(KELThreadLocal));
    EXPECT_EQ(sizeof(CurrentEnvironment), sizeof(KELThreadLocal) + sizeof(CORBA_Environment));
}

TEST(CurrentEnvironment, IsTheThreadsObjectOfItsSlot) {
    CurrentEnvironment* const mine = CurrentEnvironment::instance();
    EXPECT_EQ(KELThreadLocal::instance(CurrentEnvironment::key_id()), mine);
    EXPECT_EQ(mine->_slot, CurrentEnvironment::key_id());
}

TEST(CurrentEnvironment, DiffersBetweenThreads) {
    CORBA_Environment* const mine = CORBA::current_environment();
    CORBA_Environment* theirs = nullptr;
    in_kel_thread([&] { theirs = CORBA::current_environment(); });
    EXPECT_NE(theirs, nullptr);
    EXPECT_NE(theirs, mine);
}

TEST(CurrentEnvironment, OfAFreshThreadHoldsNothing) {
    Semaphore gone;
    CORBA::current_environment()->exception(new Witness(gone));
    const CORBA_Exception* theirs = &*CORBA::current_environment()->exception();
    in_kel_thread([&] { theirs = CORBA::current_environment()->exception(); });
    EXPECT_EQ(theirs, nullptr);
    CORBA::current_environment()->clear();
}

TEST(CurrentEnvironment, OfAThreadThatNeverAskedDoesNotExist) {
    KELThreadLocal* found = CurrentEnvironment::instance();
    in_kel_thread([&] { found = KELThreadLocal::instance(CurrentEnvironment::key_id()); });
    EXPECT_EQ(found, nullptr);
}

TEST(CurrentEnvironment, IsReleasedAtTheEndOfAThreadOfTheLibrary) {
    Semaphore gone;
    in_kel_thread([&] { CORBA::current_environment()->exception(new Witness(gone)); });
    gone.wait();
}

TEST(CurrentEnvironment, IsReleasedAtTheEndOfAnyThread) {
    Semaphore gone;
    in_thread([&] { CORBA::current_environment()->exception(new Witness(gone)); });
    EXPECT_EQ(gone.value(), 1);
}

TEST(CurrentEnvironment, IsFinalizedByDeletion) {
    Semaphore gone;
    in_thread([&] {
        CORBA::current_environment()->exception(new Witness(gone));
        CurrentEnvironment::instance()->finalize();
        EXPECT_EQ(gone.value(), 1);
        EXPECT_EQ(KELThreadLocal::instance(CurrentEnvironment::key_id()), nullptr);
    });
    EXPECT_EQ(gone.value(), 1);
}

TEST(CurrentEnvironment, FinalizesAsEveryPerThreadObject) {
    EXPECT_TRUE(
        (std::is_same<decltype(&CurrentEnvironment::finalize), decltype(&KELThreadLocal::finalize)>::value));
    EXPECT_TRUE((std::is_base_of<KELThreadLocal, CurrentEnvironment>::value));
}

TEST(CurrentEnvironment, ReleasesItsExceptionBeforeItIsUnregistered) {
    int registered = -1;
    in_thread([&] {
        CORBA::current_environment()->exception(new LookAround(registered));
        delete CurrentEnvironment::instance();
        EXPECT_EQ(KELThreadLocal::instance(CurrentEnvironment::key_id()), nullptr);
    });
    EXPECT_EQ(registered, 1);
}

TEST(CurrentEnvironment, ThatWasDeletedIsMadeAnew) {
    in_thread([] {
        delete CurrentEnvironment::instance();
        EXPECT_NE(CORBA::current_environment(), nullptr);
    });
}

TEST(CurrentEnvironment, OfAThreadCannotBeConstructedTwice) {
    in_thread([] {
        CurrentEnvironment* const first = CurrentEnvironment::instance();
        EXPECT_THROW(new CurrentEnvironment, CORBA_BAD_PARAM);
        EXPECT_EQ(CurrentEnvironment::instance(), first);
    });
}

TEST(CurrentEnvironment, WithoutMemoryCanBeMadeLaterUnderTheSameSlot) {
    const unsigned long slot = CurrentEnvironment::key_id();
    const std::uint32_t next = next_slot();
    in_thread([] {
        AllocationPlan::fail(1);
        {
            Armed armed;
            EXPECT_THROW(CORBA::current_environment(), std::bad_alloc);
        }
        reset_faults();
        EXPECT_NE(CORBA::current_environment(), nullptr);
    });
    EXPECT_EQ(CurrentEnvironment::key_id(), slot);
    EXPECT_EQ(next_slot(), next);
}

// --- the slot ----------------------------------------------------------------------------------------

TEST(CurrentEnvironmentSlot, IsDrawnOnceAndKept) {
    const unsigned long slot = CurrentEnvironment::key_id();
    EXPECT_NE(slot, 0u);
    EXPECT_EQ(CurrentEnvironment::key_id(), slot);
    EXPECT_EQ(CurrentEnvironment::_key_id, slot);
}

TEST(CurrentEnvironmentSlot, IsTheNextFreeOne) {
    const Outcome o = in_child([] {
        CurrentEnvironment::_key_id = 0;
        const std::uint32_t next = next_slot();
        const unsigned long slot = CurrentEnvironment::key_id();
        std::cout << (slot == next) << (next_slot() == next + 1) << (CurrentEnvironment::_key_id == slot);
    });
    EXPECT_EQ(o.out, "111");
}

TEST(CurrentEnvironmentSlot, IsOneForThreadsThatRaceForIt) {
    const Outcome o = in_child([] {
        CurrentEnvironment::_key_id = 0;
        const std::uint32_t next = next_slot();
        std::vector<unsigned long> slots(8);
        std::vector<std::thread> threads;
        for (unsigned long& slot : slots)
            threads.emplace_back([&slot] { slot = CurrentEnvironment::key_id(); });
        for (std::thread& thread : threads) thread.join();
        for (unsigned long slot : slots) std::cout << (slot == next);
        std::cout << (next_slot() - next);
    });
    EXPECT_EQ(o.out, "111111111");
}

TEST(CurrentEnvironmentSlot, IsNotDrawnAgainWhenAnotherThreadWasFaster) {
    const Outcome o = in_child([] {
        CurrentEnvironment::_key_id = 0;
        const std::uint32_t next = next_slot();
        unsigned long theirs = 0;
        seams::pthread_mutex_lock.script([&theirs](pthread_mutex_t* m) {
            if (theirs == 0) in_thread([&theirs] { theirs = CurrentEnvironment::key_id(); });
            return seams::pthread_mutex_lock.real(m);
        });
        unsigned long mine;
        {
            Armed armed;
            mine = CurrentEnvironment::key_id();
        }
        std::cout << (theirs == next) << (mine == next) << (next_slot() - next);
    });
    EXPECT_EQ(o.out, "111");
}

template <class Mutex>
bool lies_in(const void* address, const Mutex& mutex) {
    const char* const start = reinterpret_cast<const char*>(&mutex);
    const char* const p = static_cast<const char*>(address);
    return p >= start && p < start + sizeof mutex;
}

TEST(CurrentEnvironmentSlot, IsDrawnUnderItsOwnLockAndThenTheCountersLock) {
    const Outcome o = in_child([] {
        CurrentEnvironment::_key_id = 0;
        std::vector<const void*> locked;
        seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
            locked.push_back(m);
            return seams::pthread_mutex_lock.real(m);
        });
        {
            Armed armed;
            CurrentEnvironment::key_id();
        }
        std::cout << locked.size() << lies_in(locked[0], CurrentEnvironment::_mtx)
                  << lies_in(locked[1], KELThreadLocal::_mutex);
    });
    EXPECT_EQ(o.out, "211");
}

TEST(CurrentEnvironmentSlot, IsReadWithoutALockOnceItIsDrawn) {
    CurrentEnvironment::key_id();
    reset_faults();
    {
        Armed armed;
        CurrentEnvironment::key_id();
    }
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

// The destructor has run, which the run-time type check would object to.
__attribute__((no_sanitize("vptr"))) void lock_and_unlock(KELMutex& mutex) {
    mutex.lock();
    mutex.unlock();
}

TEST(CurrentEnvironmentSlot, ItsLockWorksAfterTheExitHandlersRan) {
    const Outcome o = in_child([] {
        abi::__cxa_finalize(nullptr);
        lock_and_unlock(CurrentEnvironment::_mtx);
        ::_exit(5);
    });
    EXPECT_EQ(o.exit_code, 5) << o.err;
}

}  // namespace
