// The layouts of the dictionaries and of the string holder, written down a second time.
//
//   DictionaryMirror    the fields of a dictionary, copied out of it
//   mirror_of           copies them; the sizes must agree
//   capacity_of         the second field of a string holder
//
//     EXPECT_EQ(mirror_of(dictionary).last_index, 5u);
//
// Tests look here at what no operation shows, and pin where every field lies.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CONTAINERS_MIRRORS_H
#define KEL_TESTS_CONTAINERS_MIRRORS_H

#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace kel {
namespace test {

struct PlainMirror {
    std::uint32_t capacity;
    std::uint32_t count;
    void** table;
    void* inline_table[32];
    std::uint16_t free_count;
    void* pool[32];
    std::uint32_t last_index;
    std::uint32_t bits;
    std::uint32_t mask;
    void (*remove_callback)();
};

struct LockedMirror {
    std::uint32_t capacity;
    std::uint32_t count;
    void** table;
    void* inline_table[32];
    alignas(KELRWLock) unsigned char rwlock[sizeof(KELRWLock)];
    std::uint16_t free_count;
    void* pool[32];
    std::uint32_t last_index;
    std::uint32_t bits;
    std::uint32_t mask;
    void (*remove_callback)();
};

#if defined(__i386__)
static_assert(offsetof(PlainMirror, count) == 4, "count");
static_assert(offsetof(PlainMirror, table) == 8, "table");
static_assert(offsetof(PlainMirror, inline_table) == 12, "inline table");
static_assert(offsetof(PlainMirror, free_count) == 140, "free count");
static_assert(offsetof(PlainMirror, pool) == 144, "pool");
static_assert(offsetof(PlainMirror, last_index) == 272, "last index");
static_assert(offsetof(PlainMirror, bits) == 276, "bits");
static_assert(offsetof(PlainMirror, mask) == 280, "mask");
static_assert(offsetof(PlainMirror, remove_callback) == 284, "remove callback");
static_assert(sizeof(PlainMirror) == 288, "no byte more");
#endif

template <class K, class V>
PlainMirror mirror_of(const KELDictionary<K, V>& dictionary) {
    static_assert(sizeof(dictionary) == sizeof(PlainMirror), "the plain table has a field more or less");
    PlainMirror mirror;
    std::memcpy(&mirror, static_cast<const void*>(&dictionary), sizeof(mirror));
    return mirror;
}

template <class K, class V>
LockedMirror mirror_of(const KELDictionary_r<K, V>& dictionary) {
    static_assert(sizeof(dictionary) == sizeof(LockedMirror), "the locked table has a field more or less");
    LockedMirror mirror;
    std::memcpy(&mirror, static_cast<const void*>(&dictionary), sizeof(mirror));
    return mirror;
}

// The bytes that a holder knows it may write into.
inline unsigned long capacity_of(const CORBA_String_var& holder) {
    struct {
        char* held;
        unsigned long capacity;
    } mirror;
    static_assert(sizeof(mirror) == sizeof(holder), "the holder has a field more or less");
    std::memcpy(&mirror, static_cast<const void*>(&holder), sizeof(mirror));
    return mirror.capacity;
}

// A key whose hash is chosen freely; keys are equal when their ids are.
struct TestKey {
    std::uint32_t hash;
    int id;
};
inline int compare(const TestKey& a, const TestKey& b) { return a.id - b.id; }
inline unsigned long _kel_hash(const TestKey& key) { return key.hash; }

// A hash whose home is `slot` in a table of 2^bits slots: the multiplier's inverse modulo 2^32 undoes
// the spreading.
constexpr std::uint32_t hash_for_home(std::uint32_t slot, unsigned bits) {
    return (slot << (32 - bits)) * 0x144CBC89u;
}
static_assert(0x9E3779B9u * 0x144CBC89u == 1u, "not the inverse");

}  // namespace test
}  // namespace kel

#endif
