// The pool of the records that count references.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/resource.h>

#include <new>
#include <vector>

#include "tests/core/probe.h"
#include "tests/core/records.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;

using ResourcePool = ResourceTest;

TEST_F(ResourcePool, IsOne) { EXPECT_EQ(KELResourceImplFactory::instance(), pool); }

TEST_F(ResourcePool, NewRecordHasOneReferenceAndTheInitialSharing) {
    KELResourceImpl* const shared = pool->create();
    KELResource::set_init_sharing(0);
    KELResourceImpl* const unshared = pool->create();
    EXPECT_EQ(count_of(shared), 1);
    EXPECT_EQ(sharing_of(shared), 1);
    EXPECT_EQ(count_of(unshared), 1);
    EXPECT_EQ(sharing_of(unshared), 0);
    pool->destroy(shared);
    pool->destroy(unshared);
}

TEST_F(ResourcePool, ParksRecordsWithCountZero) {
    KELResourceImpl* const r = pool->create();
    pool->destroy(r);
    EXPECT_EQ(parked(), 1u);
    EXPECT_EQ(count_of(r), 0);
}

TEST_F(ResourcePool, HandsOutTheNewestFirst) {
    KELResourceImpl* const a = pool->create();
    KELResourceImpl* const b = pool->create();
    pool->destroy(a);
    pool->destroy(b);
    EXPECT_EQ(pool->create(), b);
    EXPECT_EQ(pool->create(), a);
    pool->destroy(a);
    pool->destroy(b);
}

TEST_F(ResourcePool, RecycledRecordHasOneReferenceAndTheSharingOfNow) {
    KELResourceImpl* const r = pool->create();
    pool->destroy(r);
    KELResource::set_init_sharing(0);
    ASSERT_EQ(pool->create(), r);
    EXPECT_EQ(count_of(r), 1);
    EXPECT_EQ(sharing_of(r), 0);
    pool->destroy(r);
}

TEST_F(ResourcePool, RecycledRecordIsRaisedUnderItsMutex) {
    KELResourceImpl* const r = pool->create();
    pool->destroy(r);
    pthread_mutex_t* const guard = native(*impl_of(*reinterpret_cast<KELSpinMutex*>(pool)));
    record_locks();
    {
        Armed armed;
        pool->create();
    }
    EXPECT_THAT(locked, ElementsAre(guard, native(r)));
    pool->destroy(r);
}

TEST_F(ResourcePool, UnsharedRecycledRecordIsRaisedWithoutItsMutex) {
    KELResourceImpl* const r = pool->create();
    pool->destroy(r);
    KELResource::set_init_sharing(0);
    Armed armed;
    pool->create();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1) << "the guard of the pool";
    pool->destroy(r);
}

TEST_F(ResourcePool, IgnoresNull) {
    Armed armed;
    pool->destroy(nullptr);
    EXPECT_EQ(parked(), 0u);
}

TEST_F(ResourcePool, ObjectWithoutARecordParksNone) {
    { Counted object; }
    EXPECT_EQ(parked(), 0u);
}

TEST_F(ResourcePool, DestroyedObjectParksItsRecord) {
    KELResourceImpl* record = nullptr;
    {
        Counted object;
        object._ref();
        record = object._impl;
    }
    EXPECT_EQ(parked(), 1u);
    EXPECT_EQ(pool->create(), record);
    pool->destroy(record);
}

TEST_F(ResourcePool, ParksAThousandAndTwentyFourAndFreesTheNext) {
    {
        std::vector<Counted> objects(1025);
        for (Counted& object : objects) object._ref();
    }
    EXPECT_EQ(parked(), 1024u);
    KELResource::garbage_collect();
    EXPECT_EQ(parked(), 0u);
}

TEST_F(ResourcePool, FreesTheRecordThatFindsThePoolFull) {
    std::vector<KELResourceImpl*> records;
    for (int i = 0; i < 1025; ++i) records.push_back(pool->create());
    for (int i = 0; i < 1024; ++i) pool->destroy(records[i]);
    const long blocks = AllocationPlan::live_blocks();
    pool->destroy(records[1024]);
    EXPECT_LT(AllocationPlan::live_blocks(), blocks);
    EXPECT_EQ(pool->create(), records[1023]);
    pool->destroy(records[1023]);
}

// Keeps the parked mutexes out of their pool while it lives.
class EmptyMutexPool {
public:
    EmptyMutexPool() {
        while (field_at<std::int32_t>(pool, 0) > 0) _kept.push_back(pool->create());
    }
    ~EmptyMutexPool() {
        for (KELSpinMutexImpl* impl : _kept) pool->destroy(impl);
    }

    KELSpinMutexImplFactory* const pool = KELSpinMutexImplFactory::instance();

private:
    std::vector<KELSpinMutexImpl*> _kept;
};

// The mutexes of the records go to their own pool, which shows the order.
TEST_F(ResourcePool, GarbageCollectDestroysTheNewestFirst) {
    KELResourceImpl* const a = pool->create();
    KELResourceImpl* const b = pool->create();
    KELSpinMutexImpl* const of_a = impl_of(mutex_of(a));
    KELSpinMutexImpl* const of_b = impl_of(mutex_of(b));
    pool->destroy(a);
    pool->destroy(b);
    EmptyMutexPool mutexes;
    KELResource::garbage_collect();
    EXPECT_EQ(mutexes.pool->create(), of_a) << "parked last";
    EXPECT_EQ(mutexes.pool->create(), of_b);
    mutexes.pool->destroy(of_b);
    mutexes.pool->destroy(of_a);
}

TEST_F(ResourcePool, GarbageCollectFreesTheRecords) {
    pool->destroy(pool->create());
    const long blocks = AllocationPlan::live_blocks();
    KELResource::garbage_collect();
    EXPECT_LT(AllocationPlan::live_blocks(), blocks);
}

bool is_locked(pthread_mutex_t* m) {
    if (pthread_mutex_trylock(m) != 0) return true;
    pthread_mutex_unlock(m);
    return false;
}

TEST_F(ResourcePool, ParksAndCollectsUnderItsGuard) {
    pthread_mutex_t* const guard = native(*impl_of(*reinterpret_cast<KELSpinMutex*>(pool)));
    KELResourceImpl* const r = pool->create();
    bool held = false;
    {
        record_locks();
        Armed armed;
        pool->destroy(r);
        EXPECT_THAT(locked, ElementsAre(guard));
    }
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        if (m != guard) held = is_locked(guard);  // the record's mutex goes back to its own pool
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    KELResource::garbage_collect();
    EXPECT_TRUE(held);
}

TEST_F(ResourcePool, GarbageCollectOfAnEmptyPoolDoesNothing) {
    KELResource::garbage_collect();
    pool->garbage_collect();
    EXPECT_EQ(parked(), 0u);
}

// The first allocation is the record, the second its mutex.
TEST_F(ResourcePool, CreationWithoutMemoryLeavesObjectAndPoolAsTheyWere) {
    for (const long nth : {1, 2}) {
        KELResource::garbage_collect();
        EmptyMutexPool makes_the_mutex_new;
        Counted object;
        const long blocks = AllocationPlan::live_blocks();
        AllocationPlan::fail(nth);
        {
            Armed armed;
            EXPECT_THROW(object._ref(), std::bad_alloc);
        }
        EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
        EXPECT_EQ(object._num_refs(), 1ul);
        reset_faults();
        EXPECT_EQ(object._ref(), 2ul);
    }
}

TEST_F(ResourcePool, FailedMutexThrowsNoResourcesAndLeavesThePoolUsable) {
    EmptyMutexPool makes_the_mutex_new;
    Counted object;
    expect_no_resources(seams::pthread_mutex_init, [&] { object._ref(); });
    EXPECT_EQ(object._impl, nullptr);
    EXPECT_EQ(object._ref(), 2ul);
}

}  // namespace
