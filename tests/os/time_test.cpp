// KELPortable's time, waiting and sleeping.
//
// SPDX-License-Identifier: MIT
#include <kel/os/portable.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <limits>

#include "tests/support/child.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class Time : public FaultTest {};
class Select : public FaultTest {};
class Sleep : public FaultTest {};

timeval time_of(long long seconds, long microseconds) {
    timeval tv;
    tv.tv_sec = static_cast<time_t>(seconds);
    tv.tv_usec = microseconds;
    return tv;
}

void expect_time(const timeval& tv, long long seconds, long microseconds) {
    EXPECT_EQ(tv.tv_sec, static_cast<time_t>(seconds));
    EXPECT_EQ(tv.tv_usec, microseconds);
}

// --- Time -------------------------------------------------------------------------------------

TEST_F(Time, OfDayIsTheSystemsWithoutATimeZone) {
    seams::gettimeofday.script([](timeval* tv, void* zone) {
        EXPECT_EQ(zone, nullptr);
        *tv = time_of(12, 34);
        return 0;
    });
    timeval by_reference = time_of(0, 0);
    timeval by_pointer = time_of(0, 0);
    Armed armed;
    EXPECT_EQ(KELPortable::gettimeofday(by_reference), 0);
    EXPECT_EQ(KELPortable::vgettimeofday(&by_pointer), 0);
    expect_time(by_reference, 12, 34);
    expect_time(by_pointer, 12, 34);
}

TEST_F(Time, OfDayReportsAFailureAsTheSystemDoes) {
    seams::gettimeofday.fail(1, EFAULT, true);
    timeval tv;
    Armed armed;
    EXPECT_EQ(KELPortable::gettimeofday(tv), -1);
    EXPECT_EQ(errno, EFAULT);
    EXPECT_EQ(KELPortable::vgettimeofday(&tv), -1);
}

TEST_F(Time, ElapsedIsTheLaterMinusTheEarlier) {
    expect_time(KELPortable::elapsed(time_of(10, 250), time_of(13, 750)), 3, 500);
    expect_time(KELPortable::elapsed(time_of(13, 0), time_of(10, 0)), -3, 0);
}

TEST_F(Time, ElapsedTakesASecondForNegativeMicroseconds) {
    expect_time(KELPortable::elapsed(time_of(1, 500000), time_of(2, 0)), 0, 500000);
    expect_time(KELPortable::elapsed(time_of(0, 1), time_of(0, 0)), -1, 999999);
}

TEST_F(Time, ElapsedCarriesMoreThanAMillionMicroseconds) {
    expect_time(KELPortable::elapsed(time_of(0, 0), time_of(1, 1000001)), 2, 1);
}

TEST_F(Time, ElapsedLeavesExactlyAMillionMicroseconds) {
    expect_time(KELPortable::elapsed(time_of(0, 0), time_of(1, 1000000)), 1, 1000000);
}

TEST_F(Time, ElapsedCarriesOnce) {
    expect_time(KELPortable::elapsed(time_of(0, 0), time_of(0, 2500000)), 1, 1500000);
    expect_time(KELPortable::elapsed(time_of(0, 2500000), time_of(0, 0)), -1, -1500000);
}

TEST_F(Time, ElapsedWrapsForTimesTooFarApart) {
    const time_t last = std::numeric_limits<time_t>::max();
    const time_t first = std::numeric_limits<time_t>::min();
    expect_time(KELPortable::elapsed(time_of(first, 0), time_of(last, 0)), -1, 0);
}

TEST_F(Time, ComparesSecondsFirst) {
    timeval earlier = time_of(10, 900000);
    timeval later = time_of(17, 0);
    EXPECT_EQ(KELPortable::compare_time(earlier, later), -7);
    EXPECT_EQ(KELPortable::compare_time(later, earlier), 7);
}

TEST_F(Time, ComparesMicrosecondsWithinASecond) {
    timeval earlier = time_of(10, 100);
    timeval later = time_of(10, 999);
    EXPECT_EQ(KELPortable::compare_time(earlier, later), -899);
    EXPECT_EQ(KELPortable::compare_time(later, earlier), 899);
    EXPECT_EQ(KELPortable::compare_time(later, later), 0);
}

TEST_F(Time, ComparesWithMilliseconds) {
    timeval a = time_of(1, 999999);
    EXPECT_EQ(KELPortable::compare_time(a, 1999ULL), 0);
    EXPECT_EQ(KELPortable::compare_time(a, 2000ULL), -1);
    EXPECT_EQ(KELPortable::compare_time(a, 0ULL), 1999);
}

TEST_F(Time, ComparisonWithMillisecondsIsCutToThirtyTwoBits) {
    timeval a = time_of(0, 5000);
    EXPECT_EQ(KELPortable::compare_time(a, 0x100000000ULL), 5);
    EXPECT_EQ(KELPortable::compare_time(a, 0x80000000ULL + 5), INT_MIN);
}

TEST_F(Time, ConvertsMilliseconds) {
    timeval tv;
    KELPortable::convert(1999, tv);
    expect_time(tv, 1, 999000);
    KELPortable::convert(0, tv);
    expect_time(tv, 0, 0);
    KELPortable::convert(60000ULL, tv);
    expect_time(tv, 60, 0);
}

TEST_F(Time, ConvertsToMillisecondsAndDropsTheRest) {
    EXPECT_EQ(KELPortable::convert(time_of(1, 999999)), 1999u);
    EXPECT_EQ(KELPortable::convert(time_of(0, 999)), 0u);
    EXPECT_EQ(KELPortable::convert(time_of(2, -1500)), 1999u);
}

TEST_F(Time, ConvertsToMillisecondsIn64Bits) {
    EXPECT_EQ(KELPortable::convert(time_of(INT_MAX, 0)), 2147483647000ULL);
    EXPECT_EQ(KELPortable::convert(time_of(-1, 0)), 0ULL - 1000);
}

// --- Select -----------------------------------------------------------------------------------

TEST_F(Select, WrappedGetsItsArgumentsAndGivesItsResult) {
    fd_set r, w, e;
    timeval timeout = time_of(5, 6);
    seams::select.script([&](int n, fd_set* reads, fd_set* writes, fd_set* exceptions, timeval* limit) {
        EXPECT_EQ(n, 9);
        EXPECT_EQ(reads, &r);
        EXPECT_EQ(writes, &w);
        EXPECT_EQ(exceptions, &e);
        expect_time(*limit, 5, 6);
        return 3;
    });
    Armed armed;
    EXPECT_EQ(wrapped_select(9, &r, &w, &e, &timeout), 3);
    EXPECT_EQ(seams::select.calls(), 1);
}

TEST_F(Select, WrappedLeavesTheCallersTimeOutAsItWas) {
    seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval* limit) {
        *limit = time_of(0, 1);
        errno = EINTR;
        return -1;
    });
    timeval timeout = time_of(5, 6);
    Armed armed;
    EXPECT_EQ(wrapped_select(0, nullptr, nullptr, nullptr, &timeout), -1);
    EXPECT_EQ(errno, EINTR);
    expect_time(timeout, 5, 6);
}

TEST_F(Select, WrappedWaitsWithoutALimitForANullTimeOut) {
    seams::select.script(
        [](int, fd_set*, fd_set*, fd_set*, timeval* limit) { return limit == nullptr ? 1 : 0; });
    Armed armed;
    EXPECT_EQ(wrapped_select(0, nullptr, nullptr, nullptr, nullptr), 1);
}

// --- Sleep ------------------------------------------------------------------------------------

void expect_wait(unsigned long ms, long seconds, long microseconds) {
    SCOPED_TRACE(ms);
    seams::select.script([=](int, fd_set*, fd_set*, fd_set*, timeval* limit) {
        expect_time(*limit, seconds, microseconds);
        return 0;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::sleep(ms), 0);
}

TEST_F(Sleep, WaitsTheGivenMilliseconds) {
    expect_wait(0, 0, 0);
    expect_wait(1, 0, 1000);
    expect_wait(999, 0, 999000);
    expect_wait(1000, 1, 0);
    expect_wait(1999, 1, 999000);
    expect_wait(4294967295UL, 4294967, 295000);
    EXPECT_EQ(seams::select.calls(), 6);
}

TEST_F(Sleep, WatchesTheExceptionsOfDescriptorZero) {
    seams::select.script([](int n, fd_set* reads, fd_set* writes, fd_set* exceptions, timeval*) {
        EXPECT_EQ(n, 1);
        EXPECT_EQ(reads, nullptr);
        EXPECT_EQ(writes, nullptr);
        for (int fd = 0; fd < FD_SETSIZE; ++fd) EXPECT_EQ(FD_ISSET(fd, exceptions) != 0, fd == 0) << fd;
        return 0;
    });
    Armed armed;
    KELPortable::sleep(10);
}

TEST_F(Sleep, GivesTheResultOfTheWait) {
    seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval*) { return 1; });
    Armed armed;
    EXPECT_EQ(KELPortable::sleep(10), 1);
}

TEST_F(Sleep, EndsEarlyForASignal) {
    seams::select.fail(1, EINTR);
    Armed armed;
    EXPECT_EQ(KELPortable::sleep(1000000), -1);
    EXPECT_EQ(errno, EINTR);
    EXPECT_EQ(seams::select.calls(), 1);
}

TEST_F(Sleep, FailsAtOnceWithoutDescriptorZero) {
    const Outcome outcome = in_child([] {
        ::close(0);
        _exit(KELPortable::sleep(1000000) == -1 && errno == EBADF ? 7 : 8);
    });
    EXPECT_EQ(outcome.exit_code, 7);
}

TEST_F(Sleep, InSecondsIsTheSystems) {
    seams::sleep.script([](unsigned seconds) { return seconds - 1; });
    Armed armed;
    EXPECT_EQ(KELPortable::vsleep(7), 6u);
    EXPECT_EQ(seams::sleep.calls(), 1);
}

}  // namespace
