// Capacities, indices and times of the pollers.
// SPDX-License-Identifier: MIT
#include <kel/os/poll.h>

#include <climits>
#include <memory>
#include <vector>

#include "tests/faults/bounds/bounds.h"

using namespace kel::test;

namespace {

const char header[] = "kel/os/poll.h";

typedef std::unique_ptr<KELPoll> Poller;

// From 2^31 on an int is negative, and a capacity below 1 counts as 1.
template <class Make>
void make_with_capacity(std::uint32_t n, Make make) {
    const int capacity = static_cast<int>(n);
    if (capacity == INT_MAX) {
        EXPECT_TRUE(refused([&] { Poller(make(capacity)); }));
        return;
    }
    const Poller poller(make(capacity));
    int users[3];
    for (int i = 0; i < 3; ++i) poller->add(i, KELPoll::evMaskRead, &users[i]);
    EXPECT_EQ(poller->count(), 3);
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(poller->descriptor(i), i);
        EXPECT_EQ(poller->userData(i), &users[i]);
    }
}

// A poller with two entries, the second for descriptor 7, read and the user pointer of this file.
Poller with_two_entries() {
    Poller poller(new KELImplPoll(1));
    poller->add(5, 0, nullptr);
    poller->add(7, KELPoll::evMaskRead, const_cast<char*>(header));
    return poller;
}

// What `wait` hands to poll.
template <class Wait>
std::vector<int> times_of_poll(Wait wait) {
    std::vector<int> times;
    seams::poll.script([&](pollfd*, nfds_t, int ms) {
        times.push_back(ms);
        return 0;
    });
    KELImplPoll poller(1);
    Armed armed;
    EXPECT_EQ(wait(poller), 0);
    return times;
}

// What `wait` hands to select for `ms`. The system itself decides about a negative time.
template <class Wait>
void expect_select_time(int ms, Wait wait) {
    int calls = 0;
    seams::select.script([&](int fds, fd_set* r, fd_set* w, fd_set* e, timeval* tv) {
        ++calls;
        if (ms == -1) {
            EXPECT_EQ(tv, nullptr);
            return 0;
        }
        EXPECT_EQ(tv->tv_sec, ms / 1000);
        EXPECT_EQ(tv->tv_usec, ms % 1000 * 1000);
        return ms < 0 ? seams::select.real(fds, r, w, e, tv) : 0;
    });
    KELImplSelect poller(1);
    Armed armed;
    const int result = wait(poller);
    const int error = errno;
    EXPECT_EQ(result, ms < -1 ? -1 : 0);
    EXPECT_TRUE(result == 0 || error == EINVAL) << error;
    EXPECT_EQ(calls, 1);
}

}  // namespace

AT_BOUNDS(Poller, HasRoomForEveryCapacityButTheGreatest, header, "capacity") {
    make_with_capacity(n, [](int capacity) { return KELPoll::create(capacity, KELPoll::API_POLL); });
    make_with_capacity(n, [](int capacity) { return KELPoll::create(capacity, KELPoll::API_SELECT); });
}
AT_BOUNDS(PollPoller, HasRoomForEveryCapacityButTheGreatest, header, "capacity") {
    make_with_capacity(n, [](int capacity) { return new KELImplPoll(capacity); });
}
AT_BOUNDS(SelectPoller, HasRoomForEveryCapacityButTheGreatest, header, "capacity") {
    make_with_capacity(n, [](int capacity) { return new KELImplSelect(capacity); });
}

AT_BOUNDS(RequestedEvent, IsNoneWhereThereIsNoEntry, header, "index") {
    EXPECT_EQ(with_two_entries()->requestedEvent(static_cast<int>(n)), n == 1 ? KELPoll::evMaskRead : 0);
}
AT_BOUNDS(ReportedEvent, IsNoneWhereThereIsNoEntry, header, "index") {
    seams::poll.script([](pollfd* entries, nfds_t, int) {
        entries[1].revents = KELPoll::evMaskRead;
        return 1;
    });
    const Poller poller = with_two_entries();
    Armed armed;
    EXPECT_EQ(poller->waitForEvents(0), 1);
    EXPECT_EQ(poller->reportedEvent(static_cast<int>(n)), n == 1 ? KELPoll::evMaskRead : 0);
}
AT_BOUNDS(Descriptor, IsNoneWhereThereIsNoEntry, header, "index") {
    EXPECT_EQ(with_two_entries()->descriptor(static_cast<int>(n)), n == 0 ? 5 : n == 1 ? 7 : -1);
}
AT_BOUNDS(UserData, IsNullWhereThereIsNoEntry, header, "index") {
    EXPECT_EQ(with_two_entries()->userData(static_cast<int>(n)), n == 1 ? header : nullptr);
}

AT_BOUNDS(TimeVal, KeepsMillisecondsInStep, header, "ms") {
    const int ms = static_cast<int>(n);
    KELPoll::TimeVal time;
    time.set(ms);
    EXPECT_EQ(time._ms, ms);
    EXPECT_EQ(time._ptr, ms < 0 ? nullptr : &time._tv);
    EXPECT_EQ(time._tv.tv_sec, ms < 0 ? 0 : ms / 1000);
    EXPECT_EQ(time._tv.tv_usec, ms < 0 ? 0 : ms % 1000 * 1000);
}

// What has no number of milliseconds has its low 32 bits.
AT_BOUNDS(TimeVal, OfSecondsWrapsInMilliseconds, header, "sec") {
    KELPoll::TimeVal time;
    time.set(static_cast<int>(n), 1999);
    EXPECT_EQ(time._ms, static_cast<std::int32_t>(n * 1000u + 1u));
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_sec, static_cast<int>(n));
    EXPECT_EQ(time._tv.tv_usec, 1999);
}
AT_BOUNDS(TimeVal, OfMicrosecondsIsTruncatedToMilliseconds, header, "usec") {
    const int usec = static_cast<int>(n);
    KELPoll::TimeVal time;
    time.set(2, usec);
    EXPECT_EQ(time._ms, 2000 + usec / 1000);
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_usec, usec);
}
AT_BOUNDS(TimeVal, OfASystemTimeWrapsInMilliseconds, header, "seconds of a timeval") {
    timeval tv = {static_cast<int>(n), 999999};
    KELPoll::TimeVal time;
    time.set(&tv);
    EXPECT_EQ(time._ms, static_cast<std::int32_t>(n * 1000u + 999u));
    EXPECT_EQ(KELPoll::milliseconds(&tv), time._ms);
}

AT_BOUNDS(PollWait, HandsItsMillisecondsToTheSystem, header, "ms") {
    const int ms = static_cast<int>(n);
    EXPECT_THAT(times_of_poll([&](KELPoll& p) { return p.waitForEvents(ms); }), testing::ElementsAre(ms));
}
AT_BOUNDS(PlainPollWait, HandsItsMillisecondsToTheSystem, header, "ms") {
    const int ms = static_cast<int>(n);
    EXPECT_THAT(times_of_poll([&](KELPoll& p) { return p._waitForEvents(ms); }), testing::ElementsAre(ms));
}
AT_BOUNDS(SelectWait, HandsItsMillisecondsToTheSystem, header, "ms") {
    const int ms = static_cast<int>(n);
    expect_select_time(ms, [&](KELPoll& p) { return p.waitForEvents(ms); });
}
AT_BOUNDS(PlainSelectWait, HandsItsMillisecondsToTheSystem, header, "ms") {
    const int ms = static_cast<int>(n);
    expect_select_time(ms, [&](KELPoll& p) { return p._waitForEvents(ms); });
}
