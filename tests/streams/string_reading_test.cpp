// SPDX-License-Identifier: MIT
// Reading narrow strings with their length, whatever a peer may send as one.

#include <gtest/gtest.h>

#include <cstring>
#include <new>

#include "tests/streams/string_fixtures.h"
#include "tests/support/fault.h"

using kel::test::AllocationPlan;
using kel::test::Armed;

namespace {

TEST(StringReading, ReadsBackWhatWasWritten) {
    const StringRead read("4\"abc\"\n|");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.result, &read.reader.in);
    EXPECT_EQ(read.messages, "");
}

TEST(StringReading, CountsFourAndWhatTheQuotedFormAdds) {
    const StringRead read("4\"abc\"\n|");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 4u + 1 + 3 + 1);
}

TEST(StringReading, LeavesWhatFollows) {
    StringRead read("4\"abc\"\n7 ");
    EXPECT_EQ(read.reader.rest(), "7 ");
}

TEST(StringReading, TheLastStringLeavesTheStreamReadable) {
    const StringRead read("4\"abc\"\n");
    EXPECT_FALSE(read.reader.text.fail());
    EXPECT_TRUE(read.reader.text.eof());
}

TEST(StringReading, ANewlineBehindTheStringIsTaken) {
    StringRead read("4\"abc\"\n\nx");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.reader.rest(), "x");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 9u);
}

TEST(StringReading, AnyOtherCharacterBehindTheStringStays) {
    StringRead read("4\"abc\"\n x");
    EXPECT_EQ(read.reader.rest(), " x");
}

TEST(StringReading, ANullStringReadsAsNull) {
    StringRead read("0 |");
    EXPECT_EQ(read.s, nullptr);
    EXPECT_EQ(read.reader.in.cur_in_offset(), 5u);
    EXPECT_EQ(read.reader.rest(), "|");
}

TEST(StringReading, AnEmptyStringReadsAsEmptyAndNotNull) {
    StringRead read("1 |");
    EXPECT_STREQ(read.s, "");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 4u);
    EXPECT_EQ(read.reader.rest(), "|");
}

TEST(StringReading, AnEmptyStringMayBeQuoted) {
    StringRead read("1\"\"\n|");
    EXPECT_STREQ(read.s, "");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 4u + 1 + 1);
    EXPECT_EQ(read.reader.rest(), "|");
}

TEST(StringReading, AQuotedCharacterUnderALengthOfOneIsKept) {
    const StringRead read("1\"a\"\n");
    EXPECT_STREQ(read.s, "a");
}

TEST(StringReading, TwoQuotedCharactersUnderALengthOfOneAreTerminated) {
    const StringRead read("1\"ab\"\n");
    EXPECT_STREQ(read.s, "ab");
    EXPECT_EQ(read.messages, "");
}

TEST(StringReading, ThreeQuotedCharactersUnderALengthOfOneOverflow) {
    const StringRead read("1\"abc\"\n");
    EXPECT_STREQ(read.s, "ab");
    EXPECT_EQ(read.messages, overflow_message);
}

TEST(StringReading, AStringThatFillsItsLengthIsTerminatedAtTheNewline) {
    StringRead read("3\"abc\"\n|");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.reader.rest(), "|");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 4u + 1 + 3);
}

TEST(StringReading, AStringThatFillsItsLengthIsTerminatedWithoutANewline) {
    Reader r("23\"as long as its block is\"|");
    // The block that the string will get holds no zero where the terminator belongs.
    char* s = CORBA::string_alloc(23);
    std::memset(s, 'x', 24);
    CORBA::string_free(s);
    s = nullptr;
    r.in >> s;
    EXPECT_STREQ(s, "as long as its block is");
    EXPECT_EQ(r.rest(), "|");
    CORBA::string_free(s);
}

TEST(StringReading, AStreamThatThrowsLeavesAnEmptyString) {
    for (const char* input : {"20 \"cut off ", "1\"c"}) {
        Reader r(input);
        r.text.exceptions(std::ios::failbit | std::ios::eofbit);
        char* s = nullptr;
        EXPECT_THROW(r.in >> s, std::ios_base::failure);
        EXPECT_STREQ(s, "");
        CORBA::string_free(s);
    }
}

TEST(StringReading, AStringLongerThanItsLengthIsCutAndReported) {
    StringRead read("3\"abcde\"\n");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.reader.rest(), "de\"\n");
}

TEST(StringReading, AStringShorterThanItsLengthIsTerminated) {
    const StringRead read("9\"abc\"\n");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.messages, "");
}

TEST(StringReading, WhiteSpaceBeforeLengthAndQuotesIsSkipped) {
    const StringRead read(" \n4 \n\"abc\"\n");
    EXPECT_STREQ(read.s, "abc");
    EXPECT_EQ(read.reader.in.cur_in_offset(), 9u);
}

TEST(StringReading, ThePreviousStringIsFreed) {
    const long before = AllocationPlan::live_blocks();
    {
        Reader r("0 ");
        char* s = CORBA::string_dup("old");
        r.in >> s;
        EXPECT_EQ(s, nullptr);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST(StringReading, ThePreviousStringIsReplaced) {
    const StringRead read("4\"abc\"\n", CORBA::string_dup("old"));
    EXPECT_STREQ(read.s, "abc");
}

TEST(StringReading, TheEmptyStringOfAHolderIsReplacedAndNotFreed) {
    CORBA_String_var holder;
    char* s = holder.inout();
    Reader r("4\"abc\"\n");
    r.in >> s;
    EXPECT_STREQ(s, "abc");
    EXPECT_STREQ(holder.in(), "");
    CORBA::string_free(s);
}

TEST(StringReading, TheStringComesFromOneAllocation) {
    kel::test::reset_faults();
    Reader r("4\"abc\"\n");
    char* s = nullptr;
    {
        Armed armed;
        r.in >> s;
    }
    EXPECT_EQ(AllocationPlan::calls(), 1);
    CORBA::string_free(s);
}

TEST(StringReading, ReturnsTheStreamWhateverTheLength) {
    for (const char* input : {"", "0 ", "1 ", "1\"\"\n", "4\"abc\"\n"}) {
        const StringRead read(input);
        EXPECT_EQ(read.result, &read.reader.in) << input;
    }
}

TEST(StringReading, AMissingLengthGivesNullAndAFailedStream) {
    const StringRead read("", CORBA::string_dup("old"));
    EXPECT_EQ(read.s, nullptr);
    EXPECT_TRUE(read.reader.text.fail());
    EXPECT_EQ(read.reader.in.cur_in_offset(), 5u);
}

TEST(StringReading, AStreamThatHadFailedGivesNull) {
    Reader r("4\"abc\"\n");
    r.text.setstate(std::ios::failbit);
    char* s = nullptr;
    r.in >> s;
    EXPECT_EQ(s, nullptr);
}

TEST(StringReading, AStringThatIsNotQuotedGivesAnEmptyOneAndAMessage) {
    const StringRead read("4abc\"\n");
    EXPECT_STREQ(read.s, "");
    EXPECT_EQ(read.messages, object_message);
}

TEST(StringReading, AStringThatIsMissingGivesAnEmptyOneAndAMessage) {
    const StringRead read("4");
    EXPECT_STREQ(read.s, "");
    EXPECT_EQ(read.messages, eof_message);
}

TEST(StringReading, AStringCutOffByTheEndIsFilledAndTerminated) {
    const StringRead read("4\"ab");
    EXPECT_STREQ(read.s, "ab\xff\xff");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.reader.in.cur_in_offset(), 4u + 1 + 2 + 3);
}

struct OwnUnquotes : KEListream {
    explicit OwnUnquotes(std::istream& in) : KEListream(in) {}
    KEListream& getCString(char* buf, unsigned int len) override {
        room.push_back(len);
        offset_then = cur_in_offset();
        buf[0] = 'o';
        buf[1] = '\0';
        return *this;
    }
    std::vector<unsigned int> room;
    unsigned long offset_then = 99;
};

std::string read_through(OwnUnquotes& in) {
    char* s = nullptr;
    static_cast<KEListream&>(in) >> s;
    const std::string result(s);
    CORBA::string_free(s);
    return result;
}

TEST(StringReading, CallsTheVirtualQuotedFormWithTheLength) {
    std::istringstream text("4");
    OwnUnquotes in(text);
    EXPECT_EQ(read_through(in), "o");
    EXPECT_EQ(in.room, std::vector<unsigned int>{4});
}

TEST(StringReading, TheLengthIsCountedBeforeTheQuotedFormAndNothingBehindIt) {
    std::istringstream text("4\n");
    OwnUnquotes in(text);
    read_through(in);
    EXPECT_EQ(in.offset_then, 4u);
    EXPECT_EQ(in.cur_in_offset(), 4u);
}

TEST(StringReading, CallsTheVirtualQuotedFormForAQuotedEmptyString) {
    std::istringstream text("1\"\"\n");
    OwnUnquotes in(text);
    EXPECT_EQ(read_through(in), "o");
    EXPECT_EQ(in.room, std::vector<unsigned int>{2});
    EXPECT_EQ(text.peek(), '"');
}

class HostileStringLength : public ::testing::TestWithParam<const char*> {};

TEST_P(HostileStringLength, EndsInBadAllocAndANullString) {
    Reader r(GetParam());
    char* s = CORBA::string_dup("old");
    EXPECT_THROW(r.in >> s, std::bad_alloc);
    EXPECT_EQ(s, nullptr);
}

INSTANTIATE_TEST_SUITE_P(Lengths, HostileStringLength,
                         ::testing::Values("4294967295\"abc\"\n", "4294967294\"abc\"\n",
                                           "2147483648\"abc\"\n", "2147483647\"abc\"\n",
                                           "99999999999999999999\"abc\"\n", "-1\"abc\"\n"));

class StringMemory : public kel::test::FaultTest {};

TEST_F(StringMemory, FailedAllocationLeavesANullString) {
    Reader r("4\"abc\"\n");
    char* s = CORBA::string_dup("old");
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(r.in >> s, std::bad_alloc);
    }
    EXPECT_EQ(s, nullptr);
}

TEST_F(StringMemory, AThrowingQuotedFormLeavesATerminatedString) {
    struct Throwing : KEListream {
        explicit Throwing(std::istream& in) : KEListream(in) {}
        KEListream& getCString(char*, unsigned int) override { throw 1; }
    };
    std::istringstream text("4\"abc\"\n");
    Throwing in(text);
    char* s = nullptr;
    EXPECT_THROW(static_cast<KEListream&>(in) >> s, int);
    EXPECT_STREQ(s, "");
    CORBA::string_free(s);
}

}  // namespace
