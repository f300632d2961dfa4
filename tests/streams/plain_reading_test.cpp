// SPDX-License-Identifier: MIT
// Plain streams over a string are read without the standard library's extraction. Nobody can tell.

#include <kel/containers/strings.h>

#include <cfenv>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <iomanip>
#include <limits>
#include <random>
#include <vector>

#include "tests/streams/twin_fixtures.h"

namespace {

// The bytes of values, so that no sign of a zero is lost.
template <class T>
std::string bytes(const T& value) {
    std::ostringstream words;
    const unsigned char* const at = reinterpret_cast<const unsigned char*>(&value);
    const std::size_t size = std::is_same<T, long double>::value ? 10 : sizeof value;
    for (std::size_t i = 0; i < size; ++i) words << std::hex << static_cast<int>(at[i]) << ' ';
    return words.str();
}

// One value, and another one.
template <class T>
void read_one_and_two(const std::string& input, const Dress& dress) {
    same_reading(
        [](KEListream& in) {
            T value = static_cast<T>(42);
            in >> value;
            return bytes(value);
        },
        input, dress);
    same_reading(
        [](KEListream& in) {
            T first = static_cast<T>(42), second = static_cast<T>(43);
            in >> first >> second;
            return bytes(first) + bytes(second);
        },
        input, dress);
}

// Once at the end of the input, where more digits might have come, and once with a separator behind.
template <class T>
void read_as(const std::string& input, const Dress& dress = undressed) {
    read_one_and_two<T>(input, dress);
    read_one_and_two<T>(input + ' ', dress);
}

template <class T>
void read_array_as(const std::string& input, const Dress& dress = undressed) {
    for (const std::string& text : {input, input + ' '}) {
        for (unsigned int n : {0u, 1u, 3u, 5u}) {
            same_reading(
                [n](KEListream& in) {
                    T values[5] = {T(1), T(2), T(3), T(4), T(5)};
                    in.get(values, n);
                    return bytes(values);
                },
                text, dress);
        }
    }
}

void read_as_integers(const std::string& input, const Dress& dress = undressed) {
    read_as<char>(input, dress);
    read_as<unsigned char>(input, dress);
    read_as<short>(input, dress);
    read_as<unsigned short>(input, dress);
    read_as<int>(input, dress);
    read_as<unsigned int>(input, dress);
    read_as<long>(input, dress);
    read_as<unsigned long>(input, dress);
    read_as<long long>(input, dress);
    read_as<unsigned long long>(input, dress);
    read_as<wchar_t>(input, dress);
    read_array_as<short>(input, dress);
    read_array_as<unsigned int>(input, dress);
    read_array_as<long long>(input, dress);
    read_array_as<wchar_t>(input, dress);
}

void read_as_decimals(const std::string& input, const Dress& dress = undressed) {
    read_as<float>(input, dress);
    read_as<double>(input, dress);
    read_array_as<float>(input, dress);
    read_array_as<double>(input, dress);
}

void read_as_anything(const std::string& input, const Dress& dress = undressed) {
    read_as_integers(input, dress);
    read_as_decimals(input, dress);
}

// Good numbers, bad numbers, and what stands between them.
const char* const hostile[] = {
    "",
    " ",
    "\n\t\v\f\r ",
    "-",
    "+",
    "--1",
    "+-1",
    "- 1",
    "-x",
    ".",
    "-.",
    "..",
    "e",
    "e5",
    "1e",
    "1e+",
    "1e-",
    "1E5",
    "1e5",
    "1E",
    "1.5E3",
    "1e+5",
    "1e-5",
    "1e5e5",
    "1e5.5",
    "1.5.5",
    "1..5",
    "1.",
    "-1.",
    ".5",
    "-.5",
    "+.5",
    "1.e5",
    "0x10",
    "0X",
    "-0x1",
    "0x1p3",
    "010",
    "00",
    "-0",
    "-00.0",
    "+0",
    "+7",
    "007",
    "1,000",
    "1'000",
    "nan",
    "inf",
    "-inf",
    "infinity",
    "NAN(1)",
    "12a",
    "1 2 3 4 5 6",
    "1\n2\n3",
    "1\t\t2",
    "1  2",
    "1x2",
    "127 128 255 256 -128 -129",
    "32767 32768 65535 65536 -32768 -32769",
    "2147483647 2147483648",
    "-2147483648 -2147483649",
    "4294967295 4294967296",
    "-4294967295",
    "9223372036854775807 9223372036854775808",
    "-9223372036854775808 -9223372036854775809",
    "18446744073709551615 18446744073709551616",
    "-18446744073709551615",
    "99999999999999999999",
    "184467440737095516150",
    "999999999 1",
    "9999999999 1",
    "999999999999999999 1",
    "9999999999999999999 1",
    "00000000000000000000000000000001 2",
    "0000000000000000000000.5 2",
    "000000000000000000.5 2",
    "0.00000000000000000000000001 2",
    "123456789.123456789 2",
    "1234567890.5 2",
    "12345678901234567890.5 2",
    "0.1234567890123456789 2",
    "1e400 2",
    "1e-400 2",
    "1e0000000000005 2",
    "1e99999999999 2",
    "1e22 1e23 1e27 1e28 1e-27 1e-28",
    "3.4e38 3.5e38 1e39",
    "0e5 0e-5 0e400",
    "-1e-30",
    "1.17549e-38",
    "4.9e-324",
    "\xe4 5",
    "\xff",
    "5\xff",
    "1\x80",
    "\2405",
};

const Dress dresses[] = {
    [](std::ios& s) { s.setf(std::ios::hex, std::ios::basefield); },
    [](std::ios& s) { s.setf(std::ios::oct, std::ios::basefield); },
    [](std::ios& s) { s.unsetf(std::ios::basefield); },
    [](std::ios& s) { s.unsetf(std::ios::skipws); },
    [](std::ios& s) { s.setf(std::ios::uppercase); },
    [](std::ios& s) { s.width(3); },
    [](std::ios& s) { s.precision(3); },
    [](std::ios& s) { s.setstate(std::ios::eofbit); },
    [](std::ios& s) { s.setstate(std::ios::failbit); },
    [](std::ios& s) { s.setstate(std::ios::badbit); },
    [](std::ios& s) { s.exceptions(std::ios::eofbit); },
    [](std::ios& s) { s.exceptions(std::ios::failbit); },
    [](std::ios& s) { s.exceptions(std::ios::eofbit | std::ios::failbit | std::ios::badbit); },
};

}  // namespace

// ---- numbers ----

TEST(PlainReading, TakesHostileNumbersAsTheStandardLibraryDoes) {
    for (const char* text : hostile) {
        for (const char* before : {"", " ", "\n\v"}) {
            for (const char* after : {"", " ", "\n", "  7 8", "x"}) {
                read_as_anything(std::string(before) + text + after);
            }
        }
    }
}

TEST(PlainReading, TakesNumbersFromRandomCharacters) {
    static const char alphabet[] = "0123456789012345678900--+..eE x\n";
    std::mt19937 draw(1);
    for (int i = 0; i < 4000; ++i) {
        std::string text(1 + draw() % 24, '\0');
        for (char& c : text) c = alphabet[draw() % (sizeof alphabet - 1)];
        read_as<int>(text);
        read_as<unsigned long long>(text);
        read_as<double>(text);
        read_as<float>(text);
    }
}

TEST(PlainReading, TakesIntegersOfEveryLength) {
    std::mt19937_64 draw(2);
    for (int bits = 0; bits < 64; ++bits) {
        for (int i = 0; i < 10; ++i) {
            const std::uint64_t number = draw() >> bits;
            read_as_integers(std::to_string(number) + " 1");
            read_as_integers("-" + std::to_string(number) + " 1");
        }
    }
}

TEST(PlainReading, TakesDoublesOfEverySignAndExponent) {
    std::mt19937_64 draw(3);
    for (std::uint64_t front = 0; front < 4096; ++front) {
        for (int digits : {6, 9, 17, 18}) {
            const std::uint64_t bits = front << 52 | draw() >> 12;
            double value;
            std::memcpy(&value, &bits, sizeof value);
            char text[64];
            std::snprintf(text, sizeof text, "%.*g %.*e", digits, value, digits - 1, value);
            read_as<double>(text);
            read_as<float>(text);
        }
    }
}

// Halfway between two neighbours, which no 64 bits decide, and close to it.
TEST(PlainReading, TakesDecimalsThatLieBetweenTwoNumbers) {
    std::mt19937_64 draw(4);
    for (int i = 0; i < 600; ++i) {
        const std::uint64_t half = (draw() >> 11 | 1) << (i % 10);
        for (std::uint64_t number : {half - 1, half, half + 1}) {
            read_as_decimals(std::to_string(number));
            read_as_decimals(std::to_string(number >> 20) + "e" + std::to_string(i % 60 - 30));
        }
        const float single = static_cast<float>(draw() >> 44);
        char text[64];
        std::snprintf(text, sizeof text, "%.10g", (static_cast<double>(single) + 0.03125 * (i % 32)) / 16);
        read_as_decimals(text);
    }
}

TEST(PlainReading, RoundsAsTheThreadIsTold) {
    for (int direction : {FE_DOWNWARD, FE_UPWARD, FE_TOWARDZERO}) {
        std::fesetround(direction);
        for (const char* text : {"0.1", "-0.1", "0.7", "123.456", "-9.99e-5"}) read_as_decimals(text);
        std::fesetround(FE_TONEAREST);
    }
}

TEST(PlainReading, TakesLongArrays) {
    std::string text;
    for (int i = 0; i < 1000; ++i) text += std::to_string(i * 7919) + (i % 7 == 0 ? "\n" : " ");
    for (const std::string& end :
         {text, text + "x 1 2", text.substr(0, text.size() - 1), text + "99999999999 1"}) {
        same_reading(
            [](KEListream& in) {
                std::vector<int> values(1003);
                in.get(values.data(), 1003);
                std::string all;
                for (int value : values) all += std::to_string(value) + ' ';
                return all;
            },
            end);
    }
}

TEST(PlainReading, GivesTheValuesThatAreKnown) {
    Reader reader("-12 0.1 4294967295 -1e-05 1e+22 x");
    int a = 0;
    double b = 0, d = 0, e = 0;
    unsigned int c = 0;
    reader.in >> a >> b >> c >> d >> e;
    EXPECT_EQ(a, -12);
    EXPECT_EQ(b, 0.1);
    EXPECT_EQ(c, 4294967295u);
    EXPECT_EQ(d, -1e-5);
    EXPECT_EQ(e, 1e22);
    EXPECT_EQ(reader.rest(), "x");
}

TEST(PlainReading, LeavesEveryStreamThatIsNotPlainToTheStandardLibrary) {
    for (const Dress& dress : dresses) {
        for (const char* text : {"12 34 56", "12", "-7 x", "0x1f 1", "  5", "1.25 1e5", ""}) {
            read_as_anything(text, dress);
        }
    }
}

TEST(PlainReading, FlushesTheTiedStreamBeforeItReads) {
    CountingBuffer counting;
    std::ostream tied(&counting);
    Reader reader("1 2 ");
    reader.text.tie(&tied);
    int value = 0;
    reader.in >> value;
    EXPECT_GT(counting.flushes, 0);
}

TEST(PlainReading, SeesWhatIsWrittenBehindWhatWasRead) {
    const auto read = [](bool ordinary) {
        std::stringstream text("1");
        if (ordinary) text.imbue(alike());
        KEListream in(text);
        int a = 0, b = 0, c = 0;
        text.seekp(0, std::ios::end);
        text << "2 ";
        in >> a;
        text << "34";
        in >> b;
        text.clear();
        text << " 5 ";
        in >> c;
        return std::to_string(a) + ',' + std::to_string(b) + ',' + std::to_string(c) + seen(text);
    };
    EXPECT_EQ(read(false), read(true));
}

// ---- strings ----

namespace {

void read_string(const std::string& input) {
    same_reading(
        [](KEListream& in) {
            char* s = nullptr;
            in >> s;
            const std::string read = s == nullptr ? "null" : s;
            CORBA::string_free(s);
            return read;
        },
        input);
}

void read_quoted(const std::string& input, unsigned int room) {
    same_reading(
        [room](KEListream& in) {
            std::string buffer(room + 8, '#');
            in.getCString(&buffer[0], room);
            return buffer;
        },
        input);
}

std::string quoted(std::mt19937& draw, std::size_t length, unsigned odd) {
    static const char* const pieces[] = {"\\\"", "\\\\",   "\\[",   "\\]",    "\\n",   "\\x41", "\\xfF",
                                         "\n",   "\\x4\"", "\\x\"", "\\x",    "\\12 ", "\\-3x", "\\ 7 ",
                                         "\\q",  "\\",     "{",     "\\x\n4", "\xff",  "\\x-1"};
    std::string text = "\"";
    while (text.size() < length) {
        if (draw() % odd == 0) {
            text += pieces[draw() % (sizeof pieces / sizeof *pieces)];
        } else {
            text += static_cast<char>('a' + draw() % 26);
        }
    }
    return text + "\"\n";
}

}  // namespace

TEST(PlainReading, TakesWrittenStringsOfEveryLength) {
    std::mt19937 draw(5);
    for (std::size_t length = 0; length < 1100; length += length < 140 ? 1 : 61) {
        std::string s(length, '\0');
        for (char& c : s) c = static_cast<char>(draw() % 8 == 0 ? 1 + draw() % 255 : 'a');
        Writer writer;
        writer.out << s.c_str() << 5;
        read_string(writer.written());
        Reader reader(writer.written());
        char* back = nullptr;
        reader.in >> back;
        EXPECT_EQ(s, back);
        CORBA::string_free(back);
    }
}

TEST(PlainReading, TakesQuotedTextOfAnyKindIntoAnyRoom) {
    std::mt19937 draw(6);
    for (int round = 0; round < 1500; ++round) {
        const std::string text = quoted(draw, draw() % 200, 1 + draw() % 60);
        for (unsigned int room : {0u, 1u, 63u, 64u, 65u, 100u, 150u, 300u}) read_quoted(text, room);
    }
}

TEST(PlainReading, TakesQuotedTextLongerThanABlock) {
    std::mt19937 draw(7);
    for (int round = 0; round < 300; ++round) {
        const std::string text = quoted(draw, 900 + draw() % 2500, 1 + draw() % 2000);
        for (unsigned int room : {1000u, 1023u, 1024u, 1025u, 1500u, 4000u}) read_quoted(text, room);
    }
}

TEST(PlainReading, TakesQuotedTextThatEndsAnywhere) {
    std::mt19937 draw(8);
    for (int round = 0; round < 100; ++round) {
        const std::string text = quoted(draw, 150, 8);
        for (std::size_t n = 0; n <= text.size(); ++n) {
            read_quoted(text.substr(0, n), 200);
            read_string("120" + text.substr(0, n));
        }
    }
}

TEST(PlainReading, TakesFalseLengths) {
    for (const char* length :
         {"0", "1", "2", "3", "4", "5", "6", "70", "100", "3000", "-1", "x", "", " 4", "0x5"}) {
        for (const char* text :
             {"\"abc\"\n", " \"abc\"\n1 ", "\"abc\"1", "abc", "\"ab\\\"c\"\n\n", " ", ""}) {
            if (std::string(length) != "-1") read_string(std::string(length) + text);
        }
    }
}

TEST(PlainReading, LeavesStringsOfOtherStreamsToTheStandardLibrary) {
    for (const Dress& dress : dresses) {
        same_reading(
            [](KEListream& in) {
                char buffer[100] = {};
                in.getCString(buffer, 99);
                return std::string(buffer);
            },
            " \"abc\\x41\\12 \"\n7 ", dress);
    }
}
