// SPDX-License-Identifier: MIT
// What a dictionary is like after an operation that found no memory: as it was before.
#include <kel/containers/dictionary.h>

#include <functional>
#include <memory>
#include <new>
#include <string>
#include <vector>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

typedef KELDictionary<CORBA_String_var, CORBA_String_var> Strings;

// Long enough that every copy needs memory of its own.
std::string key_text(int i) { return "the key number " + std::to_string(i); }
std::string value_text(int i) { return "the value that belongs to it: " + std::to_string(i); }

void put(Strings& table, int i) { table.add(key_text(i).c_str(), value_text(i).c_str()); }
void drop(Strings& table, int i) { table.removeKey(key_text(i).c_str()); }

int calls_back = 0;
void count_removal(CORBA_String_var, CORBA_String_var) { ++calls_back; }

// Everything that a dictionary is made of, but for what its parked records hold.
struct State {
    explicit State(const Strings& table)
        : fields(mirror_of(table)), slots(fields.table, fields.table + fields.capacity) {
        Strings::Iterator i(const_cast<Strings&>(table));
        while (const Strings::Assoc* entry = ++i) {
            texts.push_back(entry->_key.in());
            texts.push_back(entry->_value.in());
        }
    }

    PlainMirror fields;
    std::vector<void*> slots;
    std::vector<std::string> texts;
};

void expect_same(const State& before, const State& after) {
    EXPECT_EQ(after.fields.capacity, before.fields.capacity);
    EXPECT_EQ(after.fields.count, before.fields.count);
    EXPECT_EQ(after.fields.table, before.fields.table);
    EXPECT_EQ(after.fields.free_count, before.fields.free_count);
    EXPECT_EQ(after.fields.last_index, before.fields.last_index);
    EXPECT_EQ(after.fields.bits, before.fields.bits);
    EXPECT_EQ(after.fields.mask, before.fields.mask);
    for (int i = 0; i < before.fields.free_count; ++i) EXPECT_EQ(after.fields.pool[i], before.fields.pool[i]);
    EXPECT_EQ(after.slots, before.slots);
    EXPECT_EQ(after.texts, before.texts);
}

// Whether `operation` ran to its end although the nth allocation failed.
bool survives(const std::function<void()>& operation, int nth, bool from_then_on) {
    reset_faults();
    AllocationPlan::fail(nth, from_then_on);
    try {
        Armed armed;
        operation();
    } catch (const std::bad_alloc&) {
        return false;
    }
    return true;
}

class DictionaryFailure : public FaultTest, public ::testing::WithParamInterface<bool> {
protected:
    // Lets every allocation of `operation` fail in turn, each time on a fresh table that `prepare` has
    // filled, and compares the table with what it was.
    void expect_unchanged_by(const std::function<void(Strings&)>& prepare,
                             const std::function<void(Strings&)>& operation) {
        int nth = 1;
        for (;; ++nth) {
            SCOPED_TRACE("allocation " + std::to_string(nth));
            const long blocks = AllocationPlan::live_blocks();
            bool survived;
            {
                Strings table(16, count_removal);
                prepare(table);
                calls_back = 0;
                const std::unique_ptr<State> before(new State(table));
                survived = survives([&] { operation(table); }, nth, GetParam());
                reset_faults();
                if (!survived) {
                    const State after(table);
                    if (_may_forget_last_index && after.fields.last_index == 0) before->fields.last_index = 0;
                    expect_same(*before, after);
                    EXPECT_EQ(calls_back, 0);
                    operation(table);  // succeeds now
                }
            }
            EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
            if (survived) break;
        }
        EXPECT_GT(nth, 1) << "nothing was allocated";
    }

    bool _may_forget_last_index = false;
};

INSTANTIATE_TEST_SUITE_P(Once, DictionaryFailure, ::testing::Values(false));
INSTANTIATE_TEST_SUITE_P(FromThenOn, DictionaryFailure, ::testing::Values(true));

void fill_to(Strings& table, int entries) {
    for (int i = 0; i < entries; ++i) put(table, i);
}

void add_one_more(Strings& table) {
    CORBA_String_var key("the key number one hundred");
    CORBA_String_var value("the value that belongs to one hundred");
    table.add(key, value);
}

TEST_P(DictionaryFailure, AddOfANewRecordChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 5); }, add_one_more);
}

TEST_P(DictionaryFailure, AddIntoAParkedRecordLeavesItParked) {
    expect_unchanged_by(
        [](Strings& table) {
            fill_to(table, 5);
            drop(table, 2);
            drop(table, 4);
        },
        add_one_more);
}

TEST_P(DictionaryFailure, AddThatGrowsTheInlineTableChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 28); }, add_one_more);
}

TEST_P(DictionaryFailure, AddThatGrowsATableOfTheHeapChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 124); }, add_one_more);
}

TEST_P(DictionaryFailure, AddThatGrowsWithAParkedRecordChangesNothing) {
    expect_unchanged_by(
        [](Strings& table) {
            fill_to(table, 28);
            drop(table, 3);
            put(table, 50);
            drop(table, 7);
            table.reSize(8);  // 27 entries in 32 slots of the heap
            put(table, 51);
            drop(table, 9);
            put(table, 52);
        },
        add_one_more);
}

TEST_P(DictionaryFailure, AddIfNotExistChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 28); },
                        [](Strings& table) { table.addIfNotExist("the key number 99", "no value yet"); });
}

TEST_P(DictionaryFailure, ResizeChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 20); }, [](Strings& table) { table.reSize(64); });
}

TEST_P(DictionaryFailure, RemovalWhoseCallbackGetsNoCopyChangesNothing) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 20); },
                        [](Strings& table) { table.removeKey("the key number 11"); });
}

// The last index is only a hint where to look first.
TEST_P(DictionaryFailure, RemovalOfTheRememberedKeyWhoseCallbackGetsNoCopyMayForgetTheLastIndexOnly) {
    _may_forget_last_index = true;
    expect_unchanged_by([](Strings& table) { fill_to(table, 12); },
                        [](Strings& table) { table.removeKeyIfExists("the key number 11"); });
}

TEST_P(DictionaryFailure, LookUpWhoseResultGetsNoCopyLeavesTheTableAlone) {
    expect_unchanged_by([](Strings& table) { fill_to(table, 12); },
                        [](Strings& table) { table.atKey("the key number 11"); });
}

TEST_P(DictionaryFailure, ConstructorOfALargeTableLosesNothing) {
    const long blocks = AllocationPlan::live_blocks();
    EXPECT_FALSE(survives([] { Strings table(17); }, 1, GetParam()));
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
}

// RemoveAll tells the callback entry by entry, so a failure may leave some of them removed. The rest
// must be whole, with clusters that wrap around slot 0 too.
struct Wrapping {
    TestKey key;
};
int compare(const Wrapping& a, const Wrapping& b) { return compare(a.key, b.key); }
unsigned long _kel_hash(const Wrapping& k) { return _kel_hash(k.key); }

int told = 0;
void note(Wrapping, CORBA_String_var) { ++told; }

TEST_P(DictionaryFailure, RemoveAllThatIsCutShortLeavesTheRestFindable) {
    const int entries = 14;
    for (int nth = 1; nth <= entries; ++nth) {
        KELDictionary<Wrapping, CORBA_String_var> table(16, note);
        for (int id = 0; id < entries; ++id) {
            table.add(Wrapping{TestKey{hash_for_home(static_cast<std::uint32_t>(id % 5 + 30) % 32, 5), id}},
                      "text");
        }
        told = 0;
        ASSERT_FALSE(survives([&] { table.removeAll(); }, nth, GetParam()));
        reset_faults();
        EXPECT_EQ(told, nth - 1);
        EXPECT_EQ(table.count(), static_cast<unsigned long>(entries - told));
        int found = 0;
        for (int id = 0; id < entries; ++id) {
            CORBA_String_var value;
            const std::uint32_t home = static_cast<std::uint32_t>(id % 5 + 30) % 32;
            if (table.atKey(Wrapping{TestKey{hash_for_home(home, 5), id}}, value)) ++found;
        }
        EXPECT_EQ(found, entries - told);
        table.removeAll();
        EXPECT_EQ(told, entries);
        EXPECT_EQ(table.count(), 0u);
    }
}

}  // namespace
}  // namespace test
}  // namespace kel
