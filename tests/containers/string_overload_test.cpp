// SPDX-License-Identifier: MIT
// What a string holder becomes where a program writes it: copied or taken over, text or pointer.
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/services/debug_logger.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstring>
#include <sstream>
#include <string>
#include <type_traits>

#include "tests/containers/mirrors.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {
namespace {

class StringOverload : public FaultTest {
protected:
    long blocks_before = AllocationPlan::live_blocks();
};

template <class T>
constexpr bool is_assignable_from() {
    return std::is_assignable<CORBA_String_var&, T>::value;
}

// Strings come from pointers, arrays and holders; nothing else becomes a holder by mistake.
static_assert(std::is_convertible<char*, CORBA_String_var>::value, "a pointer");
static_assert(std::is_convertible<char* const&, CORBA_String_var>::value, "a constant pointer");
static_assert(std::is_convertible<const char*, CORBA_String_var>::value, "text");
static_assert(std::is_convertible<char (&)[4], CORBA_String_var>::value, "an array");
static_assert(!std::is_convertible<int, CORBA_String_var>::value, "a number");
static_assert(!std::is_convertible<void*, CORBA_String_var>::value, "any address");
static_assert(!std::is_convertible<wchar_t*, CORBA_String_var>::value, "wide characters");
static_assert(!is_assignable_from<int>() && !is_assignable_from<void*>(), "nor by assignment");

// `flag ? holder : nullptr` must not become a holder of its own.
static_assert(!std::is_constructible<CORBA_String_var, std::nullptr_t>::value, "a null literal");

// An out parameter that took a holder's string would leave it with two owners.
static_assert(!std::is_assignable<CORBA_String_out&, CORBA_String_var&>::value, "a holder");
static_assert(!std::is_assignable<CORBA_String_out&, const CORBA_String_var&>::value, "a holder");

// Copied or taken over

TEST_F(StringOverload, PointerIsTakenOverHoweverItIsPassed) {
    char* const constant = CORBA::string_dup("vesta");
    CORBA_String_var copied_syntax = constant;
    CORBA_String_var braced{CORBA::string_dup("juno")};
    CORBA_String_var assigned;
    char* changeable = CORBA::string_dup("ceres");
    assigned = changeable;
    EXPECT_EQ(copied_syntax.in(), constant);
    EXPECT_EQ(assigned.in(), changeable);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before + 3);
}

TEST_F(StringOverload, ArrayIsCopied) {
    char text[] = "vesta";
    CORBA_String_var constructed(text), assigned;
    assigned = text;
    EXPECT_NE(constructed.in(), text);
    EXPECT_NE(assigned.in(), text);
    EXPECT_STREQ(constructed, "vesta");
    EXPECT_STREQ(assigned, "vesta");
    EXPECT_EQ(capacity_of(assigned), 6u);
}

TEST_F(StringOverload, ArrayIsCopiedIntoAnOutParameter) {
    char text[] = "vesta";
    CORBA_String_var holder;
    CORBA_String_out out(holder);
    out = text;
    EXPECT_NE(holder.in(), text);
    EXPECT_STREQ(holder, "vesta");
}

TEST_F(StringOverload, ArrayIsAKeyAndAValue) {
    KELDictionary<CORBA_String_var, CORBA_String_var> table;
    char key[] = "key 0", value[] = "value 0";
    for (char digit = '0'; digit < '5'; ++digit) {
        key[4] = value[6] = digit;
        table.add(key, value);
    }
    EXPECT_EQ(table.count(), 5u);
    key[4] = '3';
    EXPECT_STREQ(table.atKey(key), "value 3");
}

TEST_F(StringOverload, WhatAnOutParameterRefersToIsCopied) {
    CORBA_String_var owner;
    CORBA_String_out out(owner);
    out = "vesta";
    CORBA_String_var constructed(out), assigned;
    assigned = out;
    EXPECT_STREQ(constructed, "vesta");
    EXPECT_STREQ(assigned, "vesta");
    EXPECT_STREQ(owner, "vesta");
    EXPECT_NE(constructed.in(), owner.in());
    EXPECT_NE(assigned.in(), owner.in());
}

TEST_F(StringOverload, AssignedNullLiteralReleasesTheString) {
    CORBA_String_var first("vesta"), second("juno"), third("ceres");
    first = 0;
    second = nullptr;
    third = NULL;
    EXPECT_EQ(first.in(), nullptr);
    EXPECT_EQ(second.in(), nullptr);
    EXPECT_EQ(third.in(), nullptr);
    EXPECT_EQ(AllocationPlan::live_blocks(), blocks_before);
}

TEST_F(StringOverload, OutParameterTakesANullLiteral) {
    CORBA_String_var holder;
    CORBA_String_out out(holder);
    out = 0;
    EXPECT_EQ(holder.in(), nullptr);
    out = nullptr;
    EXPECT_EQ(holder.in(), nullptr);
}

TEST_F(StringOverload, ResultOfAFunctionIsTakenFromTheHolder) {
    CORBA_String_var source("vesta"), target;
    const char* const text = source.in();
    target = source._retn();
    EXPECT_EQ(target.in(), text);
    EXPECT_EQ(source.in(), nullptr);
}

// Parameters

std::string taken_as_text(const char* s) { return s; }
[[maybe_unused]] std::string taken_as_text(const std::string& s) { return "not as text: " + s; }
bool is_null(char*& s) { return s == nullptr; }
bool is_null_out(CORBA_String_out out) { return out.ptr() == nullptr; }

TEST_F(StringOverload, HolderAndOutParameterArePassedAsText) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    char* p = nullptr;
    CORBA_String_out out(p);
    out = holder._retn();
    EXPECT_EQ(taken_as_text(out), "vesta");
    holder = p;
    EXPECT_EQ(taken_as_text(holder), "vesta");
    EXPECT_EQ(taken_as_text(constant), "vesta");
    EXPECT_EQ(std::string(holder) + std::string(constant), "vestavesta");
}

TEST_F(StringOverload, HolderFillsAPointerParameterThroughOut) {
    CORBA_String_var holder("vesta");
    EXPECT_FALSE(is_null(holder.inout()));
    EXPECT_TRUE(is_null(holder.out()));
    holder = "juno";
    EXPECT_TRUE(is_null_out(holder.out()));
    holder = "ceres";
    EXPECT_TRUE(is_null_out(holder));
    EXPECT_EQ(holder.in(), nullptr);
}

// Expressions

TEST_F(StringOverload, ComparesWithNullAndWithPointers) {
    CORBA_String_var holder("vesta"), nothing(CORBA::string_dup(nullptr));
    const CORBA_String_var& constant = holder;
    const char* const text = holder.in();
    EXPECT_TRUE(nothing == 0 && 0 == nothing && nothing == nullptr && nothing == NULL);
    EXPECT_TRUE(holder != 0 && nullptr != holder && constant != 0 && constant != nullptr);
    EXPECT_TRUE(holder == text && text == constant && holder == constant && holder != nothing);
    EXPECT_TRUE(holder && constant && !nothing);
}

TEST_F(StringOverload, ConditionBetweenTwoHoldersGivesTheHolderItself) {
    CORBA_String_var first("vesta"), second("juno");
    const CORBA_String_var& constant = second;
    for (const bool flag : {true, false}) {
        const char* const both = flag ? first : second;
        const char* const mixed = flag ? first : constant;
        const char* const with_text = flag ? first.in() : "none";
        EXPECT_EQ(both, flag ? first.in() : second.in());
        EXPECT_EQ(mixed, flag ? first.in() : second.in());
        EXPECT_STREQ(with_text, flag ? "vesta" : "none");
    }
}

TEST_F(StringOverload, IsReadLikeAPointer) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    EXPECT_EQ(*holder, 'v');
    EXPECT_EQ(*constant, 'v');
    EXPECT_STREQ(holder + 1, "esta");
    EXPECT_STREQ(1u + constant, "esta");
    EXPECT_EQ(std::strchr(holder, 't') - holder, 3);
}

// Streams

template <class Value>
std::string printed(Value&& value) {
    std::ostringstream out;
    out << value;
    return out.str();
}

template <class Value>
std::string marshalled(Value&& value) {
    std::ostringstream text;
    KELostream out(text);
    out << value;
    return text.str();
}

TEST_F(StringOverload, StandardStreamsPrintTheText) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    char* p = nullptr;
    CORBA_String_out out(p);
    out = "juno";
    EXPECT_EQ(printed(holder), "vesta");
    EXPECT_EQ(printed(constant), "vesta");
    EXPECT_EQ(printed(CORBA_String_var("ceres")), "ceres");
    EXPECT_EQ(printed(out), "juno");
    CORBA::string_free(p);
}

TEST_F(StringOverload, MarshallingStreamsWriteTheString) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var& constant = holder;
    char* p = nullptr;
    CORBA_String_out out(p);
    out = "vesta";
    const std::string expected = marshalled(static_cast<const char*>("vesta"));
    EXPECT_EQ(marshalled(holder), expected);
    EXPECT_EQ(marshalled(constant), expected);
    EXPECT_EQ(marshalled(CORBA_String_var("vesta")), expected);
    EXPECT_EQ(marshalled(out), expected);
    CORBA::string_free(p);
}

class Encoder : public KELostream {
public:
    using KELostream::operator<<;
    KELostream& operator<<(const char* s) override {
        written += s;
        return *this;
    }
    std::string written;
};

TEST_F(StringOverload, EncodingsGetTheStringThroughTheirOwnOperator) {
    CORBA_String_var holder("vesta");
    const CORBA_String_var constant("juno");
    Encoder out;
    out << holder << constant;
    EXPECT_EQ(out.written, "vestajuno");
}

TEST_F(StringOverload, HoldersAndOutParametersAreReadOneAfterAnother) {
    std::stringstream text;
    KELostream out(text);
    out << "vesta"
        << "juno"
        << "ceres";
    KEListream in(text);
    CORBA_String_var first, second;
    char* p = nullptr;
    CORBA_String_out third(p);
    in >> first >> second.out() >> third;
    EXPECT_STREQ(first, "vesta");
    EXPECT_STREQ(second, "juno");
    EXPECT_STREQ(p, "ceres");
    CORBA::string_free(p);
}

// A holder is text for the logger too. Nothing is logged here: the overloads must merely be clear.
static_assert(std::is_same<decltype(std::declval<KELDebugLogger&>() << std::declval<CORBA_String_var&>()),
                           KELDebugLogger&>::value,
              "the logger takes a holder");

}  // namespace
}  // namespace test
}  // namespace kel
