// The condition variable: reports, deadlines, results and wake-ups.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/condition.h>

#include <chrono>
#include <climits>
#include <memory>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/core/probe.h"
#include "tests/core/reports.h"

namespace {

using namespace kel::test;

class Condition : public FaultTest {
protected:
    // The time of day, and what the system's wait was given and answers.
    void set_clock(long seconds, long microseconds) {
        seams::gettimeofday.script([=](timeval* now, void*) {
            now->tv_sec = seconds;
            now->tv_usec = microseconds;
            return 0;
        });
    }

    void answer_waits_with(int rc) {
        seams::pthread_cond_timedwait.script(
            [this, rc](pthread_cond_t* c, pthread_mutex_t* p, const timespec* t) {
                waited_on = c;
                released = p;
                deadline = *t;
                return rc;
            });
    }

    template <class... Limit>
    void wait(Limit... limit) {
        KELMutex_var hold(m, 1);
        Armed armed;
        condition.wait(m, limit...);
    }

    template <class Limit>
    unsigned char timedwait(Limit limit) {
        KELMutex_var hold(m, 1);
        Armed armed;
        return condition.timedwait(m, limit);
    }

    template <class Limit>
    timespec deadline_of(Limit limit) {
        answer_waits_with(0);
        timedwait(limit);
        return deadline;
    }

    template <class Limit>
    int result_for(int rc, Limit limit) {
        answer_waits_with(rc);
        return timedwait(limit);
    }

    template <class Limit>
    static void expect_timedwait_report(int rc, Limit limit, const std::string& function) {
        const auto use = [=] {
            KELMutex mutex;
            KELCondition c;
            KELMutex_var hold(mutex, 1);
            seams::pthread_cond_timedwait.script([=](pthread_cond_t*, pthread_mutex_t*, const timespec*) {
                errno = EIO;
                return rc;
            });
            c.timedwait(mutex, limit);
        };
        expect_use_failure(use, "pthread_cond_timedwait", "(rc == 0 || rc == 110 || rc == 4 )", function);
    }

    KELMutex m;
    KELCondition condition;
    pthread_cond_t* waited_on = nullptr;
    pthread_mutex_t* released = nullptr;
    timespec deadline = {};
};

#define EXPECT_DEADLINE(value, seconds, nanoseconds)             \
    do {                                                         \
        const timespec seen = value;                             \
        EXPECT_EQ(seen.tv_sec, static_cast<time_t>(seconds));    \
        EXPECT_EQ(seen.tv_nsec, static_cast<long>(nanoseconds)); \
    } while (false)

// --- life --------------------------------------------------------------------------------------------

TEST_F(Condition, HasDefaultAttributes) {
    const pthread_condattr_t* attributes = reinterpret_cast<const pthread_condattr_t*>(1);
    seams::pthread_cond_init.script([&](pthread_cond_t* c, const pthread_condattr_t* a) {
        attributes = a;
        return seams::pthread_cond_init.real(c, a);
    });
    Armed armed;
    KELCondition c;
    EXPECT_EQ(attributes, nullptr);
    EXPECT_EQ(seams::pthread_cond_init.calls(), 1);
}

TEST_F(Condition, FailedCreationThrowsNoResourcesWithErrnoAsMinor) {
    expect_no_resources(seams::pthread_cond_init, [] { KELCondition c; });
}

TEST_F(Condition, DestructorDestroysTheConditionInsideAndIgnoresAFailure) {
    std::unique_ptr<KELCondition> c(new KELCondition);
    seams::pthread_cond_destroy.fail(1, EBUSY);
    Armed armed;
    c.reset();
    EXPECT_EQ(seams::pthread_cond_destroy.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
}

TEST_F(Condition, CannotBeCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELCondition>::value);
    EXPECT_FALSE(std::is_copy_assignable<KELCondition>::value);
}

// --- reports -----------------------------------------------------------------------------------------

TEST_F(Condition, FailedWaitEndsTheProcess) {
    const auto use = [] {
        KELMutex mutex;
        KELCondition c;
        KELMutex_var hold(mutex, 1);
        fail_use(seams::pthread_cond_wait, EPERM);
        c.wait(mutex);
    };
    expect_use_failure(use, "pthread_cond_wait", "(rc == 0)", "void KELCondition::wait(KELMutex&)");
}

TEST_F(Condition, WaitWithoutALimitNeitherExpiresNorIsInterrupted) {
    for (const int rc : {ETIMEDOUT, EINTR}) {
        const auto use = [rc] {
            KELMutex mutex;
            KELCondition c;
            KELMutex_var hold(mutex, 1);
            fail_use(seams::pthread_cond_wait, rc);
            c.wait(mutex);
        };
        expect_use_failure(use, "pthread_cond_wait", "(rc == 0)", "void KELCondition::wait(KELMutex&)");
    }
}

TEST_F(Condition, FailedSignalEndsTheProcess) {
    const auto use = [] {
        KELCondition c;
        fail_use(seams::pthread_cond_signal, EINVAL);
        c.signal();
    };
    expect_use_failure(use, "pthread_cond_signal", "(rc == 0)", "void KELCondition::signal()");
}

TEST_F(Condition, FailedBroadcastEndsTheProcess) {
    const auto use = [] {
        KELCondition c;
        fail_use(seams::pthread_cond_broadcast, EINVAL);
        c.broadcast();
    };
    expect_use_failure(use, "pthread_cond_broadcast", "(rc == 0)", "void KELCondition::broadcast()");
}

TEST_F(Condition, FailedWaitForSecondsEndsTheProcess) {
    expect_timedwait_report(EINVAL, 1ul,
                            "unsigned char KELCondition::timedwait(KELMutex&, long unsigned int)");
}

TEST_F(Condition, FailedWaitForMillisecondsEndsTheProcess) {
    expect_timedwait_report(EPERM, 1ull,
                            "unsigned char KELCondition::timedwait(KELMutex&, long long unsigned int)");
}

TEST_F(Condition, FailedThrowingWaitReportsTheTimedWait) {
    const auto use = [] {
        KELMutex mutex;
        KELCondition c;
        KELMutex_var hold(mutex, 1);
        fail_use(seams::pthread_cond_timedwait, EINVAL);
        c.wait(mutex, 1ul);
    };
    expect_use_failure(use, "pthread_cond_timedwait", "(rc == 0 || rc == 110 || rc == 4 )",
                       "unsigned char KELCondition::timedwait(KELMutex&, long unsigned int)");
}

// --- results -----------------------------------------------------------------------------------------

TEST_F(Condition, WaitUsesTheConditionAndTheMutexInside) {
    seams::pthread_cond_wait.script([&](pthread_cond_t* c, pthread_mutex_t* p) {
        waited_on = c;
        released = p;
        return 0;
    });
    wait();
    EXPECT_EQ(static_cast<void*>(waited_on), &condition);
    EXPECT_EQ(released, native(m));
}

TEST_F(Condition, TimedWaitsUseTheConditionAndTheMutexInside) {
    deadline_of(1ul);
    EXPECT_EQ(static_cast<void*>(waited_on), &condition);
    EXPECT_EQ(released, native(m));
    waited_on = nullptr;
    deadline_of(1ull);
    EXPECT_EQ(static_cast<void*>(waited_on), &condition);
}

TEST_F(Condition, WokenTimedWaitGivesZero) {
    EXPECT_EQ(result_for(0, 5ul), 0);
    EXPECT_EQ(result_for(0, 5ull), 0);
}

TEST_F(Condition, ExpiredTimedWaitGivesOne) {
    EXPECT_EQ(result_for(110, 5ul), 1);
    EXPECT_EQ(result_for(110, 5ull), 1);
}

TEST_F(Condition, InterruptedTimedWaitGivesOne) {
    EXPECT_EQ(result_for(4, 5ul), 1);
    EXPECT_EQ(result_for(4, 5ull), 1);
    EXPECT_EQ(seams::pthread_cond_timedwait.calls(), 2) << "an interruption is not tried again";
}

TEST_F(Condition, WokenThrowingWaitReturns) {
    answer_waits_with(0);
    EXPECT_NO_THROW(wait(5ul));
    EXPECT_NO_THROW(wait(5ull));
}

template <class Wait>
void expect_timeout(Wait wait) {
    try {
        wait();
        ADD_FAILURE() << "no TIMEOUT";
    } catch (const CORBA_TIMEOUT& e) {
        EXPECT_EQ(e.minor(), 0x4f4d0000ul);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
    }
}

TEST_F(Condition, ExpiredThrowingWaitThrowsADefaultTimeout) {
    answer_waits_with(110);
    expect_timeout([&] { wait(5ul); });
    expect_timeout([&] { wait(5ull); });
}

TEST_F(Condition, InterruptedThrowingWaitThrowsADefaultTimeout) {
    answer_waits_with(4);
    expect_timeout([&] { wait(5ul); });
    expect_timeout([&] { wait(5ull); });
}

// --- deadlines ---------------------------------------------------------------------------------------

TEST_F(Condition, UnsignedLongCountsSeconds) {
    set_clock(1000, 250);
    EXPECT_DEADLINE(deadline_of(2ul), 1002, 250000);
}

TEST_F(Condition, UnsignedLongLongCountsMilliseconds) {
    set_clock(1000, 250);
    EXPECT_DEADLINE(deadline_of(2ull), 1000, 2250000);
}

TEST_F(Condition, ThrowingWaitsUseTheSameUnits) {
    set_clock(1000, 0);
    answer_waits_with(0);
    wait(3ul);
    EXPECT_DEADLINE(deadline, 1003, 0);
    wait(3ull);
    EXPECT_DEADLINE(deadline, 1000, 3000000);
}

TEST_F(Condition, ZeroIsNow) {
    set_clock(77, 999999);
    EXPECT_DEADLINE(deadline_of(0ul), 77, 999999000);
    EXPECT_DEADLINE(deadline_of(0ull), 77, 999999000);
}

TEST_F(Condition, MillisecondsCarryIntoTheSeconds) {
    set_clock(1000, 700000);
    EXPECT_DEADLINE(deadline_of(1500ull), 1002, 200000000);
}

TEST_F(Condition, ExactlyOneSecondOfMicrosecondsCarries) {
    set_clock(1000, 500000);
    EXPECT_DEADLINE(deadline_of(500ull), 1001, 0);
}

TEST_F(Condition, JustBelowOneSecondOfMicrosecondsDoesNotCarry) {
    set_clock(1000, 999);
    EXPECT_DEADLINE(deadline_of(999ull), 1000, 999999000);
}

TEST_F(Condition, TheGreatestSumOfMicrosecondsCarriesOnce) {
    set_clock(1000, 999999);
    EXPECT_DEADLINE(deadline_of(999ull), 1001, 998999000);
}

TEST_F(Condition, AThousandMillisecondsAreASecond) {
    set_clock(1000, 1);
    EXPECT_DEADLINE(deadline_of(86400000ull), 87400, 1000);
}

TEST_F(Condition, SecondsWrapInTheWidthOfTheField) {
    set_clock(1000, 0);
    EXPECT_DEADLINE(deadline_of(ULONG_MAX), 999, 0);
    EXPECT_DEADLINE(deadline_of(static_cast<unsigned long>(LONG_MAX)),
                    static_cast<time_t>(1000ul + static_cast<unsigned long>(LONG_MAX)), 0);
}

TEST_F(Condition, MillisecondsBeyondTheSecondsFieldWrap) {
    if (sizeof(time_t) != 4) GTEST_SKIP() << "the field is wider";
    set_clock(1000, 0);
    EXPECT_DEADLINE(deadline_of(((1ull << 32) + 5) * 1000), 1005, 0);
}

TEST_F(Condition, AClockThatFailsCountsAsZero) {
    seams::gettimeofday.fail(1, EFAULT, true);
    EXPECT_DEADLINE(deadline_of(3ul), 3, 0);
    EXPECT_DEADLINE(deadline_of(3ull), 0, 3000000);
}

template <class Limit, class = void>
struct CanWait : std::false_type {};
template <class Limit>
struct CanWait<Limit, decltype(std::declval<KELCondition&>().timedwait(std::declval<KELMutex&>(),
                                                                       std::declval<Limit>()),
                               void())> : std::true_type {};

TEST_F(Condition, AnIntLimitDoesNotCompile) {
    EXPECT_TRUE(CanWait<unsigned long>::value);
    EXPECT_TRUE(CanWait<unsigned long long>::value);
    EXPECT_FALSE(CanWait<int>::value);
}

// --- the real thing ----------------------------------------------------------------------------------

TEST_F(Condition, ZeroExpiresAtOnce) {
    KELMutex_var hold(m, 1);
    EXPECT_EQ(condition.timedwait(m, 0ul), 1);
    EXPECT_EQ(condition.timedwait(m, 0ull), 1);
}

TEST_F(Condition, MutexIsHeldAfterEveryWait) {
    KELMutex_var hold(m, 1);
    condition.timedwait(m, 1ull);
    EXPECT_TRUE(is_held(m));
    EXPECT_THROW(condition.wait(m, 1ull), CORBA_TIMEOUT);
    EXPECT_TRUE(is_held(m));
}

TEST_F(Condition, WaitsAsLongAsItIsTold) {
    KELMutex_var hold(m, 1);
    const auto start = std::chrono::system_clock::now();
    EXPECT_EQ(condition.timedwait(m, 30ull), 1);
    EXPECT_GE(std::chrono::system_clock::now() - start, std::chrono::milliseconds(29));
}

// A deadline beyond the field lies in the past.
TEST_F(Condition, AnImpossibleDeadlineExpiresAtOnce) {
    KELMutex_var hold(m, 1);
    EXPECT_EQ(condition.timedwait(m, ULONG_MAX), 1);
}

// Threads that wait until told to go; each has its own place in the count.
class Waiters {
public:
    explicit Waiters(int n) {
        for (int i = 0; i < n; ++i) {
            _threads.emplace_back([this] {
                KELMutex_var hold(_mutex, 1);
                ++_waiting;
                while (_tickets == 0) _changed.wait(_mutex);
                --_tickets;
                ++_gone;
            });
        }
        while (count(_waiting) != n) std::this_thread::yield();
    }

    void give(int tickets) {
        KELMutex_var hold(_mutex, 1);
        _tickets += tickets;
    }
    int gone() { return count(_gone); }
    KELCondition& changed() { return _changed; }
    void join() {
        for (std::thread& thread : _threads) thread.join();
    }

private:
    int count(const int& number) {
        KELMutex_var hold(_mutex, 1);
        return number;
    }

    KELMutex _mutex;
    KELCondition _changed;
    int _waiting = 0;
    int _tickets = 0;
    int _gone = 0;
    std::vector<std::thread> _threads;
};

TEST_F(Condition, SignalWakesAWaitingThread) {
    Waiters waiters(1);
    waiters.give(1);
    waiters.changed().signal();
    waiters.join();
    EXPECT_EQ(waiters.gone(), 1);
}

TEST_F(Condition, BroadcastWakesAllWaitingThreads) {
    Waiters waiters(4);
    waiters.give(4);
    waiters.changed().broadcast();
    waiters.join();
    EXPECT_EQ(waiters.gone(), 4);
}

TEST_F(Condition, SignalEndsATimedWaitWithZero) {
    KELMutex_var hold(m, 1);
    std::thread signaller([&] {
        KELMutex_var wait_for_the_wait(m, 1);
        condition.signal();
    });
    EXPECT_EQ(condition.timedwait(m, 10ul), 0);
    hold.unlock();
    signaller.join();
}

TEST_F(Condition, SignalAndBroadcastWithoutWaitersAreLost) {
    condition.signal();
    condition.broadcast();
    KELMutex_var hold(m, 1);
    EXPECT_EQ(condition.timedwait(m, 0ul), 1);
}

}  // namespace
