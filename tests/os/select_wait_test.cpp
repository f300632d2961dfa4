// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <kel/os/poll.h>

#include <climits>
#include <new>
#include <string>
#include <vector>

#include "tests/os/poll_forms.h"
#include "tests/support/fault.h"

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using TimeVal = KELPoll::TimeVal;

namespace {

const short write_and_error = KELPoll::evMaskWrite | KELPoll::evMaskError;

// A set as text: "null", or its descriptors.
std::string to_text(const fd_set* set) {
    if (set == nullptr) return "null";
    std::string text;
    for (int fd = 0; fd < FD_SETSIZE; ++fd) {
        if (FD_ISSET(fd, set)) text += (text.empty() ? "" : " ") + std::to_string(fd);
    }
    return text;
}

std::string to_text(const timeval* tv) {
    if (tv == nullptr) return "null";
    return std::to_string(static_cast<long long>(tv->tv_sec)) + " s " +
           std::to_string(static_cast<long long>(tv->tv_usec)) + " us";
}

// The script of select leaves in the sets what `ready_*` say and returns their number.
class SelectWait : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        seams::select.script([this](int n, fd_set* r, fd_set* w, fd_set* e, timeval* tv) {
            nfds.push_back(n);
            sets = to_text(r) + "|" + to_text(w) + "|" + to_text(e);
            limits.push_back(to_text(tv));
            if (tv != nullptr) tv->tv_sec = tv->tv_usec = 4711;
            if (error != 0) {
                errno = error;
                return -1;
            }
            return keep(r, ready_read) + keep(w, ready_write) + keep(e, ready_error);
        });
    }

    static int keep(fd_set* set, const std::vector<int>& ready) {
        if (set == nullptr) return 0;
        fd_set left;
        FD_ZERO(&left);
        int n = 0;
        for (const int fd : ready) {
            if (!FD_ISSET(fd, set)) continue;
            FD_SET(fd, &left);
            ++n;
        }
        *set = left;
        return n;
    }

    int wait(int ms = 10) {
        Armed armed;
        return poller.waitForEvents(ms);
    }

    KELImplSelect poller{4};
    std::vector<int> ready_read, ready_write, ready_error;
    int error = 0;
    std::vector<int> nfds;
    std::string sets;
    std::vector<std::string> limits;
};

}  // namespace

TEST_F(SelectWait, PutsEachDescriptorIntoTheSetItAsksFor) {
    poller.add(3, KELPoll::evMaskRead, nullptr);
    poller.add(4, KELPoll::evMaskWrite, nullptr);
    poller.add(5, KELPoll::evMaskError, nullptr);
    poller.add(6, KELPoll::evMaskRead, nullptr);
    for (const Form& form : wait_forms) {
        Armed armed;
        form.wait(poller, 10);
        EXPECT_EQ(sets, "3 6|4|5") << form.name;
    }
    EXPECT_THAT(nfds, ElementsAre(7, 7, 7, 7, 7, 7));
}

TEST_F(SelectWait, AnEntryForReadAndWriteIsWatchedForReadOnly) {
    poller.add(5, read_and_write, nullptr);
    wait();
    EXPECT_EQ(sets, "5|null|null");
}

TEST_F(SelectWait, AnEntryForWriteAndErrorIsWatchedForWriteOnly) {
    poller.add(5, write_and_error, nullptr);
    wait();
    EXPECT_EQ(sets, "null|5|null");
}

TEST_F(SelectWait, AnEntryForNoneOfTheThreeIsNotWatched) {
    poller.add(5, POLLHUP, nullptr);
    wait();
    EXPECT_EQ(sets, "null|null|null");
    EXPECT_THAT(nfds, ElementsAre(6));
}

TEST_F(SelectWait, ASetWithoutDescriptorsIsNull) {
    poller.add(5, KELPoll::evMaskError, nullptr);
    wait();
    EXPECT_EQ(sets, "null|null|5");
}

TEST_F(SelectWait, AnEmptyPollerPassesNothing) {
    wait();
    EXPECT_EQ(sets, "null|null|null");
    EXPECT_THAT(nfds, ElementsAre(0));
}

TEST_F(SelectWait, DoesNotChangeTheCallersTimeval) {
    timeval tv = {2, 3};
    Armed armed;
    poller._waitForEvents(&tv);
    poller.waitForEvents(&tv);
    EXPECT_THAT(limits, ElementsAre("2 s 3 us", "2 s 3 us"));
    EXPECT_EQ(to_text(&tv), "2 s 3 us");
}

TEST_F(SelectWait, DoesNotChangeThePreparedTimeOut) {
    TimeVal time;
    time.set(1500);
    Armed armed;
    poller.waitForEvents(time);
    poller.waitForEvents(time);
    EXPECT_THAT(limits, ElementsAre("1 s 500000 us", "1 s 500000 us"));
}

TEST_F(SelectWait, SplitsMillisecondsTowardZero) {
    for (const int ms : {0, 999, 1000, 2345, -5, -1500}) wait(ms);
    EXPECT_THAT(limits, ElementsAre("0 s 0 us", "0 s 999000 us", "1 s 0 us", "2 s 345000 us", "0 s -5000 us",
                                    "-1 s -500000 us"));
}

TEST_F(SelectWait, WithoutLimitPassesNullInEveryForm) {
    Armed armed;
    for (const Form& form : wait_forms) form.wait(poller, -1);
    EXPECT_THAT(limits, ElementsAre("null", "null", "null", "null", "null", "null"));
}

TEST(SelectWaitForms, AllGoThroughTheOneWithATimeval) {
    struct Counting : KELImplSelect {
        Counting() : KELPoll(1), KELImplSelect(1) {}
        using KELImplSelect::_waitForEvents;
        int _waitForEvents(timeval*) override { return ++waits; }
        int waits = 0;
    } poller;
    for (const Form& form : wait_forms) form.wait(poller, 10);
    EXPECT_EQ(poller.waits, 6);
}

TEST_F(SelectWait, AReadyEntryReportsItsWholeMask) {
    poller.add(5, read_and_write, nullptr);
    ready_read = {5};
    EXPECT_EQ(wait(), 1);
    EXPECT_EQ(poller.reportedEvent(0), read_and_write);
}

TEST_F(SelectWait, OnlyReadyEntriesReport) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.add(6, KELPoll::evMaskWrite, nullptr);
    poller.add(7, KELPoll::evMaskError, nullptr);
    ready_write = {6};
    ready_error = {7};
    EXPECT_EQ(wait(), 2);
    EXPECT_EQ(poller.reportedEvent(0), 0);
    EXPECT_EQ(poller.reportedEvent(1), KELPoll::evMaskWrite);
    EXPECT_EQ(poller.reportedEvent(2), KELPoll::evMaskError);
}

TEST_F(SelectWait, OneReadyEventReportsToOneEntry) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    wait();
    EXPECT_EQ(poller.reportedEvent(0), KELPoll::evMaskRead);
    EXPECT_EQ(poller.reportedEvent(1), 0);
}

TEST_F(SelectWait, AnEntryTakesAnyReadyEventOfItsDescriptorThatItAskedFor) {
    poller.add(5, read_and_write, nullptr);
    poller.add(5, KELPoll::evMaskWrite, nullptr);
    ready_write = {5};
    wait();
    EXPECT_EQ(poller.reportedEvent(0), read_and_write);
    EXPECT_EQ(poller.reportedEvent(1), 0);
}

TEST_F(SelectWait, AnEntryTakesReadinessToReadBeforeThatToWrite) {
    poller.add(5, read_and_write, nullptr);
    poller.add(5, KELPoll::evMaskWrite, nullptr);
    ready_read = ready_write = {5};
    wait();
    EXPECT_EQ(poller.reportedEvent(0), read_and_write);
    EXPECT_EQ(poller.reportedEvent(1), KELPoll::evMaskWrite);
}

TEST_F(SelectWait, AnEntryTakesReadinessToWriteBeforeAnError) {
    poller.add(5, write_and_error, nullptr);
    poller.add(5, KELPoll::evMaskError, nullptr);
    ready_write = ready_error = {5};
    wait();
    EXPECT_EQ(poller.reportedEvent(0), write_and_error);
    EXPECT_EQ(poller.reportedEvent(1), KELPoll::evMaskError);
}

TEST_F(SelectWait, TheUnderscoreFormsReportNothing) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    for (const Form& form : wait_forms) {
        if (form.reports) continue;
        Armed armed;
        EXPECT_EQ(form.wait(poller, 10), 1);
        EXPECT_EQ(poller.reportedEvent(0), 0) << form.name;
    }
}

TEST_F(SelectWait, SetReportedEventsFillsInAfterwards) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    Armed armed;
    poller._waitForEvents(10);
    poller.setReportedEvents();
    EXPECT_EQ(poller.reportedEvent(0), KELPoll::evMaskRead);
}

TEST_F(SelectWait, SetReportedEventsUsesUpWhatTheWaitFound) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    wait();
    poller.remove(5);
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.setReportedEvents();
    EXPECT_EQ(poller.reportedEvent(0), 0);
}

TEST_F(SelectWait, AFailedWaitReportsNothingAndKeepsErrno) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    error = EBADF;
    errno = 0;
    EXPECT_EQ(wait(), -1);
    EXPECT_EQ(errno, EBADF);
    EXPECT_EQ(poller.reportedEvent(0), 0);
}

TEST_F(SelectWait, AWaitThatFindsNothingReportsNothing) {
    seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval*) { return 0; });
    poller.add(5, KELPoll::evMaskRead, nullptr);
    EXPECT_EQ(wait(), 0);
    EXPECT_EQ(poller.reportedEvent(0), 0);
}

TEST_F(SelectWait, AWaitStartsWithNothingReported) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    wait();
    ready_read.clear();
    EXPECT_EQ(wait(), 0);
    EXPECT_EQ(poller.reportedEvent(0), 0);
}

TEST_F(SelectWait, TheCountIsTheHighestDescriptorPlusOne) {
    for (const int fd : {3, 9, 4}) poller.add(fd, KELPoll::evMaskRead, nullptr);
    wait();
    EXPECT_THAT(nfds, ElementsAre(10));
}

TEST_F(SelectWait, WithoutMemoryAddLeavesTheCount) {
    KELImplSelect small(1);
    small.add(3, KELPoll::evMaskRead, nullptr);
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(small.add(9, KELPoll::evMaskRead, nullptr), std::bad_alloc);
    small.waitForEvents(10);
    EXPECT_THAT(nfds, ElementsAre(4));
}

TEST_F(SelectWait, RemovingTheHighestDescriptorLowersTheCountByOne) {
    poller.add(3, KELPoll::evMaskRead, nullptr);
    poller.add(9, KELPoll::evMaskRead, nullptr);
    poller.remove(9);
    wait();
    EXPECT_THAT(nfds, ElementsAre(9));
    EXPECT_EQ(sets, "3|null|null");
}

TEST_F(SelectWait, RemovingALowerDescriptorKeepsTheCount) {
    poller.add(3, KELPoll::evMaskRead, nullptr);
    poller.add(9, KELPoll::evMaskRead, nullptr);
    poller.remove(3);
    wait();
    EXPECT_THAT(nfds, ElementsAre(10));
}

TEST_F(SelectWait, RemovingAnUnregisteredDescriptorStillLowersTheCount) {
    poller.add(9, KELPoll::evMaskRead, nullptr);
    poller.remove(9);
    poller.remove(8);
    wait();
    EXPECT_THAT(nfds, ElementsAre(8));
}

TEST_F(SelectWait, RemovingMinusOneFromAnEmptyPollerLowersTheCountToMinusOne) {
    poller.remove(-1);
    wait();
    EXPECT_THAT(nfds, ElementsAre(-1));
}

TEST_F(SelectWait, RemoveAllPassesNoDescriptors) {
    poller.add(9, KELPoll::evMaskRead, nullptr);
    poller.removeAll();
    wait();
    EXPECT_THAT(nfds, ElementsAre(0));
    EXPECT_EQ(sets, "null|null|null");
}

TEST_F(SelectWait, RemoveTakesBackWhatTheWaitFound) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    Armed armed;
    poller._waitForEvents(10);
    poller.remove(5);
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.setReportedEvents();
    EXPECT_EQ(poller.reportedEvent(0), 0);
}

TEST_F(SelectWait, RemoveTakesBackWhatTheWaitFoundInEverySet) {
    ready_read = ready_write = ready_error = {5};
    Armed armed;
    for (const short events : {KELPoll::evMaskRead, KELPoll::evMaskWrite, KELPoll::evMaskError}) {
        poller.add(5, events, nullptr);
        EXPECT_EQ(poller._waitForEvents(10), 1);
        poller.remove(5);
        poller.add(5, events, nullptr);
        poller.setReportedEvents();
        EXPECT_EQ(poller.reportedEvent(0), 0) << events;
        poller.remove(5);
    }
}

TEST_F(SelectWait, RemoveAllLeavesWhatTheWaitFound) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    Armed armed;
    poller._waitForEvents(10);
    poller.removeAll();
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.setReportedEvents();
    EXPECT_EQ(poller.reportedEvent(0), KELPoll::evMaskRead);
}

TEST_F(SelectWait, RemovingAnUnregisteredDescriptorLeavesWhatTheWaitFound) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    Armed armed;
    poller._waitForEvents(10);
    poller.removeAll();
    poller.remove(5);
    poller.add(5, KELPoll::evMaskRead, nullptr);
    poller.setReportedEvents();
    EXPECT_EQ(poller.reportedEvent(0), KELPoll::evMaskRead);
}

TEST_F(SelectWait, WhatAnEarlierWaitFoundDoesNotReachTheNext) {
    poller.add(5, KELPoll::evMaskRead, nullptr);
    ready_read = {5};
    {
        Armed armed;
        poller._waitForEvents(10);
    }
    poller.removeAll();
    poller.add(6, KELPoll::evMaskRead, nullptr);
    wait();
    EXPECT_EQ(sets, "6|null|null");
}

TEST_F(SelectWait, DescriptorsThatDoNotFitIntoASetAreNotWatched) {
    for (const int fd : {1024, 5000, -1, INT_MAX, INT_MIN}) poller.add(fd, KELPoll::evMaskRead, nullptr);
    poller.add(1023, KELPoll::evMaskWrite, nullptr);
    ready_write = {1023};
    EXPECT_EQ(wait(), 1);
    EXPECT_EQ(sets, "null|1023|null");
    EXPECT_THAT(nfds, ElementsAre(1024));
    EXPECT_EQ(poller.reportedEvent(0), 0);
    EXPECT_EQ(poller.reportedEvent(5), KELPoll::evMaskWrite);
}

TEST_F(SelectWait, DescriptorsThatDoNotFitIntoASetCanBeRemoved) {
    for (const int fd : {1024, INT_MAX, -1}) poller.add(fd, KELPoll::evMaskRead, nullptr);
    for (const int fd : {1024, INT_MAX, -1}) poller.remove(fd);
    EXPECT_THAT(descriptors(poller), IsEmpty());
}

TEST(SelectWaitReal, MinusFiveMillisecondsIsInvalid) {
    Channel channel;
    const auto poller = make(1, KELPoll::API_SELECT);
    poller->add(channel.reader(), KELPoll::evMaskRead, nullptr);
    errno = 0;
    EXPECT_EQ(poller->waitForEvents(-5), -1);
    EXPECT_EQ(errno, EINVAL);
}

TEST(SelectWaitReal, MinusOneMillisecondWaitsWithoutLimit) {
    Channel channel;
    channel.fill();
    const auto poller = make(1, KELPoll::API_SELECT);
    poller->add(channel.reader(), KELPoll::evMaskRead, nullptr);
    EXPECT_EQ(poller->waitForEvents(-1), 1);
}

TEST(SelectWaitReal, AWritableEntryForReadAndWriteIsNotReported) {
    Channel channel;
    const auto poller = make(1, KELPoll::API_SELECT);
    poller->add(channel.writer(), read_and_write, nullptr);
    EXPECT_EQ(poller->waitForEvents(0), 0);
    EXPECT_EQ(poller->reportedEvent(0), 0);
}
