// SPDX-License-Identifier: MIT
// The string functions: allocation, copies, release, hash and order.
#include <kel/containers/strings.h>
#include <malloc.h>

#include <climits>
#include <cstring>
#include <new>
#include <sstream>
#include <string>

#include "tests/support/fault.h"

// A sanitizer would end the process where the system merely has no memory.
extern "C" const char* __asan_default_options();
extern "C" const char* __tsan_default_options();
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

// The whole program compares with this one, whose results are not limited to -1, 0 and 1 as those of
// the C library are on some processors.
extern "C" __attribute__((no_sanitize("address", "thread"))) int strcmp(const char* a,
                                                                        const char* b) noexcept {
    while (*a != 0 && *a == *b) ++a, ++b;
    return static_cast<unsigned char>(*a) - static_cast<unsigned char>(*b);
}

namespace kel {
namespace test {
namespace {

class Strings : public FaultTest {};

// Allocation

TEST_F(Strings, AllocGivesRoomForTheTerminator) {
    // Of every length, as blocks come in steps and most have a byte to spare.
    for (unsigned long length = 0; length < 64; ++length) {
        char* const s = CORBA::string_alloc(length);
        EXPECT_GE(malloc_usable_size(s), length + 1);
        std::memset(s, 'x', length + 1);
        CORBA::string_free(s);
    }
}

TEST_F(Strings, AllocOfNothingHoldsAnEmptyString) {
    char* const s = CORBA::string_alloc(0);
    ASSERT_NE(s, nullptr);
    s[0] = 0;
    EXPECT_STREQ(s, "");
    CORBA::string_free(s);
}

TEST_F(Strings, AllocUsesTheArrayAllocatorOnce) {
    Armed armed;
    CORBA::string_free(CORBA::string_alloc(5));
    EXPECT_EQ(AllocationPlan::calls(), 1);
}

TEST_F(Strings, AllocWithoutMemoryThrowsBadAlloc) {
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(CORBA::string_alloc(5), std::bad_alloc);
}

TEST_F(Strings, AllocOfALengthThatWrapsThrowsBadAlloc) {
    EXPECT_THROW(CORBA::string_alloc(ULONG_MAX), std::bad_alloc);
}

TEST_F(Strings, AllocOfMoreThanTheAddressSpaceThrowsBadAlloc) {
    EXPECT_THROW(CORBA::string_alloc(ULONG_MAX - 1), std::bad_alloc);
}

TEST_F(Strings, DupCopiesTheTextWithItsTerminator) {
    const char text[] = "vesta";
    char* const s = CORBA::string_dup(text);
    EXPECT_NE(s, text);
    EXPECT_STREQ(s, "vesta");
    CORBA::string_free(s);
}

TEST_F(Strings, DupOfTheEmptyStringIsAllocated) {
    const long before = AllocationPlan::live_blocks();
    char* const s = CORBA::string_dup("");
    EXPECT_STREQ(s, "");
    EXPECT_EQ(AllocationPlan::live_blocks(), before + 1);
    CORBA::string_free(s);
}

TEST_F(Strings, DupOfNullIsNull) { EXPECT_EQ(CORBA::string_dup(nullptr), nullptr); }

TEST_F(Strings, DupWithoutMemoryThrowsBadAlloc) {
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(CORBA::string_dup("vesta"), std::bad_alloc);
}

TEST_F(Strings, FreeReleasesTheBlock) {
    const long before = AllocationPlan::live_blocks();
    CORBA::string_free(CORBA::string_dup("vesta"));
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(Strings, FreeOfNullDoesNothing) {
    const long before = AllocationPlan::live_blocks();
    CORBA::string_free(nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(Strings, FreeOfTheEmptyStringOfADefaultHolderDoesNothing) {
    CORBA_String_var holder;
    const long before = AllocationPlan::live_blocks();
    CORBA::string_free(holder.inout());
    CORBA::string_free(holder.inout());
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
    EXPECT_STREQ(holder, "");
}

// Hash

TEST_F(Strings, HashOfNothingIsZero) {
    EXPECT_EQ(CORBA::hash(nullptr), 0u);
    EXPECT_EQ(CORBA::hash(""), 0u);
}

TEST_F(Strings, HashShiftsByOneAndMixesTheNextByteIn) {
    EXPECT_EQ(CORBA::hash("a"), 0x61u);
    EXPECT_EQ(CORBA::hash("ab"), 0xa0u);
    EXPECT_EQ(CORBA::hash("abc"), 0x123u);
}

TEST_F(Strings, HashExtendsTheSignOfHighBytes) {
    EXPECT_EQ(CORBA::hash("\xff"), 0x7fffffffu);
    EXPECT_EQ(CORBA::hash("\x80"), 0x7fffff80u);
    EXPECT_EQ(CORBA::hash("\xff\x01"), 0x7fffffffu);
    EXPECT_EQ(CORBA::hash("\xff\xff"), 1u);
}

TEST_F(Strings, HashLosesTheTopBitAndWrapsAt32Bits) {
    const std::string text(40, 'a');
    EXPECT_EQ(CORBA::hash(text.c_str()), 0x7fffffdfu);
}

TEST_F(Strings, HashIsTheSameAtEveryWordSize) {
    EXPECT_EQ(CORBA::hash("IDL:omg.org/CORBA/BAD_PARAM:1.0"), 0x557b4f88u);
    EXPECT_EQ(CORBA::hash("IDL:omg.org/CORBA/OBJECT_NOT_EXIST:1.0"), 0x3dc96318u);
}

TEST_F(Strings, KeyHashOfHoldersAndWrappersIsTheStringHash) {
    EXPECT_EQ(_kel_hash(CORBA_String_var("vesta")), CORBA::hash("vesta"));
    EXPECT_EQ(_kel_hash(KELStringWrapper("vesta")), CORBA::hash("vesta"));
    EXPECT_EQ(_kel_hash(KELStringWrapper(nullptr)), 0u);
    EXPECT_EQ(_kel_hash(CORBA_String_var()), 0u);
}

// Order

const char* const null = nullptr;

TEST_F(Strings, CompareOfTwoNullsIsZero) {
    EXPECT_EQ(compare(CORBA_String_var(null), CORBA_String_var(null)), 0);
    EXPECT_EQ(compare(KELStringWrapper(null), KELStringWrapper(null)), 0);
}

TEST_F(Strings, CompareOfNullWithAnEmptyStringIsMinusOne) {
    EXPECT_EQ(compare(CORBA_String_var(null), CORBA_String_var("")), -1);
    EXPECT_EQ(compare(CORBA_String_var(null), CORBA_String_var()), -1);
    EXPECT_EQ(compare(KELStringWrapper(null), KELStringWrapper("")), -1);
}

TEST_F(Strings, CompareOfAnEmptyStringWithNullIsOne) {
    EXPECT_EQ(compare(CORBA_String_var(""), CORBA_String_var(null)), 1);
    EXPECT_EQ(compare(CORBA_String_var(), CORBA_String_var(null)), 1);
    EXPECT_EQ(compare(KELStringWrapper(""), KELStringWrapper(null)), 1);
}

TEST_F(Strings, CompareOfEqualTextsIsZero) {
    EXPECT_EQ(compare(CORBA_String_var("vesta"), CORBA_String_var("vesta")), 0);
    EXPECT_EQ(compare(CORBA_String_var(""), CORBA_String_var()), 0);
    EXPECT_EQ(compare(KELStringWrapper("vesta"), KELStringWrapper("vesta")), 0);
}

TEST_F(Strings, CompareHandsOnWhatStrcmpReturns) {
    const struct {
        const char* a;
        const char* b;
        int difference;
    } rows[] = {{"a", "z", -25}, {"z", "a", 25},        {"", "x", -120},
                {"x", "", 120},  {"\xff", "\x01", 254}, {"abc", "abd", -1}};
    for (const auto& row : rows) {
        EXPECT_EQ(compare(CORBA_String_var(row.a), CORBA_String_var(row.b)), row.difference);
        EXPECT_EQ(compare(KELStringWrapper(row.a), KELStringWrapper(row.b)), row.difference);
    }
}

TEST_F(Strings, CompareTakesALiteralBesideAHolder) {
    const CORBA_String_var holder("vesta");
    EXPECT_EQ(compare(holder, "vesta"), 0);
    EXPECT_EQ(compare("vesta", holder), 0);
}

TEST_F(Strings, WrapperBorrowsItsString) {
    const char text[] = "vesta";
    const KELStringWrapper wrapper(text);
    EXPECT_EQ(wrapper.in(), text);
}

// Printing

std::string printed(const CORBA_String_var& holder) {
    std::ostringstream out;
    out << holder;
    return out.str();
}

TEST_F(Strings, PrintsTheText) {
    EXPECT_EQ(printed(CORBA_String_var("vesta")), "vesta");
    EXPECT_EQ(printed(CORBA_String_var()), "");
}

TEST_F(Strings, PrintsNullInParentheses) { EXPECT_EQ(printed(CORBA_String_var(null)), "(null)"); }

TEST_F(Strings, PrintingReturnsTheStreamAndTakesHoldersThatMayChange) {
    CORBA_String_var holder("vesta");
    std::ostringstream out;
    out << holder << '!';
    EXPECT_EQ(out.str(), "vesta!");
}

}  // namespace
}  // namespace test
}  // namespace kel
