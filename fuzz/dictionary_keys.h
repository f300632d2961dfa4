// The keys and values of the dictionary target, numbered as its model knows them.
//
//   IntegerKeys     integers, chosen so that they crowd in some slots
//   BorrowedTexts   strings that the key only points to
//   OwnedTexts      strings that key and value own
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_DICTIONARY_KEYS_H
#define KEL_FUZZ_DICTIONARY_KEYS_H

#include <kel/containers/dictionary.h>
#include <kel/core/unique_id.h>

#include <string_view>

#include "fuzz/dictionary_model.h"
#include "tests/containers/mirrors.h"

namespace kel {
namespace fuzz {

constexpr int key_count = SlotModel::keys;

// Neighbours, keys of a cluster that wraps around slot 0, keys of one home, and scattered ones.
struct Integers {
    Integers() {
        for (std::uint32_t i = 0; i < key_count; ++i) {
            const std::uint32_t homes[] = {0, kel::test::hash_for_home((i % 6 + 29) % 32, 5), 0, 0};
            const std::uint32_t steps[] = {1, 0x144CBC89u, 0x144CBC89u, 0x01000193u * (i + 1)};
            hashes[i] = homes[i / 16] + i * steps[i / 16];
        }
    }
    std::uint32_t hashes[key_count];
};
inline const Integers integers;

// Null, the empty string, short ones, pairs of one hash, and long ones that differ only in what the
// hash has shifted out.
struct Texts {
    Texts() {
        const std::string_view tail = "-a-tail-of-more-than-forty-characters-for-all-of-them";
        texts[0] = nullptr;
        for (std::size_t i = 1; i < key_count; ++i) {
            char* const text = memory[i];
            const char letter = static_cast<char>('a' + i / 4);
            if (i < 32) {
                text[0] = i % 4 < 2 ? letter : static_cast<char>(letter ^ 2);
                text[1] = i % 4 < 2 ? 'b' : 'f';
                text[2] = i % 2 == 0 ? '\0' : 'x';
            } else {
                text[0] = static_cast<char>('A' + i - 32);
                std::copy(tail.begin(), tail.end(), text + 1);
            }
            texts[i] = text;
        }
        memory[1][0] = '\0';
        for (int i = 0; i < key_count; ++i) hashes[i] = static_cast<std::uint32_t>(CORBA::hash(texts[i]));
    }
    char memory[key_count][64] = {};
    const char* texts[key_count];
    std::uint32_t hashes[key_count];
};
inline const Texts texts;

constexpr int value_count = 8;
inline const char* const value_texts[value_count] = {nullptr,         "", "1", "22", "333", "four",
                                                     "a fifth value", "6"};

// How a table's types stand for the numbers of the model.
struct NumberedValues {
    typedef int Value;
    static Value value(int number) { return number; }
    static bool is(Value value, int number) { return value == number; }
};
struct IntegerKeys : NumberedValues {
    typedef KELUniqueId Key;
    static Key key(int number) { return KELUniqueId(integers.hashes[number]); }
    static const std::uint32_t* hashes() { return integers.hashes; }
};
struct BorrowedTexts : NumberedValues {
    typedef KELStringWrapper Key;
    static Key key(int number) { return KELStringWrapper(texts.texts[number]); }
    static const std::uint32_t* hashes() { return texts.hashes; }
};
struct OwnedTexts {
    typedef CORBA_String_var Key;
    typedef CORBA_String_var Value;
    static Key key(int number) { return Key(texts.texts[number]); }
    static Value value(int number) { return Value(value_texts[number]); }
    static bool is(const Value& value, int number) { return compare(value, Value(value_texts[number])) == 0; }
    static const std::uint32_t* hashes() { return texts.hashes; }
};

}  // namespace fuzz
}  // namespace kel

#endif
