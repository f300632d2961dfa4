// SPDX-License-Identifier: MIT
// The escapes of quoted strings, in both directions and as a peer may send them.

#include <gtest/gtest.h>

#include <cctype>
#include <cstdio>
#include <iomanip>

#include "tests/streams/string_fixtures.h"

namespace {

struct EscapeCase {
    const char* name;
    char byte;
    const char* text;
    unsigned long written;
    unsigned long read;  // what reading it counts
};

void PrintTo(const EscapeCase& c, std::ostream* os) { *os << c.name; }

class StringEscapes : public ::testing::TestWithParam<EscapeCase> {};

TEST_P(StringEscapes, IsWritten) {
    Writer w;
    w.out.putCString(std::string(1, GetParam().byte).c_str());
    EXPECT_EQ(w.written(), std::string("\"") + GetParam().text + "\"\n");
    EXPECT_EQ(w.out.cur_out_offset(), 3 + GetParam().written);
}

TEST_P(StringEscapes, IsReadBack) {
    const BufferRead read(std::string("\"") + GetParam().text + "\"\n", 2);
    EXPECT_EQ(read.buffer[0], GetParam().byte);
    EXPECT_EQ(read.buffer[1], '\0');
    EXPECT_EQ(read.offset(), 2 + GetParam().read);
    EXPECT_EQ(read.messages, "");
}

const EscapeCase escape_cases[] = {
    {"Backspace", '\b', "\\b", 2, 2},
    {"Tab", '\t', "\\t", 2, 2},
    {"Newline", '\n', "\\n", 2, 2},
    {"FormFeed", '\f', "\\f", 2, 2},
    {"CarriageReturn", '\r', "\\r", 2, 2},
    {"DoubleQuote", '"', "\\\"", 2, 2},
    {"Backslash", '\\', "\\\\", 2, 2},
    {"LeftBrace", '{', "\\[", 2, 2},
    {"RightBrace", '}', "\\]", 2, 2},
    {"Letter", 'a', "a", 1, 1},
    {"Blank", ' ', " ", 1, 1},
    {"Tilde", '~', "~", 1, 1},
    {"LeftBracket", '[', "[", 1, 1},
    {"SingleQuote", '\'', "'", 1, 1},
    {"One", '\1', "\\x01", 4, 5},
    {"VerticalTab", '\v', "\\x0b", 4, 5},
    {"Bell", '\a', "\\x07", 4, 5},
    {"Delete", '\x7f', "\\x7f", 4, 5},
    {"HighByte", '\x80', "\\x80", 4, 5},
    {"LastByte", '\xff', "\\xff", 4, 5},
};

INSTANTIATE_TEST_SUITE_P(EveryKind, StringEscapes, ::testing::ValuesIn(escape_cases),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(StringEscapes, BracesTravelAsBracketEscapes) {
    Writer w;
    w.out << "a\"b{c}";
    EXPECT_EQ(w.written(), "7\"a\\\"b\\[c\\]\"\n");
    const StringRead read(w.written());
    EXPECT_STREQ(read.s, "a\"b{c}");
}

TEST(StringEscapes, HexadecimalCountsFiveOnReading) {
    Writer w;
    w.out.putCString("\1");
    EXPECT_EQ(w.out.cur_out_offset(), 1u + 4 + 2);
    for (const std::locale& locale : {std::locale::classic(), alike()}) {
        const BufferRead read(w.written(), 2, locale);
        EXPECT_EQ(read.offset(), 1u + 5 + 1);
    }
}

// One byte as it stands in a quoted string.
std::string form_of(unsigned char byte) {
    const std::string bytes = "\b\t\n\f\r\"\\{}", letters = "btnfr\"\\[]";
    const std::size_t i = bytes.find(static_cast<char>(byte));
    if (i != std::string::npos) return std::string("\\") + letters[i];
    if (std::isprint(byte)) return std::string(1, static_cast<char>(byte));
    char text[8];
    std::snprintf(text, sizeof text, "\\x%02x", byte);
    return text;
}

TEST(StringEscapes, EveryByteHasItsForm) {
    for (int c = 1; c < 256; ++c) {
        Writer w;
        w.out.putCString(std::string(1, static_cast<char>(c)).c_str());
        const std::string form = form_of(static_cast<unsigned char>(c));
        EXPECT_EQ(w.written(), "\"" + form + "\"\n") << c;
        EXPECT_EQ(w.out.cur_out_offset(), 3 + form.size()) << c;
    }
}

TEST(StringEscapes, EveryByteSurvivesTheRoundTrip) {
    std::string all;
    for (int c = 1; c < 256; ++c) all += static_cast<char>(c);
    Writer w;
    w.out << all.c_str();
    const StringRead read(w.written());
    EXPECT_EQ(read.s, all);
    EXPECT_EQ(read.messages, "");
    EXPECT_TRUE(!read.reader.text.fail());
}

TEST(StringEscapes, ADecimalNumberAndItsDelimiterAreOneByte) {
    const BufferRead read("\"\\65 b\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "Ab");
    EXPECT_EQ(read.offset(), 1u + 2 + 1 + 1);
}

TEST(StringEscapes, ADecimalNumberKeepsItsLowByte) {
    const BufferRead read("\"\\321;\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "A");
}

TEST(StringEscapes, ANegativeDecimalNumberIsRead) {
    const BufferRead read("\"\\-1 \"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "\xff");
}

TEST(StringEscapes, BlanksBeforeADecimalNumberAreSkippedAndNotCounted) {
    const BufferRead read("\"\\  65;b\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "Ab");
    EXPECT_EQ(read.offset(), 1u + 2 + 1 + 1);
}

TEST(StringEscapes, ADecimalNumberNeedsNoWayBack) {
    NoWayBack source("\"\\65;b\"\n");
    std::istream text(&source);
    KEListream in(text);
    char buffer[4];
    in.getCString(buffer, 4);
    EXPECT_STREQ(buffer, "Ab");
    EXPECT_TRUE(text.good());
}

TEST(StringEscapes, AStreamThatThrowsKeepsItsBase) {
    Reader r("\"\\zab\"\n");
    r.text >> std::hex;
    r.text.exceptions(std::ios::failbit);
    char buffer[4];
    EXPECT_THROW(r.in.getCString(buffer, 4), std::ios_base::failure);
    EXPECT_EQ(r.text.flags() & std::ios::basefield, std::ios::hex);
}

TEST(StringEscapes, ADecimalNumberIsDecimalInEveryBase) {
    Reader r("\"\\65 \"\n");
    r.text >> std::hex;
    char buffer[4];
    r.in.getCString(buffer, 4);
    EXPECT_STREQ(buffer, "A");
    EXPECT_EQ(r.text.flags() & std::ios::basefield, std::ios::hex);
}

TEST(StringEscapes, HexadecimalStopsAtANewline) {
    const BufferRead read("\"\\x4\nb\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(),
                 "\x04"
                 "b");
    EXPECT_EQ(read.messages, "");
}

TEST(StringEscapes, HexadecimalWithoutDigitsIsAZero) {
    const BufferRead read("\"\\x\nb\"\n", 4);
    EXPECT_EQ(read.buffer.substr(0, 3), std::string("\0b\0", 3));
    EXPECT_EQ(read.messages, "");
}

TEST(StringEscapes, HexadecimalTakesTwoCharactersWhateverTheyAre) {
    const BufferRead read("\"\\x4gb\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(),
                 "\x04"
                 "b");
}

TEST(StringEscapes, HexadecimalTakesUpperCaseDigits) {
    const BufferRead read("\"\\xAB\"\n", 4);
    EXPECT_STREQ(read.buffer.c_str(), "\xab");
}

TEST(StringEscapes, AFailedDecimalNumberStoresAZeroAndEndsTheInput) {
    const BufferRead read("\"\\zab\"\n", 4);
    EXPECT_EQ(read.buffer.substr(0, 4), std::string("\0\xff\xff\xff", 4));
    EXPECT_EQ(read.messages, overflow_message);
}

TEST(StringEscapes, AByteOutsideTheRangeIsADecimalNumberToo) {
    const BufferRead read("\"\\\x80\"\n", 2);
    EXPECT_EQ(read.buffer.substr(0, 2), std::string("\0\xff", 2));
    EXPECT_EQ(read.messages, overflow_message);
}

TEST(StringEscapes, AnEscapeCutOffByTheEndStoresAZero) {
    const BufferRead read("\"\\", 3);
    EXPECT_EQ(read.buffer.substr(0, 3), std::string("\0\xff\xff", 3));
    EXPECT_EQ(read.messages, overflow_message);
}

TEST(StringEscapes, AHexadecimalCutOffByTheEndKeepsItsDigit) {
    const BufferRead read("\"\\x4", 2);
    EXPECT_EQ(read.buffer.substr(0, 2), "\x04\xff");
    EXPECT_EQ(read.messages, overflow_message);
}

}  // namespace
