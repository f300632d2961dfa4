// SPDX-License-Identifier: MIT
// Reading one quoted string into a buffer.

#include <gtest/gtest.h>

#include "tests/streams/string_fixtures.h"

namespace {

TEST(QuotedReading, StoresTheStringAndItsTerminator) {
    BufferRead read("\"abc\"\n|", 4);
    EXPECT_EQ(read.buffer, std::string("abc\0########", 12));
    EXPECT_EQ(read.offset(), 1u + 3 + 1);
    EXPECT_EQ(read.reader.rest(), "|");
    EXPECT_EQ(read.result, &read.reader.in);
}

TEST(QuotedReading, TheCharacterBehindTheClosingQuoteIsConsumedWhateverItIs) {
    BufferRead read("\"abc\"x|", 4);
    EXPECT_EQ(read.reader.rest(), "|");
}

TEST(QuotedReading, AStringThatFillsTheBufferHasNoTerminator) {
    BufferRead read("\"abc\"\n|", 3);
    EXPECT_EQ(read.buffer, "abc########");
    EXPECT_EQ(read.offset(), 1u + 3);
    EXPECT_EQ(read.reader.rest(), "\n|");
    EXPECT_EQ(read.messages, "");
}

TEST(QuotedReading, AnEmptyStringNeedsNoRoom) {
    BufferRead read("\"\"\n", 0);
    EXPECT_EQ(read.buffer, "########");
    EXPECT_EQ(read.offset(), 1u);
    EXPECT_EQ(read.reader.rest(), "\n");
}

TEST(QuotedReading, WhiteSpaceBeforeTheQuoteIsSkippedAndNotCounted) {
    BufferRead read(" \n\t\"abc\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "abc");
    EXPECT_EQ(read.offset(), 5u);
}

TEST(QuotedReading, RawNewlinesAreSkippedButCounted) {
    for (const std::locale& locale : {std::locale::classic(), alike()}) {
        BufferRead read("\"a\n\nb\"\n", 3, locale);
        EXPECT_STREQ(read.buffer.c_str(), "ab");
        EXPECT_EQ(read.offset(), 1u + 4 + 1);
    }
}

TEST(QuotedReading, RawNewlinesNeedNoRoom) {
    BufferRead read("\"ab\n\"\n", 2);
    EXPECT_EQ(read.buffer, "ab########");
    EXPECT_EQ(read.messages, "");
}

TEST(QuotedReading, AStringThatDoesNotFitIsReportedAndTheRestStays) {
    BufferRead read("\"abcd\"", 3);
    EXPECT_EQ(read.buffer, "abc########");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.reader.rest(), "d\"");
    EXPECT_EQ(read.offset(), 1u + 4);
}

TEST(QuotedReading, AnEscapeThatDoesNotFitStaysWhole) {
    BufferRead read("\"abc\\n\"", 3);
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.reader.rest(), "\\n\"");
}

TEST(QuotedReading, AnOverflowLeavesTheRestOfABufferWithoutAWayBack) {
    Swapped errors(std::cerr);
    NoWayBack source("\"abcd\"");
    std::istream text(&source);
    KEListream in(text);
    char buffer[3];
    in.getCString(buffer, 3);
    EXPECT_EQ(std::string(buffer, 3), "abc");
    EXPECT_EQ(source.rest(), "d\"");
    EXPECT_TRUE(text.good());
}

TEST(QuotedReading, WithoutRoomNothingIsStored) {
    BufferRead read("\"abc\"\n", 0);
    EXPECT_EQ(read.buffer, "########");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.offset(), 1u + 1);
    EXPECT_EQ(read.reader.rest(), "abc\"\n");
}

TEST(QuotedReading, WithoutRoomNoBufferIsNeeded) {
    Swapped errors(std::cerr);
    Reader closed("\"\""), open("\"");
    closed.in.getCString(nullptr, 0);
    EXPECT_EQ(errors.text(), "");
    open.in.getCString(nullptr, 0);
    EXPECT_EQ(errors.text(), overflow_message);
}

TEST(QuotedReading, TheStreamIsGoodAfterAnOverflow) {
    const BufferRead read("\"abcd\"", 3);
    EXPECT_TRUE(read.reader.text.good());
}

TEST(QuotedReading, MissingInputIsReported) {
    BufferRead read("", 4);
    EXPECT_EQ(read.messages, eof_message);
    EXPECT_EQ(read.buffer, std::string(12, '#'));
    EXPECT_EQ(read.offset(), 1u);
    EXPECT_EQ(read.result, &read.reader.in);
}

TEST(QuotedReading, WhiteSpaceAloneIsMissingInput) {
    const BufferRead read("  \n ", 4);
    EXPECT_EQ(read.messages, eof_message);
}

TEST(QuotedReading, AMissingQuoteIsReportedAndNothingStored) {
    BufferRead read(" abc\"", 4);
    EXPECT_EQ(read.messages, object_message);
    EXPECT_EQ(read.buffer, std::string(12, '#'));
    EXPECT_EQ(read.offset(), 1u);
    EXPECT_EQ(read.reader.rest(), "bc\"");
    EXPECT_EQ(read.result, &read.reader.in);
}

TEST(QuotedReading, AStreamThatHadFailedIsReportedAsAMissingQuote) {
    Swapped errors(std::cerr);
    Reader r("\"abc\"\n");
    r.text.setstate(std::ios::failbit);
    char buffer[4] = {'#', '#', '#', '#'};
    r.in.getCString(buffer, 4);
    EXPECT_EQ(errors.text(), object_message);
    EXPECT_EQ(std::string(buffer, 4), "####");
    EXPECT_EQ(r.in.cur_in_offset(), 1u);
}

TEST(QuotedReading, TheEndInsideTheQuotesFillsTheRoomAndIsReported) {
    BufferRead read("\"ab", 4);
    EXPECT_EQ(read.buffer, "ab\xff\xff########");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.offset(), 1u + 2 + (2 + 1));
    EXPECT_TRUE(read.reader.text.eof());
}

TEST(QuotedReading, TheEndInsideTheQuotesWithoutRoomIsReported) {
    BufferRead read("\"ab", 2);
    EXPECT_EQ(read.buffer, "ab########");
    EXPECT_EQ(read.messages, overflow_message);
    EXPECT_EQ(read.offset(), 1u + 2 + 1);
}

TEST(QuotedReading, EveryMessageIsFlushed) {
    for (const char* input : {"", "abc", "\"abc\""}) {
        Swapped errors(std::cerr);
        std::cerr << std::nounitbuf;
        Reader r(input);
        char byte;
        r.in.getCString(&byte, 1);
        EXPECT_GT(errors.text().size(), 0u) << input;
        EXPECT_GE(errors.buffer.flushes, 1) << input;
    }
}

}  // namespace
