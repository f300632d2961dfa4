// SPDX-License-Identifier: MIT
// How an iterator walks through the slots of a dictionary.
#include <gtest/gtest.h>
#include <kel/containers/dictionary.h>
#include <kel/core/unique_id.h>

#include <vector>

#include "tests/containers/mirrors.h"

namespace kel {
namespace test {
namespace {

typedef KELDictionary<TestKey, int> Table;
typedef KELDictionary<KELUniqueId, int> IntegerTable;

// A key whose home in the 32-slot table is `slot`.
TestKey key_at(std::uint32_t slot, int id) { return TestKey{hash_for_home(slot, 5), id}; }

void fill(IntegerTable& table, unsigned long entries) {
    for (unsigned long i = 0; i < entries; ++i) table.add(KELUniqueId(i), static_cast<int>(i));
}

template <class Dict>
std::vector<int> values_of(Dict& dictionary) {
    std::vector<int> values;
    typename Dict::Iterator i(dictionary);
    while (typename Dict::Assoc* entry = ++i) values.push_back(entry->_value);
    return values;
}

TEST(DictionaryIterator, NewIteratorStandsBeforeTheFirstSlot) {
    IntegerTable table;
    fill(table, 3);
    const IntegerTable::Iterator i(table);
    EXPECT_EQ(static_cast<long>(i.index()), -1);
    EXPECT_EQ(i.entry(), nullptr);
}

TEST(DictionaryIterator, IteratorVisitsInSlotOrder) {
    Table table;
    const std::uint32_t slots[] = {31, 4, 0, 17};
    for (int id = 0; id < 4; ++id) table.add(key_at(slots[id], id), static_cast<int>(slots[id]));
    EXPECT_EQ(values_of(table), (std::vector<int>{0, 4, 17, 31}));
}

TEST(DictionaryIterator, IteratorShowsEntryAndSlotItReached) {
    Table table;
    table.add(key_at(4, 7), 70);
    Table::Iterator i(table);
    Table::Assoc* const entry = ++i;
    ASSERT_NE(entry, nullptr);
    EXPECT_EQ(i.entry(), entry);
    EXPECT_EQ(i.index(), 4u);
    EXPECT_EQ(entry->_key.id, 7);
    EXPECT_EQ(entry->_value, 70);
}

TEST(DictionaryIterator, IteratorEndsAtTheLastSlotWithNull) {
    Table table;
    table.add(key_at(4, 7), 70);
    Table::Iterator i(table);
    ++i;
    EXPECT_EQ(++i, nullptr);
    EXPECT_EQ(i.index(), 31u);
    EXPECT_EQ(i.entry(), nullptr);
}

TEST(DictionaryIterator, IteratorStaysInTheLastSlotWithItsRecord) {
    Table table;
    table.add(key_at(31, 7), 70);
    Table::Iterator i(table);
    Table::Assoc* const last = ++i;
    ASSERT_NE(last, nullptr);
    EXPECT_EQ(i.index(), 31u);
    for (int step = 0; step < 3; ++step) {
        EXPECT_EQ(++i, nullptr);
        EXPECT_EQ(i.entry(), last);
        EXPECT_EQ(i.index(), 31u);
    }
}

TEST(DictionaryIterator, IteratorPastTheEndOfASmallerTableStaysWhereItIs) {
    Table table(64);
    table.add(TestKey{hash_for_home(100, 7), 1}, 10);
    Table::Iterator i(table);
    Table::Assoc* const entry = ++i;
    ASSERT_EQ(i.index(), 100u);
    table.reSize(16);
    EXPECT_EQ(++i, nullptr);
    EXPECT_EQ(i.entry(), entry);
    EXPECT_EQ(i.index(), 100u);
}

TEST(DictionaryIterator, IteratorVisitsTheOnlySlotOfTheSmallestTable) {
    Table table(0);
    Table::Iterator i(table);
    EXPECT_EQ(++i, nullptr);
    EXPECT_EQ(i.index(), 0u);
    EXPECT_EQ(++i, nullptr);
    EXPECT_EQ(i.index(), 0u);
}

TEST(DictionaryIterator, IteratorStopsAtEachOccupiedSlot) {
    Table table;
    table.add(key_at(4, 1), 10);
    table.add(key_at(5, 2), 20);
    table.add(key_at(30, 3), 30);
    Table::Iterator i(table);
    std::vector<unsigned long> reached;
    while (++i != nullptr) reached.push_back(i.index());
    EXPECT_EQ(reached, (std::vector<unsigned long>{4, 5, 30}));
    EXPECT_EQ(i.index(), 31u);
}

TEST(DictionaryIterator, IteratorOfAnEmptyTableHasNoEntry) {
    Table table;
    Table::Iterator i(table);
    EXPECT_EQ(++i, nullptr);
}

TEST(DictionaryIterator, IteratorVisitsEveryEntryOfAGrownTable) {
    IntegerTable table;
    fill(table, 500);
    EXPECT_EQ(values_of(table).size(), 500u);
}

}  // namespace
}  // namespace test
}  // namespace kel
