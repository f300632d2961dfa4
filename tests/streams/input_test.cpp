// SPDX-License-Identifier: MIT
// Reading scalars and raw bytes, and the life of an input stream.

#include <gtest/gtest.h>

#include <climits>
#include <iomanip>
#include <locale>

#include "tests/streams/case_fixtures.h"
#include "tests/support/child.h"

namespace {

constexpr int end_of_file = std::char_traits<char>::eof();

// ---- a stream's own life ----

TEST(InputStream, StartsEmptyWithoutAStandardStream) {
    KEListream in;
    EXPECT_EQ(in._tables, nullptr);
    EXPECT_EQ(in._table_count, 0);
    EXPECT_EQ(in._table_capacity, 0);
    EXPECT_EQ(in._offset, 0u);
    EXPECT_EQ(in._strm, nullptr);
}

TEST(InputStream, KeepsTheAddressOfItsStandardStream) {
    std::istringstream text;
    KEListream in(text);
    EXPECT_EQ(in._strm, &text);
    EXPECT_EQ(in._tables, nullptr);
    EXPECT_EQ(in._table_count, 0);
    EXPECT_EQ(in._table_capacity, 0);
    EXPECT_EQ(in._offset, 0u);
}

TEST(InputStream, TellsWhetherItHasAStandardStream) {
    std::istringstream text;
    EXPECT_EQ(KEListream().istrm_is_null(), 1);
    EXPECT_EQ(KEListream(text).istrm_is_null(), 0);
}

TEST(InputStream, CopyIsAnEmptyStream) {
    Reader source("1 ");
    int value = 0;
    source.in >> value;
    source.in.set_in_table(0, new TestTable(0));
    KEListream copy(source.in);
    EXPECT_EQ(copy.cur_in_offset(), 0u);
    EXPECT_TRUE(copy.istrm_is_null());
    EXPECT_EQ(copy._tables, nullptr);
    EXPECT_EQ(copy._table_count, 0);
    EXPECT_EQ(copy._table_capacity, 0);
}

TEST(InputStream, AssignmentChangesNeitherStream) {
    Reader a("1 "), b("");
    int value = 0;
    a.in >> value;
    a.in.set_in_table(0, new TestTable(0));
    KEListream* result = &(b.in = a.in);
    EXPECT_EQ(result, &b.in);
    EXPECT_EQ(b.in._strm, &b.text);
    EXPECT_EQ(b.in._offset, 0u);
    EXPECT_EQ(b.in._table_count, 0);
    EXPECT_EQ(a.in._strm, &a.text);
    EXPECT_EQ(a.in._offset, 5u);
    EXPECT_EQ(a.in._table_count, 1);
}

TEST(InputStream, LeavesTheStandardStreamAloneWhenItDies) {
    std::istringstream text("42");
    { KEListream in(text); }
    int value = 0;
    EXPECT_TRUE(text >> value);
    EXPECT_EQ(value, 42);
}

TEST(InputStream, AnyNumberOfBytesIsAvailable) {
    KEListream in;
    EXPECT_EQ(in.is_available(0), 1);
    EXPECT_EQ(in.is_available(1), 1);
    EXPECT_EQ(in.is_available(ULONG_MAX), 1);
}

TEST(InputStream, TypeNumberIsZero) { EXPECT_EQ(KEListream()._type_number(), 0); }

TEST(InputStream, OffsetIsTheField) {
    KEListream in;
    in._offset = 0xfffffff0u;
    EXPECT_EQ(in.cur_in_offset(), 0xfffffff0ul);
}

TEST(InputStream, OffsetWrapsAtThirtyTwoBits) {
    Reader r("1 ");
    r.in._offset = 0xfffffffeu;
    int value = 0;
    r.in >> value;
    EXPECT_EQ(r.in.cur_in_offset(), 3u);
}

TEST(InputStream, ResetSetsTheOffsetToZero) {
    Reader r("1 2 ");
    int value = 0;
    r.in >> value;
    r.in.reset();
    EXPECT_EQ(r.in.cur_in_offset(), 0u);
    EXPECT_EQ(r.rest(), "2 ");
}

struct BareCall {
    const char* name;
    void (*call)(KEListream& in);
};

void PrintTo(const BareCall& c, std::ostream* os) { *os << c.name; }

class InputWithoutAStandardStream : public ::testing::TestWithParam<BareCall> {};

TEST_P(InputWithoutAStandardStream, FailsAnAssertion) {
    const kel::test::Assertion a = kel::test::assertion_of([] {
        KEListream in;
        GetParam().call(in);
    });
    EXPECT_TRUE(a.failed);
    EXPECT_EQ(a.expression, "_strm != 0");
}

template <class T>
void extracting(KEListream& in) {
    T value = T();
    in >> value;
}

template <class T>
void getting(KEListream& in) {
    T values[2];
    in.get(values, 2u);
}

const BareCall bare_calls[] = {
    {"Number", extracting<int>},
    {"String", extracting<char*>},
    {"WideString", extracting<wchar_t*>},
    {"Get", [](KEListream& in) { in.get(); }},
    {"RawChar",
     [](KEListream& in) {
         char c;
         in.get(c);
     }},
    {"RawBytes", getting<char>},
    {"RawUnsignedBytes", getting<unsigned char>},
    {"Array", getting<short>},
    {"LongLongArray", getting<long long>},
    {"QuotedString",
     [](KEListream& in) {
         char buffer[2];
         in.getCString(buffer, 2);
     }},
};

INSTANTIATE_TEST_SUITE_P(EveryKind, InputWithoutAStandardStream, ::testing::ValuesIn(bare_calls),
                         [](const auto& case_info) { return case_info.param.name; });

// ---- every scalar and raw operation ----

class InputScalars : public ::testing::TestWithParam<InputCase> {};

TEST_P(InputScalars, ReadsItsTextAndCountsWhatItExtracts) {
    Reader r(GetParam().text);
    std::string shown;
    GetParam().read(r.in, shown);
    EXPECT_EQ(shown, GetParam().shown);
    EXPECT_EQ(r.in.cur_in_offset(), GetParam().offset);
    EXPECT_TRUE(r.text.good());
}

TEST_P(InputScalars, ReturnsTheStream) {
    Reader r(GetParam().text);
    std::string shown;
    EXPECT_EQ(&GetParam().read(r.in, shown), &r.in);
}

// Reads one scalar, then shows it and the character that follows its separator.
template <class T>
KEListream& reading(KEListream& in, std::string& shown) {
    T value = 0;
    KEListream& result = in >> value;
    shown = show(value) + " then " + static_cast<char>(in._strm->peek());
    return result;
}

const InputCase scalar_cases[] = {
    {"Char", "x |", reading<char>, "120 then |", 2},
    {"CharAfterWhiteSpace", " \n\tx |", reading<char>, "120 then |", 2},
    {"UnsignedChar", "200 |", reading<unsigned char>, "200 then |", 5},
    {"UnsignedCharKeepsEightBits", "513 |", reading<unsigned char>, "1 then |", 5},
    {"UnsignedCharOfANegativeNumber", "-1 |", reading<unsigned char>, "255 then |", 5},
    {"Short", "-2 |", reading<short>, "-2 then |", 3},
    {"UnsignedShort", "65535 |", reading<unsigned short>, "65535 then |", 3},
    {"Int", "  7 |", reading<int>, "7 then |", 5},
    {"UnsignedInt", "4294967295 |", reading<unsigned int>, "4294967295 then |", 5},
    {"Long", "-2147483648 |", reading<long>, "-2147483648 then |", 5},
    {"UnsignedLong", "4294967295 |", reading<unsigned long>, "4294967295 then |", 5},
    {"Float", "1.5 |", reading<float>, "1.500000 then |", 5},
    {"Double", "-0.25 |", reading<double>, "-0.250000 then |", 9},
    {"LongLong", "-9223372036854775808 |", reading<long long>, "-9223372036854775808 then |", 9},
    {"UnsignedLongLong", "18446744073709551615 |", reading<unsigned long long>, "18446744073709551615 then |",
     9},
    {"WideChar", "65 |", reading<wchar_t>, "65 then |", 5},
    {"WideCharNegative", "-1 |", reading<wchar_t>, "-1 then |", 5},
    {"AnySeparatorIsConsumed", "7,|", reading<int>, "7 then |", 5},
    {"RawChar", " x",
     [](KEListream& in, std::string& shown) -> KEListream& {
         char c = 0;
         KEListream& result = in.get(c);
         shown = c;
         return result;
     },
     " ", 1},
    {"RawUnsignedChar", "\xff",
     [](KEListream& in, std::string& shown) -> KEListream& {
         unsigned char c = 0;
         KEListream& result = in.get(c);
         shown = show(c);
         return result;
     },
     "255", 1},
    {"RawBytes", " a\nb|",
     [](KEListream& in, std::string& shown) -> KEListream& {
         char bytes[4];
         KEListream& result = in.get(bytes, 4u);
         shown.assign(bytes, 4);
         return result;
     },
     " a\nb", 4},
    {"RawUnsignedBytes", "ab|",
     [](KEListream& in, std::string& shown) -> KEListream& {
         unsigned char bytes[2];
         KEListream& result = in.get(bytes, 2u);
         shown = show(bytes[0]) + " " + show(bytes[1]);
         return result;
     },
     "97 98", 2},
    {"NoRawBytes", "ab",
     [](KEListream& in, std::string&) -> KEListream& { return in.get(static_cast<char*>(nullptr), 0u); }, "",
     0},
};

INSTANTIATE_TEST_SUITE_P(EveryType, InputScalars, ::testing::ValuesIn(scalar_cases),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(InputScalars, UnsignedCharCountsFourAndOne) {
    Reader r("200 ");
    unsigned char value = 0;
    r.in >> value;
    EXPECT_EQ(r.in.cur_in_offset(), 5u);
}

TEST(InputScalars, ASeparatorThatThrowsLeavesTheValueCounted) {
    Reader r("7");
    r.text.exceptions(std::ios::failbit);
    double value = 0;
    EXPECT_THROW(r.in >> value, std::ios_base::failure);
    EXPECT_EQ(value, 7);
    EXPECT_EQ(r.in.cur_in_offset(), 8u);
}

TEST(InputScalars, ReadingBackCountsDifferentlyFromWriting) {
    Writer w;
    w.out << short(-2) << 7 << static_cast<unsigned char>(200) << 'x';
    EXPECT_EQ(w.out.cur_out_offset(), 12u);
    Reader r(w.written());
    short a = 0;
    int b = 0;
    unsigned char c = 0;
    char d = 0;
    r.in >> a >> b >> c >> d;
    EXPECT_EQ(a, -2);
    EXPECT_EQ(b, 7);
    EXPECT_EQ(c, 200);
    EXPECT_EQ(d, 'x');
    EXPECT_EQ(r.in.cur_in_offset(), 15u);
}

TEST(InputGet, ReturnsTheCharacterAndCountsFour) {
    Reader r(" \xff");
    EXPECT_EQ(r.in.get(), ' ');
    EXPECT_EQ(r.in.get(), 0xff);
    EXPECT_EQ(r.in.cur_in_offset(), 8u);
}

TEST(InputGet, ReturnsEndOfFileAsTheStandardStreamDoes) {
    Reader r("");
    EXPECT_EQ(r.in.get(), end_of_file);
    EXPECT_EQ(r.in.cur_in_offset(), 4u);
    EXPECT_TRUE(r.text.eof());
    EXPECT_TRUE(r.text.fail());
}

TEST(InputGet, ShortInputFailsTheStreamAndCountsInFull) {
    Reader r("ab");
    char bytes[4] = {};
    r.in.get(bytes, 4u);
    EXPECT_EQ(std::string(bytes), "ab");
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(r.in.cur_in_offset(), 4u);
}

// ---- flags and locale ----

TEST(InputFlags, BaseIsHonoured) {
    Reader r("ff c8 41 ");
    r.text >> std::hex;
    int a = 0;
    unsigned char b = 0;
    wchar_t c = 0;
    r.in >> a >> b >> c;
    EXPECT_EQ(a, 255);
    EXPECT_EQ(b, 200);
    EXPECT_EQ(c, L'A');
}

TEST(InputFlags, WithoutSkippingWhiteSpaceACharIsTheNextOne) {
    Reader r(" x");
    r.text >> std::noskipws;
    char c = 0;
    r.in >> c;
    EXPECT_EQ(c, ' ');
}

struct CommaPoint : std::numpunct<char> {
    char do_decimal_point() const override { return ','; }
};

TEST(InputFlags, LocaleIsHonoured) {
    Reader r("2,5 ");
    r.text.imbue(std::locale(std::locale::classic(), new CommaPoint));
    double value = 0;
    r.in >> value;
    EXPECT_EQ(value, 2.5);
}

// ---- failed reads ----

TEST(InputFailure, LeavesTheStreamFailedTheTargetAsTheExtractorDoesAndCounts) {
    Reader r("abc ");
    int value = 5;
    r.in >> value;
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(value, 0);
    EXPECT_EQ(r.in.cur_in_offset(), 5u);
}

TEST(InputFailure, AnOverflowingShortIsClamped) {
    Reader r("99999 ");
    short value = 5;
    r.in >> value;
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(value, SHRT_MAX);
}

TEST(InputFailure, AStreamThatHadFailedLeavesEveryTarget) {
    Reader r("1 2 3 ");
    r.text.setstate(std::ios::failbit);
    int a = 5;
    unsigned char b = 6;
    wchar_t c = L'7';
    char d = '8';
    r.in >> a >> b >> c >> d;
    EXPECT_EQ(a, 5);
    EXPECT_EQ(b, 6);
    EXPECT_EQ(c, L'7');
    EXPECT_EQ(d, '8');
    EXPECT_EQ(r.in.cur_in_offset(), 17u);
}

TEST(InputFailure, AFailedByteIsWhatTheExtractorStores) {
    Reader r("abc ");
    unsigned char value = 6;
    r.in >> value;
    EXPECT_EQ(value, 0);
}

TEST(InputFailure, AMissingSeparatorFailsTheStreamBehindAGoodValue) {
    Reader r("42");
    int value = 0;
    r.in >> value;
    EXPECT_EQ(value, 42);
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(r.in.cur_in_offset(), 5u);
}

TEST(InputFailure, AFailedRawCharacterLeavesTheTarget) {
    Reader r("");
    char a = 'a';
    unsigned char b = 'b';
    r.in.get(a).get(b);
    EXPECT_EQ(a, 'a');
    EXPECT_EQ(b, 'b');
    EXPECT_EQ(r.in.cur_in_offset(), 2u);
}

TEST(InputFailure, ABufferThatThrowsFailsTheStandardStreamAndNothingIsThrown) {
    Broken buffer;
    std::istream text(&buffer);
    KEListream in(text);
    int value = 5;
    char byte = 'x';
    EXPECT_NO_THROW(in >> value);
    EXPECT_TRUE(text.bad());
    text.clear();
    EXPECT_NO_THROW(in.get(byte));
    EXPECT_TRUE(text.bad());
    EXPECT_EQ(in.cur_in_offset(), 6u);
}

TEST(InputFailure, WhatAStandardStreamIsToldToThrowPassesThrough) {
    Reader r("x ");
    r.text.exceptions(std::ios::failbit);
    int value = 5;
    EXPECT_THROW(r.in >> value, std::ios_base::failure);
}

#if defined(__i386__)
TEST(InputFailure, ARawLengthBeyondTwoGigabytesFailsTheStream) {
    Reader r("abc");
    char byte = 'x';
    r.in.get(&byte, 0x80000000u);
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(byte, 'x');
    EXPECT_EQ(r.in.cur_in_offset(), 0x80000000u);
}
#endif

}  // namespace
