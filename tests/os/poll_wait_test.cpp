// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <kel/os/poll.h>

#include <climits>
#include <new>
#include <vector>

#include "tests/os/poll_forms.h"
#include "tests/support/fault.h"

using namespace kel::test;
using ::testing::ElementsAre;

namespace {

class ArrayOfPoll : public KELImplPoll {
public:
    using KELPoll::_entries;
    explicit ArrayOfPoll(int capacity) : KELPoll(capacity), KELImplPoll(capacity) {}
};

class PollWait : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        seams::poll.script([this](pollfd* entries, nfds_t n, int ms) {
            given.assign(entries, entries + n);
            array = entries;
            limits.push_back(ms);
            for (nfds_t i = 0; i < n; ++i) entries[i].revents = POLLHUP;
            return static_cast<int>(n);
        });
        poller.add(7, KELPoll::evMaskRead, nullptr);
        poller.add(9, read_and_write, nullptr);
    }

    ArrayOfPoll poller{4};
    std::vector<pollfd> given;
    const pollfd* array = nullptr;
    std::vector<int> limits;
};

}  // namespace

TEST_F(PollWait, PassesItsOwnEntries) {
    for (const Form& form : wait_forms) {
        Armed armed;
        EXPECT_EQ(form.wait(poller, 10), 2) << form.name;
        EXPECT_EQ(array, poller._entries.items);
        ASSERT_EQ(given.size(), 2u);
        EXPECT_EQ(given[0].fd, 7);
        EXPECT_EQ(given[0].events, KELPoll::evMaskRead);
        EXPECT_EQ(given[1].fd, 9);
        EXPECT_EQ(given[1].events, read_and_write);
    }
    EXPECT_EQ(seams::poll.calls(), 6);
}

TEST_F(PollWait, WithoutMemoryForBothArraysKeepsTheOldOnes) {
    ArrayOfPoll small(1);
    small.add(3, KELPoll::evMaskRead, nullptr);
    const pollfd* const old = small._entries.items;
    AllocationPlan::fail(2);
    Armed armed;
    EXPECT_THROW(small.add(4, KELPoll::evMaskRead, nullptr), std::bad_alloc);
    EXPECT_EQ(small._entries.items, old);
    EXPECT_EQ(small._entries.capacity, 1);
}

TEST_F(PollWait, PassesNoEntriesWhenThereAreNone) {
    poller.removeAll();
    Armed armed;
    EXPECT_EQ(poller.waitForEvents(10), 0);
    EXPECT_THAT(limits, ElementsAre(10));
    EXPECT_TRUE(given.empty());
}

TEST_F(PollWait, ReportsWhatTheSystemWroteInEveryForm) {
    for (const Form& form : wait_forms) {
        poller._entries.items[0].revents = 0;
        Armed armed;
        form.wait(poller, 10);
        EXPECT_EQ(poller.reportedEvent(0), POLLHUP) << form.name;
    }
}

TEST_F(PollWait, PassesTheMillisecondsOfEveryForm) {
    Armed armed;
    for (const Form& form : wait_forms) form.wait(poller, 1500);
    EXPECT_THAT(limits, ElementsAre(1500, 1500, 1500, 1500, 1500, 1500));
}

TEST_F(PollWait, WithoutLimitPassesMinusOneInEveryForm) {
    Armed armed;
    for (const Form& form : wait_forms) form.wait(poller, -1);
    EXPECT_THAT(limits, ElementsAre(-1, -1, -1, -1, -1, -1));
}

TEST_F(PollWait, PassesNegativeMillisecondsAsTheyAre) {
    Armed armed;
    poller.waitForEvents(-5);
    poller._waitForEvents(INT_MIN);
    EXPECT_THAT(limits, ElementsAre(-5, INT_MIN));
}

TEST_F(PollWait, DropsTheMicrosecondsBelowAMillisecond) {
    timeval tv = {1, 2999};
    Armed armed;
    poller.waitForEvents(&tv);
    EXPECT_THAT(limits, ElementsAre(1002));
}

TEST(PollWaitReal, MinusFiveMillisecondsWaitsWithoutLimit) {
    Channel channel;
    channel.fill();
    const auto poller = make(1, KELPoll::API_POLL);
    poller->add(channel.reader(), KELPoll::evMaskRead, nullptr);
    EXPECT_EQ(poller->waitForEvents(-5), 1);
}

TEST(PollWaitReal, AnEntryForReadAndWriteReportsWhatIsReady) {
    Channel channel;
    const auto poller = make(1, KELPoll::API_POLL);
    poller->add(channel.writer(), read_and_write, nullptr);
    EXPECT_EQ(poller->waitForEvents(0), 1);
    EXPECT_EQ(poller->reportedEvent(0), KELPoll::evMaskWrite);
}
