// Reference counts and their records.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/resource.h>
#include <kel/exceptions/standard.h>
#include <sys/mman.h>

#include <cstring>
#include <thread>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/probe.h"
#include "tests/core/records.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;

using Resource = ResourceTest;

// --- counting ----------------------------------------------------------------------------------------

TEST_F(Resource, StartsWithOneReferenceAndNoRecord) {
    Counted object;
    EXPECT_EQ(object._impl, nullptr);
    EXPECT_EQ(object._num_refs(), 1ul);
    EXPECT_EQ(object._impl, nullptr) << "asking makes no record";
}

TEST_F(Resource, FirstRefGivesTwo) {
    Counted object;
    EXPECT_EQ(object._ref(), 2ul);
    EXPECT_EQ(object._num_refs(), 2ul);
}

// The first use of the pool in a process fails for ever; a destructor that made the pool would throw.
const FreshScene no_pool_for_records("no_pool_for_records", [] {
    Armed armed;
    seams::pthread_mutex_init.fail(1, EAGAIN, true);
    try {
        Counted object;
        object._ref();
    } catch (const CORBA_NO_RESOURCES&) {
        std::cout << "thrown";
    }
});

TEST_F(Resource, AnObjectWithoutARecordIsDestroyedWithoutThePool) {
    EXPECT_EQ(no_pool_for_records.play().out, "thrown");
}

TEST_F(Resource, EveryRefCounts) {
    Counted object;
    object._ref();
    EXPECT_EQ(object._ref(), 3ul);
    EXPECT_EQ(object._ref(), 4ul);
}

TEST_F(Resource, UnrefOfAFreshObjectGivesZeroAndDeletes) {
    int deleted = 0;
    Counted* const object = new Counted(&deleted);
    EXPECT_EQ(object->_unref(), 0l);
    EXPECT_EQ(deleted, 1);
}

TEST_F(Resource, RefThenUnrefTwiceGivesTwoOneZeroAndDeletes) {
    int deleted = 0;
    Counted* const object = new Counted(&deleted);
    EXPECT_EQ(object->_ref(), 2ul);
    EXPECT_EQ(object->_unref(), 1l);
    EXPECT_EQ(deleted, 0);
    EXPECT_EQ(object->_unref(), 0l);
    EXPECT_EQ(deleted, 1);
}

class AsksAtItsEnd : public KELResource {
public:
    explicit AsksAtItsEnd(bool& held) : _held(held) {}
    ~AsksAtItsEnd() override { _held = is_held(*impl_of(mutex_of(_impl))); }

private:
    bool& _held;
};

TEST_F(Resource, DeletesWhenItsMutexIsFree) {
    bool held = true;
    AsksAtItsEnd* const object = new AsksAtItsEnd(held);
    object->_ref();
    object->_unref();
    EXPECT_EQ(object->_unref(), 0l);
    EXPECT_FALSE(held);
}

TEST_F(Resource, UnrefBelowZeroGoesUnnoticed) {
    int deleted = 0;
    Counted object(&deleted);
    object._reset_refs();
    EXPECT_EQ(object._unref(), -1l);
    EXPECT_EQ(deleted, 0);
}

TEST_F(Resource, DerefOfAFreshObjectGivesZeroAndChangesNothing) {
    int deleted = 0;
    Counted object(&deleted);
    EXPECT_EQ(object._deref(), 0ul);
    EXPECT_EQ(object._num_refs(), 1ul);
    EXPECT_EQ(object._impl, nullptr);
    EXPECT_EQ(deleted, 0);
}

TEST_F(Resource, DerefGivesTheNewCountAndNeverDeletes) {
    int deleted = 0;
    Counted object(&deleted);
    object._ref();
    EXPECT_EQ(object._deref(), 1ul);
    EXPECT_EQ(object._deref(), 0ul);
    EXPECT_EQ(object._num_refs(), 0ul);
    EXPECT_EQ(deleted, 0);
}

TEST_F(Resource, DerefBelowZeroWraps) {
    Counted object;
    object._reset_refs();
    EXPECT_EQ(object._deref(), static_cast<unsigned long>(-1));
}

TEST_F(Resource, ResetOfAFreshObjectGivesZeroReferences) {
    Counted object;
    object._reset_refs();
    EXPECT_NE(object._impl, nullptr);
    EXPECT_EQ(object._num_refs(), 0ul);
}

TEST_F(Resource, ResetForgetsTheCount) {
    Counted object;
    object._ref();
    object._ref();
    object._reset_refs();
    EXPECT_EQ(object._num_refs(), 0ul);
    EXPECT_EQ(object._ref(), 1ul);
}

TEST_F(Resource, CopyIsAnObjectOfItsOwn) {
    Counted object;
    object._ref();
    Counted copy(object);
    EXPECT_EQ(copy._impl, nullptr);
    EXPECT_EQ(copy._num_refs(), 1ul);
    EXPECT_EQ(object._num_refs(), 2ul);
}

TEST_F(Resource, AssignmentKeepsTheReferencesOfBoth) {
    Counted a, b;
    a._ref();
    KELResourceImpl* const record = a._impl;
    b._ref();
    b._ref();
    a = b;
    EXPECT_EQ(a._impl, record);
    EXPECT_EQ(a._num_refs(), 2ul);
    EXPECT_EQ(b._num_refs(), 3ul);
}

void count_in_four_threads(KELResource& object) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            for (int n = 0; n < 1000; ++n) object._ref();
            for (int n = 0; n < 999; ++n) object._unref();
        });
    }
    for (std::thread& thread : threads) thread.join();
}

TEST_F(Resource, CountsTheReferencesOfManyThreads) {
    Counted object;
    object._ref();
    count_in_four_threads(object);
    EXPECT_EQ(object._num_refs(), 6ul);
}

TEST_F(Resource, ManyThreadsMayMakeTheFirstReference) {
    Counted object;
    count_in_four_threads(object);
    EXPECT_EQ(object._num_refs(), 5ul);
}

// The other thread's first reference arrives while this one's record is being made.
TEST_F(Resource, TwoFirstReferencesShareOneRecord) {
    Counted object;
    bool came = false;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        if (!came) {
            came = true;
            EXPECT_EQ(object._ref(), 2ul);
        }
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    EXPECT_EQ(object._ref(), 3ul);
    EXPECT_EQ(parked(), 1u) << "the record that came too late";
}

// Threads may ask together for the count of a record without sharing while none of them changes it.
TEST_F(Resource, AskingForTheCountWritesNothing) {
    Counted object;
    object._set_sharing(0);
    object._ref();
    KELResourceImpl* const record = object._impl;
    void* const page = mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(page, MAP_FAILED);
    std::memcpy(page, static_cast<void*>(record), sizeof *record);
    mprotect(page, 4096, PROT_READ);
    const Outcome seen = in_child([&] {
        object._impl = static_cast<KELResourceImpl*>(page);
        std::cout << object._num_refs() << std::flush;
        object._impl = record;
    });
    munmap(page, 4096);
    EXPECT_EQ(seen.out, "2");
    EXPECT_EQ(seen.signal, 0);
}

TEST_F(Resource, UnrefAfterTheLastDerefDoesNotDelete) {
    int deleted = 0;
    Counted object(&deleted);
    object._ref();
    object._deref();
    object._deref();
    EXPECT_EQ(object._unref(), -1l);
    EXPECT_EQ(deleted, 0);
}

// --- sharing -----------------------------------------------------------------------------------------

TEST_F(Resource, RecordsAreSharedInitially) {
    EXPECT_EQ(KELResourceImpl::get_init_sharing(), 1);
    Counted object;
    object._ref();
    EXPECT_EQ(sharing_of(object._impl), 1);
}

const FreshScene initial_sharing("initial_sharing", [] { std::cout << int(KELResourceImpl::_init_sharing); });

TEST_F(Resource, InitialSharingStartsAsTrue) { EXPECT_EQ(initial_sharing.play().out, "1"); }

TEST_F(Resource, SetInitSharingReachesTheRecordClass) {
    KELResource::set_init_sharing(0);
    EXPECT_EQ(KELResourceImpl::get_init_sharing(), 0);
    EXPECT_EQ(KELResourceImpl::_init_sharing, 0);
    KELResourceImpl::set_init_sharing(1);
    EXPECT_EQ(KELResourceImpl::_init_sharing, 1);
}

TEST_F(Resource, SharedCountIsChangedAndReadUnderItsMutex) {
    Counted object;
    object._ref();
    record_locks();
    pthread_mutex_t* const mutex = native(object._impl);
    Armed armed;
    object._ref();
    object._unref();
    object._deref();
    object._num_refs();
    EXPECT_THAT(locked, ElementsAre(mutex, mutex, mutex, mutex));
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 4);
}

TEST_F(Resource, UnsharedCountTakesNoMutex) {
    KELResource::set_init_sharing(0);
    Counted object;
    object._ref();
    Armed armed;
    EXPECT_EQ(object._ref(), 3ul);
    EXPECT_EQ(object._unref(), 2l);
    EXPECT_EQ(object._deref(), 1ul);
    EXPECT_EQ(object._num_refs(), 1ul);
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

TEST_F(Resource, InitSharingDoesNotChangeExistingRecords) {
    Counted object;
    object._ref();
    KELResource::set_init_sharing(0);
    Armed armed;
    object._ref();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
}

TEST_F(Resource, SetSharingSwitchesOneObject) {
    Counted object;
    object._set_sharing(0);
    Armed armed;
    object._ref();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
    object._set_sharing(1);
    object._ref();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
}

TEST_F(Resource, SetSharingMakesARecordWithOneReference) {
    Counted object;
    object._set_sharing(1);
    EXPECT_NE(object._impl, nullptr);
    EXPECT_EQ(object._num_refs(), 1ul);
}

TEST_F(Resource, SetSharingTakesNoMutex) {
    Counted object;
    object._ref();
    Armed armed;
    object._set_sharing(0);
    object._set_sharing(1);
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

TEST_F(Resource, ResetTakesNoMutex) {
    Counted object;
    object._ref();
    Armed armed;
    object._reset_refs();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

TEST_F(Resource, SharingSwitchedOffBetweenLockAndUnlockStillUnlocks) {
    Counted object;
    object._ref();
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        object._set_sharing(0);
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    object._ref();
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 1);
}

}  // namespace
