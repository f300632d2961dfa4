// What the threads of a process share in the lowest layer: pools of mutexes and of reference counts,
// the registry of threads, the tables of per-thread objects, the reader-writer lock and the counter.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/containers/dictionary.h>
#include <kel/core/condition.h>
#include <kel/core/resource.h>
#include <kel/core/rwlock.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>

#include <algorithm>
#include <atomic>
#include <memory>
#include <set>
#include <vector>

#include "tests/core/probe.h"
#include "tests/stress/together.h"

namespace kel {
namespace test {
namespace {

// --- pools of mutexes --------------------------------------------------------------------------------

// Each thread has more of them than the pool keeps, then gives them all back.
template <class Mutex>
void expect_each_its_own() {
    const int each = 40;
    Start exchange(crowd);
    std::vector<const void*> all(crowd * each);
    together(crowd, [&](int thread) {
        for (int round = 0; round < 10; ++round) {
            std::vector<std::unique_ptr<Mutex>> own;
            for (int i = 0; i < each; ++i) {
                own.emplace_back(new Mutex);
                own.back()->lock();
                own.back()->unlock();
                all[thread * each + i] = impl_of(*own.back());
            }
            exchange.arrive();
            EXPECT_EQ(std::set<const void*>(all.begin(), all.end()).size(), all.size());
            exchange.arrive();
        }
    });
}

TEST(MutexPools, GiveNoMutexToTwoOwners) { expect_each_its_own<KELSpinMutex>(); }
TEST(MutexPools, GiveNoRecursiveMutexToTwoOwners) { expect_each_its_own<KELRSpinMutex>(); }

// Only one may own a mutex of the recursive pool that another thread has just put back.
TEST(MutexPools, RecycledMutexStillExcludes) {
    for (int round = 0; round < 50; ++round) {
        KELRSpinMutex mutex;
        int counter = 0;
        together(crowd, [&](int) {
            for (int i = 0; i < 20; ++i) {
                mutex.lock();
                mutex.lock();
                ++counter;
                mutex.unlock();
                mutex.unlock();
            }
        });
        ASSERT_EQ(counter, crowd * 20);
    }
}

// --- reference counts --------------------------------------------------------------------------------

class Counted : public KELResource {
public:
    explicit Counted(std::atomic<int>& alive) : _alive(alive) { ++_alive; }
    ~Counted() override { --_alive; }

private:
    std::atomic<int>& _alive;
};

// The first reference makes the record that holds the count, and all threads take theirs at once.
TEST(Resources, LiveExactlyAsLongAsTheirReferences) {
    std::atomic<int> alive(0);
    for (int round = 0; round < 200; ++round) {
        Counted* const shared = new Counted(alive);
        together(crowd, [shared](int i) {
            shared->_ref();
            if (i == 0) KELResource::garbage_collect();
            shared->_ref();
            shared->_num_refs();
            shared->_unref();
            if (i == 1) KELResource::set_init_sharing(1);
            shared->_unref();
        });
        ASSERT_EQ(alive, 1);
        ASSERT_EQ(shared->_num_refs(), 1u);
        ASSERT_EQ(shared->_unref(), 0);
        ASSERT_EQ(alive, 0);
    }
}

// Whoever drops the last reference deletes the object while the others still leave the lock of its count.
TEST(Resources, AreDeletedByTheLastThreadThatLetsGo) {
    std::atomic<int> alive(0);
    for (int round = 0; round < 200; ++round) {
        Counted* const shared = new Counted(alive);
        for (int i = 1; i < crowd; ++i) shared->_ref();
        together(crowd, [shared](int) { shared->_unref(); });
        ASSERT_EQ(alive, 0);
    }
}

TEST(Resources, RecordsGoThroughThePoolOfAllThreads) {
    std::atomic<int> alive(0);
    together(crowd, [&alive](int) {
        for (int round = 0; round < 500; ++round) {
            Counted* const own = new Counted(alive);
            EXPECT_EQ(own->_ref(), 2u);
            EXPECT_EQ(own->_deref(), 1u);
            EXPECT_EQ(own->_unref(), 0);
        }
    });
    EXPECT_EQ(alive, 0);
}

// --- threads -----------------------------------------------------------------------------------------

// Counts down to the moment when nothing is left.
class Countdown {
public:
    explicit Countdown(int left) : _left(left) {}

    void down() {
        KELMutex_var hold(_mutex, 1);
        if (--_left == 0) _nothing_left.broadcast();
    }
    void wait() {
        KELMutex_var hold(_mutex, 1);
        while (_left != 0) _nothing_left.wait(_mutex);
    }

private:
    KELMutex _mutex;
    KELCondition _nothing_left;
    int _left KEL_GUARDED_BY(_mutex);
};

// Looks itself up while the registry stands still, then deletes itself.
class SelfDeleting : public KELThread {
public:
    SelfDeleting(Countdown& running, std::atomic<int>& found)
        : KELThread(0), _running(running), _found(found) {}

    void begin() override {
        Countdown& running = _running;
        {
            KELMutex_var hold(KELThread::_mutex, 1);
            if (instance(KELThreadId(pthread_self())) == this) ++_found;
        }
        delete this;
        running.down();
    }

private:
    Countdown& _running;
    std::atomic<int>& _found;
};

class NeverRun : public KELThread {
public:
    NeverRun() : KELThread(0) {}
    void begin() override {}
};

TEST(ThreadRegistry, KnowsEveryThreadAndForgetsItsObject) {
    const int each = 25;
    Countdown running(crowd * each);
    std::atomic<int> found(0);
    together(crowd, [&](int) {
        for (int i = 0; i < each; ++i) {
            NeverRun older;
            (new SelfDeleting(running, found))->run();
            NeverRun newer;
        }
        // Until its thread runs, an object has the identifier of who made it. No thread may get that one.
        running.wait();
    });
    EXPECT_EQ(found, crowd * each);
    KELMutex_var hold(KELThread::_mutex, 1);
    EXPECT_EQ(KELThread::_first, nullptr);
}

// --- per-thread objects ------------------------------------------------------------------------------

class Slot : public KELThreadLocal {
public:
    Slot(unsigned long number, std::atomic<int>& alive) : KELThreadLocal(number), _alive(alive) { ++_alive; }
    ~Slot() override { --_alive; }

protected:
    std::atomic<int>& _alive;
};

// Its end creates another object, for which the clean-up goes on.
class Successor : public Slot {
public:
    using Slot::Slot;
    void finalize() override {
        new Slot(_slot, _alive);
        delete this;
    }
};

TEST(ThreadLocals, EndWithTheirThread) {
    std::atomic<int> alive(0);
    for (int round = 0; round < 25; ++round) {
        together(crowd, [&alive](int) {
            Slot* const first = new Slot(1001, alive);
            new Successor(1002, alive);
            new Slot(1003, alive);
            EXPECT_EQ(KELThreadLocal::instance(1001), first);
            delete first;
            EXPECT_EQ(KELThreadLocal::instance(1001), nullptr);
        });
        ASSERT_EQ(alive, 0);
    }
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    EXPECT_EQ(KELThreadLocal::_dict_instance()->count(), 0u);
}

TEST(ThreadLocals, MayBeDeletedByAnotherThread) {
    std::atomic<int> alive(0);
    Slot* objects[crowd] = {};
    Start exchange(crowd);
    together(crowd, [&](int i) {
        for (int round = 0; round < 25; ++round) {
            objects[i] = new Slot(1001, alive);
            exchange.arrive();
            delete objects[(i + 1) % crowd];
            KELThreadLocal::instance(1002);
            exchange.arrive();
            EXPECT_EQ(KELThreadLocal::instance(1001), nullptr);
        }
    });
    EXPECT_EQ(alive, 0);
}

// --- the reader-writer lock and the counter ----------------------------------------------------------

TEST(ReaderWriterLock, ReadersSeeNoHalfDoneWork) {
    KELRWLock lock;
    int twins[2] = {0, 0};
    together(crowd, [&](int i) {
        for (int round = 0; round < 500; ++round) {
            if (i == 0) {
                KELWLock_var hold(lock);
                ++twins[0];
                ++twins[1];
            } else {
                KELRLock_var hold(lock);
                ASSERT_EQ(twins[0], twins[1]);
            }
        }
    });
    EXPECT_EQ(twins[0], 500);
}

TEST(UniqueIds, AreDrawnOnce) {
    std::vector<unsigned long> drawn[crowd];
    together(crowd, [&drawn](int i) {
        for (int n = 0; n < 1000; ++n) drawn[i].push_back(KELUniqueId().value());
    });
    std::vector<unsigned long> all;
    for (const std::vector<unsigned long>& some : drawn) all.insert(all.end(), some.begin(), some.end());
    std::sort(all.begin(), all.end());
    EXPECT_EQ(all.back() - all.front() + 1, all.size());
    EXPECT_EQ(std::unique(all.begin(), all.end()), all.end());
}

}  // namespace
}  // namespace test
}  // namespace kel
