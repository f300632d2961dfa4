// What a dictionary must be: which slot holds which key, which value belongs to it, and which slot is
// remembered.
//
//   SlotModel   keys are small numbers; their hashes are given
//
//     SlotModel model(hashes, 32);
//     KEL_REQUIRE(table.addIfNotExist(key, value) == model.add(number, value));
//
// It thinks in distances along the probe path, not in masks, and finds what moves into a hole by its
// distance from home. The values lie beside it, by key, and know nothing of slots.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_DICTIONARY_MODEL_H
#define KEL_FUZZ_DICTIONARY_MODEL_H

#include "fuzz/target.h"

namespace kel {
namespace fuzz {

class SlotModel {
public:
    static constexpr int none = -1;
    static constexpr int keys = 64;
    static constexpr std::uint32_t most_slots = 1024;

    SlotModel(const std::uint32_t* hashes, std::uint32_t capacity) : _hashes(hashes) { clear(capacity); }

    std::uint32_t capacity() const { return _capacity; }
    std::uint32_t count() const { return _count; }
    std::uint32_t last() const { return _last; }
    std::uint32_t parked() const { return _parked; }
    int key_in(std::uint32_t slot) const { return slot < _capacity ? _slots[slot] : none; }
    bool has(int key) const { return _present[key]; }
    int value_of(int key) const { return _values[key]; }

    // Twice the next power of two, a power of two included.
    static std::uint64_t slots_for(std::uint64_t n) {
        std::uint64_t slots = 1;
        while (slots < n) slots *= 2;
        return n == 0 ? 1 : 2 * slots;
    }

    std::uint32_t find(int key) const {
        std::uint32_t slot = home(key);
        while (_slots[slot] != none && _slots[slot] != key) slot = below(slot);
        return slot;
    }

    bool add(int key, int value) {
        if (_present[key]) return false;
        _last = find(key);
        _slots[_last] = static_cast<std::int8_t>(key);
        _present[key] = true;
        _values[key] = value;
        if (_parked > 0) --_parked;
        if (++_count + 4 > _capacity) resize(2 * _capacity);
        return true;
    }

    bool look_up(int key) {
        if (_present[key]) _last = find(key);
        return _present[key];
    }

    bool remove(int key) {
        if (!_present[key]) return false;
        const bool remembered = key_in(_last) == key;
        remove_slot(find(key));
        if (remembered) _last = 0;
        return true;
    }

    void remove_slot(std::uint32_t slot) {
        if (key_in(slot) == none) return;
        forget(slot);
        std::uint32_t hole = slot;
        for (std::uint32_t j = below(slot); _slots[j] != none; j = below(j)) {
            const std::uint32_t from = home(_slots[j]);
            if (steps(from, hole) > steps(from, j)) continue;
            _slots[hole] = _slots[j];
            _slots[j] = none;
            hole = j;
        }
    }

    void remove_all() {
        for (std::uint32_t i = 0; i < _capacity; ++i) {
            if (_slots[i] != none) forget(i);
        }
    }

    // The slots that a resize to `n` gives, which must hold what is there.
    std::uint64_t slots_after_resize(std::uint64_t n) const {
        std::uint64_t slots = slots_for(n == 0 ? 16 : n);
        while (slots <= _count) slots *= 2;
        return slots;
    }

    void resize(std::uint64_t n) {
        std::int8_t before[most_slots];
        const std::uint32_t capacity_before = _capacity;
        std::copy(_slots, _slots + capacity_before, before);
        set_capacity(slots_after_resize(n));
        for (std::uint32_t i = 0; i < capacity_before; ++i) {
            if (before[i] != none) _slots[find(before[i])] = before[i];
        }
    }

private:
    void clear(std::uint32_t capacity) {
        set_capacity(capacity);
        std::fill(_present, _present + keys, false);
    }

    void set_capacity(std::uint64_t capacity) {
        KEL_REQUIRE(capacity <= most_slots);
        _capacity = static_cast<std::uint32_t>(capacity);
        std::memset(_slots, none, _capacity);
    }

    // The top of the product, as a fraction of the capacity.
    std::uint32_t home(int key) const {
        const std::uint32_t product = _hashes[key] * 0x9E3779B9u;
        return static_cast<std::uint32_t>(std::uint64_t(product) * _capacity >> 32);
    }

    std::uint32_t below(std::uint32_t slot) const { return slot == 0 ? _capacity - 1 : slot - 1; }

    // Steps down from one slot to another.
    std::uint32_t steps(std::uint32_t from, std::uint32_t to) const {
        return from >= to ? from - to : from + _capacity - to;
    }

    void forget(std::uint32_t slot) {
        _present[_slots[slot]] = false;
        _slots[slot] = none;
        --_count;
        if (_parked < 32) ++_parked;
    }

    const std::uint32_t* _hashes;
    std::uint32_t _capacity = 0;
    std::uint32_t _count = 0;
    std::uint32_t _last = 0;
    std::uint32_t _parked = 0;
    std::int8_t _slots[most_slots];
    bool _present[keys];
    int _values[keys];
};

}  // namespace fuzz
}  // namespace kel

#endif
