// SPDX-License-Identifier: MIT
// Wide strings: allocation, the holder, order, hash, reading and printing.
#include <kel/containers/wstrings.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>
#include <malloc.h>

#include <climits>
#include <cwchar>
#include <new>
#include <sstream>
#include <string>
#include <type_traits>

#include "tests/support/fault.h"

// The whole program compares with this one, whose results are not limited to -1, 0 and 1.
extern "C" __attribute__((no_sanitize("address", "thread"))) int wcscmp(const wchar_t* a,
                                                                        const wchar_t* b) noexcept {
    while (*a != 0 && *a == *b) ++a, ++b;
    return static_cast<int>(*a - *b);
}

namespace kel {
namespace test {
namespace {

const wchar_t* const null = nullptr;

class WideStrings : public FaultTest {
protected:
    long blocks_before = AllocationPlan::live_blocks();
};

static_assert(std::is_same<CORBA::WString_var, CORBA_WString_var>::value, "both names are one class");
static_assert(std::is_same<CORBA::WString_out, CORBA_WString_out>::value, "both names are one class");
static_assert(sizeof(CORBA_WString_var) == sizeof(wchar_t*), "the holder has one field");

// Allocation

TEST_F(WideStrings, AllocGivesFourBytesACharacterAndATerminator) {
    wchar_t* const s = CORBA::wstring_alloc(15);
    EXPECT_GE(malloc_usable_size(s), 64u);
    std::wmemset(s, L'x', 16);
    CORBA::wstring_free(s);
}

TEST_F(WideStrings, AllocWithoutMemoryThrowsBadAlloc) {
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(CORBA::wstring_alloc(5), std::bad_alloc);
}

TEST_F(WideStrings, AllocOfALengthThatWrapsThrowsBadAlloc) {
    for (const unsigned long len :
         {ULONG_MAX, ULONG_MAX - 1, ULONG_MAX / 2, ULONG_MAX / 4, ULONG_MAX / 4 + 1}) {
        EXPECT_THROW(CORBA::wstring_alloc(len), std::bad_alloc) << len;
    }
}

TEST_F(WideStrings, DupCopiesTheTextWithItsTerminator) {
    const wchar_t text[] = L"vesta \x2641";
    wchar_t* const s = CORBA::wstring_dup(text);
    EXPECT_NE(s, text);
    EXPECT_STREQ(s, text);
    CORBA::wstring_free(s);
}

TEST_F(WideStrings, DupOfNullIsNull) { EXPECT_EQ(CORBA::wstring_dup(nullptr), nullptr); }

TEST_F(WideStrings, FreeReleasesTheBlockAndIgnoresNull) {
    CORBA::wstring_free(CORBA::wstring_dup(L"vesta"));
    CORBA::wstring_free(nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

// The holder

TEST_F(WideStrings, DefaultHolderHoldsNull) { EXPECT_EQ(CORBA_WString_var().in(), nullptr); }

TEST_F(WideStrings, HolderAdoptsAPointerAndCopiesAConstString) {
    wchar_t* const s = CORBA::wstring_dup(L"vesta");
    const CORBA_WString_var adopted(s), copied(L"juno"), nothing(null);
    EXPECT_EQ(adopted.in(), s);
    EXPECT_STREQ(copied.in(), L"juno");
    EXPECT_EQ(nothing.in(), nullptr);
}

TEST_F(WideStrings, HolderCopiesHaveStringsOfTheirOwn) {
    const CORBA_WString_var first(L"vesta"), nothing;
    const CORBA_WString_var second(first), third(nothing);
    EXPECT_NE(second.in(), first.in());
    EXPECT_STREQ(second.in(), L"vesta");
    EXPECT_EQ(third.in(), nullptr);
}

TEST_F(WideStrings, HolderReleasesWhatItHolds) {
    {
        CORBA_WString_var holder(L"vesta");
        holder = L"juno";
        holder = CORBA::wstring_dup(L"ceres");
        holder = CORBA_WString_var(L"pallas");
        EXPECT_STREQ(holder.in(), L"pallas");
        EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(WideStrings, HolderTakesNull) {
    CORBA_WString_var holder(L"vesta");
    holder = null;
    EXPECT_EQ(holder.in(), nullptr);
    holder = L"juno";
    holder = static_cast<wchar_t*>(nullptr);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(WideStrings, HolderAssignedToItselfKeepsTheText) {
    CORBA_WString_var holder(L"vesta");
    const CORBA_WString_var& same = holder;
    holder = same;
    EXPECT_STREQ(holder.in(), L"vesta");
    holder = holder.inout();
    EXPECT_STREQ(holder.in(), L"vesta");
    holder = holder.in() + 2;
    EXPECT_STREQ(holder.in(), L"sta");
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(WideStrings, HolderAssignmentWithoutMemoryLeavesItAsItWas) {
    CORBA_WString_var holder(L"vesta");
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(holder = L"juno", std::bad_alloc);
    }
    EXPECT_STREQ(holder.in(), L"vesta");
}

TEST_F(WideStrings, HolderConvertsAndIsIndexed) {
    CORBA_WString_var holder(L"vesta");
    const CORBA_WString_var& constant = holder;
    holder[1] = L'i';
    holder[2u] = L's';
    EXPECT_EQ(constant[1ul], L'i');
    EXPECT_EQ(constant[1l], L'i');
    wchar_t* const changeable = holder;
    const wchar_t* const readable = constant;
    EXPECT_EQ(changeable, readable);
    EXPECT_EQ(std::wcslen(holder), 5u);
}

TEST_F(WideStrings, HolderLendsItsPointer) {
    CORBA_WString_var holder(L"vesta");
    EXPECT_STREQ(holder.inout(), L"vesta");
    wchar_t*& p = holder.out();
    EXPECT_EQ(p, nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
    p = CORBA::wstring_dup(L"juno");
    wchar_t* const s = holder._retn();
    EXPECT_STREQ(s, L"juno");
    EXPECT_EQ(holder.in(), nullptr);
    CORBA::wstring_free(s);
}

// Only a pointer that may change hands its string over.
static_assert(!std::is_constructible<CORBA_WString_var, std::nullptr_t>::value, "a null literal");
static_assert(!std::is_assignable<CORBA_WString_out&, CORBA_WString_var&>::value, "a holder");

TEST_F(WideStrings, HolderTakesNullLiterals) {
    CORBA_WString_var first(L"vesta"), second(L"juno");
    first = 0;
    second = nullptr;
    EXPECT_TRUE(first == 0 && second == nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(WideStrings, ArrayIsCopied) {
    wchar_t text[] = L"vesta";
    CORBA_WString_var constructed(text), assigned, filled;
    assigned = text;
    CORBA_WString_out out(filled);
    out = text;
    for (const CORBA_WString_var* const holder : {&constructed, &assigned, &filled}) {
        EXPECT_NE(holder->in(), text);
        EXPECT_STREQ(holder->in(), L"vesta");
    }
}

TEST_F(WideStrings, WhatAnOutParameterRefersToIsCopied) {
    CORBA_WString_var owner;
    CORBA_WString_out out(owner);
    out = L"vesta";
    CORBA_WString_var constructed(out), assigned;
    assigned = out;
    EXPECT_STREQ(constructed.in(), L"vesta");
    EXPECT_STREQ(assigned.in(), L"vesta");
    EXPECT_NE(constructed.in(), owner.in());
    EXPECT_NE(assigned.in(), owner.in());
}

void give(CORBA_WString_out out, const wchar_t* text) { out = text; }

TEST_F(WideStrings, OutParameterFillsAPointerOrAHolder) {
    wchar_t* p = const_cast<wchar_t*>(L"left over");
    CORBA_WString_var holder(L"vesta");
    give(p, L"juno");
    give(holder, L"ceres");
    EXPECT_STREQ(p, L"juno");
    EXPECT_STREQ(holder.in(), L"ceres");
    CORBA::wstring_free(p);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(WideStrings, OutParameterStartsAsNullAndSharesItsPointer) {
    wchar_t* p = const_cast<wchar_t*>(L"left over");
    CORBA_WString_out out(p);
    EXPECT_EQ(p, nullptr);
    CORBA_WString_out same(out);
    same = CORBA::wstring_dup(L"vesta");
    EXPECT_STREQ(out.ptr(), L"vesta");
    wchar_t* q = nullptr;
    CORBA_WString_out other(q);
    other = out;
    EXPECT_EQ(p, q);
    wchar_t*& reference = out;
    CORBA::wstring_free(reference);
}

TEST_F(WideStrings, TextOfNilIsNilInParentheses) { EXPECT_STREQ(CORBA_WString_out::_nil, L"(nil)"); }

// Order

TEST_F(WideStrings, CompareSortsNullFirst) {
    EXPECT_EQ(compare(CORBA_WString_var(), CORBA_WString_var()), 0);
    EXPECT_EQ(compare(CORBA_WString_var(), CORBA_WString_var(L"")), -1);
    EXPECT_EQ(compare(CORBA_WString_var(L""), CORBA_WString_var()), 1);
}

TEST_F(WideStrings, CompareHandsOnWhatWcscmpReturns) {
    EXPECT_EQ(compare(CORBA_WString_var(L"a"), CORBA_WString_var(L"z")), -25);
    EXPECT_EQ(compare(CORBA_WString_var(L"z"), CORBA_WString_var(L"a")), 25);
    EXPECT_EQ(compare(CORBA_WString_var(L""), CORBA_WString_var(L"\x2641")), -0x2641);
    EXPECT_EQ(compare(CORBA_WString_var(L"abc"), CORBA_WString_var(L"abc")), 0);
}

// Hash

unsigned long hash_of(const wchar_t* text) { return _kel_hash(CORBA_WString_var(text)); }

TEST_F(WideStrings, HashOfNothingIsZero) {
    EXPECT_EQ(hash_of(null), 0u);
    EXPECT_EQ(hash_of(L""), 0u);
}

TEST_F(WideStrings, HashSeesTheLengthAndTheFirstCharacterOnly) {
    EXPECT_EQ(hash_of(L"a"), 0x61u);
    EXPECT_EQ(hash_of(L"ab"), 0xa3u);  // 0xc2 ^ 0x61
    EXPECT_EQ(hash_of(L"ab"), hash_of(L"ax"));
    EXPECT_NE(hash_of(L"ab"), hash_of(L"abc"));
    EXPECT_NE(hash_of(L"ab"), hash_of(L"bb"));
}

TEST_F(WideStrings, HashTakesTheLowByteWithItsSign) {
    EXPECT_EQ(hash_of(L"\x161"), 0x61u);
    EXPECT_EQ(hash_of(L"\x80"), 0x7fffff80u);
    EXPECT_EQ(hash_of(L"\x100"), 0u);
    EXPECT_EQ(hash_of(L"\xff\xff"), 1u);
}

TEST_F(WideStrings, HashLosesTheTopBitAndWrapsAt32Bits) {
    const std::wstring text(40, L'a');
    EXPECT_EQ(hash_of(text.c_str()), 0x7fffffdfu);
}

// Streams

class WideStream : public KEListream {
public:
    using KEListream::operator>>;

    KEListream& operator>>(wchar_t*& s) override {
        given = s;
        blocks_when_called = AllocationPlan::live_blocks();
        s = CORBA::wstring_dup(L"from the stream");
        if (broken) throw CORBA_COMM_FAILURE();
        return *this;
    }

    wchar_t* given = const_cast<wchar_t*>(L"not called");
    long blocks_when_called = 0;
    bool broken = false;
};

TEST_F(WideStrings, StreamReadsStraightIntoTheEmptiedHolder) {
    WideStream in;
    CORBA_WString_var holder(L"vesta");
    EXPECT_EQ(&(in >> holder), &in);
    EXPECT_EQ(in.given, nullptr);
    EXPECT_EQ(in.blocks_when_called, blocks_before);
    EXPECT_STREQ(holder.in(), L"from the stream");
}

TEST_F(WideStrings, WhatABrokenStreamStoredBelongsToTheHolder) {
    WideStream in;
    in.broken = true;
    CORBA_WString_var holder;
    EXPECT_THROW(in >> holder, CORBA_COMM_FAILURE);
    EXPECT_STREQ(holder.in(), L"from the stream");
}

std::string printed(const void* address) {
    std::ostringstream out;
    out << address;
    return out.str();
}

TEST_F(WideStrings, PrintsTheAddressOfTheCharacters) {
    CORBA_WString_var holder(L"vesta");
    const CORBA_WString_var& constant = holder;
    std::ostringstream out;
    out << holder << ' ' << constant;
    EXPECT_EQ(out.str(), printed(holder.in()) + ' ' + printed(holder.in()));
}

TEST_F(WideStrings, PrintsTheAddressOfTheWordNullForNull) {
    std::ostringstream out;
    out << CORBA_WString_var();
    void* address = nullptr;
    std::istringstream(out.str()) >> address;
    ASSERT_NE(address, nullptr);
    EXPECT_STREQ(static_cast<const wchar_t*>(address), L"(null)");
}

}  // namespace
}  // namespace test
}  // namespace kel
