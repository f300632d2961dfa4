// Per-thread objects: registration, look-up and destruction.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <memory>
#include <new>
#include <thread>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/probe.h"
#include "tests/core/reports.h"
#include "tests/core/thread_locals.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

using ThreadLocal = ThreadLocalFixture;

// --- registration and look-up ------------------------------------------------------------------------

TEST_F(ThreadLocal, KeepsItsOwnerAndItsSlot) {
    Local object(slot);
    EXPECT_EQ(object._owner.id(), pthread_self());
    EXPECT_EQ(object._slot, slot);
}

TEST_F(ThreadLocal, IsFoundByItsSlotInItsThread) {
    Local object(slot);
    EXPECT_EQ(KELThreadLocal::instance(slot), &object);
}

TEST_F(ThreadLocal, IsNotFoundInAnotherThread) {
    Local object(slot);
    KELThreadLocal* found = &object;
    in_another_thread([&] { found = KELThreadLocal::instance(slot); });
    EXPECT_EQ(found, nullptr);
}

TEST_F(ThreadLocal, InstanceIsNullInAThreadThatConstructedNone) {
    EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
}

TEST_F(ThreadLocal, InstanceOfAnotherSlotIsNull) {
    Local object(slot);
    EXPECT_EQ(KELThreadLocal::instance(draw_slot()), nullptr);
}

TEST_F(ThreadLocal, InstanceCreatesNothing) {
    KELThreadLocal::_dict_instance();
    Armed armed;
    KELThreadLocal::instance(slot);
    EXPECT_EQ(AllocationPlan::calls(), 0);
    EXPECT_EQ(my_table(), nullptr);
}

TEST_F(ThreadLocal, InstanceLooksUnderTheMutex) {
    std::vector<pthread_mutex_t*> locked;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        locked.push_back(m);
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    KELThreadLocal::instance(slot);
    EXPECT_THAT(locked, ElementsAre(native(KELThreadLocal::_mutex)));
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 1);
}

TEST_F(ThreadLocal, EachSlotHasItsOwnObject) {
    Local a(slot);
    Local b(draw_slot());
    EXPECT_EQ(KELThreadLocal::instance(a._slot), &a);
    EXPECT_EQ(KELThreadLocal::instance(b._slot), &b);
}

TEST_F(ThreadLocal, EachThreadHasItsOwnObject) {
    Local mine(slot);
    in_another_thread([&] {
        Local* const theirs = new Local(slot);
        EXPECT_EQ(KELThreadLocal::instance(slot), theirs);
    });
    EXPECT_EQ(KELThreadLocal::instance(slot), &mine);
}

TEST_F(ThreadLocal, SlotTableHasThirtyTwoSlots) {
    Local object(slot);
    EXPECT_EQ(my_table()->capacity(), 32u);
    EXPECT_EQ(my_table()->count(), 1u);
}

TEST_F(ThreadLocal, FirstObjectOfAThreadSetsTheKeyValue) {
    record_key_values();
    Armed armed;
    Local a(slot);
    Local b(draw_slot());
    EXPECT_THAT(key_values, ElementsAre(static_cast<KELThreadLocal*>(&a)));
}

TEST_F(ThreadLocal, NextObjectSetsTheKeyValueAgainAfterTheLastWasDestroyed) {
    { Local last(slot); }
    record_key_values();
    Armed armed;
    Local next(slot);
    EXPECT_THAT(key_values, ElementsAre(static_cast<KELThreadLocal*>(&next)));
}

TEST_F(ThreadLocal, IsRegisteredEvenWhenTheKeyValueCannotBeSet) {
    { Local makes_the_key(slot); }
    seams::pthread_setspecific.fail(1, ENOMEM);
    Armed armed;
    Local object(slot);
    EXPECT_EQ(seams::pthread_setspecific.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
    EXPECT_EQ(KELThreadLocal::instance(slot), &object);
}

TEST_F(ThreadLocal, SetsTheKeyValueBeforeItIsRegistered) {
    { Local makes_the_key(slot); }
    bool registered = true;
    seams::pthread_setspecific.script([&](pthread_key_t key, const void* value) {
        registered = KELThreadLocal::instance(slot) != nullptr;
        return seams::pthread_setspecific.real(key, value);
    });
    Armed armed;
    Local object(slot);
    EXPECT_FALSE(registered);
}

TEST_F(ThreadLocal, LeavesTheMutexFree) {
    Local object(slot);
    EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
    KELThreadLocal::instance(slot);
    EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
}

// --- first use ---------------------------------------------------------------------------------------

const FreshScene initial_values("initial_values", []() KEL_NO_THREAD_SAFETY_ANALYSIS {
    std::cout << (KELThreadLocal::_key_dict == nullptr) << ' ' << KELThreadLocal::_cnt;
});

TEST_F(ThreadLocal, StartsWithoutATableAndWithSlotOne) { EXPECT_EQ(initial_values.play().out, "1 1"); }

const FreshScene first_table("first_table", []() KEL_NO_THREAD_SAFETY_ANALYSIS {
    KELThreadLocal::ThreadTable* const table = KELThreadLocal::_dict_instance();
    std::cout << (table == KELThreadLocal::_key_dict) << (table == KELThreadLocal::_dict_instance()) << ' '
              << table->capacity() << ' ' << table->count();
});

TEST_F(ThreadLocal, TableOfThreadsIsMadeOnceWithThirtyTwoSlots) {
    EXPECT_EQ(first_table.play().out, "11 32 0");
}

const FreshScene locks_of_the_table("locks_of_the_table", [] {
    std::vector<long> locks;
    for (int i = 0; i < 2; ++i) {
        reset_faults();
        Armed armed;
        KELThreadLocal::_dict_instance();
        locks.push_back(seams::pthread_mutex_lock.calls());
    }
    std::cout << locks[0] << ' ' << locks[1];
});

TEST_F(ThreadLocal, TableOfThreadsIsMadeUnderTheMutexAndThenFoundWithoutIt) {
    EXPECT_EQ(locks_of_the_table.play().out, "1 0");
}

const FreshScene look_before_use("look_before_use", []() KEL_NO_THREAD_SAFETY_ANALYSIS {
    KELThreadLocal::_exit_thread(nullptr);
    std::cout << (KELThreadLocal::instance(1) == nullptr) << (KELThreadLocal::_key_dict == nullptr);
});

TEST_F(ThreadLocal, LookUpAndCleanUpBeforeTheFirstObjectCreateNothing) {
    EXPECT_EQ(look_before_use.play().out, "11");
}

const FreshScene one_key("one_key", [] {
    seams::pthread_key_create.script([](pthread_key_t* key, void (*destroy)(void*)) {
        std::cout << (destroy == &KELThreadLocal::_exit_thread) << (key == &KELThreadLocal::_key);
        return seams::pthread_key_create.real(key, destroy);
    });
    ArmedEverywhere armed;
    std::cout << seams::pthread_key_create.calls();
    delete new Local(1);
    delete new Local(1);
    std::thread([] { delete new Local(1); }).join();
    std::cout << seams::pthread_key_create.calls();
});

TEST_F(ThreadLocal, KeyIsCreatedByTheFirstConstructionAndNeverAgain) {
    EXPECT_EQ(one_key.play().out, "0111");
}

const FreshScene no_key("no_key", [] {
    const FailedCreation seen = fail_creation(seams::pthread_key_create, EAGAIN, 7, [] { Local object(1); });
    std::cout << seen.thrown << ' ' << seen.printed << ' ' << std::hex << seen.minor << ' ' << seen.completed
              << ' ' << seen.calls << ' ' << (KELThreadLocal::instance(1) == nullptr)
              << is_held(KELThreadLocal::_mutex);
    reset_faults();
    Armed armed;
    Local object(1);
    std::cout << ' ' << (KELThreadLocal::instance(1) == &object) << seams::pthread_key_create.calls();
});

TEST_F(ThreadLocal, FailedKeyThrowsNoResourcesAndIsTriedAgainByTheNextConstruction) {
    EXPECT_EQ(no_key.play().out, "1 pthread_key_create 4f4d0007 1 1 10 11");
}

const FreshScene end_of_main("end_of_main", [] {
    new Local(1, [] { std::cout << "finalized" << std::flush; });
    std::cout << "end";
});

TEST_F(ThreadLocal, ObjectsOfTheMainThreadAreNotFinalizedWhenTheProcessExits) {
    EXPECT_EQ(end_of_main.play().out, "end");
}

// --- failing half-way --------------------------------------------------------------------------------

TEST_F(ThreadLocal, SecondObjectForASlotThrowsBadParam) {
    Local first(slot);
    EXPECT_THROW(Local second(slot), CORBA_BAD_PARAM);
}

TEST_F(ThreadLocal, DuplicateSlotLeavesTheFirstObjectRegistered) {
    Local first(slot);
    EXPECT_THROW(Local second(slot), CORBA_BAD_PARAM);
    EXPECT_EQ(KELThreadLocal::instance(slot), &first);
    EXPECT_EQ(my_table()->count(), 1u);
    EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
}

bool construct_and_destroy(unsigned long slot) {
    try {
        Armed armed;
        Survivor object(slot);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

TEST_F(ThreadLocal, ConstructionWithoutMemoryRegistersNothing) {
    { Local makes_the_key_and_the_table(slot); }
    const long blocks = AllocationPlan::live_blocks();
    const unsigned long threads = KELThreadLocal::_dict_instance()->count();
    long failures = 0;
    for (bool constructed = false; !constructed; reset_faults()) {
        AllocationPlan::fail(failures + 1);
        constructed = construct_and_destroy(slot);
        if (!constructed) ++failures;
        EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
        EXPECT_EQ(KELThreadLocal::_dict_instance()->count(), threads);
        EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
        EXPECT_FALSE(is_held(KELThreadLocal::_mutex));
    }
    EXPECT_GE(failures, 2) << "the slot table and its first record";
}

// --- destruction -------------------------------------------------------------------------------------

TEST_F(ThreadLocal, DestroyedObjectIsNotFoundAnyMore) {
    Local stays(draw_slot());
    { Local object(slot); }
    EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
    EXPECT_EQ(KELThreadLocal::instance(stays._slot), &stays);
}

TEST_F(ThreadLocal, DestroyingTheLastObjectRemovesTheTable) {
    { Local object(slot); }
    EXPECT_EQ(my_table(), nullptr);
    EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
}

TEST_F(ThreadLocal, DestroyingTheLastObjectFreesTheTable) {
    { Local warm_up(slot); }
    const long blocks = AllocationPlan::live_blocks();
    { Local object(slot); }
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
}

TEST_F(ThreadLocal, DestroyingTheLastObjectClearsTheKeyValue) {
    std::unique_ptr<Local> object(new Local(slot));
    record_key_values();
    Armed armed;
    object.reset();
    EXPECT_THAT(key_values, ElementsAre(nullptr));
}

TEST_F(ThreadLocal, DestroyingOneOfSeveralSetsTheKeyValueToTheFirstInTheTable) {
    std::unique_ptr<Local> goes(new Local(slot));
    Local b(draw_slot()), c(draw_slot()), d(draw_slot());
    const unsigned long first = in_table_order({b._slot, c._slot, d._slot}).front();
    record_key_values();
    Armed armed;
    goes.reset();
    EXPECT_THAT(key_values, ElementsAre(KELThreadLocal::instance(first)));
}

TEST_F(ThreadLocal, DestroyingAForeignObjectRemovesItFromItsOwner) {
    Local stays(draw_slot());
    Local* const object = new Local(slot);
    in_another_thread([&] { delete object; });
    EXPECT_EQ(KELThreadLocal::instance(slot), nullptr);
    EXPECT_EQ(my_table()->count(), 1u);
}

TEST_F(ThreadLocal, DestroyingAForeignObjectSetsTheCallersKeyValue) {
    Local stays(draw_slot());
    Local* const object = new Local(slot);
    record_key_values();
    in_another_thread([&] {
        Armed armed;
        delete object;
        EXPECT_EQ(pthread_getspecific(KELThreadLocal::_key), static_cast<KELThreadLocal*>(&stays));
        seams::pthread_setspecific.real(KELThreadLocal::_key, nullptr);
    });
    EXPECT_THAT(key_values, ElementsAre(static_cast<KELThreadLocal*>(&stays)));
}

TEST_F(ThreadLocal, DestroyingTheLastForeignObjectClearsTheCallersKeyValue) {
    Local* const object = new Local(slot);
    in_another_thread([&] {
        Survivor callers(slot);
        EXPECT_NE(pthread_getspecific(KELThreadLocal::_key), nullptr);
        delete object;
        EXPECT_EQ(pthread_getspecific(KELThreadLocal::_key), nullptr);
        EXPECT_EQ(KELThreadLocal::instance(slot), &callers);
    });
    EXPECT_EQ(my_table(), nullptr);
}

TEST_F(ThreadLocal, DestroyingWithoutTheOwnersTableSetsNoKeyValue) {
    std::unique_ptr<Survivor> object(new Survivor(slot));
    KELThreadLocal::_exit_thread(nullptr);
    record_key_values();
    Armed armed;
    object.reset();
    EXPECT_THAT(key_values, IsEmpty());
}

TEST_F(ThreadLocal, DestructionWorksUnderTheMutex) {
    std::unique_ptr<Local> object(new Local(slot));
    bool held = false;
    seams::pthread_setspecific.script([&](pthread_key_t key, const void* value) {
        held = is_held(KELThreadLocal::_mutex);
        return seams::pthread_setspecific.real(key, value);
    });
    Armed armed;
    object.reset();
    EXPECT_TRUE(held);
}

}  // namespace
