// The library's associative container: a hash table that keeps one record for each key.
//
//   KELDictionary<K,V>      the table; whoever owns it locks around it
//   KELDictionary_r<K,V>    the same with a reader-writer lock inside for its owner to take; strings
//                           are released as soon as their entry is removed
//   ::Assoc                 a record: the key, then the value
//   ::Iterator              visits the records in slot order
//
//     KELDictionary<KELStringWrapper, Codec*> codecs;
//     if (!codecs.addIfNotExist("latin-1", &latin1)) report_duplicate();
//     Codec* codec = 0;
//     if (codecs.atKey(name, codec)) codec->use();
//
// A key type K is copied and assigned, and has two functions beside it (found by its namespace),
// neither of which may throw:
//
//     int compare(const K&, const K&);          // 0 when the keys are equal
//     unsigned long _kel_hash(const K&);        // its low 32 bits count
//
// How it works. Slots hold pointers to records. A key starts at its home slot, the top bits of its
// hash times the golden ratio, and probes towards lower slots, wrapping at 0. The first 32 slots lie
// in the object. The slot found or filled last is remembered, so that the next operation on the same
// key costs one comparison. Up to 32 records of removed entries are kept for the next insertions.
//
// Threads. No operation locks. Even a look-up writes the remembered slot: look-ups of several threads
// at once do no harm as long as nobody changes the table, anything else needs exclusive access.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CONTAINERS_DICTIONARY_H
#define KEL_CONTAINERS_DICTIONARY_H

#include <kel/config.h>
#include <kel/containers/strings.h>
#include <kel/core/rwlock.h>
#include <kel/exceptions/raise.h>
#include <kel/fwd.h>

#include <new>
#include <type_traits>

namespace kel {
namespace internal {

// The two tables differ in what lies between their inline slots and their pool, and in what happens
// to an entry that is recycled. The free count is part of the difference: an empty lock in front of
// it would occupy a byte and move it.
struct PlainPoolHead {
    PlainPoolHead() : _free_count(0) {}

    // The record keeps its key and value until it is used again.
    template <class K, class V>
    static void release(K&, V&) {}

    std::uint16_t _free_count;
};
static_assert(sizeof(PlainPoolHead) == 2, "the plain table has nothing but the free count here");

struct LockedPoolHead {
    LockedPoolHead() : _free_count(0) {}

    template <class K, class V>
    static void release(K& key, V& value) {
        drop(key);
        drop(value);
    }

    KELRWLock _rwlock;
    std::uint16_t _free_count;

private:
    // A holder that is emptied frees its string and forgets the buffer's size.
    static void drop(CORBA_String_var& s) { s = static_cast<char*>(0); }
    template <class T>
    static void drop(T&) {}
};

// The table itself, with the operations that both dictionaries have.
template <class K, class V, class PoolHead>
class HashTable {
public:
    // An entry.
    struct Assoc {
        // Must not be changed while the entry is in the table.
        K _key;
        // May be changed in place.
        V _value;
    };

    // Called with copies of the key and the value of an entry that is about to be removed.
    typedef void (*RemoveCallback)(K, V);

    // Stands before slot 0 until it is advanced. Changing the table invalidates it.
    class Iterator {
    public:
        // Begins before slot 0 of `table`, which must outlive the iterator.
        explicit Iterator(HashTable& table) : _dictionary(&table), _entry(0), _index(kBeforeFirst) {}

        // Moves on to the next record and returns it; null when there is none left. One that has
        // reached the last slot stays there as it is and gives null.
        Assoc* operator++() {
            if (at_last_slot()) return 0;
            do {
                _entry = _dictionary->_table[++_index];
            } while (_entry == 0 && !at_last_slot());
            return _entry;
        }

        // The record in the slot reached, null when that is empty; its key must not be changed. When
        // the last slot is taken, its record is also there after the end.
        Assoc* entry() const { return _entry; }

        // The slot reached; the greatest unsigned long before the first step.
        unsigned long index() const { return _index; }

    private:
        static const unsigned long kBeforeFirst = static_cast<unsigned long>(-1);

        // Before the first slot the sum wraps to 0.
        bool at_last_slot() const { return _index + 1 >= _dictionary->_capacity; }

        HashTable* _dictionary;
        Assoc* _entry;
        unsigned long _index;
    };

    HashTable(const HashTable&) = delete;
    HashTable& operator=(const HashTable&) = delete;

    // The number of slots.
    unsigned long capacity() const { return _capacity; }
    // The number of entries.
    unsigned long count() const { return _count; }

    // The slot that holds `k` or, when it is absent, the empty slot into which it would go.
    std::uint32_t findIndexOf(const K& k) const {
        std::uint32_t i = home_of(k);
        while (_table[i] != 0 && !same(_table[i]->_key, k)) i = (i - 1) & _mask;
        return i;
    }

    // Inserts. CORBA::BAD_PARAM when the key is present, std::bad_alloc when there is no memory;
    // the table is unchanged then.
    void add(K k, V v) {
        if (!insert(k, v)) raise_bad_param();
    }

    // Inserts and returns 1; returns 0 and changes nothing when the key is present. Throws
    // std::bad_alloc with the table unchanged.
    unsigned char addIfNotExist(K k, V v) { return insert(k, v); }

    // 1 and the value in `out`, or 0 and `out` untouched.
    unsigned char atKey(const K& k, V& out) {
        const Assoc* const entry = find(k);
        if (entry == 0) return 0;
        out = entry->_value;
        return 1;
    }

    // The value; CORBA::OBJECT_NOT_EXIST when the key is absent.
    V atKey(const K& k) {
        const Assoc* const entry = find(k);
        if (entry == 0) raise_object_not_exist();
        return entry->_value;
    }

    // Removes; CORBA::OBJECT_NOT_EXIST when the key is absent. The callback hears of it.
    void removeKey(const K& k) {
        if (!removeKeyIfExists(k)) raise_object_not_exist();
    }

    // Removes and returns 1, or returns 0. The callback hears of it.
    //
    // Deliberate: only a key found through the remembered slot takes that memory along, and removeAll
    // keeps it; a stale slot is noticed when it is used. Pinned by
    // DictionaryRemoval.RemovingTheRememberedKeyZeroesTheLastIndex,
    // DictionaryRemoval.RemovingAnotherKeyLeavesTheLastIndexAlone and
    // DictionaryRemoval.RemoveAllLeavesTheLastIndexAlone.
    unsigned char removeKeyIfExists(const K& k) {
        const std::uint32_t last = remembered();
        if (holds(last, k)) {
            remember(0);
            _removeAtIndex(last, 1);
            return 1;
        }
        const std::uint32_t i = findIndexOf(k);
        if (_table[i] == 0) return 0;
        _removeAtIndex(i, 1);
        return 1;
    }

    // Removes the entry in slot `index`; nothing happens when there is none. The callback hears of it
    // first unless `notify` is 0. Deliberate: any other number is a yes. Pinned by
    // DictionaryRemoval.CallbackOfARemovalBySlotDependsOnNotify.
    void _removeAtIndex(unsigned long index, unsigned long notify) {
        if (index >= _capacity || _table[index] == 0) return;
        if (notify != 0) tell(_table[index]);
        recycle(_table[index]);
        close_hole(static_cast<std::uint32_t>(index));
        --_count;
    }

    // Removes every entry in slot order; the callback hears of each. Keeps the slots.
    void removeAll() {
        for (std::uint32_t i = 0; i < _capacity && _count != 0; ++i) {
            if (_table[i] == 0) continue;
            tell_or_restore_order(_table[i]);
            recycle(_table[i]);
            --_count;
            _table[i] = 0;
        }
    }

    // Rebuilds the table on the heap with the capacity of setCapacity(n), where 0 stands for 16 and
    // an n that has no room for the present entries is raised. Throws std::bad_alloc with the table
    // unchanged.
    void reSize(unsigned long n) {
        if (n == 0) n = 16;
        while (capacity_for(n) <= _count) n *= 2;
        NewSlots slots(capacity_for(n));
        move_into(slots.take(), n);
    }

    // The first step of reSize and of no use without the others: sets the probing to the capacity
    // for `n` slots, which it returns, and the count to 0. Whoever calls it on a table in use has
    // lost the entries. Throws std::bad_alloc for a capacity beyond 2^31.
    unsigned long setCapacity(unsigned long n) {
        const std::uint32_t bits = bits_for(n);
        _bits = bits;
        _mask = (std::uint32_t(1) << bits) - 1;
        _count = 0;
        return capacity_for(n);
    }

protected:
    // The slots for `n` by the rule of setCapacity. Throws std::bad_alloc.
    HashTable(unsigned long n, RemoveCallback on_remove)
        : _capacity(0),
          _count(0),
          _table(_inline_table),
          _inline_table(),
          _pool(),
          _last_index(0),
          _bits(0),
          _mask(0),
          _on_remove(on_remove) {
        _capacity = static_cast<std::uint32_t>(setCapacity(n));
        if (_capacity > kInlineSlots) _table = new Assoc*[_capacity]();
    }

    ~HashTable() {
        const bool unheard = _on_remove == 0 && std::is_trivially_destructible<Assoc>::value;
        unheard ? delete_entries() : removeAll();
        if (_table != _inline_table) delete[] _table;
        while (_pool_head._free_count > 0) delete _pool[--_pool_head._free_count];
    }

    // The part in which the two tables differ.
    PoolHead& pool_head() { return _pool_head; }

private:
    static const std::uint32_t kInlineSlots = 32;
    static const std::uint16_t kPoolSize = 32;

    // Owns a slot array, all null, until the table takes it over.
    class NewSlots {
    public:
        explicit NewSlots(std::uint32_t length) : _slots(new Assoc*[length]()) {}
        ~NewSlots() { delete[] _slots; }
        NewSlots(const NewSlots&) = delete;
        NewSlots& operator=(const NewSlots&) = delete;

        Assoc** take() {
            Assoc** const slots = _slots;
            _slots = 0;
            return slots;
        }

    private:
        Assoc** _slots;
    };

    // Deliberate: a power of two doubles as well (16 gives 32 slots). The growth points and the
    // iteration order follow from it. Pinned by DictionaryCapacity.ResizeToSixteenGivesThirtyTwoSlots.
    static std::uint32_t bits_for(unsigned long n) {
        std::uint32_t bits = 0;
        for (unsigned long rest = n; rest != 0; rest >>= 1) ++bits;
        if ((n & (n - 1)) != 0) ++bits;
        if (bits > 31) throw std::bad_alloc();
        return bits;
    }

    static std::uint32_t capacity_for(unsigned long n) { return std::uint32_t(1) << bits_for(n); }

    static bool same(const K& a, const K& b) { return compare(a, b) == 0; }

    // Fibonacci hashing. A table of one slot has no bits: its shift is 0 and its mask finds slot 0.
    std::uint32_t home_of(const K& k) const {
        const std::uint32_t spread = static_cast<std::uint32_t>(_kel_hash(k)) * 0x9E3779B9u;
        return (spread >> ((32 - _bits) & 31)) & _mask;
    }

    // Threads that only look up share the remembered slot. Each reads it once and trusts nothing but
    // what it then finds there, so a stale number costs a probe and no more.
    std::uint32_t remembered() const { return __atomic_load_n(&_last_index, __ATOMIC_RELAXED); }
    void remember(std::uint32_t i) { __atomic_store_n(&_last_index, i, __ATOMIC_RELAXED); }

    // The remembered slot may lie beyond a table that has been made smaller.
    bool holds(std::uint32_t i, const K& k) const {
        return i < _capacity && _table[i] != 0 && same(_table[i]->_key, k);
    }

    Assoc* find(const K& k) {
        const std::uint32_t last = remembered();
        if (holds(last, k)) return _table[last];
        const std::uint32_t i = findIndexOf(k);
        if (_table[i] != 0) remember(i);
        return _table[i];
    }

    bool insert(const K& k, const V& v) {
        const std::uint32_t i = findIndexOf(k);
        if (_table[i] != 0) return false;
        if (_count + 5 > _capacity) {
            place_and_grow(i, k, v);
        } else {
            place(i, k, v);
        }
        return true;
    }

    void place(std::uint32_t i, const K& k, const V& v) {
        _table[i] = take_record(k, v);
        ++_count;
        remember(i);
    }

    // Growing keeps at least four slots empty. Everything that may throw comes first: the larger
    // array, then the record. Not in line: filling a table takes a tenth less time without it there.
    __attribute__((noinline)) void place_and_grow(std::uint32_t i, const K& k, const V& v) {
        const unsigned long n = 2ul * _capacity;
        NewSlots slots(capacity_for(n));
        place(i, k, v);
        move_into(slots.take(), n);
    }

    // A parked record counts as free until it has its new key and value.
    Assoc* take_record(const K& k, const V& v) {
        if (_pool_head._free_count == 0) return new Assoc{k, v};
        Assoc* const record = _pool[_pool_head._free_count - 1];
        record->_key = k;
        record->_value = v;
        --_pool_head._free_count;
        return record;
    }

    // What removeAll comes to when nobody hears of it, not even the entries: a third of its steps.
    void delete_entries() {
        for (std::uint32_t i = 0; i < _capacity && _count != 0; ++i) {
            if (_table[i] == 0) continue;
            delete _table[i];
            --_count;
        }
    }

    void recycle(Assoc* record) {
        PoolHead::release(record->_key, record->_value);
        if (_pool_head._free_count < kPoolSize) {
            _pool[_pool_head._free_count++] = record;
        } else {
            delete record;
        }
    }

    // `slots` has the capacity for `n`. The remembered slot is not touched: its number may mean
    // another entry now, which a look-up notices.
    void move_into(Assoc** slots, unsigned long n) {
        Assoc** const old_table = _table;
        const std::uint32_t old_capacity = _capacity;
        const bool was_empty = _count == 0;
        _capacity = static_cast<std::uint32_t>(setCapacity(n));
        _table = slots;
        for (std::uint32_t i = 0; i < old_capacity && !was_empty; ++i) {
            if (old_table[i] == 0) continue;
            put_back(old_table[i]);
            ++_count;
        }
        if (old_table != _inline_table) delete[] old_table;
    }

    // The keys of a table differ from one another: there is nothing to compare.
    void put_back(Assoc* entry) {
        std::uint32_t i = home_of(entry->_key);
        while (_table[i] != 0) i = (i - 1) & _mask;
        _table[i] = entry;
    }

    void tell(const Assoc* entry) const {
        if (_on_remove != 0) _on_remove(entry->_key, entry->_value);
    }

    // Fills the hole with the next entry whose probe path passes it, and goes on with the hole that
    // this entry leaves, down to the end of the cluster.
    void close_hole(std::uint32_t hole) {
        _table[hole] = 0;
        for (std::uint32_t j = (hole - 1) & _mask; _table[j] != 0; j = (j - 1) & _mask) {
            if (!passes(home_of(_table[j]->_key), hole, j)) continue;
            _table[hole] = _table[j];
            _table[j] = 0;
            hole = j;
        }
    }

    // Whether going down from `home` one reaches `hole` before `slot`.
    static bool passes(std::uint32_t home, std::uint32_t hole, std::uint32_t slot) {
        if (slot <= home) return slot < hole && hole <= home;
        return !(home < hole && hole < slot);
    }

    // The callback gets copies, and making them may throw while removeAll has emptied some of the
    // lower slots. Entries that wrapped around slot 0 would then be cut off from their home: the
    // cluster at the top is placed anew.
    void tell_or_restore_order(const Assoc* entry) {
        try {
            tell(entry);
        } catch (...) {
            for (std::uint32_t j = _mask; _table[j] != 0; j = (j - 1) & _mask) {
                Assoc* const moved = _table[j];
                _table[j] = 0;
                put_back(moved);
            }
            throw;
        }
    }

    std::uint32_t _capacity;
    std::uint32_t _count;
    Assoc** _table;
    Assoc* _inline_table[kInlineSlots];
    PoolHead _pool_head;
    Assoc* _pool[kPoolSize];
    std::uint32_t _last_index;
    std::uint32_t _bits;
    std::uint32_t _mask;
    RemoveCallback _on_remove;
};

}  // namespace internal
}  // namespace kel

// Associative container without a lock.
//
// `slots` is the number of slots wished for and passes the rule of setCapacity, so that the default
// gives the 32 slots that lie in the object. `on_remove`, when given, is called with a copy of the key
// and of the value of every entry before it is removed, by the destructor too; it must not change the
// table. What the values point to stays the caller's.
//
//   capacity() count()                slots, entries
//   add addIfNotExist                 insert
//   atKey                             look up
//   removeKey removeKeyIfExists removeAll
//   findIndexOf _removeAtIndex reSize setCapacity    by slot
template <class K, class V>
class KELDictionary : public kel::internal::HashTable<K, V, kel::internal::PlainPoolHead> {
    typedef kel::internal::HashTable<K, V, kel::internal::PlainPoolHead> Table;

public:
    // Hears of an entry that is about to be removed: void (*)(K key, V value).
    typedef typename Table::RemoveCallback RemoveCallback;

    // An empty table. Throws std::bad_alloc.
    explicit KELDictionary(unsigned long slots = 16, RemoveCallback on_remove = 0)
        : Table(slots, on_remove) {}
};

// The same with a reader-writer lock for its owner to take. The operations take no lock; only the
// destructor does, and so waits for whoever still reads. Keys and values that are CORBA_String_var are
// released when their entry is removed, before its record is kept for reuse.
template <class K, class V>
class KELDictionary_r : public kel::internal::HashTable<K, V, kel::internal::LockedPoolHead> {
    typedef kel::internal::HashTable<K, V, kel::internal::LockedPoolHead> Table;

public:
    // Hears of an entry that is about to be removed: void (*)(K key, V value).
    typedef typename Table::RemoveCallback RemoveCallback;

    // An empty table and a free lock. Throws std::bad_alloc, or what KELRWLock throws.
    explicit KELDictionary_r(unsigned long slots = 16, RemoveCallback on_remove = 0)
        : Table(slots, on_remove) {}

    ~KELDictionary_r() {
        KELWLock_var hold(rwlock());
        this->removeAll();
    }

    // The lock, for the owner to take.
    KELRWLock& rwlock() { return this->pool_head()._rwlock; }
};

#endif
