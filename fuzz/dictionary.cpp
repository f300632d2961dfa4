// The dictionaries: any sequence of operations leaves the table that the model says, slot by slot.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>

#include "fuzz/dictionary_keys.h"
#include "fuzz/dictionary_model.h"
#include "fuzz/target.h"
#include "tests/containers/mirrors.h"

namespace kel {
namespace fuzz {
namespace {

// Slot arrays of the most slots that the model has, but not of more.
constexpr std::size_t slot_memory = SlotModel::most_slots * sizeof(void*);

// ---- a table and its model, led through the same operations ----

template <class Kind, class Table>
class Pair {
public:
    Pair(std::uint32_t slots, SlotModel& model) : _table(slots, told), _model(model) { _watched = &model; }

    // The table tells of what is left in it, after this.
    ~Pair() { expect_removals(0); }

    // How many removals the callback has heard of since expect_removals.
    static unsigned removals() { return _removals; }

    void operate(std::uint8_t operation, std::uint8_t argument);
    void compare_all();

private:
    typedef typename Kind::Key Key;
    typedef typename Kind::Value Value;

    // The table keeps no context for its callback.
    static void told(Key key, Value value);
    static void expect_removals(std::uint32_t from_slot);

    void add(int key, int value);
    void add_or_refuse(int key, int value);
    void look_up(int key, int value);
    void look_up_or_refuse(int key);
    void remove(int key);
    void remove_or_refuse(int key);
    void remove_slot(std::uint32_t slot, unsigned long notify);
    void remove_all();
    void resize(unsigned long n);
    void set_capacity_again();
    void iterate();
    void compare_fields();

    Table _table;
    SlotModel& _model;

    static const SlotModel* _watched;
    static std::uint32_t _next_slot;  // where the callback looks for the entry it hears of
    static unsigned _removals;
};

template <class Kind, class Table>
const SlotModel* Pair<Kind, Table>::_watched;
template <class Kind, class Table>
std::uint32_t Pair<Kind, Table>::_next_slot;
template <class Kind, class Table>
unsigned Pair<Kind, Table>::_removals;

template <class Kind, class Table>
void Pair<Kind, Table>::expect_removals(std::uint32_t from_slot) {
    _next_slot = from_slot;
    _removals = 0;
}

// The entries go in slot order, and the model still has them.
template <class Kind, class Table>
void Pair<Kind, Table>::told(Key key, Value value) {
    while (_watched->key_in(_next_slot) == SlotModel::none) {
        KEL_REQUIRE(++_next_slot < _watched->capacity());
    }
    const int number = _watched->key_in(_next_slot++);
    KEL_REQUIRE(compare(key, Kind::key(number)) == 0 && Kind::is(value, _watched->value_of(number)));
    ++_removals;
}

template <class Kind, class Table>
void Pair<Kind, Table>::operate(std::uint8_t operation, std::uint8_t argument) {
    const int key = argument % key_count;
    const int value = operation / 16 % value_count;
    switch (operation % 16) {
        case 0:
            add_or_refuse(key, value);
            break;
        case 1:
            look_up_or_refuse(key);
            break;
        case 2:
            remove_or_refuse(key);
            break;
        case 3:
        case 4:
            look_up(key, value);
            break;
        case 5:
        case 6:
            remove(key);
            break;
        case 7:
            remove_slot(argument % (_model.capacity() + 2), static_cast<unsigned long>(value));
            break;
        case 8:
            KEL_REQUIRE(_table.findIndexOf(Kind::key(key)) == _model.find(key));
            break;
        case 9:
            if (value == 0) remove_all();
            set_capacity_again();
            break;
        case 10:
            resize(argument);
            break;
        case 11:  // about a power of two, and so often far too large
            resize((1ul << argument % 32) + (value & 3) - 1);
            break;
        case 12:
            iterate();
            break;
        case 13:
            for (int i = 0; i < 2 * value; ++i) add((key + i) % key_count, i % value_count);
            break;
        case 14:
            for (int i = 0; i < 2 * value; ++i) remove((key + i) % key_count);
            break;
        default:
            add(key, value);
    }
    compare_fields();
}

template <class Kind, class Table>
void Pair<Kind, Table>::add(int key, int value) {
    const bool added = _table.addIfNotExist(Kind::key(key), Kind::value(value)) != 0;
    KEL_REQUIRE(added == _model.add(key, value));
}

template <class Kind, class Table>
void Pair<Kind, Table>::add_or_refuse(int key, int value) {
    try {
        _table.add(Kind::key(key), Kind::value(value));
        KEL_REQUIRE(_model.add(key, value));
    } catch (const CORBA_BAD_PARAM&) {
        KEL_REQUIRE(_model.has(key));
    }
}

template <class Kind, class Table>
void Pair<Kind, Table>::look_up(int key, int value) {
    Value found = Kind::value(value);
    const bool there = _table.atKey(Kind::key(key), found) != 0;
    KEL_REQUIRE(there == _model.look_up(key));
    KEL_REQUIRE(Kind::is(found, there ? _model.value_of(key) : value));
}

template <class Kind, class Table>
void Pair<Kind, Table>::look_up_or_refuse(int key) {
    try {
        const Value found = _table.atKey(Kind::key(key));
        KEL_REQUIRE(_model.look_up(key) && Kind::is(found, _model.value_of(key)));
    } catch (const CORBA_OBJECT_NOT_EXIST&) {
        KEL_REQUIRE(!_model.has(key));
    }
}

template <class Kind, class Table>
void Pair<Kind, Table>::remove(int key) {
    expect_removals(_model.find(key));
    const bool removed = _table.removeKeyIfExists(Kind::key(key)) != 0;
    KEL_REQUIRE(removed == _model.remove(key) && _removals == (removed ? 1 : 0));
}

template <class Kind, class Table>
void Pair<Kind, Table>::remove_or_refuse(int key) {
    expect_removals(_model.find(key));
    try {
        _table.removeKey(Kind::key(key));
        KEL_REQUIRE(_model.remove(key) && _removals == 1);
    } catch (const CORBA_OBJECT_NOT_EXIST&) {
        KEL_REQUIRE(!_model.has(key));
    }
}

template <class Kind, class Table>
void Pair<Kind, Table>::remove_slot(std::uint32_t slot, unsigned long notify) {
    const bool tells = notify != 0 && _model.key_in(slot) != SlotModel::none;
    expect_removals(slot);
    _table._removeAtIndex(slot, notify);
    _model.remove_slot(slot);
    KEL_REQUIRE(_removals == (tells ? 1 : 0));
}

template <class Kind, class Table>
void Pair<Kind, Table>::remove_all() {
    expect_removals(0);
    _table.removeAll();
    KEL_REQUIRE(_removals == _model.count());
    _model.remove_all();
}

// A table too large for the memory changes nothing.
template <class Kind, class Table>
void Pair<Kind, Table>::resize(unsigned long n) {
    const bool fits = _model.slots_after_resize(n) <= SlotModel::most_slots;
    try {
        _table.reSize(n);
        KEL_REQUIRE(fits);
        _model.resize(n);
    } catch (const std::bad_alloc&) {
        KEL_REQUIRE(!fits);
    }
}

// Of an empty table, and to what it has, so that nothing is lost.
template <class Kind, class Table>
void Pair<Kind, Table>::set_capacity_again() {
    if (_model.count() == 0) KEL_REQUIRE(_table.setCapacity(_model.capacity() / 2) == _model.capacity());
}

template <class Kind, class Table>
void Pair<Kind, Table>::iterate() {
    typename Table::Iterator i(_table);
    for (std::uint32_t slot = 0; slot < _model.capacity(); ++slot) {
        const int key = _model.key_in(slot);
        if (key == SlotModel::none) continue;
        const typename Table::Assoc* const entry = ++i;
        KEL_REQUIRE(entry != nullptr && i.index() == slot && entry == i.entry());
        KEL_REQUIRE(compare(entry->_key, Kind::key(key)) == 0 &&
                    Kind::is(entry->_value, _model.value_of(key)));
    }
    KEL_REQUIRE(++i == nullptr && ++i == nullptr && i.index() == _model.capacity() - 1);
}

template <class Kind, class Table>
void Pair<Kind, Table>::compare_fields() {
    const auto fields = kel::test::mirror_of(_table);
    KEL_REQUIRE(fields.capacity == _model.capacity() && fields.mask == _model.capacity() - 1);
    KEL_REQUIRE(fields.count == _model.count() && 1u << fields.bits == _model.capacity());
    KEL_REQUIRE(fields.last_index == _model.last() && fields.free_count == _model.parked());
    KEL_REQUIRE(_table.count() == fields.count && _table.capacity() == fields.capacity);
}

template <class Kind, class Table>
void Pair<Kind, Table>::compare_all() {
    iterate();
    for (int key = 0; key < key_count; ++key) {
        KEL_REQUIRE(!_model.has(key) || _model.key_in(_model.find(key)) == key);
    }
}

template <class Kind, class Table>
void run(Bytes& input) {
    const std::uint32_t n = input.byte() % 128u;
    SlotModel model(Kind::hashes(), static_cast<std::uint32_t>(SlotModel::slots_for(n)));
    {
        Pair<Kind, Table> pair(n, model);
        for (int i = 0; i < 64 && !input.empty(); ++i) {
            const std::uint8_t operation = input.byte();
            pair.operate(operation, input.byte());
        }
        pair.compare_all();
    }
    KEL_REQUIRE((Pair<Kind, Table>::removals() == model.count()));
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    largest_block = slot_memory;
    Bytes input(data, size);
    switch (input.byte() % 4) {
        case 0:
            run<IntegerKeys, KELDictionary<KELUniqueId, int>>(input);
            break;
        case 1:
            run<BorrowedTexts, KELDictionary<KELStringWrapper, int>>(input);
            break;
        case 2:
            run<IntegerKeys, KELDictionary_r<KELUniqueId, int>>(input);
            break;
        default:
            run<OwnedTexts, KELDictionary_r<CORBA_String_var, CORBA_String_var>>(input);
    }
    largest_block = most_memory;
    return 0;
}
