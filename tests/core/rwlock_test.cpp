// The reader-writer lock. Where a thread would wait, the seam of the wait plays the other threads.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/rwlock.h>

#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/core/probe.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class RWLock : public FaultTest {
protected:
    // Each wake-up and each wait, by the name of the condition, in order.
    void record_calls() {
        seams::pthread_cond_signal.script([this](pthread_cond_t* c) {
            calls.push_back("signal " + name_of(c));
            mutex_held_while_waking |= is_held(lock._mutex);
            return 0;
        });
        seams::pthread_cond_broadcast.script([this](pthread_cond_t* c) {
            calls.push_back("broadcast " + name_of(c));
            mutex_held_while_waking |= is_held(lock._mutex);
            return 0;
        });
    }

    // The nth wait runs the nth step in place of the other threads.
    void play_at_waits(std::vector<std::function<void()>> steps) {
        seams::pthread_cond_wait.script([this, steps](pthread_cond_t* c, pthread_mutex_t*) {
            calls.push_back("wait " + name_of(c));
            steps.at(waits++)();
            return 0;
        });
    }

    void set(int state, unsigned waiting_writers) {
        lock._state = state;
        lock._waiting_writers = waiting_writers;
    }
    int state() { return lock._state; }
    unsigned waiting_writers() { return lock._waiting_writers; }

    void read_lock() {
        Armed armed;
        lock.read_lock();
    }
    void write_lock() {
        Armed armed;
        lock.write_lock();
    }
    void unlock() {
        Armed armed;
        lock.unlock();
    }

    KELRWLock lock;
    std::vector<std::string> calls;
    std::size_t waits = 0;
    bool mutex_held_while_waking = false;

private:
    std::string name_of(pthread_cond_t* c) {
        if (static_cast<void*>(c) == &lock._readers) return "readers";
        if (static_cast<void*>(c) == &lock._writers) return "writers";
        return "somebody else";
    }
};

// --- taking the lock ---------------------------------------------------------------------------------

TEST_F(RWLock, IsFreeWhenMade) {
    EXPECT_EQ(state(), 0);
    EXPECT_EQ(waiting_writers(), 0u);
}

TEST_F(RWLock, CountsItsReaders) {
    read_lock();
    EXPECT_EQ(state(), 1);
    read_lock();
    EXPECT_EQ(state(), 2);
}

TEST_F(RWLock, ReaderOfAFreeLockDoesNotWait) {
    read_lock();
    EXPECT_EQ(seams::pthread_cond_wait.calls(), 0);
}

TEST_F(RWLock, WriterOfAFreeLockDoesNotWait) {
    write_lock();
    EXPECT_EQ(state(), -1);
    EXPECT_EQ(waiting_writers(), 0u);
    EXPECT_EQ(seams::pthread_cond_wait.calls(), 0);
}

TEST_F(RWLock, ReaderWaitsForTheWriter) {
    set(-1, 0);
    play_at_waits({[&] { set(0, 0); }});
    read_lock();
    EXPECT_THAT(calls, ElementsAre("wait readers"));
    EXPECT_EQ(state(), 1);
}

TEST_F(RWLock, ReaderWaitsWhileAWriterWaits) {
    set(2, 1);
    play_at_waits({[&] { set(2, 0); }});
    read_lock();
    EXPECT_THAT(calls, ElementsAre("wait readers"));
    EXPECT_EQ(state(), 3);
}

TEST_F(RWLock, ReaderWaitsAgainWhileAWriterHoldsTheLock) {
    set(-1, 0);
    play_at_waits({[&] { set(-1, 0); }, [&] { set(-1, 0); }, [&] { set(0, 0); }});
    read_lock();
    EXPECT_EQ(waits, 3u);
}

TEST_F(RWLock, ReaderWaitsAgainWhileAWriterWaits) {
    set(-1, 0);
    play_at_waits({[&] { set(0, 2); }, [&] { set(1, 1); }, [&] { set(1, 0); }});
    read_lock();
    EXPECT_EQ(waits, 3u);
    EXPECT_EQ(state(), 2);
}

TEST_F(RWLock, WriterWaitsForTheReadersAndIsCountedMeanwhile) {
    set(1, 0);
    unsigned counted = 0;
    play_at_waits({[&] {
        counted = waiting_writers();
        set(0, waiting_writers());
    }});
    write_lock();
    EXPECT_THAT(calls, ElementsAre("wait writers"));
    EXPECT_EQ(counted, 1u);
    EXPECT_EQ(state(), -1);
    EXPECT_EQ(waiting_writers(), 0u);
}

TEST_F(RWLock, WriterWaitsForTheWriter) {
    set(-1, 0);
    play_at_waits({[&] { set(0, waiting_writers()); }});
    write_lock();
    EXPECT_EQ(waits, 1u);
    EXPECT_EQ(state(), -1);
}

TEST_F(RWLock, WriterWaitsAgainUntilTheLockIsFree) {
    set(2, 0);
    play_at_waits({[&] { set(1, waiting_writers()); }, [&] { set(-1, waiting_writers()); },
                   [&] { set(0, waiting_writers()); }});
    write_lock();
    EXPECT_EQ(waits, 3u);
    EXPECT_EQ(waiting_writers(), 0u);
}

TEST_F(RWLock, WaitsReleaseTheMutexOfTheLock) {
    pthread_mutex_t* released = nullptr;
    seams::pthread_cond_wait.script([&](pthread_cond_t*, pthread_mutex_t* m) {
        released = m;
        set(0, 0);
        return 0;
    });
    set(-1, 0);
    read_lock();
    EXPECT_EQ(released, native(lock._mutex));
}

TEST_F(RWLock, LeavesItsMutexFree) {
    read_lock();
    EXPECT_FALSE(is_held(lock._mutex));
    unlock();
    EXPECT_FALSE(is_held(lock._mutex));
    write_lock();
    EXPECT_FALSE(is_held(lock._mutex));
}

// --- releasing it ------------------------------------------------------------------------------------

TEST_F(RWLock, ReaderThatUnlocksLeavesTheOthers) {
    set(3, 0);
    unlock();
    EXPECT_EQ(state(), 2);
}

TEST_F(RWLock, WriterThatUnlocksFreesTheLock) {
    set(-1, 0);
    unlock();
    EXPECT_EQ(state(), 0);
}

TEST_F(RWLock, LastReaderSignalsAWaitingWriter) {
    set(1, 1);
    record_calls();
    unlock();
    EXPECT_THAT(calls, ElementsAre("signal writers"));
}

TEST_F(RWLock, ReaderWakesNobodyWhileReadersRemainAndAWriterWaits) {
    set(2, 1);
    record_calls();
    unlock();
    EXPECT_THAT(calls, IsEmpty());
}

TEST_F(RWLock, WriterSignalsAWaitingWriterAndNoReaders) {
    set(-1, 2);
    record_calls();
    unlock();
    EXPECT_THAT(calls, ElementsAre("signal writers"));
    EXPECT_EQ(waiting_writers(), 2u) << "the woken writer counts itself off";
}

TEST_F(RWLock, WriterBroadcastsToTheReadersWhenNoWriterWaits) {
    set(-1, 0);
    record_calls();
    unlock();
    EXPECT_THAT(calls, ElementsAre("broadcast readers"));
}

TEST_F(RWLock, LastReaderBroadcastsWhenNoWriterWaits) {
    set(1, 0);
    record_calls();
    unlock();
    EXPECT_THAT(calls, ElementsAre("broadcast readers"));
}

TEST_F(RWLock, UnlockBroadcastsEvenWhileReadersRemain) {
    set(2, 0);
    record_calls();
    unlock();
    EXPECT_THAT(calls, ElementsAre("broadcast readers"));
}

TEST_F(RWLock, WakesAfterItsMutexIsReleased) {
    set(1, 1);
    record_calls();
    unlock();
    set(-1, 0);
    unlock();
    EXPECT_EQ(calls.size(), 2u);
    EXPECT_FALSE(mutex_held_while_waking);
}

TEST_F(RWLock, UnlockOfAFreeLockReadsAsWriterHeld) {
    unlock();
    EXPECT_EQ(state(), -1);
    set(0, 0);
}

// --- guards ------------------------------------------------------------------------------------------

TEST_F(RWLock, ReadGuardHoldsForItsScope) {
    {
        KELRLock_var hold(lock);
        EXPECT_EQ(state(), 1);
    }
    EXPECT_EQ(state(), 0);
}

TEST_F(RWLock, WriteGuardHoldsForItsScope) {
    {
        KELWLock_var hold(lock);
        EXPECT_EQ(state(), -1);
    }
    EXPECT_EQ(state(), 0);
}

TEST_F(RWLock, GuardsKeepTheLockAndAFlagOfOne) {
    {
        KELRLock_var hold(lock);
        EXPECT_EQ(field_at<KELRWLock*>(&hold, 0), &lock);
        EXPECT_EQ(field_at<unsigned char>(&hold, word), 1);
    }
    KELWLock_var hold(lock);
    EXPECT_EQ(field_at<KELRWLock*>(&hold, 0), &lock);
    EXPECT_EQ(field_at<unsigned char>(&hold, word), 1);
}

template <class Guard>
void clear_flag(Guard& guard) {
    reinterpret_cast<unsigned char*>(&guard)[word] = 0;
}

TEST_F(RWLock, GuardsWithAClearedFlagDoNotUnlock) {
    {
        KELRLock_var hold(lock);
        clear_flag(hold);
    }
    EXPECT_EQ(state(), 1);
    set(0, 0);
    {
        KELWLock_var hold(lock);
        clear_flag(hold);
    }
    EXPECT_EQ(state(), -1);
}

TEST_F(RWLock, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELRWLock>::value);
    EXPECT_FALSE(std::is_copy_constructible<KELRLock_var>::value);
    EXPECT_FALSE(std::is_copy_constructible<KELWLock_var>::value);
}

// --- threads -----------------------------------------------------------------------------------------

unsigned writers_waiting_for(KELRWLock& lock) {
    KELMutex_var hold(lock._mutex, 1);
    return lock._waiting_writers;
}

// Two readers hold the lock; a writer and then a third reader come.
TEST(RWLockThreads, ThirdReaderHasItsTurnAfterTheWaitingWriter) {
    KELRWLock lock;
    std::vector<std::string> order;
    lock.read_lock();
    lock.read_lock();
    std::thread writer([&] {
        KELWLock_var hold(lock);
        order.push_back("writer");
    });
    while (writers_waiting_for(lock) == 0) std::this_thread::yield();
    std::thread reader([&] {
        KELRLock_var hold(lock);
        order.push_back("reader");
    });
    lock.unlock();
    lock.unlock();
    writer.join();
    reader.join();
    EXPECT_THAT(order, ElementsAre("writer", "reader"));
}

TEST(RWLockThreads, WritersExcludeEachOtherAndReaders) {
    KELRWLock lock;
    long counter = 0;
    bool torn = false;
    std::vector<std::thread> threads;
    for (int i = 0; i < 2; ++i) {
        threads.emplace_back([&] {
            for (int n = 0; n < 1000; ++n) {
                KELWLock_var hold(lock);
                ++counter;
                ++counter;
            }
        });
        threads.emplace_back([&] {
            for (int n = 0; n < 1000; ++n) {
                KELRLock_var hold(lock);
                if (counter % 2 != 0) torn = true;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(counter, 4000);
    EXPECT_FALSE(torn);
}

}  // namespace
