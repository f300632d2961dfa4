// SPDX-License-Identifier: MIT
// Writing narrow strings: with length and quotes, or as plain text on the console.

#include <gtest/gtest.h>

#include <iomanip>

#include "tests/streams/string_fixtures.h"
#include "tests/support/fault.h"

using kel::test::AllocationPlan;
using kel::test::Armed;

namespace {

// ---- writing ----

TEST(StringWriting, ALengthWithTheTerminatorThenTheQuotedText) {
    Writer w;
    w.out << "abc";
    EXPECT_EQ(w.written(), "4\"abc\"\n");
}

TEST(StringWriting, CountsFourAndWhatTheQuotedFormAdds) {
    Writer w;
    w.out << "abc";
    EXPECT_EQ(w.out.cur_out_offset(), 4u + 1 + 3 + 2);
}

TEST(StringWriting, ANullStringIsAZeroAndABlank) {
    Writer w;
    w.out << static_cast<const char*>(nullptr);
    EXPECT_EQ(w.written(), "0 ");
    EXPECT_EQ(w.out.cur_out_offset(), 5u);
}

TEST(StringWriting, AnEmptyStringIsAOneAndABlank) {
    Writer w;
    w.out << "";
    EXPECT_EQ(w.written(), "1 ");
    EXPECT_EQ(w.out.cur_out_offset(), 5u);
}

TEST(StringWriting, TheLengthFollowsTheFlags) {
    Writer w;
    w.text << std::hex << std::setw(4) << std::setfill('.');
    w.out << "0123456789abcdef";
    EXPECT_EQ(w.written(), "..11\"0123456789abcdef\"\n");
}

TEST(StringWriting, ReturnsTheStream) {
    Writer w;
    EXPECT_EQ(&(w.out << "abc"), &w.out);
    EXPECT_EQ(&(w.out << ""), &w.out);
    EXPECT_EQ(&w.out.putCString("abc"), &w.out);
}

TEST(StringWriting, TheQuotedFormAlone) {
    Writer w;
    w.out.putCString("abc");
    EXPECT_EQ(w.written(), "\"abc\"\n");
    EXPECT_EQ(w.out.cur_out_offset(), 6u);
}

TEST(StringWriting, TheQuotedFormOfAnEmptyString) {
    Writer w;
    w.out.putCString("");
    EXPECT_EQ(w.written(), "\"\"\n");
    EXPECT_EQ(w.out.cur_out_offset(), 3u);
}

TEST(StringWriting, CallsTheVirtualQuotedForm) {
    std::ostringstream text;
    OwnQuotes out(text);
    out << "abc";
    EXPECT_EQ(out.quoted, std::vector<std::string>{"abc"});
    EXPECT_EQ(text.str(), "4");
    EXPECT_EQ(out.cur_out_offset(), 4u);
}

TEST(StringWriting, NullAndEmptyStringsHaveNoQuotedForm) {
    std::ostringstream text;
    OwnQuotes out(text);
    out << "" << static_cast<const char*>(nullptr);
    EXPECT_TRUE(out.quoted.empty());
}

// ---- console ----

class ConsoleStrings : public ::testing::TestWithParam<std::ostream*> {};

TEST_P(ConsoleStrings, ShowThePlainText) {
    Swapped console(*GetParam());
    KELostream out(*GetParam());
    KELostream* result = &(out << "a\"b{\n");
    EXPECT_EQ(console.text(), "a\"b{\n");
    EXPECT_EQ(out.cur_out_offset(), 6u);
    EXPECT_EQ(result, &out);
}

TEST_P(ConsoleStrings, AnEmptyStringShowsNothingAndCountsItsTerminator) {
    Swapped console(*GetParam());
    KELostream out(*GetParam());
    out << "";
    EXPECT_EQ(console.text(), "");
    EXPECT_EQ(out.cur_out_offset(), 1u);
}

TEST_P(ConsoleStrings, ANullStringShowsNothing) {
    Swapped console(*GetParam());
    KELostream out(*GetParam());
    out << static_cast<const char*>(nullptr);
    EXPECT_EQ(console.text(), "");
    EXPECT_TRUE(GetParam()->good());
    EXPECT_EQ(out.cur_out_offset(), 0u);
}

TEST_P(ConsoleStrings, DoNotReachTheQuotedForm) {
    Swapped console(*GetParam());
    OwnQuotes out(*GetParam());
    out << "abc";
    EXPECT_TRUE(out.quoted.empty());
}

TEST_P(ConsoleStrings, TheQuotedFormIsTheSameOnTheConsole) {
    Swapped console(*GetParam());
    KELostream out(*GetParam());
    out.putCString("a{");
    EXPECT_EQ(console.text(), "\"a\\[\"\n");
}

TEST_P(ConsoleStrings, NumbersAreTheSameOnTheConsole) {
    Swapped console(*GetParam());
    KELostream out(*GetParam());
    out << 7 << 'x';
    EXPECT_EQ(console.text(), "7 x ");
}

INSTANTIATE_TEST_SUITE_P(CoutAndCerr, ConsoleStrings, ::testing::Values(&std::cout, &std::cerr),
                         [](const auto& case_info) {
                             return case_info.param == &std::cout ? "Cout" : "Cerr";
                         });

TEST(ConsoleStrings, ClogGetsLengthAndQuotes) {
    Swapped console(std::clog);
    KELostream out(std::clog);
    out << "abc";
    EXPECT_EQ(console.text(), "4\"abc\"\n");
    EXPECT_EQ(out.cur_out_offset(), 10u);
}

TEST(ConsoleStrings, AnotherStreamOverTheSameBufferIsNoConsole) {
    Swapped console(std::cout);
    std::ostream twin(&console.buffer);
    KELostream out(twin);
    out << "abc";
    EXPECT_EQ(console.text(), "4\"abc\"\n");
}

TEST(ConsoleWords, CinReadsAWordIntoTheCallersBuffer) {
    Swapped console(std::cin, "  hello world");
    KEListream in(std::cin);
    char buffer[16] = "";
    char* s = buffer;
    KEListream* result = &(in >> s);
    EXPECT_EQ(s, buffer);
    EXPECT_STREQ(buffer, "hello");
    EXPECT_EQ(in.cur_in_offset(), 5u);
    EXPECT_EQ(std::cin.peek(), ' ');
    EXPECT_EQ(result, &in);
}

TEST(ConsoleWords, NothingIsAllocatedOrFreed) {
    Swapped console(std::cin, "hello ");
    KEListream in(std::cin);
    char buffer[16] = "";
    char* s = buffer;
    kel::test::reset_faults();
    const long before = AllocationPlan::live_blocks();
    {
        Armed armed;
        in >> s;
    }
    EXPECT_EQ(AllocationPlan::calls(), 0);
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST(ConsoleWords, TheWidthBoundsTheWord) {
    Swapped console(std::cin, "hello");
    KEListream in(std::cin);
    char buffer[16] = "";
    char* s = buffer;
    std::cin.width(4);
    in >> s;
    EXPECT_STREQ(buffer, "hel");
    EXPECT_EQ(in.cur_in_offset(), 3u);
}

TEST(ConsoleWords, WithoutABufferTheStreamFails) {
    Swapped console(std::cin, "hello");
    KEListream in(std::cin);
    char* s = nullptr;
    in >> s;
    EXPECT_EQ(s, nullptr);
    EXPECT_TRUE(std::cin.fail());
    EXPECT_EQ(in.cur_in_offset(), 0u);
}

TEST(ConsoleWords, AMissingWordCountsNothing) {
    Swapped console(std::cin, "");
    KEListream in(std::cin);
    char buffer[16] = "old";
    char* s = buffer;
    in >> s;
    EXPECT_TRUE(std::cin.fail());
    EXPECT_EQ(in.cur_in_offset(), 0u);
}

TEST(ConsoleWords, AnotherStreamOverTheSameBufferReadsAString) {
    Swapped console(std::cin, "4\"abc\"\n");
    std::istream twin(&console.buffer);
    KEListream in(twin);
    char* s = nullptr;
    in >> s;
    EXPECT_STREQ(s, "abc");
    CORBA::string_free(s);
}

}  // namespace
