// SPDX-License-Identifier: MIT
// Writing scalars and raw bytes, and the life of an output stream.

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <iomanip>
#include <locale>

#include "tests/streams/case_fixtures.h"
#include "tests/support/child.h"

namespace {

// ---- a stream's own life ----

TEST(OutputStream, StartsEmptyWithoutAStandardStream) {
    KELostream out;
    EXPECT_EQ(out._tables, nullptr);
    EXPECT_EQ(out._table_count, 0);
    EXPECT_EQ(out._table_capacity, 0);
    EXPECT_EQ(out._offset, 0u);
    EXPECT_EQ(out._strm, nullptr);
}

TEST(OutputStream, KeepsTheAddressOfItsStandardStream) {
    std::ostringstream text;
    KELostream out(text);
    EXPECT_EQ(out._strm, &text);
    EXPECT_EQ(out._tables, nullptr);
    EXPECT_EQ(out._table_count, 0);
    EXPECT_EQ(out._table_capacity, 0);
    EXPECT_EQ(out._offset, 0u);
}

TEST(OutputStream, CopyIsAnEmptyStream) {
    Writer source;
    source.out << 1;
    source.out.set_out_table(0, new TestTable(0));
    KELostream copy(source.out);
    EXPECT_EQ(copy.cur_out_offset(), 0u);
    EXPECT_EQ(copy._strm, nullptr);
    EXPECT_EQ(copy._tables, nullptr);
    EXPECT_EQ(copy._table_count, 0);
    EXPECT_EQ(copy._table_capacity, 0);
}

TEST(OutputStream, AssignmentChangesNeitherStream) {
    Writer a, b;
    a.out << 1;
    a.out.set_out_table(0, new TestTable(0));
    KELostream* result = &(b.out = a.out);
    EXPECT_EQ(result, &b.out);
    EXPECT_EQ(b.out._strm, &b.text);
    EXPECT_EQ(b.out._offset, 0u);
    EXPECT_EQ(b.out._table_count, 0);
    EXPECT_EQ(a.out._strm, &a.text);
    EXPECT_EQ(a.out._offset, 5u);
    EXPECT_EQ(a.out._table_count, 1);
}

TEST(OutputStream, LeavesTheStandardStreamAloneWhenItDies) {
    std::ostringstream text;
    { KELostream out(text); }
    text << "still open";
    EXPECT_EQ(text.str(), "still open");
}

TEST(OutputStream, OffsetIsTheField) {
    KELostream out;
    out._offset = 0xfffffff0u;
    EXPECT_EQ(out.cur_out_offset(), 0xfffffff0ul);
}

TEST(OutputStream, OffsetWrapsAtThirtyTwoBits) {
    Writer w;
    w.out._offset = 0xfffffffeu;
    w.out << 1;
    EXPECT_EQ(w.out.cur_out_offset(), 3u);
}

TEST(OutputStream, TypeNumberIsZero) { EXPECT_EQ(KELostream()._type_number(), 0); }

TEST(OutputStream, ResetSetsTheOffsetToZero) {
    Writer w;
    w.out << 1;
    w.out.reset();
    EXPECT_EQ(w.out.cur_out_offset(), 0u);
    EXPECT_EQ(w.written(), "1 ");
}

struct BareCall {
    const char* name;
    void (*call)(KELostream& out);
};

void PrintTo(const BareCall& c, std::ostream* os) { *os << c.name; }

class OutputWithoutAStandardStream : public ::testing::TestWithParam<BareCall> {};

TEST_P(OutputWithoutAStandardStream, FailsAnAssertion) {
    const kel::test::Assertion a = kel::test::assertion_of([] {
        KELostream out;
        GetParam().call(out);
    });
    EXPECT_TRUE(a.failed);
    EXPECT_EQ(a.expression, "_strm != 0");
}

template <class T>
void putting(KELostream& out) {
    const T values[2] = {};
    out.put(values, 2u);
}

const BareCall bare_calls[] = {
    {"Number", [](KELostream& out) { out << 1; }},
    {"String", [](KELostream& out) { out << "ab"; }},
    {"WideString", [](KELostream& out) { out << L"ab"; }},
    {"RawChar", [](KELostream& out) { out.put('x'); }},
    {"RawBytes", putting<char>},
    {"RawUnsignedBytes", putting<unsigned char>},
    {"Array", putting<short>},
    {"LongLongArray", putting<long long>},
    {"QuotedString", [](KELostream& out) { out.putCString("ab"); }},
};

INSTANTIATE_TEST_SUITE_P(EveryKind, OutputWithoutAStandardStream, ::testing::ValuesIn(bare_calls),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(OutputStream, AFailedStandardStreamStillCounts) {
    Writer w;
    w.text.setstate(std::ios::badbit);
    w.out << 1 << "abc";
    EXPECT_EQ(w.written(), "");
    EXPECT_EQ(w.out.cur_out_offset(), 15u);
}

TEST(OutputStream, ABufferThatThrowsFailsTheStandardStreamAndNothingIsThrown) {
    Broken buffer;
    std::ostream text(&buffer);
    KELostream out(text);
    const int values[2] = {1, 2};
    EXPECT_NO_THROW(out << 1 << "abc");
    EXPECT_TRUE(text.bad());
    text.clear();
    EXPECT_NO_THROW(out.put(values, 2u).put("abc", 3u));
    EXPECT_TRUE(text.bad());
    EXPECT_EQ(out.cur_out_offset(), 15u + 10 + 3);
}

TEST(OutputStream, WhatAStandardStreamIsToldToThrowPassesThrough) {
    Broken buffer;
    std::ostream text(&buffer);
    KELostream out(text);
    text.exceptions(std::ios::badbit);
    EXPECT_THROW(out << 7, int);
}

// ---- end of line ----

TEST(EndOfLine, WritesANewlineAndFlushes) {
    CountingBuffer buffer;
    std::ostream text(&buffer);
    KELostream out(text);
    KELostream* result = &endl(out);
    EXPECT_EQ(result, &out);
    EXPECT_EQ(buffer.str(), "\n");
    EXPECT_EQ(buffer.flushes, 1);
}

TEST(EndOfLine, DoesNotCount) {
    Writer w;
    endl(w.out);
    EXPECT_EQ(w.out.cur_out_offset(), 0u);
}

TEST(EndOfLine, WorksAsAManipulator) {
    Writer w;
    w.out << 1 << endl << 2;
    EXPECT_EQ(w.written(), "1 \n2 ");
}

struct Binary : KELostream {
    using KELostream::operator<<;
    KELostream& operator<<(const char* s) override {
        strings.push_back(s);
        return *this;
    }
    std::vector<std::string> strings;
};

TEST(EndOfLine, IsAStringToAStreamWithoutAStandardStream) {
    Binary out;
    KELostream* result = &endl(out);
    EXPECT_EQ(result, &out);
    EXPECT_EQ(out.strings, std::vector<std::string>{"\n"});
    EXPECT_EQ(out.cur_out_offset(), 0u);
}

TEST(EndOfLine, DoesNotReachTheStringOperatorWhenThereIsAStandardStream) {
    Binary out;
    std::ostringstream text;
    out._strm = &text;
    endl(out);
    EXPECT_TRUE(out.strings.empty());
    EXPECT_EQ(text.str(), "\n");
}

// ---- every scalar and raw operation ----

class OutputScalars : public ::testing::TestWithParam<OutputCase> {};

TEST_P(OutputScalars, WritesItsTextAndCountsItsBinarySize) {
    Writer w;
    GetParam().write(w.out);
    EXPECT_EQ(w.written(), GetParam().text);
    EXPECT_EQ(w.out.cur_out_offset(), GetParam().offset);
}

TEST_P(OutputScalars, ReturnsTheStream) {
    Writer w;
    EXPECT_EQ(&GetParam().write(w.out), &w.out);
}

template <class T>
std::function<KELostream&(KELostream&)> writing(T value) {
    return [value](KELostream& out) -> KELostream& { return out << value; };
}

const OutputCase scalar_cases[] = {
    {"Char", writing('x'), "x ", 2},
    {"CharBlank", writing(' '), "  ", 2},
    {"UnsignedCharSmallest", writing<unsigned char>(0), "0 ", 2},
    {"UnsignedChar", writing<unsigned char>(200), "200 ", 2},
    {"UnsignedCharLargest", writing<unsigned char>(255), "255 ", 2},
    {"Short", writing<short>(-2), "-2 ", 3},
    {"ShortSmallest", writing<short>(SHRT_MIN), "-32768 ", 3},
    {"UnsignedShort", writing<unsigned short>(65535), "65535 ", 3},
    {"Int", writing(7), "7 ", 5},
    {"IntSmallest", writing(INT_MIN), "-2147483648 ", 5},
    {"UnsignedInt", writing(4294967295u), "4294967295 ", 5},
    {"Long", writing(-2147483647l), "-2147483647 ", 5},
    {"UnsignedLong", writing(4294967295ul), "4294967295 ", 5},
    {"Float", writing(1.5f), "1.5 ", 5},
    {"Double", writing(-0.25), "-0.25 ", 9},
    {"LongLong", writing(LLONG_MIN), "-9223372036854775808 ", 9},
    {"UnsignedLongLong", writing(ULLONG_MAX), "18446744073709551615 ", 9},
    {"WideChar", writing(L'A'), "65 ", 5},
    {"WideCharBeyondTheBasicPlane", writing(static_cast<wchar_t>(0x1f600)), "128512 ", 5},
    {"WideCharAsASignedNumber", writing(static_cast<wchar_t>(-1)), "-1 ", 5},
    {"RawChar", [](KELostream& out) -> KELostream& { return out.put('x'); }, "x", 1},
    {"RawBytes", [](KELostream& out) -> KELostream& { return out.put("abc", 3u); }, "abc", 3},
    {"NoRawBytes", [](KELostream& out) -> KELostream& { return out.put("abc", 0u); }, "", 0},
    {"RawUnsignedBytes",
     [](KELostream& out) -> KELostream& {
         return out.put(reinterpret_cast<const unsigned char*>("a\xff"), 2u);
     },
     "a\xff", 2},
};

INSTANTIATE_TEST_SUITE_P(EveryType, OutputScalars, ::testing::ValuesIn(scalar_cases),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(OutputText, FourScalarsInARow) {
    Writer w;
    w.out << static_cast<short>(-2) << 7 << static_cast<unsigned char>(200) << 'x';
    EXPECT_EQ(w.written(), "-2 7 200 x ");
    EXPECT_EQ(w.out.cur_out_offset(), 12u);
}

TEST(OutputText, CharWritesAnyByteAsItIs) {
    Writer w;
    w.out << '\0' << '\xff' << '\n';
    EXPECT_EQ(w.written(), std::string("\0 \xff \n ", 6));
}

TEST(OutputText, RawBytesMayHoldZeros) {
    Writer w;
    w.out.put("a\0b", 3u);
    EXPECT_EQ(w.written(), std::string("a\0b", 3));
}

// ---- formatting flags ----

TEST(OutputFlags, WidthAppliesToTheValueAndNotToItsSeparator) {
    Writer w;
    w.text << std::setw(6) << std::setfill('.');
    w.out << 42 << 43;
    EXPECT_EQ(w.written(), "....42 43 ");
    EXPECT_EQ(w.out.cur_out_offset(), 10u);
}

TEST(OutputFlags, WidthAppliesToCharacters) {
    Writer w;
    w.text << std::setw(3);
    w.out << 'x';
    EXPECT_EQ(w.written(), "  x ");
    EXPECT_EQ(w.out.cur_out_offset(), 2u);
}

TEST(OutputFlags, WidthDoesNotApplyToRawCharacters) {
    Writer w;
    w.text << std::setw(3);
    w.out.put('x').put("y", 1u);
    EXPECT_EQ(w.written(), "xy");
}

TEST(OutputFlags, BaseAppliesToEveryInteger) {
    Writer w;
    w.text << std::hex << std::showbase;
    w.out << static_cast<unsigned char>(200) << static_cast<unsigned short>(255) << 16u << 17ul << 18ull
          << L'A';
    EXPECT_EQ(w.written(), "0xc8 0xff 0x10 0x11 0x12 0x41 ");
}

TEST(OutputFlags, HexadecimalShowsTheBitPatternOfNegativeNumbers) {
    Writer w;
    w.text << std::hex;
    w.out << static_cast<short>(-2) << -2 << static_cast<wchar_t>(-2) << -2ll;
    EXPECT_EQ(w.written(), "fffe fffffffe fffffffe fffffffffffffffe ");
}

TEST(OutputFlags, HexadecimalShowsALongAsTheStandardInserterDoes) {
    Writer w;
    std::ostringstream plain;
    w.text << std::hex;
    plain << std::hex << -2l << " ";
    w.out << -2l;
    EXPECT_EQ(w.written(), plain.str());
}

TEST(OutputFlags, OctalShowsTheBitPatternOfNegativeNumbers) {
    Writer w;
    w.text << std::oct;
    w.out << static_cast<short>(-1) << -1;
    EXPECT_EQ(w.written(), "177777 37777777777 ");
}

TEST(OutputFlags, ShowposAppliesToBytesAndWideCharacters) {
    Writer w;
    w.text << std::showpos;
    w.out << static_cast<unsigned char>(1) << L'A';
    EXPECT_EQ(w.written(), "+1 +65 ");
}

TEST(OutputFlags, PrecisionAppliesToBothFloatingTypes) {
    Writer w;
    w.text << std::fixed << std::setprecision(2);
    w.out << 1.239f << 2.0;
    EXPECT_EQ(w.written(), "1.24 2.00 ");
}

TEST(OutputFlags, FloatIsWrittenAsADouble) {
    Writer w;
    w.text << std::setprecision(17);
    w.out << 0.1f;
    EXPECT_EQ(w.written(), "0.10000000149011612 ");
}

TEST(OutputFlags, InfinityAndNanAreWrittenAsTheStandardDoes) {
    Writer w;
    w.out << HUGE_VALF << std::nan("");
    EXPECT_EQ(w.written(), "inf nan ");
}

struct Grouping : std::numpunct<char> {
    char do_thousands_sep() const override { return '\''; }
    std::string do_grouping() const override { return "\3"; }
    char do_decimal_point() const override { return ','; }
};

TEST(OutputFlags, LocaleIsHonoured) {
    Writer w;
    w.text.imbue(std::locale(std::locale::classic(), new Grouping));
    w.out << 1234567 << 2.5;
    EXPECT_EQ(w.written(), "1'234'567 2,5 ");
}

// ---- raw bytes ----

#if defined(__i386__)
TEST(OutputRawBytes, ALengthBeyondTwoGigabytesFailsTheStream) {
    Writer w;
    const char byte = 'x';
    w.out.put(&byte, 0xffffffffu);
    EXPECT_TRUE(w.text.bad());
    EXPECT_EQ(w.written(), "");
    EXPECT_EQ(w.out.cur_out_offset(), 0xffffffffu);
}
#endif

}  // namespace
