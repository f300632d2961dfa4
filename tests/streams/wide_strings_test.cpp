// SPDX-License-Identifier: MIT
// Wide strings: written without their length, read with it.

#include <gtest/gtest.h>
#include <kel/containers/wstrings.h>

#include <cwchar>
#include <iomanip>
#include <iostream>
#include <memory>
#include <new>

#include "tests/streams/fixtures.h"
#include "tests/support/fault.h"

using kel::test::AllocationPlan;
using kel::test::Armed;

namespace {

TEST(WideStrings, AreWrittenAsNumbersBetweenBlanks) {
    Writer w;
    w.out << L"ab";
    EXPECT_EQ(w.written(), " 97 98  ");
}

TEST(WideStrings, TheLengthIsNotWritten) {
    Writer w;
    w.out << L"abc";
    EXPECT_EQ(w.written(), " 97 98 99  ");
}

TEST(WideStrings, CountTheArrayAndFourPerCharacterAndTwo) {
    Writer w;
    w.out << L"ab";
    EXPECT_EQ(w.out.cur_out_offset(), 5u * 2 + 4 * 2 + 2);
}

TEST(WideStrings, AnEmptyOneIsTwoBlanks) {
    Writer w;
    w.out << L"";
    EXPECT_EQ(w.written(), "  ");
    EXPECT_EQ(w.out.cur_out_offset(), 2u);
}

TEST(WideStrings, ANullOneIsWrittenLikeAnEmptyOne) {
    Writer w;
    w.out << static_cast<const wchar_t*>(nullptr);
    EXPECT_EQ(w.written(), "  ");
    EXPECT_EQ(w.out.cur_out_offset(), 2u);
}

TEST(WideStrings, WritingReturnsTheStream) {
    Writer w;
    EXPECT_EQ(&(w.out << L"ab"), &w.out);
}

struct OwnArrays : KELostream {
    explicit OwnArrays(std::ostream& out) : KELostream(out) {}
    using KELostream::put;
    KELostream& put(const wchar_t* values, unsigned int n) override {
        seen = values;
        length = n;
        offset_then = cur_out_offset();
        *_strm << "[]";
        return *this;
    }
    const wchar_t* seen = nullptr;
    unsigned int length = 0;
    unsigned long offset_then = 99;
};

TEST(WideStrings, WritingCallsTheVirtualArrayOperation) {
    std::ostringstream text;
    OwnArrays out(text);
    const wchar_t* const s = L"abc";
    static_cast<KELostream&>(out) << s;
    EXPECT_EQ(out.seen, s);
    EXPECT_EQ(out.length, 3u);
    EXPECT_EQ(text.str(), " [] ");
}

TEST(WideStrings, TheirOwnShareIsCountedBehindTheArray) {
    std::ostringstream text;
    OwnArrays out(text);
    static_cast<KELostream&>(out) << L"abc";
    EXPECT_EQ(out.offset_then, 0u);
    EXPECT_EQ(out.cur_out_offset(), 4u * 3 + 2);
}

// ---- console ----

std::string address_of(const void* p) {
    std::ostringstream text;
    text << p << " ";
    return text.str();
}

TEST(ConsoleWideStrings, CoutShowsTheAddress) {
    const wchar_t* const s = L"abc";
    Swapped console(std::cout);
    KELostream out(std::cout);
    KELostream* result = &(out << s);
    EXPECT_EQ(console.text(), address_of(s));
    EXPECT_EQ(out.cur_out_offset(), 4u * 3 + 1);
    EXPECT_EQ(result, &out);
}

TEST(ConsoleWideStrings, CerrShowsTheAddress) {
    const wchar_t* const s = L"abc";
    Swapped console(std::cerr);
    KELostream out(std::cerr);
    out << s;
    EXPECT_EQ(console.text(), address_of(s));
    EXPECT_EQ(out.cur_out_offset(), 13u);
}

TEST(ConsoleWideStrings, ClogShowsTheCharacters) {
    Swapped console(std::clog);
    KELostream out(std::clog);
    out << L"a";
    EXPECT_EQ(console.text(), " 97  ");
    EXPECT_EQ(out.cur_out_offset(), 11u);
}

TEST(ConsoleWideStrings, TheArrayOperationIsNotCalled) {
    Swapped console(std::cout);
    OwnArrays out(std::cout);
    static_cast<KELostream&>(out) << L"abc";
    EXPECT_EQ(out.seen, nullptr);
}

TEST(ConsoleWideStrings, ANullOneShowsTheNullAddress) {
    Swapped console(std::cout);
    KELostream out(std::cout);
    out << static_cast<const wchar_t*>(nullptr);
    EXPECT_EQ(console.text(), "0 ");
    EXPECT_EQ(out.cur_out_offset(), 1u);
}

// ---- reading ----

typedef std::unique_ptr<wchar_t[]> WideBuffer;

TEST(WideStringReading, ANullPointerBecomesANewArray) {
    Reader r("2 97 98 |");
    wchar_t* ws = nullptr;
    KEListream* result = &(r.in >> ws);
    WideBuffer hold(ws);
    ASSERT_NE(ws, nullptr);
    EXPECT_EQ(ws[0], L'a');
    EXPECT_EQ(ws[1], L'b');
    EXPECT_EQ(r.rest(), "|");
    EXPECT_EQ(result, &r.in);
}

TEST(WideStringReading, CountsTheArrayAndFourPerCharacter) {
    Reader r("2 97 98 |");
    wchar_t* ws = nullptr;
    r.in >> ws;
    WideBuffer hold(ws);
    EXPECT_EQ(r.in.cur_in_offset(), (4u * 2 + 1) + 4 * 2);
}

TEST(WideStringReading, ACallersBufferIsFilledAndNotTouchedBehindTheCount) {
    Reader r("2 97 98 |");
    wchar_t buffer[3] = {L'x', L'x', L'x'};
    wchar_t* ws = buffer;
    r.in >> ws;
    EXPECT_EQ(ws, buffer);
    EXPECT_EQ(buffer[0], L'a');
    EXPECT_EQ(buffer[1], L'b');
    EXPECT_EQ(buffer[2], L'x');
}

TEST(WideStringReading, ANewArrayHasAZeroBehindItsCharacters) {
    Reader r("5 97 98 99 100 101 |");
    // The block that the array will get holds no zero behind its characters.
    wchar_t* ws = CORBA::wstring_alloc(5);
    std::wmemset(ws, L'x', 6);
    CORBA::wstring_free(ws);
    ws = nullptr;
    r.in >> ws;
    WideBuffer hold(ws);
    EXPECT_EQ(std::wstring(ws), L"abcde");
}

TEST(WideStringReading, CharactersThatAreMissingAreZeros) {
    Reader r("4 97 ");
    wchar_t* ws = nullptr;
    r.in >> ws;
    WideBuffer hold(ws);
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(std::wstring(ws, 5), std::wstring(L"a\0\0\0\0", 5));
}

TEST(WideStringReading, ACountOfZeroGivesAnEmptyArray) {
    Reader r("0 |");
    wchar_t* ws = nullptr;
    r.in >> ws;
    WideBuffer hold(ws);
    ASSERT_NE(ws, nullptr);
    EXPECT_EQ(ws[0], L'\0');
    EXPECT_EQ(r.rest(), "|");
    EXPECT_EQ(r.in.cur_in_offset(), 1u);
}

TEST(WideStringReading, AMissingCountGivesAnEmptyArrayAndAFailedStream) {
    Reader r("");
    wchar_t* ws = nullptr;
    r.in >> ws;
    WideBuffer hold(ws);
    ASSERT_NE(ws, nullptr);
    EXPECT_EQ(ws[0], L'\0');
    EXPECT_TRUE(r.text.fail());
}

struct OwnReads : KEListream {
    explicit OwnReads(std::istream& in) : KEListream(in) {}
    using KEListream::get;
    KEListream& get(wchar_t* values, unsigned int n) override {
        seen = values;
        length = n;
        offset_then = cur_in_offset();
        return *this;
    }
    wchar_t* seen = nullptr;
    unsigned int length = 0;
    unsigned long offset_then = 99;
};

TEST(WideStringReading, CallsTheVirtualArrayOperationWithTheCount) {
    std::istringstream text("3 97 98 99 ");
    OwnReads in(text);
    wchar_t buffer[3];
    wchar_t* ws = buffer;
    static_cast<KEListream&>(in) >> ws;
    EXPECT_EQ(in.seen, buffer);
    EXPECT_EQ(in.length, 3u);
}

TEST(WideStringReading, TheCountAddsNothingAndTheCharactersAreCountedBehindTheArray) {
    std::istringstream text("3 97 98 99 ");
    OwnReads in(text);
    wchar_t buffer[3];
    wchar_t* ws = buffer;
    static_cast<KEListream&>(in) >> ws;
    EXPECT_EQ(in.offset_then, 0u);
    EXPECT_EQ(in.cur_in_offset(), 12u);
}

class HostileWideCount : public ::testing::TestWithParam<const char*> {};

TEST_P(HostileWideCount, EndsInBadAllocAndLeavesThePointerNull) {
    Reader r(GetParam());
    wchar_t* ws = nullptr;
    EXPECT_THROW(r.in >> ws, std::bad_alloc);
    EXPECT_EQ(ws, nullptr);
}

INSTANTIATE_TEST_SUITE_P(Lengths, HostileWideCount,
                         ::testing::Values("4294967295 97 ", "4294967294 97 ", "2147483648 97 ",
                                           "2147483647 97 ", "1073741824 97 ", "1073741823 97 ",
                                           "536870911 97 ", "99999999999999999999 97 ", "-1 97 "));

TEST(WideStringReading, ACountThatDoesNotFitLeavesTheCallersBuffer) {
    Reader r("99999999999999999999 97 98 ");
    wchar_t buffer[2] = {L'x', L'y'};
    wchar_t* ws = buffer;
    r.in >> ws;
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(buffer[0], L'x');
    EXPECT_EQ(buffer[1], L'y');
}

class WideStringMemory : public kel::test::FaultTest {};

TEST_F(WideStringMemory, FailedAllocationLeavesThePointerNull) {
    Reader r("2 97 98 ");
    wchar_t* ws = nullptr;
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(r.in >> ws, std::bad_alloc);
    }
    EXPECT_EQ(ws, nullptr);
}

}  // namespace
