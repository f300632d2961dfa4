// SPDX-License-Identifier: MIT
// How many slots a dictionary has, and when it gets more.
#include <kel/containers/dictionary.h>
#include <kel/core/unique_id.h>

#include <climits>
#include <new>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

typedef KELDictionary<TestKey, int> Table;
typedef KELDictionary<KELUniqueId, int> IntegerTable;

void fill(IntegerTable& table, unsigned long entries) {
    for (unsigned long i = 0; i < entries; ++i) table.add(KELUniqueId(i), static_cast<int>(i));
}

class DictionaryCapacity : public FaultTest {};

TEST_F(DictionaryCapacity, CapacityRuleDoublesThePowerOfTwoThatHolds) {
    const struct {
        unsigned long n;
        unsigned long capacity;
    } rows[] = {{0, 1},
                {1, 2},
                {2, 4},
                {3, 8},
                {4, 8},
                {5, 16},
                {15, 32},
                {16, 32},
                {17, 64},
                {20, 64},
                {64, 128},
                {65, 256},
                {0x20000000, 0x40000000}};
    for (const auto& row : rows) EXPECT_EQ(Table().setCapacity(row.n), row.capacity) << row.n;
}

TEST_F(DictionaryCapacity, SetCapacitySetsBitsAndMaskAndForgetsTheCount) {
    IntegerTable table;
    table.setCapacity(1);
    EXPECT_EQ(mirror_of(table).bits, 1u);
    EXPECT_EQ(mirror_of(table).mask, 1u);

    IntegerTable used;
    used.add(KELUniqueId(0), 0);
    EXPECT_EQ(used.setCapacity(16), 32u);
    EXPECT_EQ(used.count(), 0u);
    used._removeAtIndex(0, 0);  // gives the record back, so that nothing is lost
    used.setCapacity(16);
}

TEST_F(DictionaryCapacity, ATableThatForgotItsCountEndsWithItsSlots) {
    IntegerTable table;
    table.add(KELUniqueId(1), 1);
    table.setCapacity(16);
    table.removeKey(KELUniqueId(1));
    EXPECT_EQ(table.count(), 0xffffffffu);
}

TEST_F(DictionaryCapacity, CapacityBeyondTheSlotNumbersIsRefused) {
    IntegerTable table;
    EXPECT_THROW(table.setCapacity(0x40000001ul), std::bad_alloc);
    EXPECT_THROW(table.setCapacity(0x80000000ul), std::bad_alloc);
    EXPECT_THROW(table.setCapacity(ULONG_MAX), std::bad_alloc);
    EXPECT_THROW(table.reSize(ULONG_MAX), std::bad_alloc);
    EXPECT_THROW(IntegerTable(ULONG_MAX), std::bad_alloc);
    EXPECT_EQ(mirror_of(table).bits, 5u);
    EXPECT_EQ(mirror_of(table).mask, 31u);
}

#if defined(__i386__)  // with wider addresses there may be so much memory
TEST_F(DictionaryCapacity, SlotsBeyondTheAddressesOfTheMachineAreRefused) {
    EXPECT_THROW(IntegerTable(0x40000000ul), std::bad_alloc);
}
#endif

TEST_F(DictionaryCapacity, ResizeToSixteenGivesThirtyTwoSlots) {
    IntegerTable table;
    table.reSize(16);
    EXPECT_EQ(table.capacity(), 32u);
}

TEST_F(DictionaryCapacity, ResizeToZeroGivesThirtyTwoSlots) {
    IntegerTable table(64);
    table.reSize(0);
    EXPECT_EQ(table.capacity(), 32u);
}

TEST_F(DictionaryCapacity, ResizeSetsCapacityBitsAndMask) {
    IntegerTable table;
    table.reSize(100);
    EXPECT_EQ(mirror_of(table).capacity, 256u);
    EXPECT_EQ(mirror_of(table).bits, 8u);
    EXPECT_EQ(mirror_of(table).mask, 255u);
}

TEST_F(DictionaryCapacity, ResizeAlwaysTakesANewArray) {
    IntegerTable table;
    Armed armed;
    table.reSize(1);
    EXPECT_EQ(AllocationPlan::calls(), 1);
    table.reSize(1);
    EXPECT_EQ(AllocationPlan::calls(), 2);
}

TEST_F(DictionaryCapacity, ResizeFreesThePreviousArrayOfTheHeap) {
    const long before = AllocationPlan::live_blocks();
    IntegerTable table;
    table.reSize(32);
    table.reSize(64);
    table.reSize(16);
    EXPECT_EQ(AllocationPlan::live_blocks(), before + 1);
}

TEST_F(DictionaryCapacity, ResizeKeepsEveryEntryAndTheCount) {
    IntegerTable table;
    fill(table, 20);
    table.reSize(200);
    EXPECT_EQ(table.count(), 20u);
    for (unsigned long i = 0; i < 20; ++i) EXPECT_EQ(table.atKey(KELUniqueId(i)), static_cast<int>(i));
}

TEST_F(DictionaryCapacity, ResizeReinsertsInAscendingOrderOfTheOldSlots) {
    Table table;
    table.add(TestKey{0, 1}, 0);  // slot 0
    table.add(TestKey{0, 2}, 0);  // slot 31
    table.add(TestKey{0, 3}, 0);  // slot 30
    table.reSize(16);
    EXPECT_EQ(table.findIndexOf(TestKey{0, 1}), 0u);
    EXPECT_EQ(table.findIndexOf(TestKey{0, 3}), 31u);
    EXPECT_EQ(table.findIndexOf(TestKey{0, 2}), 30u);
}

TEST_F(DictionaryCapacity, ResizeLeavesTheLastIndexAlone) {
    IntegerTable table;
    table.add(KELUniqueId(1), 10);
    table.reSize(64);
    EXPECT_EQ(mirror_of(table).last_index, 19u);
}

TEST_F(DictionaryCapacity, LastIndexBeyondASmallerTableIsNotUsed) {
    IntegerTable table;
    table.add(KELUniqueId(1), 10);
    table.reSize(1);
    ASSERT_EQ(table.capacity(), 2u);
    EXPECT_EQ(table.atKey(KELUniqueId(1)), 10);
    EXPECT_EQ(mirror_of(table).last_index, 1u);
    table.reSize(16);
    table.atKey(KELUniqueId(1));
    table.reSize(1);
    EXPECT_EQ(table.removeKeyIfExists(KELUniqueId(1)), 1);
}

// So far that whoever looks there finds no memory.
TEST_F(DictionaryCapacity, LastIndexFarBeyondASmallerTableIsNotUsed) {
    const unsigned bits = 22;
    const TestKey key = {hash_for_home((1u << bits) - 1, bits), 1};
    KELDictionary<TestKey, int> table;
    table.reSize(1ul << (bits - 1));
    table.add(key, 10);
    ASSERT_EQ(mirror_of(table).last_index, (1u << bits) - 1);
    table.reSize(1);
    EXPECT_EQ(table.atKey(key), 10);
}

TEST_F(DictionaryCapacity, ResizeBelowTheCountIsRaisedUntilOneSlotStaysEmpty) {
    IntegerTable table;
    fill(table, 4);
    table.reSize(1);
    EXPECT_EQ(table.capacity(), 8u);
    EXPECT_EQ(table.count(), 4u);
    EXPECT_EQ(table.removeKeyIfExists(KELUniqueId(99)), 0);
}

TEST_F(DictionaryCapacity, ResizeThatLeavesOneSlotEmptyIsNotRaised) {
    IntegerTable table;
    fill(table, 7);
    table.reSize(4);
    EXPECT_EQ(table.capacity(), 8u);
    table.add(KELUniqueId(7), 7);
    EXPECT_EQ(table.capacity(), 32u);
    for (unsigned long i = 0; i < 8; ++i) EXPECT_EQ(table.atKey(KELUniqueId(i)), static_cast<int>(i));
}

// Growth

TEST_F(DictionaryCapacity, TwentyEighthEntryDoesNotGrowTheInlineTable) {
    IntegerTable table;
    fill(table, 28);
    EXPECT_EQ(table.capacity(), 32u);
}

TEST_F(DictionaryCapacity, TwentyNinthEntryGrowsTheInlineTableTo128Slots) {
    IntegerTable table;
    fill(table, 29);
    EXPECT_EQ(table.capacity(), 128u);
    EXPECT_EQ(table.count(), 29u);
    for (unsigned long i = 0; i < 29; ++i) EXPECT_EQ(table.atKey(KELUniqueId(i)), static_cast<int>(i));
}

TEST_F(DictionaryCapacity, GrowthQuadruplesAndStartsWhenFourSlotsAreLeft) {
    IntegerTable table;
    fill(table, 124);
    EXPECT_EQ(table.capacity(), 128u);
    table.add(KELUniqueId(124), 124);
    EXPECT_EQ(table.capacity(), 512u);
}

TEST_F(DictionaryCapacity, GrowthKeepsTheLastIndexOfTheOldSlots) {
    IntegerTable table;
    fill(table, 28);
    const std::uint32_t slot = table.findIndexOf(KELUniqueId(28));
    table.add(KELUniqueId(28), 28);
    EXPECT_EQ(mirror_of(table).last_index, slot);
    EXPECT_EQ(table.atKey(KELUniqueId(28)), 28);
}

TEST_F(DictionaryCapacity, GrowthIsNotUndoneByRemovals) {
    IntegerTable table;
    fill(table, 29);
    table.removeAll();
    EXPECT_EQ(table.capacity(), 128u);
}

}  // namespace
}  // namespace test
}  // namespace kel
