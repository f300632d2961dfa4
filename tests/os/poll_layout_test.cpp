// The binary interface of the pollers: where their fields are, and which operation has which slot of
// the virtual table.
//
// SPDX-License-Identifier: MIT
#include <kel/os/poll.h>
#include <poll.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <type_traits>

#include "tests/os/poll_forms.h"
#include "tests/support/fault.h"

using namespace kel::test;
using TimeVal = KELPoll::TimeVal;

namespace {

const std::size_t word = sizeof(void*);
const std::size_t list_size = 2 * sizeof(std::int32_t) + word;
const std::size_t poller_size = word + 2 * list_size;

template <class T>
T field(const void* object, std::size_t offset) {
    T value;
    std::memcpy(&value, static_cast<const char*>(object) + offset, sizeof value);
    return value;
}

// The slot of a virtual operation, counted from 1. In this ABI a pointer to a virtual member holds
// one plus the distance of its slot from the start of the table.
template <class Member>
unsigned long slot_of(Member member) {
    std::uintptr_t start;
    static_assert(sizeof(member) >= sizeof start, "a member pointer starts with one word");
    std::memcpy(&start, &member, sizeof start);
    EXPECT_EQ(start & 1, 1u) << "not virtual";
    return (start - 1) / word + 1;
}

// The six waits of a class must have the slots from `first` on.
template <class Poller>
void expect_waits_from(unsigned long first) {
    typedef int (Poller::*ByTimeval)(timeval*);
    typedef int (Poller::*ByNumber)(int);
    typedef int (Poller::*ByPrepared)(const TimeVal&);
    EXPECT_EQ(slot_of<ByTimeval>(&Poller::_waitForEvents), first);
    EXPECT_EQ(slot_of<ByTimeval>(&Poller::waitForEvents), first + 1);
    EXPECT_EQ(slot_of<ByNumber>(&Poller::_waitForEvents), first + 2);
    EXPECT_EQ(slot_of<ByNumber>(&Poller::waitForEvents), first + 3);
    EXPECT_EQ(slot_of<ByPrepared>(&Poller::_waitForEvents), first + 4);
    EXPECT_EQ(slot_of<ByPrepared>(&Poller::waitForEvents), first + 5);
}

}  // namespace

TEST(PollerSlots, TheListComesBeforeTheWaitsAndTheEventsBehind) {
    EXPECT_TRUE(std::has_virtual_destructor<KELPoll>::value);  // slots 1 and 2
    EXPECT_EQ(slot_of(&KELPoll::add), 3u);
    EXPECT_EQ(slot_of(&KELPoll::remove), 4u);
    EXPECT_EQ(slot_of(&KELPoll::removeAll), 5u);
    expect_waits_from<KELPoll>(6);
    EXPECT_EQ(slot_of(&KELPoll::requestedEvent), 12u);
    EXPECT_EQ(slot_of(&KELPoll::reportedEvent), 13u);
}

TEST(PollerSlots, ThePollOneHasItsWaitsBehindTheDestructor) { expect_waits_from<KELImplPoll>(3); }

TEST(PollerSlots, TheSelectOneHasTheListBehindItsWaits) {
    expect_waits_from<KELImplSelect>(3);
    EXPECT_EQ(slot_of(&KELImplSelect::add), 9u);
    EXPECT_EQ(slot_of(&KELImplSelect::removeAll), 10u);
    EXPECT_EQ(slot_of(&KELImplSelect::remove), 11u);
}

TEST(PollerLayout, TheEntriesComeBeforeTheUserPointers) {
    int user = 0;
    const auto poller = make(4, KELPoll::API_POLL);
    poller->add(7, read_and_write, &user);
    const KELPoll* const object = poller.get();
    for (const std::size_t list : {word, word + list_size}) {
        EXPECT_EQ(field<std::int32_t>(object, list), 1);
        EXPECT_EQ(field<std::int32_t>(object, list + sizeof(std::int32_t)), 4);
    }
    const pollfd* const entry = field<const pollfd*>(object, word + list_size - word);
    EXPECT_EQ(entry->fd, 7);
    EXPECT_EQ(entry->events, read_and_write);
    EXPECT_EQ(*field<void**>(object, poller_size - word), &user);
}

TEST(PollerLayout, BothListsDoubleTogether) {
    const auto poller = make(2, KELPoll::API_POLL);
    const KELPoll* const object = poller.get();
    for (int fd = 0; fd < 3; ++fd) poller->add(fd, KELPoll::evMaskRead, nullptr);
    for (const std::size_t list : {word, word + list_size}) {
        EXPECT_EQ(field<std::int32_t>(object, list), 3);
        EXPECT_EQ(field<std::int32_t>(object, list + sizeof(std::int32_t)), 4);
    }
}

TEST(PollerLayout, ThePollOneAddsNoFields) {
    EXPECT_EQ(sizeof(KELPoll), poller_size);
    EXPECT_EQ(sizeof(KELImplPoll), word + poller_size);
}

TEST(PollerLayout, TheSelectOneAddsThreeSetsAndTheCountOfDescriptors) {
    EXPECT_EQ(sizeof(KELImplSelect), word + 3 * sizeof(fd_set) + word + poller_size);
    reset_faults();
    seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval*) { return 0; });
    KELImplSelect poller(3);
    EXPECT_EQ(field<std::int32_t>(&poller, word + 3 * sizeof(fd_set)), 0);
    poller.add(3, KELPoll::evMaskRead, nullptr);
    poller.add(4, KELPoll::evMaskWrite, nullptr);
    poller.add(5, KELPoll::evMaskError, nullptr);
    {
        Armed armed;
        poller.waitForEvents(0);
    }
    for (int set = 0; set < 3; ++set) {
        const auto bits = field<fd_set>(&poller, word + static_cast<std::size_t>(set) * sizeof(fd_set));
        for (int fd = 0; fd < FD_SETSIZE; ++fd) EXPECT_EQ(FD_ISSET(fd, &bits) != 0, fd == 3 + set) << fd;
    }
    EXPECT_EQ(field<std::int32_t>(&poller, word + 3 * sizeof(fd_set)), 6);
    reset_faults();
}
