// The guards that hold a mutex for a scope.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/mutex.h>

#include <type_traits>

#include "tests/core/probe.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;

template <class M, class G>
struct GuardOf {
    typedef M Mutex;
    typedef G Guard;
};

// --- KELMutex_var and KELRMutex_var are the same over their kind of mutex ------------------------------

template <class Kind>
class EitherGuard : public FaultTest {
protected:
    typename Kind::Mutex m;
    typedef typename Kind::Guard Guard;
};

typedef ::testing::Types<GuardOf<KELMutex, KELMutex_var>, GuardOf<KELRMutex, KELRMutex_var>> BothKinds;
TYPED_TEST_SUITE(EitherGuard, BothKinds, );

TYPED_TEST(EitherGuard, LocksUntilTheEndOfTheScope) {
    {
        typename TestFixture::Guard hold(this->m, 1);
        EXPECT_TRUE(is_held(this->m));
    }
    EXPECT_FALSE(is_held(this->m));
}

TYPED_TEST(EitherGuard, FlagZeroLocksAsWell) {
    typename TestFixture::Guard hold(this->m, 0);
    EXPECT_TRUE(is_held(this->m));
    hold.unlock();
}

TYPED_TEST(EitherGuard, KeepsTheFlagAsItIsGiven) {
    typename TestFixture::Guard hold(this->m, 7);
    EXPECT_EQ(hold._locked, 7);
}

TYPED_TEST(EitherGuard, AnyFlagButZeroUnlocks) {
    { typename TestFixture::Guard hold(this->m, 255); }
    EXPECT_FALSE(is_held(this->m));
}

TYPED_TEST(EitherGuard, UnlockReleasesAndClearsTheFlag) {
    typename TestFixture::Guard hold(this->m, 1);
    hold.unlock();
    EXPECT_FALSE(is_held(this->m));
    EXPECT_EQ(hold._locked, 0);
}

TYPED_TEST(EitherGuard, UnlockDoesNotTestTheFlag) {
    typename TestFixture::Guard hold(this->m, 0);
    hold.unlock();
    EXPECT_FALSE(is_held(this->m));
}

TYPED_TEST(EitherGuard, DoesNotUnlockTwice) {
    Armed armed;
    {
        typename TestFixture::Guard hold(this->m, 1);
        hold.unlock();
    }
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 1);
}

TYPED_TEST(EitherGuard, LockAfterUnlockHoldsAgain) {
    typename TestFixture::Guard hold(this->m, 1);
    hold.unlock();
    hold.lock();
    EXPECT_TRUE(is_held(this->m));
    EXPECT_EQ(hold._locked, 1);
}

TYPED_TEST(EitherGuard, LockTurnsAGuardWithFlagZeroIntoOneThatUnlocks) {
    {
        typename TestFixture::Guard hold(this->m, 0);
        hold.unlock();
        hold.lock();
    }
    EXPECT_FALSE(is_held(this->m));
}

TYPED_TEST(EitherGuard, ArrowGivesTheGuardedMutex) {
    typename TestFixture::Guard hold(this->m, 1);
    EXPECT_EQ(hold.operator->(), &this->m);
}

TYPED_TEST(EitherGuard, RefersToTheMutex) {
    typename TestFixture::Guard hold(this->m, 1);
    EXPECT_EQ(&hold._mtx, &this->m);
}

TYPED_TEST(EitherGuard, ReleasesWhenAnExceptionLeavesTheScope) {
    try {
        typename TestFixture::Guard hold(this->m, 1);
        throw 1;
    } catch (int) {
    }
    EXPECT_FALSE(is_held(this->m));
}

TYPED_TEST(EitherGuard, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<typename TestFixture::Guard>::value);
    EXPECT_FALSE(std::is_copy_assignable<typename TestFixture::Guard>::value);
}

using MutexGuard = FaultTest;

TEST_F(MutexGuard, FlagZeroLeavesTheMutexLocked) {
    KELMutex m;
    { KELMutex_var hold(m, 0); }
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

// The second call would deadlock, so the seam answers it.
TEST_F(MutexGuard, LockDoesNotTestTheFlag) {
    KELMutex m;
    KELMutex_var hold(m, 1);
    seams::pthread_mutex_lock.script([](pthread_mutex_t*) { return 0; });
    Armed armed;
    hold.lock();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 1);
}

TEST(RecursiveMutexGuard, FlagZeroLeavesTheMutexLocked) {
    KELRMutex m;
    { KELRMutex_var hold(m, 0); }
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

TEST(RecursiveMutexGuard, LockDoesNotTestTheFlag) {
    KELRMutex m;
    {
        KELRMutex_var hold(m, 1);
        hold.lock();
    }
    EXPECT_TRUE(is_held(m)) << "two locks and one unlock";
    m.unlock();
}

// --- KELDMutex_var -----------------------------------------------------------------------------------

const char* const set_expression = "_mtx == (KELMutex *)__null";

class DeferredGuard : public FaultTest {
protected:
    KELMutex m;

    // set() asserts without a failed call, so nothing is printed before.
    static void expect_set_aborts(const std::function<void()>& use) {
        const Assertion seen = assertion_of(use);
        EXPECT_TRUE(seen.failed);
        EXPECT_EQ(seen.expression, set_expression);
        EXPECT_EQ(seen.file, "vthread");
        EXPECT_EQ(seen.function, "void KELDMutex_var::set(KELMutex*)");
        EXPECT_EQ(seen.child.err, "");
    }
};

TEST_F(DeferredGuard, LocksUntilTheEndOfTheScope) {
    {
        KELDMutex_var hold(&m, 1);
        EXPECT_TRUE(is_held(m));
    }
    EXPECT_FALSE(is_held(m));
}

TEST_F(DeferredGuard, FlagZeroLocksAndLeavesTheMutexLocked) {
    { KELDMutex_var hold(&m, 0); }
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

TEST_F(DeferredGuard, NullLocksNothing) {
    Armed armed;
    { KELDMutex_var hold(nullptr, 1); }
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 0);
}

TEST_F(DeferredGuard, SetLocksAndTheScopeUnlocks) {
    {
        KELDMutex_var hold(nullptr, 1);
        hold.set(&m);
        EXPECT_TRUE(is_held(m));
    }
    EXPECT_FALSE(is_held(m));
}

TEST_F(DeferredGuard, SetLeavesTheFlagAsTheConstructorSetIt) {
    {
        KELDMutex_var hold(nullptr, 0);
        hold.set(&m);
        EXPECT_EQ(hold._locked, 0);
    }
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

TEST_F(DeferredGuard, SetOfNullDoesNothing) {
    KELDMutex_var hold(nullptr, 1);
    hold.set(nullptr);
    EXPECT_EQ(hold._mtx, nullptr);
    hold.set(&m);
    EXPECT_EQ(hold._mtx, &m);
}

TEST_F(DeferredGuard, SecondSetAborts) {
    expect_set_aborts([&] {
        KELMutex other;
        KELDMutex_var hold(nullptr, 1);
        hold.set(&m);
        hold.set(&other);
    });
}

TEST_F(DeferredGuard, SetAfterConstructionWithAMutexAborts) {
    expect_set_aborts([&] {
        KELMutex other;
        KELDMutex_var hold(&m, 1);
        hold.set(&other);
    });
}

TEST_F(DeferredGuard, SetOfNullAbortsToo) {
    expect_set_aborts([&] {
        KELDMutex_var hold(&m, 1);
        hold.set(nullptr);
    });
}

TEST_F(DeferredGuard, SetAfterUnlockAborts) {
    expect_set_aborts([&] {
        KELDMutex_var hold(&m, 1);
        hold.unlock();
        hold.set(&m);
    });
}

TEST_F(DeferredGuard, UnlockReleasesAndClearsTheFlag) {
    KELDMutex_var hold(&m, 1);
    hold.unlock();
    EXPECT_FALSE(is_held(m));
    EXPECT_EQ(hold._locked, 0);
}

TEST_F(DeferredGuard, UnlockDoesNotTestTheFlag) {
    KELDMutex_var hold(&m, 0);
    hold.unlock();
    EXPECT_FALSE(is_held(m));
}

TEST_F(DeferredGuard, KeepsTheFlagAsItIsGiven) {
    KELDMutex_var hold(nullptr, 7);
    hold.set(&m);
    EXPECT_EQ(hold._locked, 7);
}

TEST_F(DeferredGuard, AnyFlagButZeroUnlocks) {
    { KELDMutex_var hold(&m, 255); }
    EXPECT_FALSE(is_held(m));
}

TEST_F(DeferredGuard, UnlockKeepsTheMutexAttached) {
    KELDMutex_var hold(&m, 1);
    hold.unlock();
    EXPECT_EQ(hold._mtx, &m);
}

TEST_F(DeferredGuard, UnlockWithoutAMutexLeavesTheFlag) {
    KELDMutex_var hold(nullptr, 1);
    hold.unlock();
    EXPECT_EQ(hold._locked, 1);
}

TEST_F(DeferredGuard, DoesNotUnlockTwice) {
    Armed armed;
    {
        KELDMutex_var hold(&m, 1);
        hold.unlock();
    }
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 1);
}

TEST_F(DeferredGuard, ArrowGivesTheMutexOrNull) {
    KELDMutex_var none(nullptr, 1);
    KELDMutex_var hold(&m, 1);
    EXPECT_EQ(none.operator->(), nullptr);
    EXPECT_EQ(hold.operator->(), &m);
}

TEST_F(DeferredGuard, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELDMutex_var>::value);
    EXPECT_FALSE(std::is_copy_assignable<KELDMutex_var>::value);
}

}  // namespace
