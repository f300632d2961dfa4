// The loader's lock, and what it guards.
//
// SPDX-License-Identifier: MIT
#include <thread>

#include "tests/services/scripted_loader.h"

namespace {

using namespace kel::test;

class LoadLibraryLock : public LoadLibraryTest {
protected:
    // How often `body` locks a mutex.
    template <class Body>
    static long locks_taken_by(Body body) {
        seams::pthread_mutex_lock.reset();
        body();
        return seams::pthread_mutex_lock.calls();
    }
};

TEST_F(LoadLibraryLock, LiesBehindTheTableOfThirtyTwoSlots) {
    EXPECT_EQ(sizeof(KELLoadLibrary), sizeof(Table) + sizeof(KELMutex));
    available = {"x"};
    EXPECT_EQ(table().capacity(), 32u);
    EXPECT_EQ(table().count(), 0u);
    load("x");
    EXPECT_EQ(table().count(), 1u);

    const void* locked = nullptr;
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        locked = m;
        return seams::pthread_mutex_lock.real(m);
    });
    unload("x");
    EXPECT_GT(locked, &table() + 1);
    EXPECT_LT(locked, &loader + 1);
}

TEST_F(LoadLibraryLock, IsNotTakenToFindTheSharedLoader) {
    EXPECT_EQ(locks_taken_by([] {
                  Armed armed;
                  KELLoadLibrary::instance();
              }),
              0);
}

// The other thread's turn comes while the first one makes its loader, as that makes a mutex.
TEST_F(LoadLibraryLock, TheSharedLoaderIsThatOfTheThreadThatPublishesItFirst) {
    KELLoadLibrary* const shared = KELLoadLibrary::_instance;
    KELLoadLibrary::_instance = nullptr;
    KELLoadLibrary* others = nullptr;
    seams::pthread_mutex_init.script([&](pthread_mutex_t* m, const pthread_mutexattr_t* a) {
        std::thread([&] { others = KELLoadLibrary::instance(); }).join();
        return seams::pthread_mutex_init.real(m, a);
    });
    const long blocks = AllocationPlan::live_blocks();
    KELLoadLibrary* mine = nullptr;
    {
        Armed armed;
        mine = KELLoadLibrary::instance();
    }
    EXPECT_NE(others, nullptr);
    EXPECT_EQ(mine, others);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks + 1) << "the loader that came second is gone";
    delete others;
    KELLoadLibrary::_instance = shared;
}

TEST_F(LoadLibraryLock, IsTakenOnceByEachOperation) {
    available = {"x"};
    EXPECT_EQ(locks_taken_by([this] { load("x"); }), 1);
    EXPECT_EQ(locks_taken_by([this] { unload("x"); }), 1);
    EXPECT_EQ(locks_taken_by([this] { unload_all(); }), 1);
}

TEST_F(LoadLibraryLock, IsLeftToTheCallerOfTheInnerOperations) {
    available = {"x", "y"};
    EXPECT_EQ(locks_taken_by([this] { load_library("x", 1); }), 0);
    EXPECT_EQ(locks_taken_by([this] { unload_unlocked("x"); }), 0);
    void* const handle = open("y", 0);
    EXPECT_EQ(locks_taken_by([&] { close_library(handle); }), 0);
}

TEST_F(LoadLibraryLock, IsHeldUntilTheEndOfEachOperation) {
    available = {"x"};
    std::vector<pthread_mutex_t*> held;
    auto lock_is_held = [&] {
        int rc = 0;
        std::thread other([&] {
            rc = pthread_mutex_trylock(held.back());
            if (rc == 0) pthread_mutex_unlock(held.back());
        });
        other.join();
        return rc == EBUSY;
    };
    seams::pthread_mutex_lock.script([&](pthread_mutex_t* m) {
        held.push_back(m);
        return seams::pthread_mutex_lock.real(m);
    });
    int times = 0;
    seams::dlopen.script([&](const char* file, int mode) {
        times += lock_is_held();
        return open(file, mode);
    });
    seams::dlclose.script([&](void* handle) {
        times += lock_is_held();
        return close(handle);
    });
    load("x");
    unload("x");
    load("x");
    unload_all();
    EXPECT_EQ(times, 6);
    EXPECT_FALSE(lock_is_held());
    EXPECT_EQ(std::set<pthread_mutex_t*>(held.begin(), held.end()).size(), 1u);
}

TEST_F(LoadLibraryLock, IsFreeAfterAFailure) {
    const ErrorText errors;
    load("x");
    std::thread([this] { loader.Unload("x"); }).join();
}

TEST_F(LoadLibraryLock, IsHeldUntilAFailureIsReported) {
    const ErrorText errors;
    std::string reported;
    seams::pthread_mutex_unlock.script([&](pthread_mutex_t* m) {
        reported = errors.str();
        return seams::pthread_mutex_unlock.real(m);
    });
    load("x");
    EXPECT_NE(reported, "");
    EXPECT_EQ(reported, errors.str());
}

TEST_F(LoadLibraryLock, LetsThreadsLoadAndUnloadAtOnce) {
    all_available = true;
    ArmedEverywhere armed;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([this, i] {
            for (int k = 0; k < 50; ++k) {
                loader.Load(std::to_string(k % 5).c_str());
                loader.Unload(("lib" + std::to_string((k + i) % 5) + "_r.so").c_str());
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    loader.UnloadAll();
    EXPECT_EQ(opened.size(), 0u);
    EXPECT_EQ(closed.size(), tried.size());
}

}  // namespace
