// SPDX-License-Identifier: MIT
// Emptying indirection tables, and the tables and their keys themselves.

#include <new>
#include <string>
#include <vector>

#include "tests/streams/table_fixtures.h"

namespace {

template <class Stream>
class TableReset : public ::testing::Test {};

TYPED_TEST_SUITE(TableReset, Directions, DirectionNames);

std::vector<void*> released;
void note_release(void* object) { released.push_back(object); }

// A table in use, with two entries each way.
TestTable* filled_table(int kind, char* objects) {
    TestTable* const table = new TestTable(kind);
    table->_by_offset.add(KELOffsetWrapper(4), objects);
    table->_by_offset.add(KELOffsetWrapper(8), objects + 1);
    table->_by_object.add(KELObjWrap(objects), 4);
    table->_by_object.add(KELObjWrap(objects + 1), 8);
    table->_mark = 11;
    table->_spare = 12;
    table->_in_use = 13;
    table->_depth = 14;
    return table;
}

TYPED_TEST(TableReset, ResetWithoutTablesSetsTheOffsetToZero) {
    TypeParam stream;
    stream._offset = 9;
    stream.reset();
    EXPECT_EQ(stream._offset, 0u);
}

TYPED_TEST(TableReset, ResetEmptiesATableInUse) {
    char objects[2];
    TypeParam stream;
    TestTable* const table = filled_table(1, objects);
    stream.set(1, table);
    stream.reset();
    EXPECT_EQ(table->_by_offset.count(), 0u);
    EXPECT_EQ(table->_by_object.count(), 0u);
}

TYPED_TEST(TableReset, ResetClearsMarkDepthAndInUseAndLeavesSpare) {
    char objects[2];
    TypeParam stream;
    TestTable* const table = filled_table(1, objects);
    stream.set(1, table);
    stream.reset();
    EXPECT_EQ(table->_mark, 0);
    EXPECT_EQ(table->_spare, 12);
    EXPECT_EQ(table->_in_use, 0);
    EXPECT_EQ(table->_depth, 0);
}

TYPED_TEST(TableReset, ResetLeavesATableThatIsNotInUse) {
    char objects[2];
    TypeParam stream;
    TestTable* const table = filled_table(1, objects);
    table->_in_use = 0;
    table->_release = note_release;
    released.clear();
    stream.set(1, table);
    stream._offset = 9;
    stream.reset();
    EXPECT_EQ(table->_by_offset.count(), 2u);
    EXPECT_EQ(table->_by_object.count(), 2u);
    EXPECT_EQ(table->_mark, 11);
    EXPECT_EQ(table->_depth, 14);
    EXPECT_TRUE(released.empty());
    EXPECT_EQ(stream._offset, 0u);
}

TYPED_TEST(TableReset, ResetReleasesEveryObjectInSlotOrder) {
    char objects[6];
    TypeParam stream;
    TestTable* const table = new TestTable(1);
    for (int i = 0; i < 6; ++i) table->_by_offset.add(KELOffsetWrapper(100 * i), objects + i);
    table->_in_use = 1;
    table->_release = note_release;
    stream.set(1, table);

    std::vector<void*> in_slot_order;
    KELDictionary<KELOffsetWrapper, void*>::Iterator it(table->_by_offset);
    while (KELDictionary<KELOffsetWrapper, void*>::Assoc* entry = ++it)
        in_slot_order.push_back(entry->_value);
    ASSERT_EQ(in_slot_order.size(), 6u);

    released.clear();
    stream.reset();
    EXPECT_EQ(released, in_slot_order);
}

KELOffsetTable* table_of_release;
unsigned long entries_at_release;
void count_entries(void*) { entries_at_release = table_of_release->_by_offset.count(); }

TYPED_TEST(TableReset, ObjectsAreReleasedBeforeTheEntriesGo) {
    char objects[2];
    TypeParam stream;
    table_of_release = filled_table(1, objects);
    table_of_release->_release = count_entries;
    stream.set(1, table_of_release);
    stream.reset();
    EXPECT_EQ(entries_at_release, 2u);
}

TYPED_TEST(TableReset, ResetKeepsTheTablesAttached) {
    char objects[2];
    TypeParam stream;
    TestTable* const table = filled_table(1, objects);
    stream.set(1, table);
    stream.reset();
    EXPECT_EQ(stream.find(1), table);
    EXPECT_EQ(table->_num_refs(), 1u);
}

TYPED_TEST(TableReset, ResetEmptiesEveryTable) {
    char objects[2];
    TypeParam stream;
    TestTable* const a = filled_table(0, objects);
    TestTable* const b = filled_table(1, objects);
    stream.set(0, a);
    stream.set(1, b);
    stream.reset();
    EXPECT_EQ(a->_in_use, 0);
    EXPECT_EQ(b->_in_use, 0);
    EXPECT_EQ(b->_by_offset.count(), 0u);
}

TYPED_TEST(TableReset, AResetTableCanBeFilledAgain) {
    char objects[2];
    TypeParam stream;
    TestTable* const table = filled_table(1, objects);
    stream.set(1, table);
    stream.reset();
    table->_by_offset.add(KELOffsetWrapper(4), objects + 1);
    EXPECT_EQ(table->_by_offset.atKey(KELOffsetWrapper(4)), objects + 1);
}

TYPED_TEST(TableReset, TablesBehindOneThatIsUnusedOrMissingAreEmptiedToo) {
    char objects[2];
    TypeParam stream;
    TestTable* const last = filled_table(1, objects);
    stream.set(0, nullptr);
    stream.set(0, new TestTable(0));
    stream.set(1, last);
    stream.reset();
    EXPECT_EQ(last->_in_use, 0);
    EXPECT_EQ(last->_by_offset.count(), 0u);
}

TYPED_TEST(TableReset, ASharedTableIsEmptyForBothItsStreams) {
    char objects[2];
    TypeParam stream, sharer;
    TestTable* const table = filled_table(1, objects);
    stream.set(1, table);
    sharer.share(stream);
    stream._offset = 9;
    sharer.reset();
    EXPECT_EQ(table->_by_offset.count(), 0u);
    EXPECT_EQ(stream.find(1), table);
    EXPECT_EQ(stream._offset, 9u);
}

// ---- the order of the steps ----

std::vector<std::string> steps;
TestTable* table_of_steps;
std::uint32_t* offset_of_steps;

// A step, the state of the table while it is taken, and the offset of the stream.
void note_step(const std::string& name) {
    steps.push_back(name + " " + std::to_string(table_of_steps->_mark) + " " +
                    std::to_string(table_of_steps->_depth) + " " + std::to_string(table_of_steps->_in_use) +
                    " at " + std::to_string(*offset_of_steps));
}
void note_object(void*) { note_step("object"); }
void note_offset_entry(KELOffsetWrapper, void*) { note_step("offset entry"); }
void note_object_entry(KELObjWrap, long) { note_step("object entry"); }

TYPED_TEST(TableReset, ObjectsGoBeforeOffsetsBeforeAddressesBeforeTheFieldsBeforeTheOffset) {
    typedef KELDictionary<KELOffsetWrapper, void*> ByOffset;
    typedef KELDictionary<KELObjWrap, long> ByObject;
    char object;
    TypeParam stream;
    TestTable* const table = new TestTable(1);
    table->_by_offset.~ByOffset();
    new (&table->_by_offset) ByOffset(16, note_offset_entry);
    table->_by_object.~ByObject();
    new (&table->_by_object) ByObject(16, note_object_entry);
    table->_by_offset.add(4, &object);
    table->_by_object.add(&object, 4);
    table->_release = note_object;
    table->_mark = 11;
    table->_depth = 14;
    table->_in_use = 13;
    stream.set(1, table);
    stream._offset = 9;

    table_of_steps = table;
    offset_of_steps = &stream._offset;
    steps.clear();
    stream.reset();
    EXPECT_EQ(steps, (std::vector<std::string>{"object 11 14 13 at 9", "offset entry 11 14 13 at 9",
                                               "object entry 11 14 13 at 9"}));
    EXPECT_EQ(table->_in_use, 0);
    EXPECT_EQ(stream._offset, 0u);
}

TYPED_TEST(TableReset, TheDestructorOfAStreamReleasesNoObjects) {
    char objects[2];
    released.clear();
    {
        TypeParam stream;
        TestTable* const table = filled_table(1, objects);
        table->_release = note_release;
        stream.set(1, table);
    }
    EXPECT_TRUE(released.empty());
}

// ---- the tables themselves ----

TEST(OffsetTable, KindsHaveTheirNumbers) {
    EXPECT_EQ(static_cast<int>(KELOffsetTable::TypeCodeIndirections), 0);
    EXPECT_EQ(static_cast<int>(KELOffsetTable::ValueIndirections), 1);
    EXPECT_EQ(static_cast<int>(KELOffsetTable::StringIndirections), 2);
    EXPECT_EQ(static_cast<int>(KELOffsetTable::RepIdsIndirections), 3);
    EXPECT_EQ(static_cast<int>(KELOffsetTable::TopLevelTCIndirections), 4);
}

TEST(OffsetTable, StartsEmptyAndUnused) {
    TestTable table(1);
    EXPECT_EQ(table._by_offset.count(), 0u);
    EXPECT_EQ(table._by_object.count(), 0u);
    EXPECT_EQ(table._release, nullptr);
    EXPECT_EQ(table._mark, 0);
    EXPECT_EQ(table._spare, 0);
    EXPECT_EQ(table._in_use, 0);
    EXPECT_EQ(table._depth, 0);
    EXPECT_EQ(table._num_refs(), 1u);
}

TEST(OffsetKeys, AnOffsetEqualsTheSameOffsetOnly) {
    EXPECT_EQ(compare(KELOffsetWrapper(4), KELOffsetWrapper(4)), 0);
    EXPECT_NE(compare(KELOffsetWrapper(4), KELOffsetWrapper(8)), 0);
    EXPECT_EQ(KELOffsetWrapper(4).offset(), 4);
}

TEST(OffsetKeys, AnOffsetHashesToItself) {
    EXPECT_EQ(_kel_hash(KELOffsetWrapper(4)), 4u);
    EXPECT_EQ(_kel_hash(KELOffsetWrapper(-1)), 0xffffffffu);
}

TEST(OffsetKeys, AnObjectEqualsTheSameObjectOnly) {
    char objects[2];
    EXPECT_EQ(compare(KELObjWrap(objects), KELObjWrap(objects)), 0);
    EXPECT_NE(compare(KELObjWrap(objects), KELObjWrap(objects + 1)), 0);
    EXPECT_EQ(KELObjWrap(objects).object(), objects);
}

TEST(OffsetKeys, TheHashOfAnObjectHasThirtyTwoBits) {
    char object;
    EXPECT_EQ(_kel_hash(KELObjWrap(&object)), _kel_hash(KELObjWrap(&object)));
    EXPECT_LE(_kel_hash(KELObjWrap(&object)), 0xfffffffful);
}

}  // namespace
