// SPDX-License-Identifier: MIT
// Plain streams are written to without the standard library's formatting. Nobody can tell.

#include <cfenv>
#include <clocale>
#include <cmath>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "tests/streams/twin_fixtures.h"
#include "tests/support/fault.h"

namespace {

using kel::test::AllocationPlan;
using kel::test::Armed;

// Numbers of every length.
template <class T>
std::vector<T> integers() {
    std::mt19937_64 draw(1);
    std::vector<T> values = {0, 1, std::numeric_limits<T>::min(), std::numeric_limits<T>::max()};
    for (std::uint64_t power = 1; power <= std::uint64_t(1) << 62; power *= 2) {
        for (int i = 0; i < 20; ++i) values.push_back(static_cast<T>(draw() % power));
        values.push_back(static_cast<T>(0 - power));
    }
    for (std::uint64_t power = 10; power < 10000000000000000000u; power *= 10) {
        for (int i = -2; i <= 2; ++i) {
            values.push_back(static_cast<T>(power + static_cast<std::uint64_t>(i)));
            values.push_back(static_cast<T>(0 - power + static_cast<std::uint64_t>(i)));
        }
    }
    return values;
}

double from_bits(std::uint64_t bits) {
    double value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

// Each sign with each exponent, and random bits behind them.
std::vector<double> doubles() {
    std::mt19937_64 draw(2);
    std::vector<double> values;
    for (std::uint64_t front = 0; front < 4096; ++front) {
        values.push_back(from_bits(front << 52));
        for (int i = 0; i < 20; ++i) values.push_back(from_bits(front << 52 | draw() >> 12));
    }
    return values;
}

// Short decimal numbers, and those halfway between two of six digits with their neighbours.
std::vector<double> decimals() {
    std::mt19937 draw(3);
    std::vector<double> values;
    for (int exponent = -30; exponent <= 40; ++exponent) {
        for (int i = 0; i < 40; ++i) {
            const double number = static_cast<double>(draw() % 2000000) / (i % 4 == 0 ? 2 : 1);
            const double value = number * std::pow(10.0, exponent);
            for (double near : {value, std::nextafter(value, 0), std::nextafter(value, HUGE_VAL)}) {
                values.push_back(near);
                values.push_back(-near);
            }
        }
    }
    for (double value :
         {999999.5, 9999995.0, 99999.95, 0.000099999949, 0.0001, 0.00001, 1e22, 1e23, 1e100, 0.1}) {
        values.push_back(value);
    }
    return values;
}

template <class T>
void each_alone_and_all(const std::vector<T>& values) {
    same_writing([&](KELostream& out) {
        for (T value : values) out << value;
    });
    const unsigned int n = static_cast<unsigned int>(values.size());
    same_writing([&](KELostream& out) { out.put(values.data(), n); });
    for (unsigned int few = 0; few < 60; ++few) {
        same_writing([&](KELostream& out) { out.put(values.data(), few); });
    }
}

const Dress dresses[] = {
    [](std::ios& s) { s.setf(std::ios::hex, std::ios::basefield); },
    [](std::ios& s) { s.setf(std::ios::oct, std::ios::basefield); },
    [](std::ios& s) { s.unsetf(std::ios::basefield); },
    [](std::ios& s) { s.setf(std::ios::showpos); },
    [](std::ios& s) { s.setf(std::ios::showbase | std::ios::hex, std::ios::showbase | std::ios::basefield); },
    [](std::ios& s) { s.setf(std::ios::showpoint); },
    [](std::ios& s) { s.setf(std::ios::uppercase | std::ios::scientific); },
    [](std::ios& s) { s.setf(std::ios::fixed, std::ios::floatfield); },
    [](std::ios& s) { s.setf(std::ios::fixed | std::ios::scientific); },
    [](std::ios& s) { s.setf(std::ios::unitbuf); },
    [](std::ios& s) { s.unsetf(std::ios::skipws); },
    [](std::ios& s) { s.precision(0); },
    [](std::ios& s) { s.precision(1); },
    [](std::ios& s) { s.precision(7); },
    [](std::ios& s) { s.precision(17); },
    [](std::ios& s) { s.width(9); },
    [](std::ios& s) {
        s.fill('#');
        s.width(12);
        s.setf(std::ios::internal);
    },
    [](std::ios& s) { s.fill('#'); },
    [](std::ios& s) { s.setstate(std::ios::eofbit); },
    [](std::ios& s) { s.setstate(std::ios::failbit); },
    [](std::ios& s) { s.setstate(std::ios::badbit); },
    [](std::ios& s) { s.exceptions(std::ios::badbit); },
    [](std::ios& s) {
        s.setstate(std::ios::badbit);
        s.clear();
        s.exceptions(std::ios::failbit);
    },
};

// One of each kind of item.
void write_everything(KELostream& out) {
    const int ints[] = {-1, 20, 300};
    const double numbers[] = {0.25, -1e9};
    out << 'x' << static_cast<unsigned char>(200) << short(-2) << static_cast<unsigned short>(65535) << -7
        << 7u;
    out << -8l << 8ul << -9ll << 9ull << L'w' << 1.5f << -0.000125 << "a \"quoted\" {string}"
        << "" << L"wide";
    out << static_cast<const char*>(nullptr);
    out.put(ints, 3).put(numbers, 2).put(L"wide", 4).putCString("\x01\x7f\xe4");
}

}  // namespace

// ---- values ----

TEST(PlainWriting, ShowsSignedIntegersOfEveryLength) {
    each_alone_and_all(integers<short>());
    each_alone_and_all(integers<int>());
    each_alone_and_all(integers<long>());
    each_alone_and_all(integers<long long>());
    each_alone_and_all(integers<wchar_t>());
}

TEST(PlainWriting, ShowsUnsignedIntegersOfEveryLength) {
    each_alone_and_all(integers<unsigned short>());
    each_alone_and_all(integers<unsigned int>());
    each_alone_and_all(integers<unsigned long>());
    each_alone_and_all(integers<unsigned long long>());
}

TEST(PlainWriting, ShowsTheLastDigitsOfLongIntegers) {
    std::vector<unsigned int> values;
    for (unsigned int value = 0; value < 4294000000u; value += value < 20000 ? 1 : 30011) {
        values.push_back(value);
    }
    std::ostringstream shown;
    KELostream(shown).put(values.data(), static_cast<unsigned int>(values.size()));
    std::string known;
    for (unsigned int value : values) known.append(std::to_string(value)).append(" ");
    EXPECT_TRUE(shown.str() == known)
        << "the texts have " << shown.str().size() << " and " << known.size() << " characters";
}

TEST(PlainWriting, ShowsDoublesOfEverySignAndExponent) { each_alone_and_all(doubles()); }
TEST(PlainWriting, ShowsShortDecimalsAndTheirNeighbours) { each_alone_and_all(decimals()); }

TEST(PlainWriting, RoundsAsTheThreadIsTold) {
    for (int direction : {FE_DOWNWARD, FE_UPWARD, FE_TOWARDZERO}) {
        std::fesetround(direction);
        for (double value : {0.12345678, -0.12345678, 999999.9, 2e-5 / 3, -1e20 / 3}) {
            same_writing([&](KELostream& out) { out << value; });
        }
        std::fesetround(FE_TONEAREST);
    }
}

TEST(PlainWriting, ShowsFloats) {
    std::mt19937 draw(4);
    std::vector<float> values;
    for (int i = 0; i < 20000; ++i) {
        const std::uint32_t bits = static_cast<std::uint32_t>(draw());
        float value;
        std::memcpy(&value, &bits, sizeof value);
        values.push_back(value);
    }
    each_alone_and_all(values);
}

TEST(PlainWriting, ShowsEveryByteAsCharacterAndAsNumber) {
    same_writing([](KELostream& out) {
        for (int c = 0; c < 256; ++c) out << static_cast<char>(c) << static_cast<unsigned char>(c);
    });
}

TEST(PlainWriting, ChangesNothingBehindWhatItOverwrites) {
    const Dress in_the_middle = [](std::ios& s) {
        dynamic_cast<std::ostringstream&>(s).str(std::string(100, 'c'));
        dynamic_cast<std::ostringstream&>(s).seekp(5);
    };
    for (int value : integers<int>()) same_writing([&](KELostream& out) { out << value; }, in_the_middle);
    for (long long value : integers<long long>()) {
        same_writing([&](KELostream& out) { out << value; }, in_the_middle);
    }
    for (double value : decimals()) same_writing([&](KELostream& out) { out << value; }, in_the_middle);
    for (int number = 0; number < 2000; ++number) {
        same_writing([&](KELostream& out) { out << number * 1.0 << number / 16.0; }, in_the_middle);
    }
    for (const char* s : {"", "s", "a longer string", "\x01\""}) {
        same_writing([&](KELostream& out) { out << 'c' << s; }, in_the_middle);
    }
    for (std::size_t length = 1; length < 110; ++length) {
        for (std::size_t escaped = 0; escaped <= length; ++escaped) {
            std::string s(length, 'p');
            if (escaped < length) s[escaped] = escaped % 2 == 0 ? '"' : '\x01';
            same_writing([&](KELostream& out) { out << s.c_str(); }, in_the_middle);
        }
        const std::string all(length, '\x01');
        same_writing([&](KELostream& out) { out << all.c_str(); }, in_the_middle);
    }
    const double few[] = {1, 0.5, 1e-5};
    const long many[] = {1, -20000, 2000000000};
    same_writing([&](KELostream& out) { out.put(few, 3u).put(many, 3u); }, in_the_middle);
}

TEST(PlainWriting, ShowsTheTextsThatAreKnown) {
    Writer writer;
    writer.out << 0 << -10000 << 99999999u << 10000000000000000000ull << 0.1 << -0.0 << 1e-5 << 123456789.0
               << 1e22 << 100000.0 << 999999.5;
    EXPECT_EQ(writer.written(),
              "0 -10000 99999999 10000000000000000000 0.1 -0 1e-05 1.23457e+08 1e+22 100000 1e+06 ");
}

// ---- strings ----

TEST(PlainWriting, QuotesStringsOfEveryLengthWithOddCharactersAnywhere) {
    std::mt19937 draw(5);
    for (std::size_t length = 0; length < 70; ++length) {
        for (int round = 0; round < 20; ++round) {
            std::string s(length, '\0');
            for (char& c : s) c = static_cast<char>(draw() % 4 == 0 ? 1 + draw() % 255 : 'a' + draw() % 26);
            same_writing([&](KELostream& out) { out << s.c_str(); });
        }
    }
}

TEST(PlainWriting, QuotesEveryByteAtEachPlaceOfABlock) {
    for (int byte = 1; byte < 256; ++byte) {
        for (std::size_t at : {0, 7, 15, 16, 31}) {
            std::string s(40, 'p');
            s[at] = static_cast<char>(byte);
            same_writing([&](KELostream& out) { out.putCString(s.c_str()); });
        }
    }
}

TEST(PlainWriting, QuotesLongStringsByTheBlock) {
    for (std::size_t length : {507, 508, 509, 510, 511, 512, 513, 1024, 100000}) {
        for (const char* piece : {"a", "\"", "\x02", "ab{"}) {
            std::string s;
            while (s.size() < length) s += piece;
            same_writing([&](KELostream& out) { out << s.c_str() << 1; });
        }
    }
}

// ---- streams ----

TEST(PlainWriting, LeavesEveryStreamThatIsNotPlainToTheStandardLibrary) {
    for (const Dress& dress : dresses) same_writing(write_everything, dress);
    same_writing(write_everything);
}

TEST(PlainWriting, ShowsWithAnyLocaleWhatTheStandardLibraryShows) {
    struct Grouping : std::numpunct<char> {
        char do_decimal_point() const override { return ','; }
        char do_thousands_sep() const override { return '.'; }
        std::string do_grouping() const override { return "\3"; }
    };
    std::ostringstream text;
    text.imbue(std::locale(std::locale::classic(), new Grouping));
    KELostream(text) << 1234567 << 1.5;
    EXPECT_EQ(text.str(), "1.234.567 1,5 ");
}

TEST(PlainWriting, FlushesTheTiedStreamBeforeEachPiece) {
    const auto flushes = [](bool ordinary) {
        CountingBuffer counting;
        std::ostream tied(&counting);
        std::ostringstream text;
        if (ordinary) text.imbue(alike());
        text.tie(&tied);
        KELostream out(text);
        write_everything(out);
        return std::to_string(counting.flushes) + text.str();
    };
    EXPECT_EQ(flushes(false), flushes(true));
    EXPECT_NE(flushes(false)[0], '0');
}

// Moving leaves the new stream the state of the old one and no buffer.
TEST(PlainWriting, FindsOutThatAGoodStreamHasNoBuffer) {
    struct Moved : std::ostream {
        explicit Moved(std::ostream&& from) : std::ostream(std::move(from)) {}
    };
    Moved moved(std::ostringstream{});
    ASSERT_TRUE(moved.good());
    KELostream(moved) << 1;
    EXPECT_EQ(moved.rdstate(), std::ios::badbit | std::ios::failbit);
}

TEST(PlainWriting, FlushesAfterEachPieceWhenTold) {
    const auto flushes = [](bool ordinary) {
        CountingBuffer counting;
        std::ostream text(&counting);
        if (ordinary) text.imbue(alike());
        text.setf(std::ios::unitbuf);
        KELostream out(text);
        write_everything(out);
        return std::to_string(counting.flushes) + counting.str();
    };
    EXPECT_EQ(flushes(false), flushes(true));
    EXPECT_NE(flushes(false)[0], '0');
}

// ---- buffers ----

namespace {

// Lists the calls it gets; takes so many characters and then refuses or throws.
class Listing : public std::streambuf {
public:
    Listing(int room, bool throws) : _room(room), _throws(throws) {}
    std::string calls;

protected:
    std::streamsize xsputn(const char* s, std::streamsize n) override {
        calls += "put " + std::string(s, static_cast<std::size_t>(n)) + "|";
        if (n <= _room) {
            _room -= static_cast<int>(n);
            return n;
        }
        const int taken = _room;
        _room = 0;
        if (_throws) throw 4711;
        return taken;
    }
    int overflow(int c) override {
        calls += "overflow " + std::to_string(c) + "|";
        if (_room-- > 0) return c;
        _room = 0;
        if (_throws) throw 4712;
        return std::char_traits<char>::eof();
    }

private:
    int _room;
    bool _throws;
};

std::string listed(int room, bool throws, std::ios::iostate exceptions, bool ordinary) {
    Listing buffer(room, throws);
    std::ostream text(&buffer);
    if (ordinary) text.imbue(alike());
    text.exceptions(exceptions);
    KELostream out(text);
    const std::string end = outcome([&] { write_everything(out); });
    return end + seen(text) + " offset " + std::to_string(out.cur_out_offset()) + buffer.calls;
}

}  // namespace

TEST(PlainWriting, GivesABufferThatIsNotKnownThePiecesOfTheStandardLibrary) {
    for (int room = 0; room < 200; ++room) {
        for (bool throws : {false, true}) {
            for (auto exceptions : {std::ios::goodbit, std::ios::badbit, std::ios::failbit}) {
                EXPECT_EQ(listed(room, throws, exceptions, false), listed(room, throws, exceptions, true));
            }
        }
    }
}

TEST(PlainWriting, FailsOverABufferThatIsOnlyRead) {
    const auto written = [](bool ordinary, void (*write)(KELostream&)) {
        std::stringbuf buffer("only read", std::ios::in);
        std::ostream text(&buffer);
        if (ordinary) text.imbue(alike());
        KELostream out(text);
        write(out);
        return seen(text) + std::to_string(out.cur_out_offset()) + buffer.str();
    };
    const auto one = [](KELostream& out) { out << 7; };
    const auto quoted = [](KELostream& out) { out.putCString("s"); };
    EXPECT_EQ(written(false, write_everything), written(true, write_everything));
    EXPECT_EQ(written(false, one), written(true, one));
    EXPECT_EQ(written(false, quoted), written(true, quoted));
}

// The string's memory ends at a character after the other: at the first, the last, and at each separator.
TEST(PlainWriting, KeepsWhatFitsWhenThereIsNoMemoryForMore) {
    const auto written = [](std::size_t before, bool ordinary,
                            const std::function<void(KELostream&)>& write) {
        std::ostringstream text;
        if (ordinary) text.imbue(alike());
        text << 0.5 << 7;
        text.str(std::string(600, 'c'));  // room for 600
        text.seekp(static_cast<std::streamoff>(before));
        KELostream out(text);
        AllocationPlan::fail(1, true);
        std::string end;
        {
            Armed armed;
            end = outcome([&] { write(out); });
        }
        kel::test::reset_faults();
        return end + seen(text) + " offset " + std::to_string(out.cur_out_offset()) + ": " + text.str();
    };
    const int ints[] = {-1, 20, 300};
    const std::string longer_than_a_block(700, 'x');
    const std::function<void(KELostream&)> works[] = {
        [](KELostream& out) { out << -123; },
        [](KELostream& out) { out << -0.25; },
        [](KELostream& out) { out << 'c'; },
        [](KELostream& out) { out.putCString("a\"b\x01"); },
        [](KELostream& out) { out << "string"; },
        [](KELostream& out) { out << "a\"longer\x01string"; },
        [](KELostream& out) { out << "some that ends with\x01"; },
        [&](KELostream& out) { out.put(ints, 3); },
        [&](KELostream& out) { out.putCString(longer_than_a_block.c_str()); },
    };
    for (const auto& work : works) {
        for (std::size_t before = 570; before <= 600; ++before) {
            EXPECT_EQ(written(before, false, work), written(before, true, work)) << before;
        }
    }
}
