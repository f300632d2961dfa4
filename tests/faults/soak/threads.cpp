// SPDX-License-Identifier: MIT
#include "tests/faults/soak/threads.h"

#include <kel/kel.h>

#include <cerrno>
#include <new>

#include "tests/faults/soak/faults.h"
#include "tests/support/fault.h"

namespace kel {
namespace soak {

namespace {

const unsigned at_a_time = 8;
const long stack_size = 256 * 1024;

// Deletes itself at the end of its body.
class Short : public KELThread {
public:
    explicit Short(Threads::Shared& shared) : KELThread(stack_size), _shared(shared) {}

    void begin() override {
        Threads::Shared& shared = _shared;
        use_environment();
        // Without its environment there is nothing to clean up when the thread ends.
        if (by_chance()) delete CurrentEnvironment::instance();
        const bool escape = by_chance();
        delete this;
        sem_post(&shared.room);
        if (!escape) return;
        ++shared.escaped;
        throw CORBA_TRANSIENT(4711, CORBA::COMPLETED_MAYBE);
    }

private:
    void use_environment() {
        try {
            test::Armed armed;
            hold_an_exception();
            ++_shared.with_environment;
        } catch (const CORBA_NO_RESOURCES&) {
            ++_shared.without_resources;
        } catch (const std::bad_alloc&) {
            ++_shared.without_resources;
        }
    }

    // The environment is fresh and stays the thread's own; what it holds goes with the thread.
    void hold_an_exception() {
        CORBA_Environment* const mine = CORBA::current_environment();
        if (mine->exception() != nullptr) ++_shared.wrong;
        mine->exception(
            new CORBA_TIMEOUT(7, CORBA::COMPLETED_NO, "a reason that is too long to be kept in place"));
        KELMutex mutex;
        KELCondition condition;
        KELMutex_var hold(mutex, 1);
        condition.signal();
        if (CORBA::current_environment() != mine || CORBA_TIMEOUT::_downcast(mine->exception()) == nullptr) {
            ++_shared.wrong;
        }
    }

    Threads::Shared& _shared;
};

const unsigned crowd = 40;

// Has its environment while all others of the crowd have theirs. Deletes itself, too.
class OneOfMany : public KELThread {
public:
    explicit OneOfMany(Threads::Shared& shared) : KELThread(stack_size), _shared(shared) {}

    void begin() override {
        Threads::Shared& shared = _shared;
        CORBA::current_environment();
        delete this;
        sem_post(&shared.arrived);
        while (sem_wait(&shared.leave) != 0) {
        }
    }

private:
    Threads::Shared& _shared;
};

}  // namespace

Threads::Threads() {
    sem_init(&_shared.room, 0, at_a_time);
    sem_init(&_shared.arrived, 0, 0);
    sem_init(&_shared.leave, 0, 0);
}

Threads::~Threads() {
    sem_destroy(&_shared.leave);
    sem_destroy(&_shared.arrived);
    sem_destroy(&_shared.room);
}

void Threads::start_a_crowd() {
    for (unsigned i = 0; i < crowd; ++i) (new OneOfMany(_shared))->run();
    for (unsigned i = 0; i < crowd; ++i) sem_wait(&_shared.arrived);
    for (unsigned i = 0; i < crowd; ++i) sem_post(&_shared.leave);
}

void Threads::start_until(std::chrono::steady_clock::time_point end) {
    while (std::chrono::steady_clock::now() < end) start_one();
    // All bodies have ended when all the room is there again.
    for (unsigned i = 0; i < at_a_time; ++i) sem_wait(&_shared.room);
    for (unsigned i = 0; i < at_a_time; ++i) sem_post(&_shared.room);
}

void Threads::start_one() {
    while (sem_wait(&_shared.room) != 0) {
    }
    KELThread* const thread = new Short(_shared);
    try {
        test::Armed armed;
        errno = ENOMEM;
        thread->run();
        ++_started;
    } catch (const CORBA_NO_RESOURCES&) {
        ++_refused;
        delete thread;
        sem_post(&_shared.room);
    }
}

}  // namespace soak
}  // namespace kel
