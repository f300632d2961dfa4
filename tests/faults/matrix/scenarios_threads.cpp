// Threads, per-thread objects and the per-thread environment.
//
// SPDX-License-Identifier: MIT
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/exceptions/standard.h>
#include <kel/services/environment.h>

#include <memory>
#include <new>

#include "tests/faults/matrix/scenario.h"
#include "tests/faults/matrix/threads.h"

namespace {

using namespace kel::test;

const unsigned long slot = 1000001;
const unsigned long other_slot = 1000002;

// --- threads -----------------------------------------------------------------------------------------

// A body's bad_alloc would end the process, as everything does that is no CORBA_Exception.
template <class Body>
class BodyThread : public KELThread {
public:
    BodyThread(long stacksize, Body body) : KELThread(stacksize), _body(body) {}
    void begin() override {
        try {
            _body();
        } catch (const std::bad_alloc&) {
            without_memory = true;
        }
    }
    bool without_memory = false;

private:
    Body _body;
};

class ThreadIsRun : public Scenario {
    void prepare() override { run_threads_in_turn(); }
    void act() override {
        auto body = [this] { gives("ran"); };
        BodyThread<decltype(body)> thread(0, body);
        thread.run();
    }
};
KEL_SCENARIO(ThreadIsRun).giving("ran").and_retried();

class ThreadWithAttributes : public Scenario {
public:
    ~ThreadWithAttributes() override { KELThread::_inheritsched = -1; }

private:
    void prepare() override {
        run_threads_in_turn();
        KELThread::_inheritsched = PTHREAD_INHERIT_SCHED;
    }
    void act() override {
        auto body = [this] { gives("ran"); };
        BodyThread<decltype(body)> thread(262144, body);
        thread.run();
    }
};
KEL_SCENARIO(ThreadWithAttributes).giving("ran").and_retried();

class ThreadThatThrows : public Scenario {
    struct Throws {
        void operator()() const { throw CORBA_BAD_PARAM(); }
    };
    void prepare() override { run_threads_in_turn(); }
    void act() override { _thread.run(); }
    BodyThread<Throws> _thread{0, Throws()};
};
KEL_SCENARIO(ThreadThatThrows)
    .showing(
        "KELThread::_start: unhandled exception in thread\n"
        "Exception: CORBA::BAD_PARAM\n\tMinor: 1330446336 \n\tCompletion Status: NO\n\n");

// --- per-thread objects ------------------------------------------------------------------------------

// Leaves this thread without per-thread objects.
class Slots : public Scenario {
public:
    ~Slots() override { KELThreadLocal::_exit_thread(nullptr); }

private:
    std::string state() override {
        std::string found;
        if (KELThreadLocal::instance(slot) != nullptr) found += "first ";
        if (KELThreadLocal::instance(other_slot) != nullptr) found += "second";
        return found;
    }
};

class ObjectOfThisThread : public Slots {
    void act() override {
        const Slot object(slot);
        gives("%s", KELThreadLocal::instance(slot) == &object ? "found" : "lost");
    }
};
KEL_SCENARIO(ObjectOfThisThread).giving("found").and_retried();

class FirstObjectOfAll : public ObjectOfThisThread {};
KEL_SCENARIO(FirstObjectOfAll).giving("found").in_a_fresh_process().and_retried();

class SecondObjectOfThisThread : public Slots {
    void prepare() override { new Slot(slot); }
    void act() override { const Slot object(other_slot); }
};
KEL_SCENARIO(SecondObjectOfThisThread).and_retried();

// So many that the table of this thread grows.
class ManyObjectsOfThisThread : public Slots {
    void act() override {
        for (unsigned long i = 0; i < 30; ++i) new Slot(2000000 + i);
        gives("%s", KELThreadLocal::instance(2000029) != nullptr ? "found" : "lost");
    }
};
KEL_SCENARIO(ManyObjectsOfThisThread).giving("found");

class SlotThatIsTaken : public Slots {
    void prepare() override { new Slot(slot); }
    void act() override { const Slot object(slot); }
};
KEL_SCENARIO(SlotThatIsTaken).giving("throws CORBA::BAD_PARAM 0x4f4d0000 NO");

class ObjectsAreFinalised : public Slots {
    void prepare() override {
        new Slot(slot);
        new Slot(other_slot);
    }
    void act() override { KELThreadLocal::_exit_thread(nullptr); }
};
KEL_SCENARIO(ObjectsAreFinalised);

// The object goes when its thread ends; whatever fails, none is left in the table.
class ObjectOfAThread : public Scenario {
    void prepare() override { run_threads_in_turn(); }
    void act() override {
        auto body = [] { new Slot(slot); };
        BodyThread<decltype(body)> thread(0, body);
        thread.run();
        if (thread.without_memory) gives("no memory");
    }
};
KEL_SCENARIO(ObjectOfAThread);

// --- the environment ---------------------------------------------------------------------------------

class Environment : public Scenario {
public:
    ~Environment() override { KELThreadLocal::_exit_thread(nullptr); }

private:
    void act() override {
        CORBA_Environment* const mine = CORBA::current_environment();
        gives("%s", CORBA::current_environment() == mine ? "one" : "two");
    }
};
KEL_SCENARIO(Environment).giving("one").and_retried();

class FirstEnvironment : public Environment {};
KEL_SCENARIO(FirstEnvironment).giving("one").in_a_fresh_process().and_retried();

class EnvironmentOfAThread : public Scenario {
    void prepare() override { run_threads_in_turn(); }
    void act() override {
        auto body = [this] {
            CORBA_Environment* const mine = CORBA::current_environment();
            mine->exception(new CORBA_BAD_PARAM);
            gives("%s", mine->exception()->_name());
        };
        BodyThread<decltype(body)> thread(0, body);
        thread.run();
        if (thread.without_memory) gives("no memory");
    }
};
KEL_SCENARIO(EnvironmentOfAThread).giving("CORBA::BAD_PARAM");

}  // namespace
