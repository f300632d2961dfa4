// Thread objects, their registry and the threads they start.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>

#include <climits>
#include <csignal>
#include <functional>
#include <memory>
#include <new>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/gate.h"
#include "tests/core/probe.h"
#include "tests/core/reports.h"
#include "tests/core/threads.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;

using Thread = ThreadFixture;
using ThreadId = ThreadFixture;

// --- identifiers -------------------------------------------------------------------------------------

TEST_F(ThreadId, HoldsAPosixIdentifier) {
    const KELThreadId id(pthread_self());
    EXPECT_EQ(id.id(), pthread_self());
    EXPECT_EQ(sizeof(KELThreadId), sizeof(pthread_t));
}

TEST_F(ThreadId, ConvertsFromAPosixIdentifier) {
    const KELThreadId id = pthread_self();
    EXPECT_EQ(id.id(), pthread_self());
}

TEST_F(ThreadId, EqualityIsThatOfTheIdentifiers) {
    EXPECT_TRUE(KELThreadId(5) == KELThreadId(5));
    EXPECT_FALSE(KELThreadId(5) == KELThreadId(6));
    EXPECT_TRUE(KELThreadId(5) != KELThreadId(6));
    EXPECT_FALSE(KELThreadId(5) != KELThreadId(5));
    EXPECT_TRUE(pthread_t(5) == KELThreadId(5));
    EXPECT_TRUE(pthread_t(5) != KELThreadId(6));
}

TEST_F(ThreadId, IsAKeyOfDictionaries) {
    EXPECT_EQ(compare(KELThreadId(5), KELThreadId(5)), 0);
    EXPECT_NE(compare(KELThreadId(5), KELThreadId(6)), 0);
    EXPECT_NE(compare(KELThreadId(6), KELThreadId(5)), 0);
    EXPECT_EQ(_kel_hash(KELThreadId(5)), 5ul);
}

TEST_F(ThreadId, HashIsThirtyTwoBitsWide) { EXPECT_EQ(_kel_hash(KELThreadId(ULONG_MAX)), 0xfffffffful); }

TEST_F(ThreadId, CopiesAndAssigns) {
    KELThreadId a(1);
    const KELThreadId b(2);
    a = b;
    EXPECT_TRUE(a == b);
    EXPECT_TRUE(KELThreadId(a) == b);
}

// --- construction and the registry -------------------------------------------------------------------

const FreshScene initial_thread_statics("initial_thread_statics", []() KEL_NO_THREAD_SAFETY_ANALYSIS {
    std::cout << (KELThread::_first == nullptr) << KELThread::_inheritsched
              << (KELThread::_factory == &KELThread::_create_thread);
});

TEST_F(Thread, StaticsStartAsNullMinusOneAndTheOwnFactory) {
    EXPECT_EQ(initial_thread_statics.play().out, "1-11");
}

TEST_F(Thread, ConstructionKeepsTheStackSizeAndTheCreatorsIdentifier) {
    Body thread([] {}, 123456);
    EXPECT_EQ(thread._stacksize, 123456);
    EXPECT_EQ(thread._tid.id(), pthread_self());
}

TEST_F(Thread, ConstructionStartsNothing) {
    Armed armed;
    Body thread;
    EXPECT_EQ(seams::pthread_create.calls(), 0);
}

TEST_F(Thread, OnlyObjectIsTheWholeRegistry) {
    ASSERT_EQ(first(), nullptr);
    {
        Body thread;
        EXPECT_EQ(first(), &thread);
        EXPECT_EQ(thread._next, nullptr);
        EXPECT_EQ(thread._prev, nullptr);
    }
    EXPECT_EQ(first(), nullptr);
}

TEST_F(Thread, NewestObjectIsTheHead) {
    Body oldest, middle, newest;
    EXPECT_EQ(first(), &newest);
    EXPECT_EQ(newest._prev, nullptr);
    EXPECT_EQ(newest._next, &middle);
    EXPECT_EQ(middle._prev, &newest);
    EXPECT_EQ(middle._next, &oldest);
    EXPECT_EQ(oldest._prev, &middle);
    EXPECT_EQ(oldest._next, nullptr);
}

TEST_F(Thread, DestroyedHeadLeavesItsSuccessor) {
    Body older;
    { Body newer; }
    EXPECT_EQ(first(), &older);
    EXPECT_EQ(older._prev, nullptr);
}

TEST_F(Thread, DestroyedMiddleObjectIsBridged) {
    Body oldest;
    std::unique_ptr<Body> middle(new Body);
    Body newest;
    middle.reset();
    EXPECT_EQ(newest._next, &oldest);
    EXPECT_EQ(oldest._prev, &newest);
    EXPECT_EQ(first(), &newest);
}

TEST_F(Thread, DestroyedOldestObjectEndsTheList) {
    std::unique_ptr<Body> oldest(new Body);
    Body newest;
    oldest.reset();
    EXPECT_EQ(newest._next, nullptr);
    EXPECT_EQ(first(), &newest);
}

TEST_F(Thread, DestructionLeavesTheObjectsOwnLinks) {
    Body oldest;
    Body* const middle = new Body;
    Body newest;
    middle->KELThread::~KELThread();
    EXPECT_EQ(field_at<KELThread*>(middle, 2 * word), &oldest);
    EXPECT_EQ(field_at<KELThread*>(middle, 3 * word), &newest);
    ::operator delete(middle);
}

TEST_F(Thread, RegistryChangesUnderItsMutex) {
    std::vector<pthread_mutex_t*> locked;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        locked.push_back(m);
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    { Body thread; }
    EXPECT_THAT(locked, ElementsAre(native(KELThread::_mutex), native(KELThread::_mutex)));
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 2);
}

// Its body does without the object once it has started.
class Outliving : public KELThread {
public:
    struct Events {
        Gate started, released, done;
    };
    explicit Outliving(Events& events) : KELThread(0), _events(events) {}
    void begin() override {
        Events& events = _events;
        events.started.open();
        events.released.wait();
        events.done.open();
    }

private:
    Events& _events;
};

TEST_F(Thread, DestructionNeitherStopsNorJoinsTheThread) {
    Outliving::Events events;
    std::unique_ptr<Outliving> thread(new Outliving(events));
    thread->run();
    events.started.wait();
    thread.reset();
    EXPECT_EQ(first(), nullptr);
    events.released.open();
    events.done.wait();
}

TEST_F(Thread, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<Body>::value);
    EXPECT_TRUE(std::is_abstract<KELThread>::value);
}

// --- look-up -----------------------------------------------------------------------------------------

TEST_F(Thread, InstanceOfAnUnknownIdentifierIsNull) {
    Body thread;
    EXPECT_EQ(KELThread::instance(KELThreadId(1)), nullptr);
}

TEST_F(Thread, InstanceFindsTheObjectOfTheIdentifier) {
    Body a, b, c;
    b._tid = KELThreadId(77);
    EXPECT_EQ(KELThread::instance(KELThreadId(77)), &b);
}

TEST_F(Thread, InstanceGivesTheNewestOfSeveral) {
    Body older, newer;
    EXPECT_EQ(KELThread::instance(KELThreadId(pthread_self())), &newer);
}

TEST_F(Thread, InstanceTakesNoLock) {
    Body thread;
    Armed armed;
    KELThread::instance(KELThreadId(1));
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

TEST_F(Thread, TerminateAllTakesNoLock) {
    Body a, b;
    Armed armed;
    KELThread::terminateAll();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

TEST_F(Thread, TerminateAllAndTerminateChangeNothing) {
    Body a, b;
    KELThread::terminateAll();
    a.terminate();
    EXPECT_EQ(first(), &b);
    EXPECT_EQ(b._next, &a);
}

TEST_F(Thread, YieldDoesNothing) {
    KELThread::yield();
    EXPECT_EQ(first(), nullptr);
}

// --- run ---------------------------------------------------------------------------------------------

struct FactoryCall {
    unsigned long stacksize;
    void* (*start)(void*);
    void* arg;
};
std::vector<FactoryCall> factory_calls;
void recording_factory(unsigned long stacksize, void* (*start)(void*), void* arg) {
    factory_calls.push_back({stacksize, start, arg});
}

TEST_F(Thread, RunHandsStackSizeStartRoutineAndObjectToTheFactory) {
    factory_calls.clear();
    KELThread::_factory = &recording_factory;
    Body thread([] {}, 65536);
    thread.run();
    ASSERT_EQ(factory_calls.size(), 1u);
    EXPECT_EQ(factory_calls[0].stacksize, 65536u);
    EXPECT_EQ(factory_calls[0].start, &KELThread::_start);
    EXPECT_EQ(factory_calls[0].arg, static_cast<KELThread*>(&thread));
}

TEST_F(Thread, EveryRunStartsAnotherThread) {
    factory_calls.clear();
    KELThread::_factory = &recording_factory;
    Body thread;
    thread.run();
    thread.run();
    EXPECT_EQ(factory_calls.size(), 2u);
}

TEST_F(Thread, RunReturnsWhileTheBodyRuns) {
    Gate returned, done;
    Body thread([&] {
        returned.wait();
        done.open();
    });
    thread.run();
    returned.open();
    done.wait();
}

TEST_F(Thread, BodyRunsInAThreadOfItsOwn) {
    pthread_t self = pthread_self();
    run([&] { self = pthread_self(); });
    EXPECT_NE(self, pthread_self());
}

// --- the start routine -------------------------------------------------------------------------------

TEST_F(Thread, StartPutsTheThreadsOwnIdentifierFirst) {
    Body* self = nullptr;
    pthread_t seen = 0;
    Body thread([&] { seen = self->_tid.id(); });
    self = &thread;
    thread._tid = KELThreadId(1);
    EXPECT_EQ(KELThread::_start(&thread), nullptr);
    EXPECT_EQ(seen, pthread_self());
}

TEST_F(Thread, RunningThreadIsFoundByItsIdentifier) {
    KELThread* found = nullptr;
    run([&] { found = KELThread::instance(KELThreadId(pthread_self())); });
    EXPECT_NE(found, nullptr);
}

class Slotted : public KELThreadLocal {
public:
    Slotted(unsigned long slot, int& finalized) : KELThreadLocal(slot), _finalized(finalized) {}
    void finalize() override {
        ++_finalized;
        delete this;
    }

private:
    int& _finalized;
};

unsigned long draw_slot() {
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    return KELThreadLocal::_cnt++;
}

TEST_F(Thread, ReturningBodyReleasesTheThreadsSlots) {
    int finalized = 0;
    const unsigned long slot = draw_slot();
    Body thread([&] { new Slotted(slot, finalized); });
    KELThread::_start(&thread);
    EXPECT_EQ(finalized, 1);
    EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
}

TEST_F(Thread, ReturningBodyFinalizesEachSlotOnce) {
    int finalized = 0;
    const unsigned long slot = draw_slot();
    run([&] { new Slotted(slot, finalized); });
    EXPECT_EQ(finalized, 1);
}

TEST_F(Thread, EscapedExceptionLeavesTheSlotsToTheKey) {
    int finalized = 0;
    const unsigned long slot = draw_slot();
    Body thread([&] {
        new Slotted(slot, finalized);
        throw CORBA_BAD_PARAM();
    });
    ::testing::internal::CaptureStdout();
    EXPECT_EQ(KELThread::_start(&thread), nullptr);
    ::testing::internal::GetCapturedStdout();
    EXPECT_EQ(finalized, 0);
    EXPECT_NE(KELThreadLocal::instance(slot), nullptr);
    KELThreadLocal::_exit_thread(nullptr);
    EXPECT_EQ(finalized, 1);
}

TEST_F(Thread, KeyReleasesTheSlotsAfterAnEscapedException) {
    int finalized = 0;
    const unsigned long slot = draw_slot();
    ::testing::internal::CaptureStdout();
    run([&] {
        new Slotted(slot, finalized);
        Body thrower([] { throw CORBA_BAD_PARAM(); });
        KELThread::_start(&thrower);
        EXPECT_EQ(finalized, 0);
    });
    ::testing::internal::GetCapturedStdout();
    EXPECT_EQ(finalized, 1);
}

TEST_F(Thread, EscapedExceptionIsPrintedOnStandardOutput) {
    const Outcome exception = in_child([] { std::cout << CORBA_BAD_PARAM(5, CORBA::COMPLETED_MAYBE); });
    const Outcome seen = in_child([] {
        Body thread([] { throw CORBA_BAD_PARAM(5, CORBA::COMPLETED_MAYBE); });
        KELThread::_start(&thread);
    });
    ASSERT_NE(exception.out, "");
    EXPECT_EQ(seen.out, "KELThread::_start: unhandled exception in thread\n" + exception.out + "\n");
    EXPECT_EQ(seen.err, "");
}

TEST_F(Thread, EscapedUserExceptionIsPrintedToo) {
    const Outcome exception = in_child([] { std::cout << KELRemarshal(); });
    const Outcome seen = in_child([] {
        Body thread([] { throw KELRemarshal(); });
        KELThread::_start(&thread);
    });
    EXPECT_EQ(seen.out, "KELThread::_start: unhandled exception in thread\n" + exception.out + "\n");
    EXPECT_EQ(seen.exit_code, 0);
}

// Opens a gate when its thread ends.
class OpensAtTheEnd : public KELThreadLocal {
public:
    OpensAtTheEnd(unsigned long slot, Gate& gate) : KELThreadLocal(slot), _gate(gate) {}
    void finalize() override {
        _gate.open();
        delete this;
    }

private:
    Gate& _gate;
};

TEST_F(Thread, ProcessGoesOnAfterAnEscapedException) {
    const Outcome seen = in_child([] {
        Gate ended;
        Body thread([&] {
            new OpensAtTheEnd(draw_slot(), ended);
            throw CORBA_BAD_PARAM();
        });
        thread.run();
        ended.wait();
        std::cout << "still here";
    });
    EXPECT_EQ(seen.exit_code, 0);
    EXPECT_THAT(seen.out, ::testing::StartsWith("KELThread::_start: unhandled exception in thread\n"));
    EXPECT_THAT(seen.out, ::testing::EndsWith("\nstill here"));
}

TEST_F(Thread, AnyOtherExceptionEndsTheProcess) {
    const Outcome seen = in_child([] {
        Body thread([] { throw 1; });
        thread.run();
        for (;;) std::this_thread::yield();
    });
    EXPECT_EQ(seen.signal, SIGABRT);
}

TEST_F(Thread, ThreadExitInTheBodyEndsTheThreadAlone) {
    int finalized = 0;
    const unsigned long slot = draw_slot();
    Body thread([&] {
        new Slotted(slot, finalized);
        pthread_exit(nullptr);
    });
    thread.run();
    wait_for_the_end_of_threads();
    EXPECT_EQ(finalized, 1);
}

class SelfDeleting : public KELThread {
public:
    explicit SelfDeleting(Gate& done) : KELThread(0), _done(done) {}
    void begin() override {
        Gate& done = _done;
        delete this;
        done.open();
    }

private:
    Gate& _done;
};

TEST_F(Thread, BodyMayDeleteItsObject) {
    Gate done;
    (new SelfDeleting(done))->run();
    done.wait();
    EXPECT_EQ(first(), nullptr);
}

TEST_F(Thread, NewThreadsAreDetached) {
    int state = -1;
    run([&] {
        pthread_attr_t attributes;
        pthread_getattr_np(pthread_self(), &attributes);
        pthread_attr_getdetachstate(&attributes, &state);
        pthread_attr_destroy(&attributes);
    });
    EXPECT_EQ(state, PTHREAD_CREATE_DETACHED);
}

}  // namespace
