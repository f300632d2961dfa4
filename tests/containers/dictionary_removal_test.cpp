// SPDX-License-Identifier: MIT
// How entries leave a dictionary: holes, recycled records, the callback and the destructor.
#include <kel/containers/dictionary.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>

#include <utility>
#include <vector>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

typedef KELDictionary<TestKey, int> Table;

TestKey key_at(std::uint32_t slot, int id) { return TestKey{hash_for_home(slot, 5), id}; }

// What the callback was told, in order: id and value.
std::vector<std::pair<int, int>> removed;

void note_removal(TestKey key, int value) { removed.emplace_back(key.id, value); }

// The table that a callback looks at.
Table* observed = nullptr;

class DictionaryRemoval : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        removed.clear();
    }
};

// A key and the slot it is expected in.
struct Placed {
    int id;
    std::uint32_t home;
    std::uint32_t slot;
};

void expect_places(const Table& table, const std::vector<Placed>& places) {
    for (const Placed& place : places) {
        EXPECT_EQ(table.findIndexOf(key_at(place.home, place.id)), place.slot) << "key " << place.id;
        EXPECT_NE(mirror_of(table).table[place.slot], nullptr) << "key " << place.id;
    }
}

// Holes

TEST_F(DictionaryRemoval, EntryBehindTheHoleMovesUp) {
    Table table;
    for (int id = 0; id < 4; ++id) table.add(key_at(20, id), id);
    table.removeKey(key_at(20, 1));
    expect_places(table, {{0, 20, 20}, {2, 20, 19}, {3, 20, 18}});
    EXPECT_EQ(mirror_of(table).table[17], nullptr);
}

TEST_F(DictionaryRemoval, EntryInItsHomeStays) {
    Table table;
    table.add(key_at(20, 0), 0);
    table.add(key_at(19, 1), 1);
    table.removeKey(key_at(20, 0));
    expect_places(table, {{1, 19, 19}});
    EXPECT_EQ(mirror_of(table).table[20], nullptr);
}

TEST_F(DictionaryRemoval, EntryWhoseHomeIsTheHoleMovesIntoIt) {
    Table table;
    table.add(key_at(20, 0), 0);
    table.add(key_at(19, 1), 1);
    table.add(key_at(19, 2), 2);
    table.removeKey(key_at(19, 1));
    expect_places(table, {{0, 20, 20}, {2, 19, 19}});
    EXPECT_EQ(mirror_of(table).table[18], nullptr);
}

TEST_F(DictionaryRemoval, ScanGoesOnBehindAnEntryThatStays) {
    Table table;
    table.add(key_at(20, 0), 0);
    table.add(key_at(19, 1), 1);
    table.add(key_at(20, 2), 2);
    table.removeKey(key_at(20, 0));
    expect_places(table, {{1, 19, 19}, {2, 20, 20}});
}

TEST_F(DictionaryRemoval, ScanStopsAtTheFirstEmptySlot) {
    Table table;
    table.add(key_at(20, 0), 0);
    table.add(key_at(18, 1), 1);
    table.removeKey(key_at(20, 0));
    expect_places(table, {{1, 18, 18}});
}

TEST_F(DictionaryRemoval, HoleAtSlotZeroIsFilledFromTheTop) {
    Table table;
    for (int id = 0; id < 3; ++id) table.add(key_at(0, id), id);
    table.removeKey(key_at(0, 0));
    expect_places(table, {{1, 0, 0}, {2, 0, 31}});
}

TEST_F(DictionaryRemoval, WrappedEntryMovesIntoAHoleAtTheTop) {
    Table table;
    for (int id = 0; id < 4; ++id) table.add(key_at(1, id), id);
    table.removeKey(key_at(1, 2));
    expect_places(table, {{0, 1, 1}, {1, 1, 0}, {3, 1, 31}});
}

TEST_F(DictionaryRemoval, EntryAtTheTopDoesNotMoveIntoAHoleBelowItsHome) {
    Table table;
    table.add(key_at(0, 0), 0);
    table.add(key_at(31, 1), 1);
    table.removeKey(key_at(0, 0));
    expect_places(table, {{1, 31, 31}});
}

TEST_F(DictionaryRemoval, WrappedEntryDoesNotMoveIntoAHoleBetweenItsSlotAndTheTop) {
    Table table;
    table.add(key_at(31, 0), 0);
    table.add(key_at(30, 1), 1);
    table.add(key_at(0, 2), 2);
    table.add(key_at(0, 3), 3);  // from 0 over 31 and 30 to 29
    expect_places(table, {{3, 0, 29}});
    table.removeKey(key_at(31, 0));
    expect_places(table, {{1, 30, 30}, {2, 0, 0}, {3, 0, 31}});
}

TEST_F(DictionaryRemoval, WrappedEntryDoesNotMoveIntoAHoleAboveItsHome) {
    Table table;
    for (int id = 0; id <= 6; ++id) table.add(key_at(static_cast<std::uint32_t>(id), id), id);
    table.add(key_at(2, 7), 7);  // over slot 0 to 31
    table.removeKey(key_at(6, 6));
    expect_places(table, {{0, 0, 0}, {5, 5, 5}, {7, 2, 31}});
    EXPECT_EQ(mirror_of(table).table[6], nullptr);
}

TEST_F(DictionaryRemoval, EveryOtherKeyOfAClusterStaysFound) {
    for (int victim = 0; victim < 12; ++victim) {
        Table table;
        for (int id = 0; id < 12; ++id) {
            table.add(key_at(static_cast<std::uint32_t>(2 + 35 - id / 3) % 32, id), id);
        }
        table.removeKey(key_at(static_cast<std::uint32_t>(2 + 35 - victim / 3) % 32, victim));
        for (int id = 0; id < 12; ++id) {
            int value = -1;
            const TestKey key = key_at(static_cast<std::uint32_t>(2 + 35 - id / 3) % 32, id);
            EXPECT_EQ(table.atKey(key, value), id != victim) << id << " without " << victim;
        }
    }
}

// Removing operations

TEST_F(DictionaryRemoval, RemoveKeyTakesTheEntryOut) {
    Table table;
    table.add(key_at(4, 1), 10);
    table.removeKey(key_at(4, 1));
    EXPECT_EQ(table.count(), 0u);
    int value = -1;
    EXPECT_EQ(table.atKey(key_at(4, 1), value), 0);
}

TEST_F(DictionaryRemoval, RemoveKeyOfAnAbsentKeyThrowsObjectNotExistOfTheDefaultConstruction) {
    Table table(16, note_removal);
    table.add(key_at(4, 1), 10);
    try {
        table.removeKey(key_at(4, 2));
        FAIL() << "nothing was thrown";
    } catch (const CORBA_OBJECT_NOT_EXIST& e) {
        const CORBA_OBJECT_NOT_EXIST expected;
        EXPECT_EQ(e.minor(), expected.minor());
        EXPECT_EQ(e.completed(), expected.completed());
    }
    EXPECT_EQ(table.count(), 1u);
    EXPECT_TRUE(removed.empty());
}

TEST_F(DictionaryRemoval, RemoveKeyIfExistsSaysWhetherItRemoved) {
    Table table;
    table.add(key_at(4, 1), 10);
    EXPECT_EQ(table.removeKeyIfExists(key_at(4, 1)), 1);
    EXPECT_EQ(table.removeKeyIfExists(key_at(4, 1)), 0);
    EXPECT_EQ(table.count(), 0u);
}

TEST_F(DictionaryRemoval, RemoveKeyIfExistsOfAnAbsentKeyCallsNoCallback) {
    Table table(16, note_removal);
    table.add(key_at(4, 1), 10);
    EXPECT_EQ(table.removeKeyIfExists(key_at(4, 2)), 0);
    EXPECT_TRUE(removed.empty());
}

TEST_F(DictionaryRemoval, RemovingTheRememberedKeyZeroesTheLastIndex) {
    Table table;
    table.add(key_at(4, 1), 10);
    table.add(key_at(9, 2), 20);
    table.removeKeyIfExists(key_at(9, 2));
    EXPECT_EQ(mirror_of(table).last_index, 0u);
    table.atKey(key_at(4, 1));
    table.removeKey(key_at(4, 1));
    EXPECT_EQ(mirror_of(table).last_index, 0u);
}

TEST_F(DictionaryRemoval, RemovingAnotherKeyLeavesTheLastIndexAlone) {
    Table table;
    for (int id = 1; id < 4; ++id) table.add(key_at(static_cast<std::uint32_t>(4 * id), id), id);
    table.removeKeyIfExists(key_at(4, 1));
    EXPECT_EQ(mirror_of(table).last_index, 12u);
    table.removeKey(key_at(8, 2));
    EXPECT_EQ(mirror_of(table).last_index, 12u);
    table.removeKeyIfExists(key_at(4, 1));
    EXPECT_EQ(mirror_of(table).last_index, 12u);
}

// What the callback looks up while the remembered key goes is remembered in turn.
void look_up_another(TestKey, int) { EXPECT_EQ(observed->atKey(key_at(9, 2)), 20); }

TEST_F(DictionaryRemoval, LastIndexIsZeroedBeforeTheCallbackIsCalled) {
    Table table(16, look_up_another);
    observed = &table;
    table.add(key_at(9, 2), 20);
    table.add(key_at(4, 1), 10);
    table.removeKeyIfExists(key_at(4, 1));
    EXPECT_EQ(mirror_of(table).last_index, 9u);
}

TEST_F(DictionaryRemoval, RememberedSlotMayHoldAnotherEntryAfterwards) {
    Table table;
    table.add(key_at(20, 1), 10);
    table.add(key_at(20, 2), 20);
    table.add(key_at(20, 3), 30);
    table.atKey(key_at(20, 2));
    table.removeKey(key_at(20, 1));
    ASSERT_EQ(mirror_of(table).last_index, 19u);
    EXPECT_EQ(table.atKey(key_at(20, 2)), 20);
    EXPECT_EQ(table.atKey(key_at(20, 3)), 30);
}

TEST_F(DictionaryRemoval, RemovalBySlotTakesThatEntryOut) {
    Table table;
    table.add(key_at(4, 1), 10);
    table.add(key_at(9, 2), 20);
    table._removeAtIndex(4, 0);
    EXPECT_EQ(table.count(), 1u);
    EXPECT_EQ(table.atKey(key_at(9, 2)), 20);
}

TEST_F(DictionaryRemoval, RemovalBySlotLeavesTheLastIndexAlone) {
    Table table;
    table.add(key_at(4, 1), 10);
    table._removeAtIndex(4, 0);
    EXPECT_EQ(mirror_of(table).last_index, 4u);
}

TEST_F(DictionaryRemoval, RemovalBySlotOfNothingChangesNothing) {
    Table table(16, note_removal);
    table.add(key_at(4, 1), 10);
    table._removeAtIndex(5, 1);
    table._removeAtIndex(32, 1);
    table._removeAtIndex(static_cast<unsigned long>(-1), 1);
    EXPECT_EQ(table.count(), 1u);
    EXPECT_TRUE(removed.empty());
}

// The callback

TEST_F(DictionaryRemoval, CallbackHearsOfEachRemovedEntry) {
    Table table(16, note_removal);
    table.add(key_at(4, 1), 10);
    table.add(key_at(9, 2), 20);
    table.removeKey(key_at(4, 1));
    table.removeKeyIfExists(key_at(9, 2));
    EXPECT_EQ(removed, (std::vector<std::pair<int, int>>{{1, 10}, {2, 20}}));
}

TEST_F(DictionaryRemoval, CallbackHearsOfThreadsToo) {
    static std::vector<pthread_t> heard;
    heard.clear();
    KELDictionary<KELThreadId, KELDictionary<KELUniqueId, KELThreadLocal*>*> table(
        16, [](KELThreadId id, KELDictionary<KELUniqueId, KELThreadLocal*>*) { heard.push_back(id.id()); });
    table.add(KELThreadId(7), nullptr);
    table.add(KELThreadId(8), nullptr);
    table.removeKey(KELThreadId(7));
    EXPECT_EQ(heard, (std::vector<pthread_t>{7}));
}

TEST_F(DictionaryRemoval, CallbackOfARemovalBySlotDependsOnNotify) {
    Table table(16, note_removal);
    for (int id = 0; id < 4; ++id) table.add(key_at(static_cast<std::uint32_t>(4 * id), id), id);
    table._removeAtIndex(0, 0);
    EXPECT_TRUE(removed.empty());
    table._removeAtIndex(4, 1);
    table._removeAtIndex(8, 2);
    table._removeAtIndex(12, static_cast<unsigned long>(-1));
    EXPECT_EQ(removed, (std::vector<std::pair<int, int>>{{1, 1}, {2, 2}, {3, 3}}));
}

std::vector<unsigned long> counts_seen;

void look_at_the_table(TestKey key, int) {
    counts_seen.push_back(observed->count());
    EXPECT_NE(mirror_of(*observed).table[observed->findIndexOf(key)], nullptr);
}

TEST_F(DictionaryRemoval, CallbackIsCalledBeforeTheEntryGoes) {
    Table table(16, look_at_the_table);
    observed = &table;
    counts_seen.clear();
    table.add(key_at(4, 1), 10);
    table.add(key_at(9, 2), 20);
    table.add(key_at(9, 3), 30);
    table.removeKey(key_at(4, 1));
    table.removeAll();
    EXPECT_EQ(counts_seen, (std::vector<unsigned long>{3, 2, 1}));
}

TEST_F(DictionaryRemoval, RefusedAndReplacedEntriesAreNotReported) {
    Table table(16, note_removal);
    table.add(key_at(4, 1), 10);
    table.addIfNotExist(key_at(4, 1), 11);
    table.reSize(64);
    EXPECT_TRUE(removed.empty());
}

// Records

TEST_F(DictionaryRemoval, RemovedRecordIsUsedForTheNextEntry) {
    Table table;
    table.add(key_at(4, 1), 10);
    void* const record = mirror_of(table).table[4];
    table.removeKey(key_at(4, 1));
    Armed armed;
    table.add(key_at(9, 2), 20);
    EXPECT_EQ(mirror_of(table).table[9], record);
    EXPECT_EQ(AllocationPlan::calls(), 0);
    EXPECT_EQ(table.atKey(key_at(9, 2)), 20);
}

TEST_F(DictionaryRemoval, RecordParkedLastIsUsedFirst) {
    Table table;
    for (int id = 0; id < 3; ++id) table.add(key_at(static_cast<std::uint32_t>(4 * id), id), id);
    void* const first = mirror_of(table).table[0];
    void* const second = mirror_of(table).table[4];
    table._removeAtIndex(0, 0);
    table._removeAtIndex(4, 0);
    EXPECT_EQ(mirror_of(table).pool[0], first);
    EXPECT_EQ(mirror_of(table).pool[1], second);
    table.add(key_at(20, 9), 9);
    EXPECT_EQ(mirror_of(table).table[20], second);
    EXPECT_EQ(mirror_of(table).free_count, 1u);
}

TEST_F(DictionaryRemoval, FortyRemovalsPark32RecordsAndDeleteEight) {
    KELDictionary<KELUniqueId, int> table;
    for (unsigned long i = 0; i < 40; ++i) table.add(KELUniqueId(i), 0);
    const long before = AllocationPlan::live_blocks();
    for (unsigned long i = 0; i < 40; ++i) table.removeKey(KELUniqueId(i));
    EXPECT_EQ(mirror_of(table).free_count, 32u);
    EXPECT_EQ(AllocationPlan::live_blocks(), before - 8);
}

TEST_F(DictionaryRemoval, RemoveAllParks32RecordsToo) {
    KELDictionary<KELUniqueId, int> table;
    for (unsigned long i = 0; i < 40; ++i) table.add(KELUniqueId(i), 0);
    const long before = AllocationPlan::live_blocks();
    table.removeAll();
    EXPECT_EQ(mirror_of(table).free_count, 32u);
    EXPECT_EQ(AllocationPlan::live_blocks(), before - 8);
}

TEST_F(DictionaryRemoval, ParkedRecordOfAPlainTableKeepsItsString) {
    KELDictionary<CORBA_String_var, int> table;
    table.add("vesta", 1);
    const long before = AllocationPlan::live_blocks();
    table.removeKey("vesta");
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(DictionaryRemoval, NewKeyAndValueAreAssignedIntoTheParkedRecord) {
    typedef KELDictionary<CORBA_String_var, CORBA_String_var> StringTable;
    StringTable table;
    table.add("a long key", "a longer value");
    table.removeKey("a long key");
    table.add("key", "value");
    const StringTable::Assoc& record =
        *static_cast<StringTable::Assoc*>(mirror_of(table).table[table.findIndexOf("key")]);
    EXPECT_STREQ(record._key, "key");
    EXPECT_EQ(capacity_of(record._key), 11u);
    EXPECT_STREQ(record._value, "value");
    EXPECT_EQ(capacity_of(record._value), 15u);
}

// All at once

TEST_F(DictionaryRemoval, RemoveAllReportsInSlotOrder) {
    Table table(16, note_removal);
    const std::uint32_t slots[] = {31, 4, 0, 17};
    for (int id = 0; id < 4; ++id) table.add(key_at(slots[id], id), static_cast<int>(slots[id]));
    table.removeAll();
    EXPECT_EQ(removed, (std::vector<std::pair<int, int>>{{2, 0}, {1, 4}, {3, 17}, {0, 31}}));
}

TEST_F(DictionaryRemoval, RemoveAllKeepsCapacityAndSlots) {
    Table table(64);
    void* const slots = mirror_of(table).table;
    table.add(key_at(4, 1), 10);
    table.removeAll();
    EXPECT_EQ(table.count(), 0u);
    EXPECT_EQ(table.capacity(), 128u);
    EXPECT_EQ(static_cast<void*>(mirror_of(table).table), slots);
    for (int i = 0; i < 128; ++i) EXPECT_EQ(mirror_of(table).table[i], nullptr);
}

TEST_F(DictionaryRemoval, RemoveAllLeavesTheLastIndexAlone) {
    Table table;
    table.add(key_at(4, 1), 10);
    table.removeAll();
    EXPECT_EQ(mirror_of(table).last_index, 4u);
    int value = -1;
    EXPECT_EQ(table.atKey(key_at(4, 1), value), 0);
}

TEST_F(DictionaryRemoval, EmptiedTableCanBeFilledAgain) {
    Table table;
    for (int round = 0; round < 3; ++round) {
        for (int id = 0; id < 20; ++id) table.add(key_at(3, id), id);
        for (int id = 0; id < 20; ++id) EXPECT_EQ(table.atKey(key_at(3, id)), id);
        table.removeAll();
    }
    EXPECT_EQ(table.capacity(), 32u);
}

TEST_F(DictionaryRemoval, RemoveAllOfAnEmptyTableDoesNothing) {
    Table table(16, note_removal);
    table.removeAll();
    EXPECT_TRUE(removed.empty());
}

// The destructor

TEST_F(DictionaryRemoval, DestructorReportsEveryEntry) {
    {
        Table table(16, note_removal);
        table.add(key_at(4, 1), 10);
        table.add(key_at(9, 2), 20);
    }
    EXPECT_EQ(removed, (std::vector<std::pair<int, int>>{{1, 10}, {2, 20}}));
}

TEST_F(DictionaryRemoval, DestructorFreesSlotsRecordsAndParkedRecords) {
    const long before = AllocationPlan::live_blocks();
    {
        KELDictionary<CORBA_String_var, CORBA_String_var> table;
        char name[] = "x00";
        for (int i = 0; i < 90; ++i) {
            name[1] = static_cast<char>('0' + i / 10);
            name[2] = static_cast<char>('0' + i % 10);
            table.add(static_cast<const char*>(name), "value");
        }
        for (int i = 0; i < 40; ++i) {
            name[1] = static_cast<char>('0' + i / 10);
            name[2] = static_cast<char>('0' + i % 10);
            table.removeKey(static_cast<const char*>(name));
        }
        ASSERT_EQ(table.count(), 50u);
        ASSERT_EQ(table.capacity(), 128u);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

}  // namespace
}  // namespace test
}  // namespace kel
