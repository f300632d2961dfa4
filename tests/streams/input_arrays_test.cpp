// SPDX-License-Identifier: MIT
// Reading arrays, and wide buffers, which are arrays of a derived stream's own making.

#include <gtest/gtest.h>

#include <iomanip>

#include "tests/streams/case_fixtures.h"

namespace {

class InputArrays : public ::testing::TestWithParam<InputCase> {};

TEST_P(InputArrays, ReadTheValuesAndOneSeparator) {
    Reader r(GetParam().text);
    r.in._offset = 100;
    std::string shown;
    GetParam().read(r.in, shown);
    EXPECT_EQ(shown, GetParam().shown);
    EXPECT_EQ(r.in.cur_in_offset(), 100 + GetParam().offset);
    EXPECT_EQ(r.rest(), "|");
}

TEST_P(InputArrays, ReturnTheStream) {
    Reader r(GetParam().text);
    std::string shown;
    EXPECT_EQ(&GetParam().read(r.in, shown), &r.in);
}

template <class T, unsigned int N>
KEListream& reading_array(KEListream& in, std::string& shown) {
    T values[N + 1] = {};
    KEListream& result = in.get(values, N);
    for (unsigned int i = 0; i < N; ++i) shown += show(values[i]) + " ";
    return result;
}

const InputCase array_cases[] = {
    {"Short", "-1  2\n3 |", reading_array<short, 3>, "-1 2 3 ", 7},
    {"UnsignedShort", "1 65535 |", reading_array<unsigned short, 2>, "1 65535 ", 5},
    {"Int", "1 2 3 |", reading_array<int, 3>, "1 2 3 ", 13},
    {"UnsignedInt", "1 4294967295 |", reading_array<unsigned int, 2>, "1 4294967295 ", 9},
    {"Long", "-1 2 |", reading_array<long, 2>, "-1 2 ", 9},
    {"UnsignedLong", "1 2 3 |", reading_array<unsigned long, 3>, "1 2 3 ", 13},
    {"Float", "0.5 -1 |", reading_array<float, 2>, "0.500000 -1.000000 ", 9},
    {"Double", "0.5 2 3 |", reading_array<double, 3>, "0.500000 2.000000 3.000000 ", 25},
    {"WideChar", "65 0 -1 |", reading_array<wchar_t, 3>, "65 0 -1 ", 13},
    {"LongLong", "-1 2 3 |", reading_array<long long, 3>, "-1 2 3 ", -7ul},
    {"UnsignedLongLong", "18446744073709551615 |", reading_array<unsigned long long, 1>,
     "18446744073709551615 ", -7ul},
    {"NoInts", " |", reading_array<int, 0>, "", 1},
    {"NoShorts", " |", reading_array<short, 0>, "", 1},
    {"NoDoubles", " |", reading_array<double, 0>, "", 1},
    {"NoWideChars", " |", reading_array<wchar_t, 0>, "", 1},
    {"NoLongLongs", " |", reading_array<long long, 0>, "", -7ul},
};

INSTANTIATE_TEST_SUITE_P(EveryType, InputArrays, ::testing::ValuesIn(array_cases),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(InputArrays, LongLongArraysMoveTheOffsetBackBySeven) {
    for (unsigned int n : {0u, 1u, 3u}) {
        Reader r("1 2 3 4 5 ");
        long long values[3] = {};
        r.in._offset = 20;
        r.in.get(values, n);
        EXPECT_EQ(values[2], n == 3 ? 3 : 0);
        EXPECT_EQ(r.in.cur_in_offset(), 13u) << n;
    }
}

TEST(InputArrays, LongLongArraysWrapTheOffsetBelowZero) {
    Reader r("1 ");
    unsigned long long value;
    r.in.get(&value, 1u);
    EXPECT_EQ(r.in.cur_in_offset(), 0xfffffff9u);
}

TEST(InputArrays, ElementsAreNotSeparatedByMoreThanTheExtractorSkips) {
    Reader r("1,2 ");
    int values[2] = {};
    r.in.get(values, 2u);
    EXPECT_EQ(values[0], 1);
    EXPECT_TRUE(r.text.fail());
}

TEST(InputArrays, TheOffsetAdvancesBeforeTheValuesAreRead) {
    OffsetAtRead buffer("1 2 3 ");
    std::istream text(&buffer);
    KEListream in(text);
    buffer.in = &in;
    int values[3];
    in.get(values, 3u);
    EXPECT_EQ(buffer.at_first, 12u);
    EXPECT_EQ(in.cur_in_offset(), 13u);
}

TEST(InputArrays, ReadingStopsOnceTheStreamHasFailed) {
    Reader r("1 2 x");
    int values[4] = {7, 7, 7, 7};
    r.in.get(values, 4u);
    EXPECT_EQ(values[0], 1);
    EXPECT_EQ(values[1], 2);
    EXPECT_EQ(values[2], 0);
    EXPECT_EQ(values[3], 7);
    EXPECT_EQ(r.in.cur_in_offset(), 17u);
}

// 2^32 - 1 attempts on a stream that has failed would take minutes.
TEST(InputArrays, AHugeLengthOnAFailedStreamEndsAtOnceAndCountsInFull) {
    Reader r("");
    int value = 7;
    r.text.setstate(std::ios::failbit);
    r.in.get(&value, 0xffffffffu);
    EXPECT_EQ(value, 7);
    EXPECT_EQ(r.in.cur_in_offset(), 4u * 0xffffffffu + 1u);
}

TEST(InputArrays, AHugeLengthAtTheEndOfInputEndsAtOnce) {
    Reader r("");
    long long value = 7;
    r.in.get(&value, 0xffffffffu);
    EXPECT_TRUE(r.text.fail());
    EXPECT_EQ(r.in.cur_in_offset(), 0xfffffff9u);
}

TEST(InputArrays, FlagsApplyToEveryElement) {
    Reader r("ff 10 ");
    r.text >> std::hex;
    short values[2];
    r.in.get(values, 2u);
    EXPECT_EQ(values[0], 255);
    EXPECT_EQ(values[1], 16);
}

TEST(InputArrays, ABufferThatThrowsFailsTheStandardStreamAndNothingIsThrown) {
    Broken buffer;
    std::istream text(&buffer);
    KEListream in(text);
    int values[2] = {7, 7};
    EXPECT_NO_THROW(in.get(values, 2u));
    EXPECT_TRUE(text.bad());
    EXPECT_EQ(in.cur_in_offset(), 9u);
}

struct OwnWideArrays : KEListream {
    using KEListream::get;
    KEListream& get(wchar_t* values, unsigned int n) override {
        seen = values;
        length = n;
        return other;
    }
    const wchar_t* seen = nullptr;
    unsigned int length = 0;
    KEListream other;
};

TEST(InputWideBuffer, CallsTheVirtualArrayOperationAndReturnsItsResult) {
    OwnWideArrays in;
    wchar_t buffer[2];
    KEListream& result = in.get_wcbuf(buffer, 2u);
    EXPECT_EQ(in.seen, buffer);
    EXPECT_EQ(in.length, 2u);
    EXPECT_EQ(&result, &in.other);
}

TEST(InputWideBuffer, ReadsLikeTheArray) {
    Reader r("97 98 |");
    wchar_t buffer[2];
    EXPECT_EQ(&r.in.get_wcbuf(buffer, 2u), &r.in);
    EXPECT_EQ(buffer[0], L'a');
    EXPECT_EQ(buffer[1], L'b');
    EXPECT_EQ(r.in.cur_in_offset(), 9u);
}

}  // namespace
