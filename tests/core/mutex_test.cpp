// Plain and recursive mutexes.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/os/portable.h>
#include <kel/services/environment.h>

#include <csignal>
#include <cstdio>
#include <memory>
#include <string>
#include <type_traits>
#include <vector>

#include "tests/core/fresh.h"
#include "tests/core/probe.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::Not;

using Mutex = FaultTest;
using RecursiveMutex = FaultTest;

// --- plain -------------------------------------------------------------------------------------------

TEST_F(Mutex, HasDefaultAttributes) {
    const pthread_mutexattr_t* attributes = reinterpret_cast<const pthread_mutexattr_t*>(1);
    seams::pthread_mutex_init.script([&](pthread_mutex_t* m, const pthread_mutexattr_t* a) {
        attributes = a;
        return seams::pthread_mutex_init.real(m, a);
    });
    Armed armed;
    KELMutex m;
    EXPECT_EQ(attributes, nullptr);
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 1);
}

TEST_F(Mutex, IsUnlockedWhenMade) {
    KELMutex m;
    EXPECT_FALSE(is_held(m));
}

TEST_F(Mutex, LockKeepsOtherThreadsOut) {
    KELMutex m;
    m.lock();
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

TEST_F(Mutex, UnlockLetsOtherThreadsIn) {
    KELMutex m;
    m.lock();
    m.unlock();
    EXPECT_FALSE(is_held(m));
}

TEST_F(Mutex, LockIsOneCallOnTheMutexInside) {
    KELMutex m;
    std::vector<pthread_mutex_t*> locked;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* p) {
        locked.push_back(p);
        return 0;
    });
    {
        Armed armed;
        m.lock();
    }
    EXPECT_THAT(locked, ElementsAre(native(m)));
}

TEST_F(Mutex, UnlockIsOneCallOnTheMutexInside) {
    KELMutex m;
    std::vector<pthread_mutex_t*> unlocked;
    seams::pthread_mutex_unlock.script([&](pthread_mutex_t* p) {
        unlocked.push_back(p);
        return 0;
    });
    {
        Armed armed;
        m.unlock();
    }
    EXPECT_THAT(unlocked, ElementsAre(native(m)));
}

TEST_F(Mutex, VirtualEntriesLockAndUnlock) {
    KELMutex m;
    KELIMutex& any = m;
    any.v_lock();
    EXPECT_TRUE(is_held(m));
    any.v_unlock();
    EXPECT_FALSE(is_held(m));
}

TEST_F(Mutex, DestructorDestroysTheMutexInside) {
    std::unique_ptr<KELMutex> m(new KELMutex);
    pthread_mutex_t* const inside = native(*m);
    std::vector<pthread_mutex_t*> destroyed;
    seams::pthread_mutex_destroy.script([&](pthread_mutex_t* p) {
        destroyed.push_back(p);
        return seams::pthread_mutex_destroy.real(p);
    });
    Armed armed;
    m.reset();
    EXPECT_THAT(destroyed, ElementsAre(inside));
}

TEST_F(Mutex, DestructorIgnoresAFailure) {
    std::unique_ptr<KELMutex> m(new KELMutex);
    seams::pthread_mutex_destroy.fail(1, EBUSY);
    Armed armed;
    m.reset();
    EXPECT_EQ(seams::pthread_mutex_destroy.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
}

TEST_F(Mutex, FailedCreationThrowsNoResourcesWithErrnoAsMinor) {
    expect_no_resources(seams::pthread_mutex_init, [] { KELMutex m; });
}

TEST_F(Mutex, FailedCreationLeavesNoObjectBehind) {
    const long blocks = AllocationPlan::live_blocks();
    fail_creation(seams::pthread_mutex_init, EAGAIN, 0, [] { delete new KELMutex; });
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
    EXPECT_EQ(seams::pthread_mutex_destroy.calls(), 0);
}

TEST_F(Mutex, CreationWorksAgainAfterAFailure) {
    fail_creation(seams::pthread_mutex_init, EAGAIN, 0, [] { KELMutex m; });
    KELMutex m;
    m.lock();
    EXPECT_TRUE(is_held(m));
    m.unlock();
}

TEST_F(Mutex, FailedLockEndsTheProcess) {
    const auto use = [] {
        KELMutex m;
        fail_use(seams::pthread_mutex_lock, EINVAL);
        m.lock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELMutex::lock()");
}

TEST_F(Mutex, FailedUnlockNamesTheLockCall) {
    const auto use = [] {
        KELMutex m;
        m.lock();
        fail_use(seams::pthread_mutex_unlock, EPERM);
        m.unlock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELMutex::unlock()");
}

TEST_F(Mutex, FailedVirtualLockReportsTheLock) {
    const auto use = [] {
        KELMutex m;
        fail_use(seams::pthread_mutex_lock, EINVAL);
        m.v_lock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELMutex::lock()");
}

TEST_F(Mutex, FailedVirtualUnlockReportsTheUnlock) {
    const auto use = [] {
        KELMutex m;
        fail_use(seams::pthread_mutex_unlock, EPERM);
        m.v_unlock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELMutex::unlock()");
}

TEST_F(Mutex, FailedUseAbortsInReleaseBuildsToo) {
    const Outcome seen = in_child([] {
        KELMutex m;
        fail_use(seams::pthread_mutex_lock, EINVAL);
        Armed armed;
        m.lock();
    });
    EXPECT_EQ(seen.signal, SIGABRT);
    EXPECT_THAT(seen.err, HasSubstr("pthread_mutex_lock: Input/output error\n"));
    EXPECT_THAT(seen.err,
                MatchesRegex("(.|\n)*vthread:[0-9]+: void KELMutex::lock\\(\\): Assertion `\\(rc == 0\\)' "
                             "failed\\.\n"));
}

TEST_F(Mutex, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELMutex>::value);
    EXPECT_FALSE(std::is_copy_assignable<KELMutex>::value);
}

// --- recursive ---------------------------------------------------------------------------------------

TEST_F(RecursiveMutex, IsMadeWithTheRecursiveTypeByItsOwnAttributeObject) {
    alignas(KELRMutex) unsigned char place[sizeof(KELRMutex)];
    void* const attributes = place + word;
    std::vector<std::string> calls;
    seams::pthread_mutexattr_init.script([&](pthread_mutexattr_t* a) {
        calls.push_back(a == attributes ? "init attributes" : "other attributes");
        return seams::pthread_mutexattr_init.real(a);
    });
    seams::pthread_mutexattr_settype.script([&](pthread_mutexattr_t* a, int type) {
        calls.push_back("type " + std::to_string(type));
        return seams::pthread_mutexattr_settype.real(a, type);
    });
    seams::pthread_mutex_init.script([&](pthread_mutex_t* m, const pthread_mutexattr_t* a) {
        calls.push_back(a == attributes ? "init mutex" : "init mutex with other attributes");
        return seams::pthread_mutex_init.real(m, a);
    });
    seams::pthread_mutexattr_destroy.script([&](pthread_mutexattr_t* a) {
        calls.push_back("destroy attributes");
        return seams::pthread_mutexattr_destroy.real(a);
    });
    Armed armed;
    KELRMutex* const m = new (place) KELRMutex;
    EXPECT_THAT(calls, ElementsAre("init attributes", "type 1", "init mutex", "destroy attributes"));
    m->~KELRMutex();
}

TEST_F(RecursiveMutex, IgnoresTheResultsOfTheAttributeCalls) {
    seams::pthread_mutexattr_init.script([](pthread_mutexattr_t* a) {
        seams::pthread_mutexattr_init.real(a);
        return ENOMEM;
    });
    seams::pthread_mutexattr_settype.fail(1, EINVAL);
    Armed armed;
    EXPECT_NO_THROW(KELRMutex m);
    EXPECT_EQ(seams::pthread_mutex_init.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
}

TEST_F(RecursiveMutex, FailedCreationThrowsNoResourcesWithErrnoAsMinor) {
    expect_no_resources(seams::pthread_mutex_init, [] { KELRMutex m; });
}

TEST_F(RecursiveMutex, FailedCreationLeavesTheAttributesUndestroyed) {
    fail_creation(seams::pthread_mutex_init, EAGAIN, 0, [] { KELRMutex m; });
    EXPECT_EQ(seams::pthread_mutexattr_init.calls(), 1);
    EXPECT_EQ(seams::pthread_mutexattr_destroy.calls(), 0);
}

TEST_F(RecursiveMutex, IsUnlockedWhenMade) {
    KELRMutex m;
    EXPECT_FALSE(is_held(m));
}

TEST_F(RecursiveMutex, HolderLocksAgain) {
    KELRMutex m;
    m.lock();
    m.lock();
    EXPECT_TRUE(is_held(m));
    m.unlock();
    m.unlock();
}

TEST_F(RecursiveMutex, NeedsAsManyUnlocksAsLocks) {
    KELRMutex m;
    m.lock();
    m.lock();
    m.unlock();
    EXPECT_TRUE(is_held(m));
    m.unlock();
    EXPECT_FALSE(is_held(m));
}

TEST_F(RecursiveMutex, LeavesTheCountingToTheSystem) {
    KELRMutex m;
    Armed armed;
    m.lock();
    m.lock();
    m.unlock();
    m.unlock();
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 2);
    EXPECT_EQ(seams::pthread_mutex_unlock.calls(), 2);
}

TEST_F(RecursiveMutex, VirtualEntriesLockAndUnlock) {
    KELRMutex m;
    KELIMutex& any = m;
    any.v_lock();
    EXPECT_TRUE(is_held(m));
    any.v_unlock();
    EXPECT_FALSE(is_held(m));
}

TEST_F(RecursiveMutex, DestructorDestroysTheMutexInsideAndIgnoresAFailure) {
    std::unique_ptr<KELRMutex> m(new KELRMutex);
    seams::pthread_mutex_destroy.fail(1, EBUSY);
    Armed armed;
    m.reset();
    EXPECT_EQ(seams::pthread_mutex_destroy.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
}

TEST_F(RecursiveMutex, FailedLockEndsTheProcess) {
    const auto use = [] {
        KELRMutex m;
        fail_use(seams::pthread_mutex_lock, EAGAIN);
        m.lock();
    };
    expect_use_failure(use, "pthread_mutex_lock", "(rc == 0)", "void KELRMutex::lock()");
}

TEST_F(RecursiveMutex, FailedUnlockNamesTheUnlockCall) {
    const auto use = [] {
        KELRMutex m;
        m.lock();
        fail_use(seams::pthread_mutex_unlock, EPERM);
        m.unlock();
    };
    expect_use_failure(use, "pthread_mutex_unlock", "(rc == 0)", "void KELRMutex::unlock()");
}

TEST_F(RecursiveMutex, UnlockByAThreadThatHoldsNothingAborts) {
    const Outcome seen = in_child([] {
        KELRMutex m;
        m.unlock();
    });
    EXPECT_EQ(seen.signal, SIGABRT);
    EXPECT_THAT(seen.err, HasSubstr("void KELRMutex::unlock(): Assertion `(rc == 0)' failed"));
}

TEST_F(RecursiveMutex, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELRMutex>::value);
    EXPECT_FALSE(std::is_copy_assignable<KELRMutex>::value);
}

// --- process exit ------------------------------------------------------------------------------------

std::string name_of(const void* address) {
    char text[32];
    std::snprintf(text, sizeof text, "<%p>", address);
    return text;
}

// Names the library's static locks, then every mutex that is destroyed until the process is gone.
const FreshScene destroyed_at_exit("destroyed_at_exit", [] {
    std::cout << name_of(native(KELThread::_mutex)) << ' ' << name_of(native(KELThreadLocal::_mutex)) << ' '
              << name_of(native(KELPortable::_mutex)) << ' ' << name_of(native(CurrentEnvironment::_mtx))
              << '\n'
              << std::flush;
    static KELMutex of_a_client;
    std::fprintf(stderr, "client %s\n", name_of(native(of_a_client)).c_str());
    seams::pthread_mutex_destroy.script([](pthread_mutex_t* m) {
        std::fprintf(stderr, "destroyed %s\n", name_of(m).c_str());
        return 0;
    });
    arm_until_the_end();
});

TEST(ProcessExit, LeavesTheLocksOfTheLibraryUsable) {
    const Outcome seen = destroyed_at_exit.play();
    ASSERT_EQ(seen.exit_code, 0);
    std::istringstream locks(seen.out);
    std::string lock;
    int count = 0;
    for (; locks >> lock; ++count) EXPECT_THAT(seen.err, Not(HasSubstr("destroyed " + lock)));
    EXPECT_EQ(count, 4);
}

TEST(ProcessExit, DestroysTheMutexesOfClients) {
    const Outcome seen = destroyed_at_exit.play();
    const std::string client =
        seen.err.substr(seen.err.find('<'), seen.err.find('>') - seen.err.find('<') + 1);
    EXPECT_THAT(seen.err, HasSubstr("destroyed " + client));
}

}  // namespace
