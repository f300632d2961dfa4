// SPDX-License-Identifier: MIT
// How a dictionary places and finds its entries.
#include <kel/containers/dictionary.h>
#include <kel/core/thread.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

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

class Dictionary : public FaultTest {};

TEST_F(Dictionary, RecordIsTheKeyFollowedByTheValue) {
    const IntegerTable::Assoc record = {KELUniqueId(7), 70};
    EXPECT_EQ(static_cast<const void*>(&record._key), static_cast<const void*>(&record));
    EXPECT_EQ(reinterpret_cast<const char*>(&record._value),
              reinterpret_cast<const char*>(&record) + sizeof(KELUniqueId));
}

TEST_F(Dictionary, FreshOneIsEmptyAndUsesTheSlotsInsideTheObject) {
    const Table table;
    const PlainMirror fields = mirror_of(table);
    EXPECT_EQ(fields.capacity, 32u);
    EXPECT_EQ(fields.count, 0u);
    EXPECT_EQ(reinterpret_cast<const char*>(fields.table),
              reinterpret_cast<const char*>(&table) + offsetof(PlainMirror, inline_table));
    EXPECT_EQ(fields.free_count, 0u);
    EXPECT_EQ(fields.last_index, 0u);
    EXPECT_EQ(fields.bits, 5u);
    EXPECT_EQ(fields.mask, 31u);
    EXPECT_EQ(fields.remove_callback, nullptr);
}

TEST_F(Dictionary, EveryFieldLiesWhereTheLayoutSaysItDoes) {
    KELDictionary<KELUniqueId, int> table(16, [](KELUniqueId, int) {});
    table.add(KELUniqueId(1), 10);
    table.add(KELUniqueId(2), 20);
    void* const first = mirror_of(table).table[19];
    table.removeKey(KELUniqueId(1));
    const PlainMirror fields = mirror_of(table);
    EXPECT_EQ(fields.count, 1u);
    EXPECT_NE(fields.inline_table[7], nullptr);
    EXPECT_EQ(fields.free_count, 1u);
    EXPECT_EQ(fields.pool[0], first);
    EXPECT_EQ(fields.last_index, 7u);
    EXPECT_NE(fields.remove_callback, nullptr);
}

TEST_F(Dictionary, SmallOneAllocatesNothingButItsRecords) {
    Armed armed;
    IntegerTable table;
    fill(table, 28);
    EXPECT_EQ(AllocationPlan::calls(), 28);
}

TEST_F(Dictionary, ConstructorRequestPassesTheCapacityRule) {
    EXPECT_EQ(Table(0).capacity(), 1u);
    EXPECT_EQ(Table(1).capacity(), 2u);
    EXPECT_EQ(Table(3).capacity(), 8u);
    EXPECT_EQ(Table(16).capacity(), 32u);
    EXPECT_EQ(Table(17).capacity(), 64u);
    EXPECT_EQ(Table(100).capacity(), 256u);
}

TEST_F(Dictionary, ConstructorRequestBeyondTheInlineSlotsTakesAnArrayFromTheHeap) {
    Armed armed;
    const Table small(16);
    EXPECT_EQ(AllocationPlan::calls(), 0);
    const Table large(17);
    EXPECT_EQ(AllocationPlan::calls(), 1);
}

TEST_F(Dictionary, OneOfASingleSlotWorksAndGrowsAtItsFirstEntry) {
    Table table(0);
    EXPECT_EQ(mirror_of(table).bits, 0u);
    EXPECT_EQ(mirror_of(table).mask, 0u);
    EXPECT_EQ(table.findIndexOf(TestKey{0xffffffff, 1}), 0u);
    table.add(TestKey{0xffffffff, 1}, 10);
    EXPECT_EQ(table.capacity(), 4u);
    EXPECT_EQ(table.atKey(TestKey{0xffffffff, 1}), 10);
}

// Homes

TEST_F(Dictionary, HomeIsTheTopBitsOfTheHashTimesTheGoldenRatio) {
    const IntegerTable table;
    EXPECT_EQ(table.findIndexOf(KELUniqueId(0)), 0u);
    EXPECT_EQ(table.findIndexOf(KELUniqueId(1)), 19u);           // 0x9e3779b9
    EXPECT_EQ(table.findIndexOf(KELUniqueId(2)), 7u);            // 0x3c6ef372
    EXPECT_EQ(table.findIndexOf(KELUniqueId(3)), 27u);           // 0xdaa66d2b
    EXPECT_EQ(table.findIndexOf(KELUniqueId(0xffffffff)), 12u);  // 0x61c88647
}

TEST_F(Dictionary, HomeUsesAsManyBitsAsTheCapacityHas) {
    EXPECT_EQ(IntegerTable(1).findIndexOf(KELUniqueId(1)), 1u);
    EXPECT_EQ(IntegerTable(32).findIndexOf(KELUniqueId(1)), 39u);
    EXPECT_EQ(IntegerTable(512).findIndexOf(KELUniqueId(1)), 0x278u);
}

TEST_F(Dictionary, ThreadIdsHashAsTheir32BitInteger) {
    const KELDictionary<KELThreadId, int> table;
    EXPECT_EQ(table.findIndexOf(KELThreadId(static_cast<pthread_t>(1))), 19u);
    EXPECT_EQ(table.findIndexOf(KELThreadId(static_cast<pthread_t>(2))), 7u);
}

TEST_F(Dictionary, StringKeysAreFoundByTheirTextWhateverHoldsIt) {
    KELDictionary<KELStringWrapper, int> borrowed;
    KELDictionary<CORBA_String_var, int> owned;
    char copy[] = "vesta";
    borrowed.add("vesta", 1);
    owned.add("vesta", 2);
    EXPECT_EQ(borrowed.atKey(static_cast<const char*>(copy)), 1);
    EXPECT_EQ(owned.atKey(static_cast<const char*>(copy)), 2);
    EXPECT_EQ(borrowed.findIndexOf("a"), owned.findIndexOf("a"));
    EXPECT_EQ(borrowed.findIndexOf("a"), 0x61u * 0x9E3779B9u >> 27);
}

TEST_F(Dictionary, StringsOfOneHashAreToldApart) {
    const char* const first = "a________________________________";
    const char* const second = "b________________________________";
    ASSERT_EQ(CORBA::hash(first), CORBA::hash(second));
    KELDictionary<CORBA_String_var, int> table;
    table.add(first, 1);
    table.add(second, 2);
    EXPECT_EQ(table.atKey(first), 1);
    EXPECT_EQ(table.atKey(second), 2);
}

TEST_F(Dictionary, NullStringIsAKeyEqualToNullOnly) {
    KELDictionary<KELStringWrapper, int> table;
    table.add(static_cast<const char*>(nullptr), 1);
    EXPECT_EQ(table.addIfNotExist(static_cast<const char*>(nullptr), 2), 0);
    EXPECT_EQ(table.addIfNotExist("", 3), 1);
    EXPECT_EQ(table.atKey(static_cast<const char*>(nullptr)), 1);
    EXPECT_EQ(table.atKey(""), 3);
}

TEST_F(Dictionary, OwnedStringKeyIsACopy) {
    KELDictionary<CORBA_String_var, int> table;
    {
        CORBA_String_var key("vesta");
        table.add(key, 1);
        key[0] = 'x';
    }
    EXPECT_EQ(table.atKey("vesta"), 1);
}

// Probing

TEST_F(Dictionary, CollidingKeysGoToLowerSlots) {
    Table table;
    for (int id = 0; id < 3; ++id) table.add(key_at(20, id), id);
    EXPECT_EQ(table.findIndexOf(key_at(20, 0)), 20u);
    EXPECT_EQ(table.findIndexOf(key_at(20, 1)), 19u);
    EXPECT_EQ(table.findIndexOf(key_at(20, 2)), 18u);
}

TEST_F(Dictionary, ProbingWrapsFromSlotZeroToTheLastSlot) {
    Table table;
    for (int id = 0; id < 3; ++id) table.add(key_at(1, id), id);
    EXPECT_EQ(table.findIndexOf(key_at(1, 1)), 0u);
    EXPECT_EQ(table.findIndexOf(key_at(1, 2)), 31u);
}

TEST_F(Dictionary, AbsentKeyIsLocatedAtItsInsertionPoint) {
    Table table;
    table.add(key_at(9, 0), 0);
    table.add(key_at(8, 1), 1);
    EXPECT_EQ(table.findIndexOf(key_at(9, 2)), 7u);
    EXPECT_EQ(table.findIndexOf(key_at(10, 2)), 10u);
    table.add(key_at(9, 2), 2);
    EXPECT_EQ(table.findIndexOf(key_at(9, 2)), 7u);
}

TEST_F(Dictionary, FindingTheSlotLeavesTheLastIndexAlone) {
    Table table;
    table.add(key_at(9, 0), 0);
    table.add(key_at(20, 1), 1);
    table.findIndexOf(key_at(9, 0));
    EXPECT_EQ(mirror_of(table).last_index, 20u);
}

// Inserting

TEST_F(Dictionary, AddStoresTheValueUnderTheKey) {
    IntegerTable table;
    table.add(KELUniqueId(5), 50);
    EXPECT_EQ(table.count(), 1u);
    EXPECT_EQ(table.atKey(KELUniqueId(5)), 50);
}

TEST_F(Dictionary, AddOfAPresentKeyThrowsBadParamOfTheDefaultConstruction) {
    IntegerTable table;
    table.add(KELUniqueId(5), 50);
    try {
        table.add(KELUniqueId(5), 51);
        FAIL() << "nothing was thrown";
    } catch (const CORBA_BAD_PARAM& e) {
        const CORBA_BAD_PARAM expected;
        EXPECT_EQ(e.minor(), expected.minor());
        EXPECT_EQ(e.completed(), expected.completed());
    }
    EXPECT_EQ(table.count(), 1u);
    EXPECT_EQ(table.atKey(KELUniqueId(5)), 50);
}

TEST_F(Dictionary, AddIfNotExistInsertsOnceAndSaysSo) {
    IntegerTable table;
    EXPECT_EQ(table.addIfNotExist(KELUniqueId(5), 50), 1);
    EXPECT_EQ(table.addIfNotExist(KELUniqueId(5), 51), 0);
    EXPECT_EQ(table.count(), 1u);
    EXPECT_EQ(table.atKey(KELUniqueId(5)), 50);
}

TEST_F(Dictionary, InsertionIsRememberedAsTheLastIndex) {
    IntegerTable table;
    table.add(KELUniqueId(1), 10);
    EXPECT_EQ(mirror_of(table).last_index, 19u);
    table.addIfNotExist(KELUniqueId(2), 20);
    EXPECT_EQ(mirror_of(table).last_index, 7u);
}

TEST_F(Dictionary, RefusedInsertionLeavesTheLastIndexAlone) {
    IntegerTable table;
    table.add(KELUniqueId(1), 10);
    table.add(KELUniqueId(2), 20);
    table.addIfNotExist(KELUniqueId(1), 11);
    EXPECT_EQ(mirror_of(table).last_index, 7u);
    EXPECT_THROW(table.add(KELUniqueId(1), 11), CORBA_BAD_PARAM);
    EXPECT_EQ(mirror_of(table).last_index, 7u);
}

TEST_F(Dictionary, InsertingDrawsNoUniqueIds) {
    const KELUniqueId before;
    IntegerTable table;
    fill(table, 40);
    for (unsigned long i = 0; i < 40; ++i) table.removeKey(KELUniqueId(i));
    fill(table, 40);
    EXPECT_EQ(KELUniqueId().value(), before.value() + 1);
}

// Looking up

TEST_F(Dictionary, LookUpCopiesTheValueOut) {
    IntegerTable table;
    table.add(KELUniqueId(5), 50);
    int value = 0;
    EXPECT_EQ(table.atKey(KELUniqueId(5), value), 1);
    EXPECT_EQ(value, 50);
}

TEST_F(Dictionary, LookUpOfAnAbsentKeyLeavesTheValueUntouched) {
    IntegerTable table;
    table.add(KELUniqueId(5), 50);
    int value = -1;
    EXPECT_EQ(table.atKey(KELUniqueId(6), value), 0);
    EXPECT_EQ(value, -1);
}

TEST_F(Dictionary, LookUpByValueOfAnAbsentKeyThrowsObjectNotExistOfTheDefaultConstruction) {
    IntegerTable table;
    try {
        table.atKey(KELUniqueId(5));
        FAIL() << "nothing was thrown";
    } catch (const CORBA_OBJECT_NOT_EXIST& e) {
        const CORBA_OBJECT_NOT_EXIST expected;
        EXPECT_EQ(e.minor(), expected.minor());
        EXPECT_EQ(e.completed(), expected.completed());
    }
}

TEST_F(Dictionary, LookUpIsRememberedAsTheLastIndex) {
    IntegerTable table;
    fill(table, 3);
    int value = 0;
    table.atKey(KELUniqueId(1), value);
    EXPECT_EQ(mirror_of(table).last_index, 19u);
    table.atKey(KELUniqueId(2));
    EXPECT_EQ(mirror_of(table).last_index, 7u);
}

TEST_F(Dictionary, FailedLookUpLeavesTheLastIndexAlone) {
    IntegerTable table;
    fill(table, 3);
    int value = 0;
    table.atKey(KELUniqueId(1));
    table.atKey(KELUniqueId(9), value);
    EXPECT_THROW(table.atKey(KELUniqueId(9)), CORBA_OBJECT_NOT_EXIST);
    EXPECT_EQ(mirror_of(table).last_index, 19u);
}

// A key that counts how often it is compared and hashed.
struct CountedKey {
    int id;
};
int comparisons = 0;
int hashings = 0;
int compare(const CountedKey& a, const CountedKey& b) {
    ++comparisons;
    return a.id - b.id;
}
unsigned long _kel_hash(const CountedKey&) {
    ++hashings;
    return 0;
}

TEST_F(Dictionary, RepeatedLookUpCostsOneComparisonAndNoHashing) {
    KELDictionary<CountedKey, int> table;
    for (int id = 0; id < 10; ++id) table.add(CountedKey{id}, id);
    int value = 0;
    table.atKey(CountedKey{7}, value);
    comparisons = hashings = 0;
    table.atKey(CountedKey{7}, value);
    EXPECT_EQ(comparisons, 1);
    EXPECT_EQ(hashings, 0);
    EXPECT_EQ(value, 7);
}

TEST_F(Dictionary, LookUpOfTheKeyJustInsertedCostsOneComparison) {
    KELDictionary<CountedKey, int> table;
    for (int id = 0; id < 10; ++id) table.add(CountedKey{id}, id);
    comparisons = hashings = 0;
    EXPECT_EQ(table.atKey(CountedKey{9}), 9);
    EXPECT_EQ(comparisons, 1);
    EXPECT_EQ(hashings, 0);
}

// Threads

// The scheduler may let either thread run at any moment; what is checked must hold for all of them.
struct Readers {
    KELDictionary<KELUniqueId, int>* table;
    unsigned long key;
    long wrong;
};

void* look_up_often(void* argument) {
    Readers& self = *static_cast<Readers*>(argument);
    for (int n = 0; n < 50000; ++n) {
        int value = -1;
        const unsigned long key = self.key + static_cast<unsigned long>(n) % 2;
        if (!self.table->atKey(KELUniqueId(key), value) || value != static_cast<int>(key)) ++self.wrong;
    }
    return nullptr;
}

TEST_F(Dictionary, LookUpsOfSeveralThreadsNeverAnswerForAnotherKey) {
    IntegerTable table;
    fill(table, 20);
    Readers readers[4];
    pthread_t threads[4];
    for (unsigned long t = 0; t < 4; ++t) {
        readers[t] = Readers{&table, 3 * t, 0};
        ASSERT_EQ(pthread_create(&threads[t], nullptr, look_up_often, &readers[t]), 0);
    }
    for (pthread_t thread : threads) pthread_join(thread, nullptr);
    for (const Readers& reader : readers) EXPECT_EQ(reader.wrong, 0);
}

}  // namespace
}  // namespace test
}  // namespace kel
