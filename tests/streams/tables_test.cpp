// SPDX-License-Identifier: MIT
// Indirection tables: who holds them, how they are found, shared and given back.

#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <new>
#include <vector>

#include "tests/streams/table_fixtures.h"
#include "tests/support/fault.h"

using kel::test::AllocationPlan;
using kel::test::Armed;

namespace {

template <class Stream>
class Tables : public kel::test::FaultTest {};

TYPED_TEST_SUITE(Tables, Directions, DirectionNames);

TYPED_TEST(Tables, AStreamWithoutTablesFindsNone) {
    TypeParam stream;
    EXPECT_EQ(stream.find(KELOffsetTable::TypeCodeIndirections), nullptr);
}

TYPED_TEST(Tables, ATableIsFoundByItsKind) {
    TypeParam stream;
    KELOffsetTable* const strings = new TestTable(KELOffsetTable::StringIndirections);
    KELOffsetTable* const ids = new TestTable(KELOffsetTable::RepIdsIndirections);
    stream.set(KELOffsetTable::StringIndirections, strings);
    stream.set(KELOffsetTable::RepIdsIndirections, ids);
    EXPECT_EQ(stream.find(KELOffsetTable::StringIndirections), strings);
    EXPECT_EQ(stream.find(KELOffsetTable::RepIdsIndirections), ids);
    EXPECT_EQ(stream.find(KELOffsetTable::ValueIndirections), nullptr);
}

TYPED_TEST(Tables, TheGivenKindIsIgnored) {
    TypeParam stream;
    KELOffsetTable* const table = new TestTable(KELOffsetTable::ValueIndirections);
    stream.set(KELOffsetTable::TypeCodeIndirections, table);
    EXPECT_EQ(stream.find(KELOffsetTable::ValueIndirections), table);
    EXPECT_EQ(stream.find(KELOffsetTable::TypeCodeIndirections), nullptr);
}

TYPED_TEST(Tables, TheEarlierTableOfAKindWins) {
    TypeParam stream;
    KELOffsetTable* const first = new TestTable(1);
    stream.set(1, first);
    stream.set(1, new TestTable(1));
    EXPECT_EQ(stream.find(1), first);
    EXPECT_EQ(stream._table_count, 2);
}

TYPED_TEST(Tables, NullEntriesAreSkipped) {
    TypeParam stream;
    KELOffsetTable* const table = new TestTable(1);
    stream.set(1, nullptr);
    stream.set(1, table);
    EXPECT_EQ(stream._table_count, 2);
    EXPECT_EQ(stream.find(1), table);
    EXPECT_EQ(stream.find(0), nullptr);
    stream.reset();
}

TYPED_TEST(Tables, TheArrayStartsWithOneAndDoubles) {
    TypeParam stream;
    std::vector<std::int32_t> capacities;
    for (int i = 0; i < 5; ++i) {
        stream.set(i, new TestTable(i));
        capacities.push_back(stream._table_capacity);
    }
    EXPECT_EQ(capacities, (std::vector<std::int32_t>{1, 2, 4, 4, 8}));
    EXPECT_EQ(stream._table_count, 5);
}

TYPED_TEST(Tables, GrowingKeepsTheOrder) {
    TypeParam stream;
    std::vector<KELOffsetTable*> tables;
    for (int i = 0; i < 5; ++i) {
        tables.push_back(new TestTable(i));
        stream.set(i, tables.back());
    }
    EXPECT_EQ(std::vector<KELOffsetTable*>(stream._tables, stream._tables + 5), tables);
}

TYPED_TEST(Tables, TheStreamTakesTheCallersReferenceOver) {
    int deaths = 0;
    {
        TypeParam stream;
        KELOffsetTable* const table = new TestTable(1, &deaths);
        stream.set(1, table);
        EXPECT_EQ(table->_num_refs(), 1u);
    }
    EXPECT_EQ(deaths, 1);
}

TYPED_TEST(Tables, LookingUpAddsNoReference) {
    TypeParam stream;
    KELOffsetTable* const table = new TestTable(1);
    stream.set(1, table);
    stream.find(1);
    EXPECT_EQ(table->_num_refs(), 1u);
}

TYPED_TEST(Tables, AReferenceOfTheCallersKeepsTheTable) {
    int deaths = 0;
    KELOffsetTable* const table = new TestTable(1, &deaths);
    table->_ref();
    {
        TypeParam stream;
        stream.set(1, table);
    }
    EXPECT_EQ(deaths, 0);
    EXPECT_EQ(table->_num_refs(), 1u);
    table->_unref();
    EXPECT_EQ(deaths, 1);
}

TYPED_TEST(Tables, ATableThatWasSetTwiceIsReleasedTwice) {
    int deaths = 0;
    {
        TypeParam stream;
        KELOffsetTable* const table = new TestTable(1, &deaths);
        table->_ref();
        stream.set(1, table);
        stream.set(1, table);
    }
    EXPECT_EQ(deaths, 1);
}

struct RefusedRelease : TestTable {
    using TestTable::TestTable;
    long _unref() override {
        releases.push_back(kind());
        return 1;
    }
    static std::vector<int> releases;
};
std::vector<int> RefusedRelease::releases;

TYPED_TEST(Tables, TheDestructorCallsTheVirtualUnrefOfEachTableInOrder) {
    RefusedRelease first(3), second(1), third(2);
    RefusedRelease::releases.clear();
    {
        TypeParam stream;
        for (RefusedRelease* table : {&first, &second, &third}) stream.set(0, table);
    }
    EXPECT_EQ(RefusedRelease::releases, (std::vector<int>{3, 1, 2}));
}

TYPED_TEST(Tables, TheArrayIsFreed) {
    const long before = AllocationPlan::live_blocks();
    {
        TypeParam stream;
        for (int i = 0; i < 3; ++i) stream.set(i, nullptr);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

// ---- sharing ----

TYPED_TEST(Tables, SharingAddsOneReferenceToEachTable) {
    int deaths = 0;
    {
        TypeParam source;
        KELOffsetTable* const a = new TestTable(0, &deaths);
        KELOffsetTable* const b = new TestTable(1, &deaths);
        source.set(0, a);
        source.set(1, b);
        {
            TypeParam target;
            target.share(source);
            EXPECT_EQ(a->_num_refs(), 2u);
            EXPECT_EQ(b->_num_refs(), 2u);
            EXPECT_EQ(target.find(0), a);
            EXPECT_EQ(target.find(1), b);
        }
        EXPECT_EQ(a->_num_refs(), 1u);
        EXPECT_EQ(deaths, 0);
    }
    EXPECT_EQ(deaths, 2);
}

TYPED_TEST(Tables, SharingTakesCountAndCapacityOver) {
    TypeParam source, target;
    for (int i = 0; i < 3; ++i) source.set(i, new TestTable(i));
    target.share(source);
    EXPECT_EQ(target._table_count, 3);
    EXPECT_EQ(target._table_capacity, 4);
    EXPECT_NE(target._tables, source._tables);
    EXPECT_EQ(source._table_count, 3);
}

TYPED_TEST(Tables, SharingKeepsNullEntries) {
    TypeParam source, target;
    KELOffsetTable* const table = new TestTable(1);
    source.set(0, nullptr);
    source.set(1, table);
    target.share(source);
    EXPECT_EQ(target._table_count, 2);
    EXPECT_EQ(target._tables[0], nullptr);
    EXPECT_EQ(target.find(1), table);
}

TYPED_TEST(Tables, SharingLeavesTheOffset) {
    TypeParam source, target;
    source._offset = 5;
    target._offset = 7;
    source.set(1, new TestTable(1));
    target.share(source);
    EXPECT_EQ(target._offset, 7u);
}

TYPED_TEST(Tables, SharingNothingChangesNothing) {
    TypeParam source, target;
    target.share(source);
    EXPECT_EQ(target._tables, nullptr);
    EXPECT_EQ(target._table_count, 0);
    EXPECT_EQ(target._table_capacity, 0);
}

TYPED_TEST(Tables, SharingIntoAStreamWithTablesThrowsBadInvOrder) {
    TypeParam source, target;
    source.set(1, new TestTable(1));
    target.set(0, new TestTable(0));
    try {
        target.share(source);
        FAIL() << "nothing was thrown";
    } catch (const CORBA_BAD_INV_ORDER& e) {
        EXPECT_EQ(e.minor(), 0x4f4d0004u);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
    }
}

TYPED_TEST(Tables, ARefusedSharingChangesNothing) {
    TypeParam source, target;
    KELOffsetTable* const theirs = new TestTable(1);
    KELOffsetTable* const ours = new TestTable(0);
    source.set(1, theirs);
    target.set(0, ours);
    EXPECT_THROW(target.share(source), CORBA_BAD_INV_ORDER);
    EXPECT_EQ(target._table_count, 1);
    EXPECT_EQ(target._tables[0], ours);
    EXPECT_EQ(theirs->_num_refs(), 1u);
}

TYPED_TEST(Tables, SharingNothingIntoAStreamWithTablesThrowsToo) {
    TypeParam source, target;
    target.set(0, new TestTable(0));
    EXPECT_THROW(target.share(source), CORBA_BAD_INV_ORDER);
}

TYPED_TEST(Tables, SharingIntoAStreamWithNothingButANullEntryThrowsToo) {
    TypeParam source, target;
    target.set(0, nullptr);
    EXPECT_THROW(target.share(source), CORBA_BAD_INV_ORDER);
}

TYPED_TEST(Tables, SharingWithItselfThrowsWhenThereAreTables) {
    TypeParam stream;
    stream.share(stream);
    stream.set(0, new TestTable(0));
    EXPECT_THROW(stream.share(stream), CORBA_BAD_INV_ORDER);
}

TYPED_TEST(Tables, SharedTablesOutliveTheirSource) {
    int deaths = 0;
    {
        TypeParam target;
        {
            TypeParam source;
            source.set(1, new TestTable(1, &deaths));
            target.share(source);
        }
        EXPECT_EQ(deaths, 0);
        EXPECT_NE(target.find(1), nullptr);
    }
    EXPECT_EQ(deaths, 1);
}

// ---- memory ----

// Makes every new reference allocate its record, and the record's lock come from the pool, so that
// live blocks can be compared.
void empty_the_record_pool() {
    TestTable* const a = new TestTable(0);
    TestTable* const b = new TestTable(0);
    for (TestTable* table : {a, b}) table->_ref();
    for (TestTable* table : {a, b}) {
        table->_unref();
        table->_unref();
    }
    KELResource::garbage_collect();
}

TYPED_TEST(Tables, WithoutMemoryForTheArrayTheCallerKeepsTheTable) {
    int deaths = 0;
    TestTable* const table = new TestTable(1, &deaths);
    {
        TypeParam stream;
        AllocationPlan::fail(1);
        {
            Armed armed;
            EXPECT_THROW(stream.set(1, table), std::bad_alloc);
        }
        EXPECT_EQ(stream._table_count, 0);
        EXPECT_EQ(stream._table_capacity, 0);
    }
    EXPECT_EQ(deaths, 0);
    table->_unref();
}

TYPED_TEST(Tables, WithoutMemoryForALargerArrayTheOldOneStays) {
    TypeParam stream;
    KELOffsetTable* const first = new TestTable(1);
    TestTable* const second = new TestTable(2);
    stream.set(1, first);
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(stream.set(2, second), std::bad_alloc);
    }
    EXPECT_EQ(stream._table_count, 1);
    EXPECT_EQ(stream._table_capacity, 1);
    EXPECT_EQ(stream.find(1), first);
    stream.set(2, second);
    EXPECT_EQ(stream.find(2), second);
}

TYPED_TEST(Tables, WithoutMemoryForTheSharedArrayNothingChanges) {
    TypeParam source, target;
    KELOffsetTable* const table = new TestTable(1);
    source.set(1, table);
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(target.share(source), std::bad_alloc);
    }
    EXPECT_EQ(target._table_count, 0);
    EXPECT_EQ(target._table_capacity, 0);
    EXPECT_EQ(table->_num_refs(), 1u);
    target.share(source);
    EXPECT_EQ(table->_num_refs(), 2u);
}

TYPED_TEST(Tables, AReferenceThatCannotBeHadLeavesThoseBeforeIt) {
    empty_the_record_pool();
    const long before = AllocationPlan::live_blocks();
    {
        TypeParam source, target;
        KELOffsetTable* const a = new TestTable(0);
        KELOffsetTable* const b = new TestTable(1);
        a->_ref();  // has its record
        source.set(0, a);
        source.set(1, b);
        AllocationPlan::fail(2);
        {
            Armed armed;
            EXPECT_THROW(target.share(source), std::bad_alloc);
        }
        EXPECT_EQ(target._table_count, 1);
        EXPECT_EQ(target._tables[0], a);
        EXPECT_EQ(a->_num_refs(), 3u);
        EXPECT_EQ(b->_num_refs(), 1u);
        a->_unref();
    }
    KELResource::garbage_collect();
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TYPED_TEST(Tables, SharingCanBeRepeatedWhenNoReferenceWasHad) {
    empty_the_record_pool();
    const long before = AllocationPlan::live_blocks();
    {
        TypeParam source, target;
        KELOffsetTable* const table = new TestTable(0);
        source.set(0, table);
        AllocationPlan::fail(2);
        {
            Armed armed;
            EXPECT_THROW(target.share(source), std::bad_alloc);
        }
        target.share(source);
        EXPECT_EQ(target.find(0), table);
    }
    KELResource::garbage_collect();
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

}  // namespace
