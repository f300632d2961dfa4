// Capacities and slots of the two dictionaries.
// SPDX-License-Identifier: MIT
#include <kel/containers/dictionary.h>

#include "tests/faults/bounds/bounds.h"

using kel::test::refused;

namespace {

const char header[] = "kel/containers/dictionary.h";

typedef KELDictionary<KELStringWrapper, int> Plain;
typedef KELDictionary_r<KELStringWrapper, int> Locked;

// The capacity is twice the next power of two; one of 2^32 slots and more has no number.
template <class Dictionary>
void construct(std::uint32_t slots) {
    if (slots > 1) {
        EXPECT_TRUE(refused([&] { Dictionary unmade(slots); }));
        return;
    }
    Dictionary table(slots);
    EXPECT_EQ(table.capacity(), slots + 1);
    table.add("one", 1);
    EXPECT_EQ(table.atKey("one"), 1);
}

template <class Dictionary>
void expect_three_entries(Dictionary& table) {
    EXPECT_EQ(table.count(), 3u);
    EXPECT_EQ(table.atKey("one"), 1);
    EXPECT_EQ(table.atKey("two"), 2);
    EXPECT_EQ(table.atKey("three"), 3);
}

template <class Dictionary>
void resize(std::uint32_t slots) {
    Dictionary table;
    table.add("one", 1);
    table.add("two", 2);
    table.add("three", 3);
    if (slots > 1) {
        EXPECT_TRUE(refused([&] { table.reSize(slots); }));
        EXPECT_EQ(table.capacity(), 32u);
    } else {
        table.reSize(slots);
        EXPECT_EQ(table.capacity(), slots == 0 ? 32u : 4u);  // four is the least that has room for three
    }
    expect_three_entries(table);
}

template <class Dictionary>
void set_capacity(std::uint32_t slots) {
    Dictionary table;
    if (slots > 1) {
        table.add("one", 1);
        table.add("two", 2);
        table.add("three", 3);
        EXPECT_TRUE(refused([&] { table.setCapacity(slots); }));
        expect_three_entries(table);
    } else {
        EXPECT_EQ(table.setCapacity(slots), slots + 1);
    }
    EXPECT_EQ(table.capacity(), 32u);
}

// A table of two slots has its one entry in one of them.
template <class Dictionary>
void remove_at(std::uint32_t slot, unsigned long notify) {
    static int told;
    told = 0;
    Dictionary table(1, [](KELStringWrapper, int) { ++told; });
    table.add("one", 1);
    table.reSize(1);
    const bool taken = slot == table.findIndexOf("one");
    table._removeAtIndex(slot, notify);
    EXPECT_EQ(table.count(), taken ? 0u : 1u);
    EXPECT_EQ(told, taken && notify != 0 ? 1 : 0);
}

}  // namespace

AT_BOUNDS(PlainDictionary, HasRoomForItsSlotsOrIsNotMade, header, "slots") { construct<Plain>(n); }
AT_BOUNDS(LockedDictionary, HasRoomForItsSlotsOrIsNotMade, header, "slots") { construct<Locked>(n); }

AT_BOUNDS(PlainDictionary, KeepsItsEntriesInEverySize, header, "n") { resize<Plain>(n); }
AT_BOUNDS(LockedDictionary, KeepsItsEntriesInEverySize, header, "n") { resize<Locked>(n); }

AT_BOUNDS(PlainDictionary, KeepsItsProbingWhenACapacityIsRefused, header, "n") { set_capacity<Plain>(n); }
AT_BOUNDS(LockedDictionary, KeepsItsProbingWhenACapacityIsRefused, header, "n") { set_capacity<Locked>(n); }

AT_BOUNDS(PlainDictionary, RemovesNothingBeyondItsSlots, header, "index") { remove_at<Plain>(n, 1); }
AT_BOUNDS(LockedDictionary, RemovesNothingBeyondItsSlots, header, "index") { remove_at<Locked>(n, 1); }

AT_BOUNDS(PlainDictionary, TellsOfARemovalForEveryNumberButZero, header, "notify") {
    remove_at<Plain>(0, n);
    remove_at<Plain>(1, n);
}
