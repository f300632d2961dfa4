// SPDX-License-Identifier: MIT
// Which operations are built on others through the virtual table. A derived stream that overrides
// one slot changes those operations too, and no other.

#include <gtest/gtest.h>
#include <kel/containers/strings.h>

#include <algorithm>
#include <iterator>
#include <utility>
#include <vector>

#include "tests/streams/case_fixtures.h"

namespace {

std::vector<int> called;  // slots, counted from 1

template <int Slot>
void* note(void* stream) {
    called.push_back(Slot);
    return stream;
}

template <int... I>
void put_notes(void** slots, std::integer_sequence<int, I...>) {
    void* const notes[] = {reinterpret_cast<void*>(&note<I + 1>)...};
    std::copy(std::begin(notes), std::end(notes), slots);
}

// Has every slot of a stream noted instead of called until the end of the scope. A qualified call
// still reaches the class's own operation.
template <class Stream, int Slots>
class Noted {
public:
    explicit Noted(Stream& stream) : _table(reinterpret_cast<void***>(&stream)), _before(*_table) {
        std::copy(_before - 2, _before, _noted);  // the offset to the top and the type
        put_notes(_noted + 2, std::make_integer_sequence<int, Slots>());
        *_table = _noted + 2;
        called.clear();
    }
    ~Noted() { *_table = _before; }
    Noted(const Noted&) = delete;
    Noted& operator=(const Noted&) = delete;

private:
    void*** _table;
    void** _before;
    void* _noted[Slots + 2];
};

typedef std::vector<int> SlotNumbers;

// ---- writing ----

struct OutputCall {
    const char* name;
    void (*call)(KELostream& out);
    SlotNumbers slots;
};

void PrintTo(const OutputCall& c, std::ostream* os) { *os << c.name; }

template <class T>
void inserting(KELostream& out) {
    out.KELostream::operator<<(T());
}

template <class T>
void putting(KELostream& out) {
    const T values[2] = {};
    out.KELostream::put(values, 2u);
}

class OutputCalls : public ::testing::TestWithParam<OutputCall> {};

// With room for all that is written: nothing is written past a slot.
TEST_P(OutputCalls, ReachTheSlotsTheyAreBuiltOnAndNoOther) {
    Writer w;
    w.text << std::string(100, ' ');
    w.text.seekp(0);
    {
        Noted<KELostream, 39> noted(w.out);
        GetParam().call(w.out);
    }
    EXPECT_EQ(called, GetParam().slots);
}

const int put_wide = 26;
const int put_quoted = 36;

const OutputCall output_calls[] = {
    {"Char", inserting<char>, {}},
    {"UnsignedChar", inserting<unsigned char>, {}},
    {"Short", inserting<short>, {}},
    {"UnsignedShort", inserting<unsigned short>, {}},
    {"Int", inserting<int>, {}},
    {"UnsignedInt", inserting<unsigned int>, {}},
    {"Long", inserting<long>, {}},
    {"UnsignedLong", inserting<unsigned long>, {}},
    {"Float", inserting<float>, {}},
    {"Double", inserting<double>, {}},
    {"LongLong", inserting<long long>, {}},
    {"UnsignedLongLong", inserting<unsigned long long>, {}},
    {"WideChar", inserting<wchar_t>, {}},
    {"RawChar", [](KELostream& out) { out.KELostream::put('x'); }, {}},
    {"RawBytes", putting<char>, {}},
    {"RawUnsignedBytes", putting<unsigned char>, {}},
    {"Shorts", putting<short>, {}},
    {"UnsignedShorts", putting<unsigned short>, {}},
    {"Ints", putting<int>, {}},
    {"UnsignedInts", putting<unsigned int>, {}},
    {"Longs", putting<long>, {}},
    {"UnsignedLongs", putting<unsigned long>, {}},
    {"Floats", putting<float>, {}},
    {"Doubles", putting<double>, {}},
    {"LongLongs", putting<long long>, {}},
    {"UnsignedLongLongs", putting<unsigned long long>, {}},
    {"WideChars", putting<wchar_t>, {}},
    {"WideBuffer", [](KELostream& out) { out.KELostream::put_wcbuf(L"ab", 2); }, {put_wide}},
    {"WideString", [](KELostream& out) { out.KELostream::operator<<(L"ab"); }, {put_wide}},
    {"EmptyWideString", [](KELostream& out) { out.KELostream::operator<<(L""); }, {put_wide}},
    {"String", [](KELostream& out) { out.KELostream::operator<<("ab"); }, {put_quoted}},
    {"EmptyString", [](KELostream& out) { out.KELostream::operator<<(""); }, {}},
    {"QuotedString", [](KELostream& out) { out.KELostream::putCString("ab"); }, {}},
    {"EndOfLine", [](KELostream& out) { endl(out); }, {}},
    {"EndOfLineWithoutAStandardStream",
     [](KELostream& out) {
         out._strm = nullptr;
         endl(out);
     },
     {8}},
    {"Reset", [](KELostream& out) { out.KELostream::reset(); }, {}},
};

INSTANTIATE_TEST_SUITE_P(Every, OutputCalls, ::testing::ValuesIn(output_calls),
                         [](const auto& case_info) { return case_info.param.name; });

// ---- reading ----

struct InputCall {
    const char* name;
    void (*call)(KEListream& in);
    SlotNumbers slots;
    const char* text;
};

void PrintTo(const InputCall& c, std::ostream* os) { *os << c.name; }

template <class T>
void extracting(KEListream& in) {
    T value = 0;
    in.KEListream::operator>>(value);
}

template <class T>
void getting(KEListream& in) {
    T values[2] = {};
    in.KEListream::get(values, 2u);
}

template <class T>
void getting_one(KEListream& in) {
    T value = 0;
    in.KEListream::get(value);
}

void extracting_string(KEListream& in) {
    char* s = nullptr;
    in.KEListream::operator>>(s);
    CORBA::string_free(s);
}

class InputCalls : public ::testing::TestWithParam<InputCall> {};

TEST_P(InputCalls, ReachTheSlotsTheyAreBuiltOnAndNoOther) {
    Reader r(GetParam().text);
    {
        Noted<KEListream, 42> noted(r.in);
        GetParam().call(r.in);
    }
    EXPECT_EQ(called, GetParam().slots);
}

const int get_wide = 28;
const int get_quoted = 38;

const InputCall input_calls[] = {
    {"Char", extracting<char>, {}, "1 "},
    {"UnsignedChar", extracting<unsigned char>, {}, "1 "},
    {"Short", extracting<short>, {}, "1 "},
    {"UnsignedShort", extracting<unsigned short>, {}, "1 "},
    {"Int", extracting<int>, {}, "1 "},
    {"UnsignedInt", extracting<unsigned int>, {}, "1 "},
    {"Long", extracting<long>, {}, "1 "},
    {"UnsignedLong", extracting<unsigned long>, {}, "1 "},
    {"Float", extracting<float>, {}, "1 "},
    {"Double", extracting<double>, {}, "1 "},
    {"LongLong", extracting<long long>, {}, "1 "},
    {"UnsignedLongLong", extracting<unsigned long long>, {}, "1 "},
    {"WideChar", extracting<wchar_t>, {}, "1 "},
    {"Get", [](KEListream& in) { in.KEListream::get(); }, {}, "1 "},
    {"RawChar", getting_one<char>, {}, "1 "},
    {"RawUnsignedChar", getting_one<unsigned char>, {}, "1 "},
    {"RawBytes", getting<char>, {}, "1 "},
    {"RawUnsignedBytes", getting<unsigned char>, {}, "1 "},
    {"Shorts", getting<short>, {}, "1 2 "},
    {"UnsignedShorts", getting<unsigned short>, {}, "1 2 "},
    {"Ints", getting<int>, {}, "1 2 "},
    {"UnsignedInts", getting<unsigned int>, {}, "1 2 "},
    {"Longs", getting<long>, {}, "1 2 "},
    {"UnsignedLongs", getting<unsigned long>, {}, "1 2 "},
    {"Floats", getting<float>, {}, "1 2 "},
    {"Doubles", getting<double>, {}, "1 2 "},
    {"LongLongs", getting<long long>, {}, "1 2 "},
    {"UnsignedLongLongs", getting<unsigned long long>, {}, "1 2 "},
    {"WideChars", getting<wchar_t>, {}, "1 2 "},
    {"WideBuffer",
     [](KEListream& in) {
         wchar_t buffer[2];
         in.KEListream::get_wcbuf(buffer, 2);
     },
     {get_wide},
     "1 2 "},
    {"WideString",
     [](KEListream& in) {
         wchar_t buffer[2];
         wchar_t* ws = buffer;
         in.KEListream::operator>>(ws);
     },
     {get_wide},
     "2 1 2 "},
    {"String", extracting_string, {get_quoted}, "3\"ab\"\n"},
    {"EmptyString", extracting_string, {}, "1 "},
    {"QuotedEmptyString", extracting_string, {get_quoted}, "1\"\"\n"},
    {"NullString", extracting_string, {}, "0 "},
    {"QuotedString",
     [](KEListream& in) {
         char buffer[4];
         in.KEListream::getCString(buffer, 4);
     },
     {},
     "\"\\65;\\n\"\n"},
    {"Reset", [](KEListream& in) { in.KEListream::reset(); }, {}, ""},
};

INSTANTIATE_TEST_SUITE_P(Every, InputCalls, ::testing::ValuesIn(input_calls),
                         [](const auto& case_info) { return case_info.param.name; });

// ---- what the called operation returns ----

// Every operation it overrides hands out another stream.
struct Elsewhere : KELostream {
    explicit Elsewhere(std::ostream& out) : KELostream(out) {}
    using KELostream::put;
    KELostream& put(const wchar_t*, unsigned int) override { return other; }
    KELostream& putCString(const char*) override { return other; }
    KELostream other;
};

TEST(OutputResult, IsTheStreamWhateverTheCalledOperationReturns) {
    std::ostringstream text;
    Elsewhere elsewhere(text);
    KELostream& out = elsewhere;
    EXPECT_EQ(&(out << "ab"), &out);
    EXPECT_EQ(&(out << L"ab"), &out);
}

TEST(OutputResult, OfEndOfLineIsItsArgumentWhateverTheStringOperatorReturns) {
    struct : KELostream {
        using KELostream::operator<<;
        KELostream& operator<<(const char*) override { return other; }
        KELostream other;
    } out;
    EXPECT_EQ(&endl(out), &out);
}

struct ReadElsewhere : KEListream {
    explicit ReadElsewhere(std::istream& in) : KEListream(in) {}
    using KEListream::get;
    KEListream& get(wchar_t*, unsigned int) override { return other; }
    KEListream& getCString(char*, unsigned int) override { return other; }
    KEListream other;
};

TEST(InputResult, IsTheStreamWhateverTheCalledOperationReturns) {
    std::istringstream text("3 2 ");
    ReadElsewhere elsewhere(text);
    KEListream& in = elsewhere;
    char* s = nullptr;
    wchar_t buffer[2];
    wchar_t* ws = buffer;
    EXPECT_EQ(&(in >> s), &in);
    EXPECT_EQ(&(in >> ws), &in);
    CORBA::string_free(s);
}

}  // namespace
