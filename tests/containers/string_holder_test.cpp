// SPDX-License-Identifier: MIT
// The string holder: what it owns, what it copies, and when it reuses its buffer.
#include <kel/containers/strings.h>

#include <cstring>
#include <new>
#include <string>
#include <type_traits>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

const char* const null = nullptr;

class StringHolder : public FaultTest {
protected:
    long blocks_before = AllocationPlan::live_blocks();
};

static_assert(std::is_same<CORBA::String_var, CORBA_String_var>::value, "both names are one class");
static_assert(std::is_same<CORBA::String_out, CORBA_String_out>::value, "both names are one class");

// Construction

TEST_F(StringHolder, DefaultHoldsAnEmptyStringThatCostsNothing) {
    Armed armed;
    const CORBA_String_var holder;
    EXPECT_STREQ(holder, "");
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::calls(), 0);
}

TEST_F(StringHolder, AllDefaultHoldersShareOneEmptyString) {
    EXPECT_EQ(CORBA_String_var().in(), CORBA_String_var().in());
}

TEST_F(StringHolder, ConstStringIsCopiedWithItsSize) {
    const char text[] = "vesta";
    const CORBA_String_var holder(text);
    EXPECT_NE(holder.in(), text);
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(StringHolder, EmptyConstStringIsAllocated) {
    const CORBA_String_var holder("");
    EXPECT_STREQ(holder, "");
    EXPECT_EQ(capacity_of(holder), 1u);
}

TEST_F(StringHolder, NullConstStringIsHeldAsNull) {
    const CORBA_String_var holder(null);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
}

TEST_F(StringHolder, PointerIsAdopted) {
    char* const s = CORBA::string_dup("vesta");
    {
        const CORBA_String_var holder(s);
        EXPECT_EQ(holder.in(), s);
        EXPECT_EQ(capacity_of(holder), 0u);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringHolder, CopyHasAStringOfItsOwn) {
    const CORBA_String_var first("vesta");
    const CORBA_String_var second(first);
    EXPECT_NE(second.in(), first.in());
    EXPECT_STREQ(second, "vesta");
    EXPECT_EQ(capacity_of(second), 6u);
}

TEST_F(StringHolder, CopyOfADefaultOneAllocatesAnEmptyString) {
    const CORBA_String_var first;
    const CORBA_String_var second(first);
    EXPECT_NE(second.in(), first.in());
    EXPECT_STREQ(second, "");
    EXPECT_EQ(capacity_of(second), 1u);
}

TEST_F(StringHolder, CopyOfNullIsNull) {
    const CORBA_String_var first(null);
    const CORBA_String_var second(first);
    EXPECT_EQ(second.in(), nullptr);
    EXPECT_EQ(capacity_of(second), 0u);
}

TEST_F(StringHolder, CopyIsAsLargeAsTheTextAndNotAsTheBuffer) {
    CORBA_String_var first("a long text");
    first = "short";
    EXPECT_EQ(capacity_of(CORBA_String_var(first)), 6u);
}

TEST_F(StringHolder, CopyTakesTheSizeOfAnAdoptedString) {
    const CORBA_String_var first(CORBA::string_dup("vesta"));
    EXPECT_EQ(capacity_of(CORBA_String_var(first)), 6u);
}

TEST_F(StringHolder, DestructorReleasesWhateverIsHeld) {
    { const CORBA_String_var empty, copied("vesta"), nothing(null), adopted(CORBA::string_dup("juno")); }
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

// Adopting assignment

TEST_F(StringHolder, AssignedPointerIsAdoptedAndTheOldStringReleased) {
    CORBA_String_var holder("vesta");
    char* const s = CORBA::string_dup("juno");
    EXPECT_EQ(&(holder = s), &holder);
    EXPECT_EQ(holder.in(), s);
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(StringHolder, AssignedNullPointerReleasesTheOldString) {
    CORBA_String_var holder("vesta");
    holder = static_cast<char*>(nullptr);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringHolder, AdoptingItsOwnPointerReleasesNothing) {
    CORBA_String_var holder("vesta");
    holder = holder.inout();
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

// Copying assignment

TEST_F(StringHolder, AssignedConstStringIsCopied) {
    CORBA_String_var holder;
    EXPECT_EQ(&(holder = "vesta"), &holder);
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(StringHolder, ShorterStringReusesTheBufferAndKeepsTheLargerCapacity) {
    CORBA_String_var holder("vesta");
    const char* const buffer = holder.in();
    Armed armed;
    holder = "juno";
    EXPECT_EQ(holder.in(), buffer);
    EXPECT_STREQ(holder, "juno");
    EXPECT_EQ(capacity_of(holder), 6u);
    EXPECT_EQ(AllocationPlan::calls(), 0);
}

TEST_F(StringHolder, StringOfTheSameLengthReusesTheBuffer) {
    CORBA_String_var holder("vesta");
    Armed armed;
    holder = "ceres";
    EXPECT_STREQ(holder, "ceres");
    EXPECT_EQ(AllocationPlan::calls(), 0);
}

TEST_F(StringHolder, LongerStringTakesANewBuffer) {
    CORBA_String_var holder("vesta");
    holder = "pallas";
    EXPECT_STREQ(holder, "pallas");
    EXPECT_EQ(capacity_of(holder), 7u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(StringHolder, BufferOfUnknownSizeIsNotReused) {
    CORBA_String_var holder(CORBA::string_dup("a long text"));
    const char* const buffer = holder.in();
    holder = "x";
    EXPECT_NE(holder.in(), buffer);
    EXPECT_EQ(capacity_of(holder), 2u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(StringHolder, EmptyStringOfADefaultHolderIsNotWrittenInto) {
    CORBA_String_var holder;
    const CORBA_String_var other;
    holder = "";
    EXPECT_NE(holder.in(), other.in());
    EXPECT_EQ(capacity_of(holder), 1u);
}

TEST_F(StringHolder, AssignedNullConstStringReleasesTheOldString) {
    CORBA_String_var holder("vesta");
    holder = null;
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringHolder, NullHolderTakesACopy) {
    CORBA_String_var holder(null);
    holder = "vesta";
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(StringHolder, AssignedHolderIsCopied) {
    CORBA_String_var first("vesta"), second("juno");
    EXPECT_EQ(&(second = first), &second);
    EXPECT_STREQ(second, "vesta");
    EXPECT_NE(second.in(), first.in());
    EXPECT_EQ(capacity_of(second), 6u);
}

TEST_F(StringHolder, AssignedNullHolderReleasesTheOldString) {
    CORBA_String_var holder("vesta");
    holder = CORBA_String_var(null);
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringHolder, SelfAssignmentKeepsTheText) {
    CORBA_String_var copied("vesta"), adopted(CORBA::string_dup("juno")), empty, nothing(null);
    const CORBA_String_var &same_copied = copied, &same_adopted = adopted, &same_empty = empty,
                           &same_nothing = nothing;
    copied = same_copied;
    adopted = same_adopted;
    empty = same_empty;
    nothing = same_nothing;
    EXPECT_STREQ(copied, "vesta");
    EXPECT_STREQ(adopted, "juno");
    EXPECT_EQ(capacity_of(adopted), 5u);
    EXPECT_STREQ(empty, "");
    EXPECT_EQ(capacity_of(empty), 1u);
    EXPECT_EQ(nothing.in(), nullptr);
}

TEST_F(StringHolder, PartOfTheHeldStringCanBeAssigned) {
    CORBA_String_var known("vesta"), adopted(CORBA::string_dup("juno"));
    known = known.in() + 2;
    adopted = adopted.in() + 2;
    EXPECT_STREQ(known, "sta");
    EXPECT_STREQ(adopted, "no");
}

TEST_F(StringHolder, AssignmentWithoutMemoryLeavesTheHolderAsItWas) {
    CORBA_String_var holder("vesta");
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(holder = "a longer text", std::bad_alloc);
    }
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 6u);
}

TEST_F(StringHolder, ConstructionWithoutMemoryThrowsBadAlloc) {
    const CORBA_String_var source("vesta");
    AllocationPlan::fail(1, true);
    Armed armed;
    EXPECT_THROW(CORBA_String_var("vesta"), std::bad_alloc);
    EXPECT_THROW(CORBA_String_var copy(source), std::bad_alloc);
}

// Access

TEST_F(StringHolder, ConvertsToBothKindsOfPointer) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    char* const changeable = holder;
    const char* const readable = constant;
    EXPECT_EQ(changeable, holder.in());
    EXPECT_EQ(readable, holder.in());
    EXPECT_EQ(std::strlen(holder), 5u);
    EXPECT_EQ(std::strcmp(constant, holder), 0);
}

TEST_F(StringHolder, ConvertsToACondition) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var nothing(null);
    EXPECT_TRUE(holder ? true : false);
    EXPECT_FALSE(nothing ? true : false);
    EXPECT_TRUE(!nothing);
}

template <class Index>
void expect_indexing() {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    holder[Index(1)] = 'i';
    EXPECT_EQ(holder[Index(1)], 'i');
    EXPECT_EQ(constant[Index(2)], 's');
    EXPECT_EQ(constant[Index(5)], 0);
}

TEST_F(StringHolder, IsIndexedByAnyIntegerType) {
    expect_indexing<int>();
    expect_indexing<unsigned>();
    expect_indexing<long>();
    expect_indexing<unsigned long>();
    expect_indexing<short>();
    expect_indexing<unsigned char>();
    expect_indexing<std::size_t>();
    CORBA_String_var holder("vesta");
    EXPECT_EQ(holder[0], 'v');
}

TEST_F(StringHolder, InoutGivesThePointerAndForgetsTheSize) {
    CORBA_String_var holder("vesta");
    char*& p = holder.inout();
    EXPECT_STREQ(p, "vesta");
    EXPECT_EQ(capacity_of(holder), 0u);
    CORBA::string_free(p);
    p = CORBA::string_dup("x");
    EXPECT_STREQ(holder, "x");
    holder = "juno";
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(StringHolder, OutReleasesTheStringAndGivesANullPointer) {
    CORBA_String_var holder("vesta");
    char*& p = holder.out();
    EXPECT_EQ(p, nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
    p = CORBA::string_dup("x");
    EXPECT_STREQ(holder, "x");
}

TEST_F(StringHolder, RetnHandsTheStringToTheCaller) {
    CORBA_String_var holder("vesta");
    char* const s = holder._retn();
    EXPECT_STREQ(s, "vesta");
    EXPECT_EQ(holder.in(), nullptr);
    EXPECT_EQ(capacity_of(holder), 0u);
    CORBA::string_free(s);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringHolder, RetnOfADefaultOneGivesWhatFreeIgnores) {
    CORBA_String_var holder;
    char* const s = holder._retn();
    EXPECT_STREQ(s, "");
    CORBA::string_free(s);
    EXPECT_EQ(holder.in(), nullptr);
}

// Out parameters

void give(CORBA_String_out out, const char* text) { out = text; }
void give_pointer(CORBA_String_out out, char* s) { out = s; }

TEST_F(StringHolder, OutParameterFillsAPointer) {
    char* p = const_cast<char*>("left over");
    give(p, "vesta");
    EXPECT_STREQ(p, "vesta");
    CORBA::string_free(p);
}

TEST_F(StringHolder, OutParameterFillsAHolderAndReleasesWhatItHeld) {
    CORBA_String_var holder("a long text");
    give(holder, "vesta");
    EXPECT_STREQ(holder, "vesta");
    EXPECT_EQ(capacity_of(holder), 0u);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 1);
}

TEST_F(StringHolder, OutParameterStartsAsNull) {
    char* p = const_cast<char*>("left over");
    const CORBA_String_out out(p);
    EXPECT_EQ(p, nullptr);
}

TEST_F(StringHolder, OutParameterAdoptsAPointer) {
    CORBA_String_var holder;
    char* const s = CORBA::string_dup("vesta");
    give_pointer(holder, s);
    EXPECT_EQ(holder.in(), s);
}

TEST_F(StringHolder, OutParameterCopiesRefersToTheSameString) {
    char* p = nullptr;
    CORBA_String_out out(p);
    CORBA_String_out same(out);
    same = "vesta";
    EXPECT_STREQ(out.ptr(), "vesta");
    char*& reference = out;
    EXPECT_EQ(&reference, &p);
    CORBA::string_free(p);
}

TEST_F(StringHolder, OutParameterAssignedFromAnotherStoresItsPointer) {
    char *p = nullptr, *q = nullptr;
    CORBA_String_out first(p), second(q);
    first = "vesta";
    second = first;
    EXPECT_EQ(p, q);
    CORBA::string_free(p);
}

TEST_F(StringHolder, TextOfNilIsNilInParentheses) { EXPECT_STREQ(CORBA_String_out::_nil, "(nil)"); }

}  // namespace
}  // namespace test
}  // namespace kel
