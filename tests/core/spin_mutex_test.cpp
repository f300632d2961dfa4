// Pooled mutexes and their pools.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/spin_mutex.h>

#include <cstring>
#include <memory>
#include <new>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/probe.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;

// Starts with an empty pool and puts back afterwards what was parked in it.
template <class Factory, class Impl>
class Pool : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        while (parked() > 0) _kept.push_back(pool->create());
    }

    void TearDown() override {
        while (parked() > 0) delete pool->create();
        while (!_kept.empty()) {
            pool->destroy(_kept.back());
            _kept.pop_back();
        }
        FaultTest::TearDown();
    }

    int parked() const { return field_at<std::int32_t>(pool, 0); }

    std::vector<Impl*> create(int n) {
        std::vector<Impl*> made;
        for (int i = 0; i < n; ++i) made.push_back(pool->create());
        return made;
    }

    void destroy(const std::vector<Impl*>& all) {
        for (Impl* impl : all) pool->destroy(impl);
    }

    Factory* const pool = Factory::instance();

private:
    std::vector<Impl*> _kept;
};

using PlainPool = Pool<KELSpinMutexImplFactory, KELSpinMutexImpl>;
using SpinMutex = PlainPool;
using RecursivePool = Pool<KELRSpinMutexImplFactory, KELRSpinMutexImpl>;
using RecursiveSpinMutex = RecursivePool;

// --- the plain pool ----------------------------------------------------------------------------------

TEST_F(PlainPool, IsOne) { EXPECT_EQ(KELSpinMutexImplFactory::instance(), pool); }

TEST_F(PlainPool, MakesANewMutexWhenNoneIsParked) {
    Armed armed;
    KELSpinMutexImpl* const made = pool->create();
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 1);
    EXPECT_FALSE(is_held(*made));
    pool->destroy(made);
}

TEST_F(PlainPool, HandsOutTheNewestFirst) {
    const auto made = create(3);
    destroy(made);
    EXPECT_EQ(pool->create(), made[2]);
    EXPECT_EQ(pool->create(), made[1]);
    EXPECT_EQ(pool->create(), made[0]);
    destroy(made);
}

TEST_F(PlainPool, MakesNoMutexWhenOneIsParked) {
    pool->destroy(pool->create());
    Armed armed;
    pool->destroy(pool->create());
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 0);
    EXPECT_EQ(seams::pthread_mutex_destroy.calls(), 0);
}

TEST_F(PlainPool, ParksThirtyTwoAndDestroysTheThirtyThird) {
    const auto made = create(33);
    std::vector<pthread_mutex_t*> destroyed;
    seams::pthread_mutex_destroy.script([&](pthread_mutex_t* m) {
        destroyed.push_back(m);
        return seams::pthread_mutex_destroy.real(m);
    });
    pthread_mutex_t* const last = native(*made[32]);
    {
        Armed armed;
        destroy(made);
    }
    EXPECT_EQ(parked(), 32);
    EXPECT_THAT(destroyed, ::testing::ElementsAre(last));
}

TEST_F(PlainPool, FreesTheMutexThatFindsThePoolFull) {
    destroy(create(32));
    KELSpinMutexImpl* const one_more = new KELSpinMutexImpl;
    const long blocks = AllocationPlan::live_blocks();
    pool->destroy(one_more);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks - 1);
}

TEST_F(PlainPool, HandsOutAllThirtyTwoNewestFirst) {
    auto made = create(33);
    destroy(made);
    made.pop_back();
    std::vector<KELSpinMutexImpl*> again = create(32);
    EXPECT_EQ(parked(), 0);
    EXPECT_EQ(again, std::vector<KELSpinMutexImpl*>(made.rbegin(), made.rend()));
    destroy(again);
}

TEST_F(PlainPool, LimitsOnlyWhatIsParked) {
    const auto made = create(200);
    EXPECT_EQ(made.size(), 200u);
    destroy(made);
    EXPECT_EQ(parked(), 32);
}

TEST_F(PlainPool, IgnoresNullWithoutTakingTheGuard) {
    Armed armed;
    pool->destroy(nullptr);
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
    EXPECT_EQ(parked(), 0);
}

TEST_F(PlainPool, WorksUnderItsGuard) {
    pthread_mutex_t* const guard = at(pool, 2 * word);
    std::vector<pthread_mutex_t*> locked;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        locked.push_back(m);
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    pool->destroy(pool->create());
    EXPECT_THAT(locked, ::testing::ElementsAre(guard, guard));
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 2);
}

TEST_F(PlainPool, FailedCreationThrowsNoResourcesAndLeavesThePoolUsable) {
    expect_no_resources(seams::pthread_mutex_init, [&] { pool->create(); });
    EXPECT_EQ(parked(), 0);
    pool->destroy(pool->create());
    EXPECT_EQ(parked(), 1);
}

TEST_F(PlainPool, CreationWithoutMemoryLeavesThePoolUsable) {
    {
        AllocationPlan::fail(1);
        Armed armed;
        EXPECT_THROW(pool->create(), std::bad_alloc);
    }
    pool->destroy(pool->create());
    EXPECT_EQ(parked(), 1);
}

TEST_F(PlainPool, ServesManyThreads) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([] {
            for (int round = 0; round < 500; ++round) {
                KELSpinMutex m;
                m.lock();
                m.unlock();
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_GE(parked(), 1);
    EXPECT_LE(parked(), 4);
}

TEST_F(PlainPool, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELSpinMutexImplFactory>::value);
}

// --- the plain handle --------------------------------------------------------------------------------

TEST_F(SpinMutex, TakesItsMutexFromThePool) {
    KELSpinMutexImpl* const parked_one = pool->create();
    pool->destroy(parked_one);
    KELSpinMutex m;
    EXPECT_EQ(impl_of(m), parked_one);
}

TEST_F(SpinMutex, GivesItsMutexBack) {
    KELSpinMutexImpl* impl = nullptr;
    {
        KELSpinMutex m;
        impl = impl_of(m);
    }
    EXPECT_EQ(parked(), 1);
    EXPECT_EQ(pool->create(), impl);
    pool->destroy(impl);
}

TEST_F(SpinMutex, HasAPlainMutexInside) {
    EXPECT_TRUE((std::is_base_of<KELMutex, KELSpinMutexImpl>::value));
    EXPECT_EQ(sizeof(KELSpinMutexImpl), sizeof(KELMutex));
}

TEST_F(SpinMutex, LocksAndUnlocksItsMutex) {
    KELSpinMutex m;
    m.lock();
    EXPECT_TRUE(is_held(*impl_of(m)));
    m.unlock();
    EXPECT_FALSE(is_held(*impl_of(m)));
}

TEST_F(SpinMutex, VirtualEntriesLockAndUnlock) {
    KELSpinMutex m;
    KELIMutex& any = m;
    any.v_lock();
    EXPECT_TRUE(is_held(*impl_of(m)));
    any.v_unlock();
    EXPECT_FALSE(is_held(*impl_of(m)));
}

TEST_F(SpinMutex, ReusesTheMutexesOfThirtyThreeDestroyedOnesNewestFirst) {
    std::vector<KELSpinMutexImpl*> impls;
    {
        std::vector<std::unique_ptr<KELSpinMutex>> handles(33);
        for (auto& handle : handles) handle.reset(new KELSpinMutex);
        for (auto& handle : handles) {
            impls.push_back(impl_of(*handle));
            handle.reset();
        }
    }
    std::vector<std::unique_ptr<KELSpinMutex>> again(32);
    Armed armed;
    for (int i = 0; i < 32; ++i) {
        again[i].reset(new KELSpinMutex);
        EXPECT_EQ(impl_of(*again[i]), impls[31 - i]);
    }
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 0);
}

TEST_F(SpinMutex, FailedCreationThrowsNoResources) {
    expect_no_resources(seams::pthread_mutex_init, [] { KELSpinMutex m; });
}

TEST_F(SpinMutex, FailedLockReportsTheMutexInside) {
    const auto use = [] {
        KELSpinMutex m;
        fail_use(seams::pthread_mutex_lock, EINVAL);
        m.lock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELMutex::lock()");
}

// No pool hands out a null for it, so the handle loses its mutex here.
TEST_F(SpinMutex, LocksAndUnlocksWithoutEffectOverNull) {
    KELSpinMutex m;
    KELSpinMutexImpl* const none = nullptr;
    pool->destroy(impl_of(m));
    std::memcpy(reinterpret_cast<unsigned char*>(&m) + word, &none, sizeof none);
    Armed armed;
    m.lock();
    m.unlock();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 0);
}

TEST_F(SpinMutex, CannotBeCopied) { EXPECT_FALSE(std::is_copy_constructible<KELSpinMutex>::value); }

// --- the recursive pool ------------------------------------------------------------------------------

TEST_F(RecursivePool, IsOne) { EXPECT_EQ(KELRSpinMutexImplFactory::instance(), pool); }

TEST_F(RecursivePool, HandsOutTheNewestFirst) {
    const auto made = create(3);
    destroy(made);
    EXPECT_EQ(pool->create(), made[2]);
    EXPECT_EQ(pool->create(), made[1]);
    EXPECT_EQ(pool->create(), made[0]);
    destroy(made);
}

TEST_F(RecursivePool, ParksThirtyTwoAndDestroysTheThirtyThird) {
    const auto made = create(33);
    Armed armed;
    destroy(made);
    EXPECT_EQ(parked(), 32);
    EXPECT_EQ(seams::pthread_mutex_destroy.calls(), 1);
}

TEST_F(RecursivePool, FreesTheMutexThatFindsThePoolFull) {
    destroy(create(32));
    KELRSpinMutexImpl* const one_more = new KELRSpinMutexImpl;
    const long blocks = AllocationPlan::live_blocks();
    pool->destroy(one_more);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks - 1);
}

TEST_F(RecursivePool, HandsOutAParkedNull) {
    pool->destroy(nullptr);
    EXPECT_EQ(parked(), 1);
    EXPECT_EQ(pool->create(), nullptr);
    EXPECT_EQ(parked(), 0);
}

TEST_F(RecursivePool, TakesTheGuardForANullToo) {
    Armed armed;
    pool->destroy(nullptr);
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
}

TEST_F(RecursivePool, CountsAParkedNullTowardsTheThirtyTwo) {
    pool->destroy(nullptr);
    const auto made = create(33);  // the null and 32 new ones
    ASSERT_EQ(made[0], nullptr);
    destroy(made);
    EXPECT_EQ(parked(), 32);
    for (int i = 31; i > 0; --i) delete pool->create();
    EXPECT_EQ(pool->create(), nullptr);
}

TEST_F(RecursivePool, IgnoresANullWhenItIsFull) {
    destroy(create(32));
    pool->destroy(nullptr);
    EXPECT_EQ(parked(), 32);
    EXPECT_NE(field_at<void*>(pool, 3 * word + 31 * word), nullptr);
}

TEST_F(RecursivePool, IsGuardedByAPooledPlainMutex) {
    KELSpinMutex& guard = *reinterpret_cast<KELSpinMutex*>(reinterpret_cast<unsigned char*>(pool) + word);
    std::vector<pthread_mutex_t*> locked;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        locked.push_back(m);
        return seams::pthread_mutex_lock.real(m);
    });
    Armed armed;
    pool->destroy(pool->create());
    pthread_mutex_t* const inside = native(*impl_of(guard));
    EXPECT_THAT(locked, ::testing::ElementsAre(inside, inside));
}

TEST_F(RecursivePool, FailedCreationThrowsNoResourcesAndLeavesThePoolUsable) {
    expect_no_resources(seams::pthread_mutex_init, [&] { pool->create(); });
    pool->destroy(pool->create());
    EXPECT_EQ(parked(), 1);
}

TEST_F(RecursivePool, CreationWithoutMemoryLeavesThePoolUsable) {
    {
        AllocationPlan::fail(1);
        Armed armed;
        EXPECT_THROW(pool->create(), std::bad_alloc);
    }
    pool->destroy(pool->create());
    EXPECT_EQ(parked(), 1);
}

TEST_F(RecursivePool, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELRSpinMutexImplFactory>::value);
}

// The first mutex of the scene is the guard of the plain pool, the second the pooled mutex that guards
// the recursive pool. Nothing in the library has used a pool before.
const FreshScene first_recursive_pool("first_recursive_pool", [] {
    ArmedEverywhere armed;
    KELRSpinMutexImplFactory::instance();
    const long by_recursive_pool = seams::pthread_mutex_init.calls();
    KELSpinMutexImplFactory::instance();
    std::cout << by_recursive_pool << ' ' << seams::pthread_mutex_init.calls();
});

TEST(PoolStart, FirstUseOfTheRecursivePoolMakesThePlainPool) {
    EXPECT_EQ(first_recursive_pool.play().out, "2 2");
}

const FreshScene failed_pool("failed_pool", [] {
    Armed armed;
    seams::pthread_mutex_init.fail(1, EAGAIN);
    try {
        KELSpinMutexImplFactory::instance();
    } catch (const CORBA_NO_RESOURCES&) {
        std::cout << "thrown, ";
    }
    KELSpinMutex m;
    m.lock();
    m.unlock();
    std::cout << "works";
});

TEST(PoolStart, IsTriedAgainAfterTheGuardCouldNotBeMade) {
    EXPECT_EQ(failed_pool.play().out, "thrown, works");
}

const FreshScene pools_at_exit("pools_at_exit", [] {
    { KELSpinMutex plain; }
    { KELRSpinMutex recursive; }
    KELSpinMutexImpl* const plain = KELSpinMutexImplFactory::instance()->create();
    KELRSpinMutexImpl* const recursive = KELRSpinMutexImplFactory::instance()->create();
    std::cout << native(*plain) << '\n' << native(*recursive) << '\n';
    KELSpinMutexImplFactory::instance()->destroy(plain);
    KELRSpinMutexImplFactory::instance()->destroy(recursive);
    seams::pthread_mutex_destroy.script([](pthread_mutex_t* m) {
        std::cerr << m << std::endl;
        return 0;
    });
    arm_until_the_end();
});

TEST(PoolEnd, LeavesTheParkedMutexes) {
    const Outcome seen = pools_at_exit.play();
    ASSERT_EQ(seen.exit_code, 0);
    std::istringstream parked(seen.out);
    std::string address;
    while (parked >> address) EXPECT_THAT(seen.err, ::testing::Not(::testing::HasSubstr(address)));
}

// --- the recursive handle ----------------------------------------------------------------------------

TEST_F(RecursiveSpinMutex, TakesItsMutexFromThePoolAndGivesItBack) {
    KELRSpinMutexImpl* const parked_one = pool->create();
    pool->destroy(parked_one);
    {
        KELRSpinMutex m;
        EXPECT_EQ(impl_of(m), parked_one);
        EXPECT_EQ(parked(), 0);
    }
    EXPECT_EQ(parked(), 1);
}

TEST_F(RecursiveSpinMutex, HasARecursiveMutexInside) {
    EXPECT_TRUE((std::is_base_of<KELRMutex, KELRSpinMutexImpl>::value));
    EXPECT_EQ(sizeof(KELRSpinMutexImpl), sizeof(KELRMutex));
}

TEST_F(RecursiveSpinMutex, NeedsAsManyUnlocksAsLocks) {
    KELRSpinMutex m;
    m.lock();
    m.lock();
    m.unlock();
    EXPECT_TRUE(is_held(*impl_of(m)));
    m.unlock();
    EXPECT_FALSE(is_held(*impl_of(m)));
}

TEST_F(RecursiveSpinMutex, VirtualEntriesLockAndUnlock) {
    KELRSpinMutex m;
    KELIMutex& any = m;
    any.v_lock();
    EXPECT_TRUE(is_held(*impl_of(m)));
    any.v_unlock();
    EXPECT_FALSE(is_held(*impl_of(m)));
}

TEST_F(RecursiveSpinMutex, LocksAndUnlocksWithoutEffectOverAParkedNull) {
    pool->destroy(nullptr);
    {
        KELRSpinMutex m;
        EXPECT_EQ(impl_of(m), nullptr);
        Armed armed;
        m.lock();
        m.v_lock();
        m.unlock();
        m.v_unlock();
        EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
        EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 0);
    }
    EXPECT_EQ(pool->create(), nullptr) << "the handle parks its null again";
}

TEST_F(RecursiveSpinMutex, FailedUnlockReportsTheMutexInside) {
    const auto use = [] {
        KELRSpinMutex m;
        m.lock();
        fail_use(seams::pthread_mutex_unlock, EPERM);
        m.unlock();
    };
    expect_use_failure(use, "pthread_mutex_unlock", "(rc == 0)", "void KELRMutex::unlock()");
}

TEST_F(RecursiveSpinMutex, CannotBeCopied) { EXPECT_FALSE(std::is_copy_constructible<KELRSpinMutex>::value); }

}  // namespace
