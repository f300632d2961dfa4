// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <kel/os/poll.h>
#include <unistd.h>

#include <climits>
#include <memory>
#include <new>
#include <type_traits>

#include "tests/os/poll_forms.h"
#include "tests/support/fault.h"

using namespace kel::test;
using ::testing::ElementsAre;
using TimeVal = KELPoll::TimeVal;

// --- The class -------------------------------------------------------------------------------------

TEST(PollerClass, TheMasksAreThoseOfTheSystemsPoll) {
    EXPECT_EQ(KELPoll::evMaskRead, 0x0040);
    EXPECT_EQ(KELPoll::evMaskWrite, 0x0100);
    EXPECT_EQ(KELPoll::evMaskError, 0x0008);
}

TEST(PollerClass, TheMasksHaveAnAddress) {
    const short* masks[] = {&KELPoll::evMaskRead, &KELPoll::evMaskWrite, &KELPoll::evMaskError};
    EXPECT_EQ(*masks[0] + *masks[1] + *masks[2], 0x0148);
}

TEST(PollerClass, TheApisAreNumberedOneAndTwo) {
    EXPECT_EQ(KELPoll::API_SELECT, 1);
    EXPECT_EQ(KELPoll::API_POLL, 2);
}

TEST(PollerClass, TheDefaultIsPoll) { EXPECT_EQ(KELPoll::_defaultAPI, KELPoll::API_POLL); }

TEST(PollerClass, TheDefaultCanBeChanged) {
    KELPoll::defaultAPI(KELPoll::API_SELECT);
    EXPECT_EQ(KELPoll::_defaultAPI, KELPoll::API_SELECT);
    KELPoll::defaultAPI(KELPoll::API_POLL);
    EXPECT_EQ(KELPoll::_defaultAPI, KELPoll::API_POLL);
}

TEST(PollerClass, CreateGivesTheImplementationAskedFor) {
    EXPECT_NE(dynamic_cast<KELImplSelect*>(make(1, KELPoll::API_SELECT).get()), nullptr);
    EXPECT_NE(dynamic_cast<KELImplPoll*>(make(1, KELPoll::API_POLL).get()), nullptr);
}

TEST(PollerClass, CreateGivesPollForAnyOtherNumber) {
    EXPECT_NE(dynamic_cast<KELImplPoll*>(make(1, static_cast<KELPoll::SupportedAPIs>(7)).get()), nullptr);
    EXPECT_NE(dynamic_cast<KELImplPoll*>(make(1, static_cast<KELPoll::SupportedAPIs>(0)).get()), nullptr);
}

TEST(PollerClass, CreateIgnoresTheDefault) {
    KELPoll::defaultAPI(KELPoll::API_SELECT);
    EXPECT_NE(dynamic_cast<KELImplPoll*>(make(1, KELPoll::API_POLL).get()), nullptr);
    KELPoll::defaultAPI(KELPoll::API_POLL);
}

TEST(PollerClass, IsAbstractAndNeverCopied) {
    EXPECT_TRUE(std::is_abstract<KELPoll>::value);
    EXPECT_FALSE(std::is_copy_constructible<KELImplPoll>::value);
    EXPECT_FALSE(std::is_copy_constructible<KELImplSelect>::value);
    EXPECT_FALSE(std::is_copy_constructible<TimeVal>::value);
    EXPECT_FALSE(std::is_copy_assignable<TimeVal>::value);
}

TEST(PollerClass, BothImplementationsMeetInOneBase) {
    // The base is virtual: an object that is both has one list.
    struct Both : KELImplPoll, KELImplSelect {
        Both() : KELPoll(1), KELImplPoll(1), KELImplSelect(1) {}
        int _waitForEvents(timeval*) override { return 0; }
        int waitForEvents(timeval*) override { return 0; }
        int _waitForEvents(int) override { return 0; }
        int waitForEvents(int) override { return 0; }
        int _waitForEvents(const TimeVal&) override { return 0; }
        int waitForEvents(const TimeVal&) override { return 0; }
    } both;
    both.add(3, KELPoll::evMaskRead, nullptr);
    EXPECT_EQ(static_cast<KELImplPoll&>(both).count(), 1);
}

TEST(PollerClass, MillisecondsOfNullIsMinusOne) { EXPECT_EQ(KELPoll::milliseconds(nullptr), -1); }

TEST(PollerClass, MillisecondsDropsMicrosecondsBelowOne) {
    timeval tv = {2, 1999};
    EXPECT_EQ(KELPoll::milliseconds(&tv), 2001);
}

TEST(PollerClass, MillisecondsWrapAtThirtyTwoBits) {
    timeval tv = {3000000, 0};
    EXPECT_EQ(KELPoll::milliseconds(&tv), static_cast<int>(3000000000u));
}

// --- TimeVal ---------------------------------------------------------------------------------------

TEST(PollerTimeVal, ANewOneWaitsNoTime) {
    const TimeVal time;
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_sec, 0);
    EXPECT_EQ(time._tv.tv_usec, 0);
    EXPECT_EQ(time._ms, 0);
}

TEST(PollerTimeVal, ItsFieldsFollowEachOther) {
    EXPECT_EQ(offsetof(TimeVal, _ptr), 0u);
    EXPECT_EQ(offsetof(TimeVal, _tv), sizeof(void*));
    EXPECT_EQ(offsetof(TimeVal, _ms), sizeof(void*) + sizeof(timeval));
}

TEST(PollerTimeVal, SetToNullWaitsWithoutLimit) {
    TimeVal time;
    time.set(nullptr);
    EXPECT_EQ(time._ptr, nullptr);
    EXPECT_EQ(time._ms, -1);
}

TEST(PollerTimeVal, SetToATimevalCopiesIt) {
    TimeVal time;
    const timeval tv = {1, 500999};
    time.set(&tv);
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_sec, 1);
    EXPECT_EQ(time._tv.tv_usec, 500999);
    EXPECT_EQ(time._ms, 1500);
}

TEST(PollerTimeVal, SetToATimevalAfterNullPointsToItselfAgain) {
    TimeVal time;
    const timeval tv = {1, 0};
    time.set(nullptr);
    time.set(&tv);
    EXPECT_EQ(time._ptr, &time._tv);
}

TEST(PollerTimeVal, SetToMillisecondsSplitsThem) {
    TimeVal time;
    time.set(1500);
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_sec, 1);
    EXPECT_EQ(time._tv.tv_usec, 500000);
    EXPECT_EQ(time._ms, 1500);
}

TEST(PollerTimeVal, SetToZeroMillisecondsWaitsNoTime) {
    TimeVal time;
    time.set(nullptr);
    time.set(0);
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._ms, 0);
}

TEST(PollerTimeVal, SetToNegativeMillisecondsWaitsWithoutLimit) {
    TimeVal time;
    time.set(1500);
    time.set(-5);
    EXPECT_EQ(time._ptr, nullptr);
    EXPECT_EQ(time._tv.tv_sec, 0);
    EXPECT_EQ(time._tv.tv_usec, 0);
    EXPECT_EQ(time._ms, -5);
}

TEST(PollerTimeVal, SetToSecondsAndMicroseconds) {
    TimeVal time;
    time.set(nullptr);
    time.set(2, 250999);
    EXPECT_EQ(time._ptr, &time._tv);
    EXPECT_EQ(time._tv.tv_sec, 2);
    EXPECT_EQ(time._tv.tv_usec, 250999);
    EXPECT_EQ(time._ms, 2250);
}

TEST(PollerTimeVal, MillisecondsWrapAtThirtyTwoBits) {
    TimeVal time;
    time.set(3000000, 0);
    EXPECT_EQ(time._ms, static_cast<int>(3000000000u));
}

// --- Both implementations --------------------------------------------------------------------------

namespace {

class Poller : public ::testing::TestWithParam<KELPoll::SupportedAPIs> {
protected:
    void SetUp() override { reset_faults(); }
    void TearDown() override { reset_faults(); }

    // How many allocations `body` makes.
    template <class Body>
    static long allocations(Body body) {
        const long before = AllocationPlan::calls();
        Armed armed;
        body();
        return AllocationPlan::calls() - before;
    }

    int user[8] = {};
};

}  // namespace

INSTANTIATE_TEST_SUITE_P(Both, Poller, ::testing::Values(KELPoll::API_POLL, KELPoll::API_SELECT),
                         [](const auto& api) { return api.param == KELPoll::API_POLL ? "Poll" : "Select"; });

TEST_P(Poller, StartsEmpty) {
    const auto poller = make(4, GetParam());
    EXPECT_EQ(poller->count(), 0);
    EXPECT_FALSE(poller->fdIsSet(0));
}

TEST_P(Poller, AddAppendsTheEntryAndItsUserPointer) {
    const auto poller = make(4, GetParam());
    poller->add(7, KELPoll::evMaskRead, &user[0]);
    poller->add(5, read_and_write, &user[1]);
    EXPECT_THAT(descriptors(*poller), ElementsAre(7, 5));
    EXPECT_EQ(poller->requestedEvent(1), read_and_write);
    EXPECT_EQ(poller->reportedEvent(1), 0);
    EXPECT_EQ(poller->userData(1), &user[1]);
}

TEST_P(Poller, TheSameDescriptorCanBeAddedTwice) {
    const auto poller = make(4, GetParam());
    poller->add(7, KELPoll::evMaskRead, &user[0]);
    poller->add(7, KELPoll::evMaskWrite, &user[1]);
    EXPECT_THAT(descriptors(*poller), ElementsAre(7, 7));
}

TEST_P(Poller, RemoveMovesTheLastEntryIntoTheGap) {
    const auto poller = make(4, GetParam());
    for (int fd = 0; fd < 4; ++fd) poller->add(fd, KELPoll::evMaskRead, &user[fd]);
    poller->remove(1);
    EXPECT_THAT(descriptors(*poller), ElementsAre(0, 3, 2));
    EXPECT_EQ(poller->userData(1), &user[3]);
}

TEST_P(Poller, RemoveOfTheLastEntryKeepsTheOthers) {
    const auto poller = make(4, GetParam());
    for (int fd = 0; fd < 3; ++fd) poller->add(fd, KELPoll::evMaskRead, &user[fd]);
    poller->remove(2);
    EXPECT_THAT(descriptors(*poller), ElementsAre(0, 1));
}

TEST_P(Poller, RemoveOfTheOnlyEntryEmptiesTheList) {
    const auto poller = make(4, GetParam());
    poller->add(3, KELPoll::evMaskRead, nullptr);
    poller->remove(3);
    EXPECT_EQ(poller->count(), 0);
}

TEST_P(Poller, RemoveDropsEveryEntryOfTheDescriptor) {
    const auto poller = make(8, GetParam());
    for (const int fd : {7, 1, 7, 2, 7, 7}) poller->add(fd, KELPoll::evMaskRead, nullptr);
    poller->remove(7);
    EXPECT_THAT(descriptors(*poller), ::testing::UnorderedElementsAre(1, 2));
}

TEST_P(Poller, RemoveOfAnUnknownDescriptorKeepsTheList) {
    const auto poller = make(4, GetParam());
    poller->add(3, KELPoll::evMaskRead, nullptr);
    poller->remove(9);
    EXPECT_THAT(descriptors(*poller), ElementsAre(3));
}

TEST_P(Poller, RemoveAllEmptiesTheListAndKeepsTheMemory) {
    const auto poller = make(1, GetParam());
    for (int fd = 0; fd < 4; ++fd) poller->add(fd, KELPoll::evMaskRead, nullptr);
    poller->removeAll();
    EXPECT_EQ(poller->count(), 0);
    EXPECT_EQ(allocations([&] {
                  for (int fd = 0; fd < 4; ++fd) poller->add(fd, KELPoll::evMaskRead, nullptr);
              }),
              0);
}

TEST_P(Poller, FdIsSetFindsEveryRegisteredDescriptor) {
    const auto poller = make(4, GetParam());
    for (const int fd : {3, 9, 4}) poller->add(fd, KELPoll::evMaskRead, nullptr);
    for (const int fd : {3, 9, 4}) EXPECT_TRUE(poller->fdIsSet(fd));
    EXPECT_FALSE(poller->fdIsSet(5));
    poller->remove(9);
    EXPECT_FALSE(poller->fdIsSet(9));
}

TEST_P(Poller, AnIndexOutsideOfTheListGivesNothing) {
    const auto poller = make(4, GetParam());
    poller->add(3, KELPoll::evMaskRead, &user[0]);
    for (const int index : {-1, 1, INT_MIN, INT_MAX}) {
        EXPECT_EQ(poller->requestedEvent(index), 0);
        EXPECT_EQ(poller->reportedEvent(index), 0);
        EXPECT_EQ(poller->descriptor(index), -1);
        EXPECT_EQ(poller->userData(index), nullptr);
    }
}

TEST_P(Poller, AFullPollerDoublesBothArrays) {
    const auto poller = make(2, GetParam());
    const auto add = [&](int fd) {
        return allocations([&] { poller->add(fd, KELPoll::evMaskRead, &user[fd]); });
    };
    EXPECT_EQ(add(0), 0);
    EXPECT_EQ(add(1), 0);
    EXPECT_EQ(add(2), 2);  // 4 slots
    EXPECT_EQ(add(3), 0);
    EXPECT_EQ(add(4), 2);  // 8 slots
    EXPECT_THAT(descriptors(*poller), ElementsAre(0, 1, 2, 3, 4));
    for (int i = 0; i < 5; ++i) EXPECT_EQ(poller->userData(i), &user[i]);
}

TEST_P(Poller, ACapacityBelowOneCountsAsOne) {
    for (const int capacity : {0, -1, INT_MIN}) {
        const auto poller = make(capacity, GetParam());
        for (int fd = 0; fd < 3; ++fd) poller->add(fd, KELPoll::evMaskRead, &user[fd]);
        EXPECT_THAT(descriptors(*poller), ElementsAre(0, 1, 2));
    }
}

TEST_P(Poller, WithoutMemoryAddLeavesThePollerAsItWas) {
    for (const long nth : {1, 2}) {
        const auto poller = make(1, GetParam());
        poller->add(3, KELPoll::evMaskRead, &user[0]);
        reset_faults();
        AllocationPlan::fail(nth);
        {
            Armed armed;
            EXPECT_THROW(poller->add(4, KELPoll::evMaskWrite, &user[1]), std::bad_alloc);
        }
        EXPECT_THAT(descriptors(*poller), ElementsAre(3));
        EXPECT_EQ(poller->userData(0), &user[0]);
        poller->add(5, KELPoll::evMaskWrite, &user[2]);
        EXPECT_THAT(descriptors(*poller), ElementsAre(3, 5));
        EXPECT_EQ(poller->userData(1), &user[2]);
    }
}

TEST(PollerClass, APollerThatCannotDoubleThrowsBadAlloc) {
    struct Full : KELImplPoll {
        Full() : KELPoll(1), KELImplPoll(1) {}
        void pretend(int slots) { _entries.count = _entries.capacity = slots; }
    } poller;
    poller.pretend(INT_MAX / 2 + 1);
    EXPECT_THROW(poller.add(3, KELPoll::evMaskRead, nullptr), std::bad_alloc);
    EXPECT_EQ(poller.count(), INT_MAX / 2 + 1);
    poller.pretend(1);
}

TEST_P(Poller, WithoutMemoryCreateLeavesNothingBehind) {
    for (const long nth : {1, 2, 3}) {
        const long before = AllocationPlan::live_blocks();
        reset_faults();
        AllocationPlan::fail(nth);
        {
            Armed armed;
            EXPECT_THROW(KELPoll::create(4, GetParam()), std::bad_alloc);
        }
        EXPECT_EQ(AllocationPlan::live_blocks(), before);
    }
}

TEST_P(Poller, DestructionThroughTheBaseFreesEverything) {
    const long before = AllocationPlan::live_blocks();
    auto poller = make(1, GetParam());
    for (int fd = 0; fd < 4; ++fd) poller->add(fd, KELPoll::evMaskRead, nullptr);
    poller.reset();
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_P(Poller, EveryWaitCountsTheReadyDescriptors) {
    Channel full;
    Channel empty;
    full.fill();
    for (const Form& form : wait_forms) {
        const auto poller = make(3, GetParam());
        poller->add(full.reader(), KELPoll::evMaskRead, nullptr);
        poller->add(empty.reader(), KELPoll::evMaskRead, nullptr);
        poller->add(empty.writer(), KELPoll::evMaskWrite, nullptr);
        EXPECT_EQ(form.wait(*poller, -1), 2) << form.name;
    }
}

TEST_P(Poller, EveryWaitEndsWithZeroWhenTheTimeIsOver) {
    Channel empty;
    const auto poller = make(1, GetParam());
    poller->add(empty.reader(), KELPoll::evMaskRead, nullptr);
    for (const Form& form : wait_forms) EXPECT_EQ(form.wait(*poller, 0), 0) << form.name;
}

TEST_P(Poller, WaitForEventsReportsTheReadyEntries) {
    Channel full;
    Channel empty;
    full.fill();
    for (const Form& form : wait_forms) {
        if (!form.reports) continue;
        const auto poller = make(2, GetParam());
        poller->add(empty.reader(), KELPoll::evMaskRead, nullptr);
        poller->add(full.reader(), KELPoll::evMaskRead, nullptr);
        form.wait(*poller, 0);
        EXPECT_EQ(poller->reportedEvent(0), 0) << form.name;
        EXPECT_EQ(poller->reportedEvent(1), KELPoll::evMaskRead) << form.name;
    }
}

TEST_P(Poller, ANewWaitForgetsWhatTheLastReported) {
    Channel channel;
    channel.fill();
    const auto poller = make(1, GetParam());
    poller->add(channel.reader(), KELPoll::evMaskRead, nullptr);
    poller->waitForEvents(0);
    char c;
    EXPECT_EQ(read(channel.reader(), &c, 1), 1);
    poller->waitForEvents(0);
    EXPECT_EQ(poller->reportedEvent(0), 0);
}

TEST_P(Poller, AnInterruptedWaitIsNotRepeated) {
    seams::poll.fail(1, EINTR, true);
    seams::select.fail(1, EINTR, true);
    const auto poller = make(1, GetParam());
    poller->add(3, KELPoll::evMaskRead, nullptr);
    for (const Form& form : wait_forms) {
        int result;
        int error;
        {
            Armed armed;
            errno = 0;
            result = form.wait(*poller, 5);
            error = errno;
        }
        EXPECT_EQ(result, -1) << form.name;
        EXPECT_EQ(error, EINTR) << form.name;
    }
    EXPECT_EQ(seams::poll.calls() + seams::select.calls(), 6);
}
