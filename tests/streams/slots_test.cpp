// SPDX-License-Identifier: MIT
// The binary interface of the stream classes: which operation has which slot of the virtual table,
// and where the fields are.

#include <dlfcn.h>
#include <elf.h>
#include <gtest/gtest.h>
#include <link.h>

#include <cstring>
#include <new>
#include <type_traits>

#include "tests/streams/fixtures.h"

namespace {

// The slot of a virtual operation, counted from 1. In this ABI a pointer to a virtual member holds
// one plus the distance of its slot from the start of the table.
template <class Member>
unsigned long slot_of(Member member) {
    std::uintptr_t word;
    static_assert(sizeof(member) >= sizeof word, "a member pointer starts with one word");
    std::memcpy(&word, &member, sizeof word);
    EXPECT_EQ(word & 1, 1u) << "not virtual";
    return (word - 1) / sizeof(void*) + 1;
}

// The number of slots in the exported virtual table of a class without virtual bases, whose other
// two words are the offset to the top and the type. A sanitizer adds zeros behind the table and
// watches them.
__attribute__((no_sanitize("address"))) long slots_in(const char* table_symbol) {
    void** const table = static_cast<void**>(dlsym(RTLD_DEFAULT, table_symbol));
    if (table == nullptr) return 0;
    Dl_info where;
    void* found = nullptr;
    if (dladdr1(table, &where, &found, RTLD_DL_SYMENT) == 0) return 0;
    const long words = static_cast<long>(static_cast<const ElfW(Sym)*>(found)->st_size / sizeof(void*));
    long slots = 0;
    while (slots + 2 < words && table[slots + 2] != nullptr) ++slots;
    return slots;
}

typedef void (*SlotFunction)(void* object);

SlotFunction slot_function(void* object, int slot) {
    void** const table = *static_cast<void***>(object);
    return reinterpret_cast<SlotFunction>(table[slot - 1]);
}

template <class T>
unsigned long inserter() {
    return slot_of(static_cast<KELostream& (KELostream::*)(T)>(&KELostream::operator<<));
}
template <class T>
unsigned long put_array() {
    return slot_of(static_cast<KELostream& (KELostream::*)(const T*, unsigned int)>(&KELostream::put));
}
template <class T>
unsigned long extractor() {
    return slot_of(static_cast<KEListream& (KEListream::*)(T&)>(&KEListream::operator>>));
}
template <class T>
unsigned long get_array() {
    return slot_of(static_cast<KEListream& (KEListream::*)(T*, unsigned int)>(&KEListream::get));
}

TEST(OutputSlots, TablesAndOffsetComeBehindTheDestructor) {
    EXPECT_EQ(slot_of(&KELostream::reset), 3u);
    EXPECT_EQ(slot_of(&KELostream::get_out_table), 4u);
    EXPECT_EQ(slot_of(&KELostream::set_out_table), 5u);
    EXPECT_EQ(slot_of(&KELostream::copy_out_tables), 6u);
    EXPECT_EQ(slot_of(&KELostream::cur_out_offset), 7u);
}

TEST(OutputSlots, ScalarsFollowInTheirOrder) {
    EXPECT_EQ(inserter<const char*>(), 8u);
    EXPECT_EQ(inserter<char>(), 9u);
    EXPECT_EQ(inserter<unsigned char>(), 10u);
    EXPECT_EQ(inserter<short>(), 11u);
    EXPECT_EQ(inserter<unsigned short>(), 12u);
    EXPECT_EQ(inserter<int>(), 13u);
    EXPECT_EQ(inserter<unsigned int>(), 14u);
    EXPECT_EQ(inserter<long>(), 15u);
    EXPECT_EQ(inserter<unsigned long>(), 16u);
    EXPECT_EQ(inserter<float>(), 17u);
    EXPECT_EQ(inserter<double>(), 18u);
    EXPECT_EQ(inserter<long long>(), 19u);
    EXPECT_EQ(inserter<unsigned long long>(), 20u);
    EXPECT_EQ(inserter<wchar_t>(), 21u);
    EXPECT_EQ(inserter<const wchar_t*>(), 22u);
}

TEST(OutputSlots, RawBytesAndArraysFollowInTheirOrder) {
    EXPECT_EQ(slot_of(static_cast<KELostream& (KELostream::*)(char)>(&KELostream::put)), 23u);
    EXPECT_EQ(put_array<char>(), 24u);
    EXPECT_EQ(put_array<unsigned char>(), 25u);
    EXPECT_EQ(put_array<wchar_t>(), 26u);
    EXPECT_EQ(slot_of(&KELostream::put_wcbuf), 27u);
    EXPECT_EQ(put_array<short>(), 28u);
    EXPECT_EQ(put_array<unsigned short>(), 29u);
    EXPECT_EQ(put_array<int>(), 30u);
    EXPECT_EQ(put_array<unsigned int>(), 31u);
    EXPECT_EQ(put_array<long>(), 32u);
    EXPECT_EQ(put_array<unsigned long>(), 33u);
    EXPECT_EQ(put_array<float>(), 34u);
    EXPECT_EQ(put_array<double>(), 35u);
    EXPECT_EQ(slot_of(&KELostream::putCString), 36u);
    EXPECT_EQ(put_array<long long>(), 37u);
    EXPECT_EQ(put_array<unsigned long long>(), 38u);
    EXPECT_EQ(slot_of(&KELostream::_type_number), 39u);
}

TEST(OutputSlots, ThereAreThirtyNine) { EXPECT_EQ(slots_in("_ZTV10KELostream"), 39); }

TEST(InputSlots, TablesAndOffsetComeBehindTheDestructor) {
    EXPECT_EQ(slot_of(&KEListream::reset), 3u);
    EXPECT_EQ(slot_of(&KEListream::get_in_table), 4u);
    EXPECT_EQ(slot_of(&KEListream::set_in_table), 5u);
    EXPECT_EQ(slot_of(&KEListream::copy_in_tables), 6u);
    EXPECT_EQ(slot_of(&KEListream::cur_in_offset), 7u);
}

TEST(InputSlots, ScalarsFollowInTheirOrder) {
    EXPECT_EQ(extractor<char*>(), 8u);
    EXPECT_EQ(extractor<char>(), 9u);
    EXPECT_EQ(extractor<unsigned char>(), 10u);
    EXPECT_EQ(extractor<short>(), 11u);
    EXPECT_EQ(extractor<unsigned short>(), 12u);
    EXPECT_EQ(extractor<int>(), 13u);
    EXPECT_EQ(extractor<unsigned int>(), 14u);
    EXPECT_EQ(extractor<long>(), 15u);
    EXPECT_EQ(extractor<unsigned long>(), 16u);
    EXPECT_EQ(extractor<float>(), 17u);
    EXPECT_EQ(extractor<double>(), 18u);
    EXPECT_EQ(extractor<long long>(), 19u);
    EXPECT_EQ(extractor<unsigned long long>(), 20u);
    EXPECT_EQ(extractor<wchar_t>(), 21u);
    EXPECT_EQ(extractor<wchar_t*>(), 22u);
}

TEST(InputSlots, RawBytesAndArraysFollowInTheirOrder) {
    EXPECT_EQ(slot_of(static_cast<int (KEListream::*)()>(&KEListream::get)), 23u);
    EXPECT_EQ(slot_of(static_cast<KEListream& (KEListream::*)(char&)>(&KEListream::get)), 24u);
    EXPECT_EQ(slot_of(static_cast<KEListream& (KEListream::*)(unsigned char&)>(&KEListream::get)), 25u);
    EXPECT_EQ(get_array<char>(), 26u);
    EXPECT_EQ(get_array<unsigned char>(), 27u);
    EXPECT_EQ(get_array<wchar_t>(), 28u);
    EXPECT_EQ(slot_of(&KEListream::get_wcbuf), 29u);
    EXPECT_EQ(get_array<short>(), 30u);
    EXPECT_EQ(get_array<unsigned short>(), 31u);
    EXPECT_EQ(get_array<int>(), 32u);
    EXPECT_EQ(get_array<unsigned int>(), 33u);
    EXPECT_EQ(get_array<long>(), 34u);
    EXPECT_EQ(get_array<unsigned long>(), 35u);
    EXPECT_EQ(get_array<float>(), 36u);
    EXPECT_EQ(get_array<double>(), 37u);
    EXPECT_EQ(slot_of(&KEListream::getCString), 38u);
    EXPECT_EQ(get_array<long long>(), 39u);
    EXPECT_EQ(get_array<unsigned long long>(), 40u);
    EXPECT_EQ(slot_of(&KEListream::is_available), 41u);
    EXPECT_EQ(slot_of(&KEListream::_type_number), 42u);
}

TEST(InputSlots, ThereAreFortyTwo) { EXPECT_EQ(slots_in("_ZTV10KEListream"), 42); }

// ---- the two slots of a destructor ----

template <class Stream>
struct Mortal : Stream {
    ~Mortal() override { ++deaths; }
    static void* operator new(std::size_t size) { return ::operator new(size); }
    static void operator delete(void* p) {
        ++frees;
        ::operator delete(p);
    }
    static int deaths;
    static int frees;
};
template <class Stream>
int Mortal<Stream>::deaths;
template <class Stream>
int Mortal<Stream>::frees;

template <class Stream>
class DestructorSlots : public ::testing::Test {};

typedef ::testing::Types<KEListream, KELostream> Streams;

struct StreamNames {
    template <class Stream>
    static std::string GetName(int) {
        return std::is_same<Stream, KEListream>::value ? "Input" : "Output";
    }
};

TYPED_TEST_SUITE(DestructorSlots, Streams, StreamNames);

TYPED_TEST(DestructorSlots, TheFirstDestroysAndTheSecondFreesToo) {
    typedef Mortal<TypeParam> M;
    M* const object = new M;
    M::deaths = M::frees = 0;
    slot_function(object, 1)(object);
    EXPECT_EQ(M::deaths, 1);
    EXPECT_EQ(M::frees, 0);
    ::new (static_cast<void*>(object)) M;
    slot_function(object, 2)(object);
    EXPECT_EQ(M::deaths, 2);
    EXPECT_EQ(M::frees, 1);
}

TYPED_TEST(DestructorSlots, DeletingThroughTheBaseDestroysTheWholeObject) {
    typedef Mortal<TypeParam> M;
    TypeParam* const stream = new M;
    M::deaths = M::frees = 0;
    delete stream;
    EXPECT_EQ(M::deaths, 1);
    EXPECT_EQ(M::frees, 1);
}

// ---- tables ----

TEST(OffsetTableSlots, KindIsTheThirdOfTheTablesOwn) { EXPECT_EQ(slot_of(&KELOffsetTable::kind), 3u); }

TEST(OffsetTableSlots, TheThirdSlotOfAConcreteTableAnswersItsKind) {
    TestTable table(KELOffsetTable::StringIndirections);
    KELOffsetTable* const base = &table;
    void** const slots = *reinterpret_cast<void***>(base);
    typedef int (*Kind)(KELOffsetTable*);
    EXPECT_EQ(reinterpret_cast<Kind>(slots[2])(base), 2);
}

TEST(OffsetTableSlots, TheCountedBaseIsAVirtualOne) {
    struct A : virtual KELResource {};
    struct Both : A, KELOffsetTable {
        int kind() override { return 0; }
    } both;
    EXPECT_EQ(static_cast<KELResource*>(static_cast<A*>(&both)),
              static_cast<KELResource*>(static_cast<KELOffsetTable*>(&both)));
}

// ---- fields ----

template <class Object, class Field>
std::size_t position(const Object& object, const Field& field) {
    return static_cast<std::size_t>(reinterpret_cast<const char*>(&field) -
                                    reinterpret_cast<const char*>(&object));
}

template <class Stream>
void expect_stream_fields() {
    Stream s;
    const std::size_t word = sizeof(void*);
    EXPECT_EQ(position(s, s._tables), word);
    EXPECT_EQ(position(s, s._table_count), 2 * word);
    EXPECT_EQ(position(s, s._table_capacity), 2 * word + 4);
    EXPECT_EQ(position(s, s._offset), 2 * word + 8);
    EXPECT_EQ(position(s, s._strm), word == 4 ? 20u : 32u);
    EXPECT_EQ(sizeof s, word == 4 ? 24u : 40u);
}

template <class Expected, class Actual>
void expect_same(Actual&&) {
    EXPECT_TRUE((std::is_same<Expected, Actual>::value));
}

TEST(StreamResults, HaveTheirTypes) {
    KEListream in;
    KELostream out;
    std::istringstream text;
    in._strm = &text;
    expect_same<unsigned char>(in.istrm_is_null());
    expect_same<unsigned char>(in.is_available(1));
    expect_same<int>(in._type_number());
    expect_same<int>(out._type_number());
    expect_same<int>(in.get());
    expect_same<unsigned long>(in.cur_in_offset());
    expect_same<unsigned long>(out.cur_out_offset());
    expect_same<KELOffsetTable*>(in.get_in_table(0));
    expect_same<KELOffsetTable*>(out.get_out_table(0));
}

template <class Stream, class Standard>
void expect_types() {
    Stream s;
    EXPECT_TRUE((std::is_same<decltype(s._tables), KELOffsetTable**>::value));
    EXPECT_TRUE((std::is_same<decltype(s._strm), Standard*>::value));
    EXPECT_TRUE(std::is_signed<decltype(s._table_count)>::value);
    EXPECT_TRUE(std::is_signed<decltype(s._table_capacity)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(s._offset)>::value);
    EXPECT_EQ(sizeof s._offset, 4u);
    EXPECT_TRUE(std::has_virtual_destructor<Stream>::value);
}

TEST(StreamFields, HaveTheirTypes) {
    expect_types<KEListream, std::istream>();
    expect_types<KELostream, std::ostream>();
}

TEST(StreamFields, FollowTheVirtualTableInTheirOrder) {
    expect_stream_fields<KEListream>();
    expect_stream_fields<KELostream>();
}

TEST(OffsetTableFields, FollowTheVirtualTableInTheirOrder) {
    TestTable concrete(0);
    KELOffsetTable& t = concrete;
    EXPECT_EQ(position(t, t._by_offset), sizeof(void*));
    EXPECT_LT(position(t, t._by_offset), position(t, t._by_object));
    EXPECT_LT(position(t, t._by_object), position(t, t._release));
    EXPECT_EQ(position(t, t._mark), position(t, t._release) + sizeof(void*));
    EXPECT_EQ(position(t, t._spare), position(t, t._mark) + 4);
    EXPECT_EQ(position(t, t._in_use), position(t, t._spare) + 4);
    EXPECT_EQ(position(t, t._depth), position(t, t._in_use) + 4);
}

}  // namespace
