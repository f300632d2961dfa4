// SPDX-License-Identifier: MIT
// A million random operations on dictionaries, each compared with a model of what a dictionary does.
//
// The model is written in terms of its own: slots in a vector, distances along the probe path, and
// records known by the order in which they were parked. The seeds are fixed; a failure names its seed
// and the number of the operation.
#include <gtest/gtest.h>
#include <kel/containers/dictionary.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>

#include <functional>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "tests/containers/mirrors.h"

namespace kel {
namespace test {
namespace {

typedef std::pair<int, int> Removal;  // key and value
std::vector<Removal> reported;        // what the dictionary told its callback

// The model. Keys are numbered; their hashes are in a table.
class Model {
public:
    struct Entry {
        int key;
        int value;
        const void* record;  // unknown until it has been seen
    };

    explicit Model(const std::vector<std::uint32_t>& hashes) : slots(32), _hashes(hashes) {}

    std::uint32_t capacity() const { return static_cast<std::uint32_t>(slots.size()); }

    std::uint32_t home(int key) const {
        const std::uint64_t product = std::uint64_t(_hashes[static_cast<std::size_t>(key)]) * 0x9E3779B9u;
        return static_cast<std::uint32_t>((product & 0xffffffffu) * slots.size() >> 32);
    }

    std::uint32_t find(int key) const {
        std::uint32_t i = home(key);
        while (slots[i] && slots[i]->key != key) i = below(i);
        return i;
    }

    bool holds(std::uint32_t i, int key) const { return i < capacity() && slots[i] && slots[i]->key == key; }

    bool add(int key, int value) {
        const std::uint32_t i = find(key);
        if (slots[i]) return false;
        const void* record = nullptr;
        if (!parked.empty()) {
            record = parked.back();
            parked.pop_back();
        }
        slots[i].reset(new Entry{key, value, record});
        last = i;
        ++count;
        if (count + 4 > capacity()) resize(2 * capacity());
        return true;
    }

    const Entry* look_up(int key) {
        if (holds(last, key)) return slots[last].get();
        const std::uint32_t i = find(key);
        if (slots[i]) last = i;
        return slots[i].get();
    }

    bool remove(int key) {
        const bool remembered = holds(last, key);
        const std::uint32_t i = remembered ? last : find(key);
        if (!slots[i]) return false;
        remove_at(i, true);
        if (remembered) last = 0;
        return true;
    }

    void remove_at(std::uint32_t i, bool notify) {
        if (i >= capacity() || !slots[i]) return;
        take_out(i, notify);
        --count;
        std::uint32_t hole = i;
        for (std::uint32_t j = below(i); slots[j]; j = below(j)) {
            const std::uint32_t from = home(slots[j]->key);
            if (distance(from, hole) > distance(from, j)) continue;
            slots[hole] = std::move(slots[j]);
            hole = j;
        }
    }

    void remove_all() {
        for (std::uint32_t i = 0; i < capacity(); ++i) {
            if (!slots[i]) continue;
            take_out(i, true);
            --count;
        }
    }

    void resize(std::uint32_t n) {
        std::uint32_t wanted = 1;
        while (wanted < (n != 0 ? n : 16)) wanted *= 2;
        wanted *= 2;
        while (wanted <= count) wanted *= 2;
        std::vector<std::unique_ptr<Entry>> old(wanted);
        old.swap(slots);
        for (std::unique_ptr<Entry>& entry : old) {
            if (!entry) continue;
            const std::uint32_t i = find(entry->key);
            slots[i] = std::move(entry);
        }
    }

    std::vector<std::unique_ptr<Entry>> slots;
    std::vector<const void*> parked;  // the last one is used first
    std::uint32_t count = 0;
    std::uint32_t last = 0;
    std::vector<Removal> removals;

private:
    std::uint32_t below(std::uint32_t i) const { return i == 0 ? capacity() - 1 : i - 1; }

    // Steps down from one slot to another.
    std::uint32_t distance(std::uint32_t from, std::uint32_t to) const {
        return from >= to ? from - to : from + capacity() - to;
    }

    void take_out(std::uint32_t i, bool notify) {
        if (notify) removals.emplace_back(slots[i]->key, slots[i]->value);
        if (parked.size() < 32) parked.push_back(slots[i]->record);
        slots[i].reset();
    }

    const std::vector<std::uint32_t>& _hashes;
};

// Kinds of keys. Each has a universe of numbered keys, their hashes and a way to read the number back.

struct IntegerKeys {
    typedef KELUniqueId Key;
    static Key make(const std::vector<std::uint32_t>& hashes, int i) {
        return KELUniqueId(hashes[static_cast<std::size_t>(i)]);
    }
};

struct ChosenKeys {
    typedef TestKey Key;
    static Key make(const std::vector<std::uint32_t>& hashes, int i) {
        return TestKey{hashes[static_cast<std::size_t>(i)], i};
    }
};

struct StringKeys {
    typedef CORBA_String_var Key;
    static std::string text(int i) { return "key-" + std::to_string(i); }
    static Key make(const std::vector<std::uint32_t>&, int i) { return Key(text(i).c_str()); }
};

// A dictionary and its model, led through the same operations.
template <class Keys>
class Pair {
public:
    typedef typename Keys::Key Key;
    typedef KELDictionary<Key, Removal> Table;

    Pair(unsigned seed, const std::vector<std::uint32_t>& hashes)
        : _random(seed), _hashes(hashes), _model(hashes), _table(16, report) {
        reported.clear();
        for (std::size_t i = 0; i < hashes.size(); ++i)
            _keys.push_back(Keys::make(hashes, static_cast<int>(i)));
    }

    // Does one random operation on both and compares what they give and what they have become.
    void step() {
        const int key = static_cast<int>(pick(_hashes.size()));
        const unsigned choice = pick(1000);
        if (choice < _insertions) {
            insert(key, choice % 2 == 0);
        } else if (choice < 700) {
            look_up(key, choice % 2 == 0);
        } else if (choice < 960) {
            remove(key, choice % 2 == 0);
        } else if (choice < 985) {
            remove_at(pick(_model.capacity() + 2), pick(3));
        } else if (choice < 997) {
            locate(key);
        } else if (choice < 999 || pick(4) != 0) {
            resize(pick(3 * _hashes.size()));
        } else {
            _table.removeAll();
            _model.remove_all();
        }
        if (pick(400) == 0) _insertions = 200 + pick(300);  // phases of growth and of decline
        compare_fields();
        if (_model.capacity() <= 64 || pick(32) == 0) compare_slots();
    }

    // Iteration and the rest of the slots.
    void finish() {
        compare_slots();
        typename Table::Iterator i(_table);
        for (std::uint32_t slot = 0; slot < _model.capacity(); ++slot) {
            if (!_model.slots[slot]) continue;
            ASSERT_NE(++i, nullptr);
            ASSERT_EQ(i.index(), slot);
        }
        ASSERT_EQ(++i, nullptr);
    }

private:
    // The value carries the number of its key, which the callback reports.
    static void report(Key, Removal value) { reported.push_back(value); }

    unsigned pick(std::size_t below) { return static_cast<unsigned>(_random() % below); }
    const Key& key_of(int key) const { return _keys[static_cast<std::size_t>(key)]; }

    void insert(int key, bool throwing) {
        const int value = ++_values;
        const bool expected = _model.add(key, value);
        bool inserted = true;
        if (throwing) {
            try {
                _table.add(key_of(key), Removal(key, value));
            } catch (const CORBA_BAD_PARAM&) {
                inserted = false;
            }
        } else {
            inserted = _table.addIfNotExist(key_of(key), Removal(key, value)) != 0;
        }
        ASSERT_EQ(inserted, expected);
        if (inserted) learn_record(key);
    }

    // A record from the pool must be the one parked last; a new one is noted.
    void learn_record(int key) {
        const std::uint32_t i = _model.find(key);
        const void* const record = mirror_of(_table).table[i];
        if (_model.slots[i]->record != nullptr) {
            ASSERT_EQ(record, _model.slots[i]->record);
        }
        _model.slots[i]->record = record;
    }

    void look_up(int key, bool throwing) {
        const Model::Entry* const entry = _model.look_up(key);
        Removal value(-1, -1);
        bool found = true;
        if (throwing) {
            try {
                value = _table.atKey(key_of(key));
            } catch (const CORBA_OBJECT_NOT_EXIST&) {
                found = false;
            }
        } else {
            found = _table.atKey(key_of(key), value) != 0;
        }
        ASSERT_EQ(found, entry != nullptr);
        ASSERT_EQ(value, found ? Removal(key, entry->value) : Removal(-1, -1));
    }

    void remove(int key, bool throwing) {
        const bool expected = _model.remove(key);
        bool removed = true;
        if (throwing) {
            try {
                _table.removeKey(key_of(key));
            } catch (const CORBA_OBJECT_NOT_EXIST&) {
                removed = false;
            }
        } else {
            removed = _table.removeKeyIfExists(key_of(key)) != 0;
        }
        ASSERT_EQ(removed, expected);
    }

    void remove_at(std::uint32_t i, unsigned long notify) {
        _model.remove_at(i, notify != 0);
        _table._removeAtIndex(i, notify);
    }

    void locate(int key) { ASSERT_EQ(_table.findIndexOf(key_of(key)), _model.find(key)); }

    void resize(std::uint32_t n) {
        _model.resize(n);
        _table.reSize(n);
    }

    void compare_fields() {
        const PlainMirror fields = mirror_of(_table);
        ASSERT_EQ(fields.capacity, _model.capacity());
        ASSERT_EQ(fields.count, _model.count);
        ASSERT_EQ(fields.last_index, _model.last);
        ASSERT_EQ(fields.mask, _model.capacity() - 1);
        ASSERT_EQ(1u << fields.bits, _model.capacity());
        ASSERT_EQ(fields.free_count, _model.parked.size());
        ASSERT_EQ(reported.size(), _model.removals.size());
        ASSERT_TRUE(reported == _model.removals);
        reported.clear();
        _model.removals.clear();
    }

    void compare_slots() {
        const PlainMirror fields = mirror_of(_table);
        for (std::uint32_t i = 0; i < _model.capacity(); ++i) {
            const typename Table::Assoc* const entry =
                static_cast<const typename Table::Assoc*>(fields.table[i]);
            ASSERT_EQ(entry != nullptr, _model.slots[i] != nullptr) << "slot " << i;
            if (entry == nullptr) continue;
            ASSERT_EQ(static_cast<const void*>(entry), _model.slots[i]->record) << "slot " << i;
            ASSERT_EQ(entry->_value, Removal(_model.slots[i]->key, _model.slots[i]->value)) << "slot " << i;
            ASSERT_EQ(compare(entry->_key, key_of(_model.slots[i]->key)), 0) << "slot " << i;
        }
        for (std::size_t i = 0; i < _model.parked.size(); ++i) ASSERT_EQ(fields.pool[i], _model.parked[i]);
    }

    std::mt19937 _random;
    const std::vector<std::uint32_t>& _hashes;
    std::vector<Key> _keys;
    Model _model;
    Table _table;
    int _values = 0;
    unsigned _insertions = 350;
};

template <class Keys>
void run(const std::vector<std::uint32_t>& hashes, int operations) {
    const int runs = 5;
    for (unsigned seed = 1; seed <= runs; ++seed) {
        Pair<Keys> pair(seed, hashes);
        for (int n = 0; n < operations / runs; ++n) {
            pair.step();
            if (::testing::Test::HasFatalFailure()) FAIL() << "seed " << seed << ", operation " << n;
        }
        pair.finish();
    }
}

std::vector<std::uint32_t> hashes(int n, const std::function<std::uint32_t(std::uint32_t)>& hash) {
    std::vector<std::uint32_t> made;
    for (int i = 0; i < n; ++i) made.push_back(hash(static_cast<std::uint32_t>(i)));
    return made;
}

TEST(DictionaryModel, AgreesOnConsecutiveIntegers) {
    run<IntegerKeys>(hashes(60, [](std::uint32_t i) { return i; }), 200000);
}

TEST(DictionaryModel, AgreesOnManyScatteredIntegers) {
    std::mt19937 random(7);
    run<IntegerKeys>(hashes(1500, [&](std::uint32_t) { return static_cast<std::uint32_t>(random()); }),
                     150000);
}

TEST(DictionaryModel, AgreesOnAddressesOfAlignedObjects) {
    run<IntegerKeys>(hashes(200, [](std::uint32_t i) { return 0xbf800000u + 64 * i; }), 150000);
}

TEST(DictionaryModel, AgreesOnKeysOfASingleHash) {
    run<ChosenKeys>(hashes(40, [](std::uint32_t) { return 0x12345678u; }), 150000);
}

TEST(DictionaryModel, AgreesOnClustersThatWrapAroundSlotZero) {
    run<ChosenKeys>(hashes(27, [](std::uint32_t i) { return hash_for_home((i % 6 + 29) % 32, 5); }), 200000);
}

TEST(DictionaryModel, AgreesOnStrings) {
    run<StringKeys>(hashes(90,
                           [](std::uint32_t i) {
                               return static_cast<std::uint32_t>(
                                   CORBA::hash(StringKeys::text(static_cast<int>(i)).c_str()));
                           }),
                    150000);
}

}  // namespace
}  // namespace test
}  // namespace kel
