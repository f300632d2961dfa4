// SPDX-License-Identifier: MIT
// Values on streams of any flags, width, precision, fill, locale and exception mask: what is written and read
// is what the standard library writes and reads.
#include <cstring>
#include <random>

#include "tests/streams/twin_fixtures.h"

namespace {

typedef std::mt19937 Draw;

class Punctuation : public std::numpunct<char> {
public:
    Punctuation(char point, char separator, const char* grouping)
        : _point(point), _separator(separator), _grouping(grouping) {}

private:
    char do_decimal_point() const override { return _point; }
    char do_thousands_sep() const override { return _separator; }
    std::string do_grouping() const override { return _grouping; }

    const char _point;
    const char _separator;
    const std::string _grouping;
};

std::locale any_locale(Draw& draw) {
    switch (draw() % 8) {
        case 0:
            return alike();
        case 1:
            return std::locale(std::locale::classic(), new Punctuation(',', '.', "\3"));
        case 2:
            return std::locale(std::locale::classic(), new Punctuation('.', '\'', "\3\2"));
        case 3:
            return std::locale(std::locale::classic(), new Punctuation(';', 'e', "\1"));
        default:
            return std::locale::classic();
    }
}

// Each part is often left as it is, so that plain streams are among them.
Dress any_dress(Draw& draw) {
    const std::ios::fmtflags flags[] = {std::ios::boolalpha,  std::ios::showbase, std::ios::showpoint,
                                        std::ios::showpos,    std::ios::skipws,   std::ios::unitbuf,
                                        std::ios::left,       std::ios::right,    std::ios::hex,
                                        std::ios::oct,        std::ios::dec,      std::ios::fixed,
                                        std::ios::scientific, std::ios::internal, std::ios::uppercase};
    std::ios::fmtflags changed{};
    if (draw() % 2 == 0) changed |= flags[draw() % 15];
    if (draw() % 4 == 0) changed |= flags[draw() % 15];
    const std::streamsize precision = draw() % 2 == 0 ? 6 : draw() % 20;
    const std::streamsize width = draw() % 2 == 0 ? 0 : draw() % 30;
    const char fill = "  *0"[draw() % 4];
    const std::ios::iostate mask = draw() % 4 == 0 ? std::ios::iostate(draw() % 8) : std::ios::goodbit;
    const std::locale locale = any_locale(draw);
    return [=](std::ios& stream) {
        stream.flags(stream.flags() ^ changed);
        stream.precision(precision);
        stream.width(width);
        stream.fill(fill);
        stream.imbue(locale);
        stream.exceptions(mask);
    };
}

// Of any size: the bits are random and their number is.
template <class T>
T any_value(Draw& draw) {
    const std::uint64_t bits = (std::uint64_t(draw()) << 32 | draw()) >> draw() % 64;
    T value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}
template <>
double any_value(Draw& draw) {
    const double few = static_cast<double>(draw() % 2000000) - 1e6;
    return draw() % 2 == 0 ? few / (1 << draw() % 20) : few * static_cast<double>(1 + draw() % 100000);
}
template <>
float any_value(Draw& draw) {
    return static_cast<float>(any_value<double>(draw));
}

template <class Put>
std::string text_of(const Dress& dress, Put put) {
    std::ostringstream text;
    dress(text);
    const std::string end = outcome([&] { put(text); });
    return end + ", " + seen(text) + ": " + text.str();
}

template <class T>
void writes_as_the_standard_library() {
    Draw draw(11);
    for (int i = 0; i < 4000; ++i) {
        const Dress dress = any_dress(draw);
        const T value = any_value<T>(draw), other = any_value<T>(draw);
        const auto by_itself = [&](std::ostream& text) { text << value << " " << other << " "; };
        const auto by_the_library = [&](std::ostream& text) { KELostream(text) << value << other; };
        const auto as_an_array = [&](std::ostream& text) {
            const T values[] = {value, other};
            KELostream(text).put(values, 2);
        };
        const std::string expected = text_of(dress, by_itself);
        ASSERT_EQ(text_of(dress, by_the_library), expected);
        ASSERT_EQ(text_of(dress, as_an_array), expected);
    }
}

// What a reader of two values finds, and what it leaves.
template <class T, class Get>
std::string found_in(const std::string& input, const Dress& dress, Get get) {
    std::istringstream text(input);
    dress(text);
    T values[] = {T(1), T(1)};
    const std::string end = outcome([&] { get(text, values); });
    std::ostringstream told;
    told.precision(20);
    told << end << ", " << seen(text) << ", count " << text.gcount() << ", values " << values[0] << ' '
         << values[1] << ", left " << text.rdbuf()->in_avail();
    return told.str();
}

template <class T>
void reads_as_the_standard_library() {
    Draw draw(12);
    for (int i = 0; i < 4000; ++i) {
        const Dress writer = any_dress(draw);
        const Dress dress = draw() % 2 == 0 ? any_dress(draw) : undressed;
        std::ostringstream text;
        if (draw() % 4 == 0) writer(text);
        text.exceptions(std::ios::goodbit);
        text << any_value<T>(draw) << "  \n\t"[draw() % 4] << any_value<T>(draw)
             << (draw() % 8 == 0 ? "" : " .");
        const std::string input = text.str();
        const auto one_by_one = [](std::istream& in, T* values) {
            in >> values[0];
            in.get();
            in >> values[1];
            in.get();
        };
        const auto by_the_library = [](std::istream& in, T* values) {
            KEListream(in) >> values[0] >> values[1];
        };
        ASSERT_EQ(found_in<T>(input, dress, by_the_library), found_in<T>(input, dress, one_by_one)) << input;

        const auto one_behind_the_other = [](std::istream& in, T* values) {
            in >> values[0];
            if (!in.fail()) in >> values[1];
            in.get();
        };
        const auto as_an_array = [](std::istream& in, T* values) { KEListream(in).get(values, 2); };
        ASSERT_EQ(found_in<T>(input, dress, as_an_array), found_in<T>(input, dress, one_behind_the_other))
            << input;
    }
}

}  // namespace

TEST(RandomDress, WritesIntegersAsTheStandardLibraryDoes) {
    writes_as_the_standard_library<short>();
    writes_as_the_standard_library<int>();
    writes_as_the_standard_library<unsigned long>();
    writes_as_the_standard_library<long long>();
    writes_as_the_standard_library<unsigned long long>();
}

TEST(RandomDress, WritesDecimalsAsTheStandardLibraryDoes) {
    writes_as_the_standard_library<double>();
    writes_as_the_standard_library<float>();
}

TEST(RandomDress, ReadsIntegersAsTheStandardLibraryDoes) {
    reads_as_the_standard_library<short>();
    reads_as_the_standard_library<int>();
    reads_as_the_standard_library<unsigned long>();
    reads_as_the_standard_library<long long>();
    reads_as_the_standard_library<unsigned long long>();
}

TEST(RandomDress, ReadsDecimalsAsTheStandardLibraryDoes) {
    reads_as_the_standard_library<double>();
    reads_as_the_standard_library<float>();
}
