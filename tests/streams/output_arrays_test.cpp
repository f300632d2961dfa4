// SPDX-License-Identifier: MIT
// Writing arrays, and wide buffers, which are arrays of a derived stream's own making.

#include <gtest/gtest.h>

#include <climits>
#include <iomanip>
#include <vector>

#include "tests/streams/case_fixtures.h"

namespace {

class OutputArrays : public ::testing::TestWithParam<OutputCase> {};

TEST_P(OutputArrays, WriteEachValueWithItsSeparator) {
    Writer w;
    GetParam().write(w.out);
    EXPECT_EQ(w.written(), GetParam().text);
    EXPECT_EQ(w.out.cur_out_offset(), GetParam().offset);
}

TEST_P(OutputArrays, ReturnTheStream) {
    Writer w;
    EXPECT_EQ(&GetParam().write(w.out), &w.out);
}

template <class T>
std::function<KELostream&(KELostream&)> putting(std::vector<T> values) {
    return [values](KELostream& out) -> KELostream& {
        return out.put(values.data(), static_cast<unsigned int>(values.size()));
    };
}

const OutputCase array_cases[] = {
    {"Short", putting<short>({-1, 2, 3}), "-1 2 3 ", 9},
    {"UnsignedShort", putting<unsigned short>({1, 65535}), "1 65535 ", 6},
    {"Int", putting<int>({1, 2, 3}), "1 2 3 ", 15},
    {"UnsignedInt", putting<unsigned int>({1, 4294967295u}), "1 4294967295 ", 10},
    {"Long", putting<long>({-1, 2}), "-1 2 ", 10},
    {"UnsignedLong", putting<unsigned long>({1, 2, 3}), "1 2 3 ", 15},
    {"Float", putting<float>({0.5f, -1}), "0.5 -1 ", 10},
    {"Double", putting<double>({0.5, 2, 3}), "0.5 2 3 ", 27},
    {"WideChar", putting<wchar_t>({L'A', L'\0', L'B'}), "65 0 66 ", 15},
    {"LongLong", putting<long long>({-1, LLONG_MAX, 3}), "-1 9223372036854775807 3 ", 9},
    {"UnsignedLongLong", putting<unsigned long long>({ULLONG_MAX, 1}), "18446744073709551615 1 ", 9},
    {"NoShorts", putting<short>({}), "", 0},
    {"NoInts", putting<int>({}), "", 0},
    {"NoDoubles", putting<double>({}), "", 0},
    {"NoWideChars", putting<wchar_t>({}), "", 0},
};

INSTANTIATE_TEST_SUITE_P(EveryType, OutputArrays, ::testing::ValuesIn(array_cases),
                         [](const auto& case_info) { return case_info.param.name; });

TEST(OutputArrays, LongLongArraysAddNineOnce) {
    Writer w;
    const long long values[4] = {1, 2, 3, 4};
    w.out.put(values, 4u);
    EXPECT_EQ(w.out.cur_out_offset(), 9u);
    w.out.put(values, 0u);
    EXPECT_EQ(w.out.cur_out_offset(), 18u);
    EXPECT_EQ(w.written(), "1 2 3 4 ");
}

TEST(OutputArrays, UnsignedLongLongArraysAddNineOnce) {
    Writer w;
    const unsigned long long values[4] = {1, 2, 3, 4};
    w.out.put(values, 4u);
    EXPECT_EQ(w.out.cur_out_offset(), 9u);
    w.out.put(values, 0u);
    EXPECT_EQ(w.out.cur_out_offset(), 18u);
}

TEST(OutputArrays, TheOffsetAdvancesBeforeTheValuesAreWritten) {
    OffsetAtWrite buffer;
    std::ostream text(&buffer);
    KELostream out(text);
    buffer.out = &out;
    const int values[3] = {1, 2, 3};
    out.put(values, 3u);
    EXPECT_EQ(buffer.at_first, 15u);
}

TEST(OutputArrays, TheOffsetOfLongLongArraysAdvancesAfterTheValues) {
    OffsetAtWrite buffer;
    std::ostream text(&buffer);
    KELostream out(text);
    buffer.out = &out;
    const long long value = 1;
    out.put(&value, 1u);
    EXPECT_EQ(buffer.at_first, 0u);
}

TEST(OutputArrays, FlagsApplyToEveryElement) {
    Writer w;
    w.text << std::hex;
    const short values[2] = {-1, 16};
    w.out.put(values, 2u);
    const wchar_t wide[1] = {L'A'};
    w.out.put(wide, 1u);
    EXPECT_EQ(w.written(), "ffff 10 41 ");
}

TEST(OutputArrays, FloatsAreWrittenAsDoubles) {
    Writer w;
    w.text << std::setprecision(17);
    const float value = 0.1f;
    w.out.put(&value, 1u);
    EXPECT_EQ(w.written(), "0.10000000149011612 ");
}

TEST(OutputArrays, WidthAppliesToTheFirstElementOnly) {
    Writer w;
    w.text << std::setw(3);
    const int values[2] = {1, 2};
    w.out.put(values, 2u);
    EXPECT_EQ(w.written(), "  1 2 ");
}

TEST(OutputArrays, AFailedStandardStreamStillCounts) {
    Writer w;
    w.text.setstate(std::ios::badbit);
    const double values[2] = {1, 2};
    w.out.put(values, 2u);
    EXPECT_EQ(w.written(), "");
    EXPECT_EQ(w.out.cur_out_offset(), 18u);
}

// A stream whose arrays and wide buffers are of its own making.
struct OwnWideArrays : KELostream {
    using KELostream::put;
    KELostream& put(const wchar_t* values, unsigned int n) override {
        seen = values;
        length = n;
        return other;
    }
    const wchar_t* seen = nullptr;
    unsigned int length = 0;
    KELostream other;
};

TEST(OutputWideBuffer, CallsTheVirtualArrayOperationAndReturnsItsResult) {
    OwnWideArrays out;
    const wchar_t text[] = L"ab";
    KELostream& result = out.put_wcbuf(text, 2u);
    EXPECT_EQ(out.seen, text);
    EXPECT_EQ(out.length, 2u);
    EXPECT_EQ(&result, &out.other);
}

TEST(OutputWideBuffer, WritesLikeTheArray) {
    Writer w;
    EXPECT_EQ(&w.out.put_wcbuf(L"ab", 2u), &w.out);
    EXPECT_EQ(w.written(), "97 98 ");
    EXPECT_EQ(w.out.cur_out_offset(), 10u);
}

}  // namespace
