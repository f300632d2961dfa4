// The numbers and strings that the streams' bench writes and reads, always the same ones.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_BENCH_SUPPORT_VALUES_H
#define KEL_BENCH_SUPPORT_VALUES_H

#include <cstdint>
#include <random>
#include <string>
#include <type_traits>
#include <vector>

namespace bench {

// Numbers of every length and both signs: what decides the cost of their digits.
template <class T>
std::vector<T> numbers(std::size_t n) {
    std::mt19937_64 draw(4711);
    std::vector<T> values(n);
    for (T& value : values) {
        const std::uint64_t bits = draw();
        value = static_cast<T>(static_cast<std::int64_t>(bits) >> (64 - 8 * sizeof(T)));
        value = static_cast<T>(value / (T(1) << draw() % (8 * sizeof(T) - 1)));
    }
    return values;
}

// What programs send: fractions between a thousandth and a million, of both signs.
template <>
inline std::vector<double> numbers<double>(std::size_t n) {
    std::mt19937_64 draw(4711);
    std::uniform_real_distribution<double> mantissa(-1, 1);
    std::uniform_int_distribution<int> exponent(-3, 6);
    static const double powers[] = {1e-3, 1e-2, 1e-1, 1, 1e1, 1e2, 1e3, 1e4, 1e5, 1e6};
    std::vector<double> values(n);
    for (double& value : values) value = mantissa(draw) * powers[exponent(draw) + 3];
    return values;
}

// Words of letters with blanks between them. With `escapes`, every thirtieth character or so has to be
// escaped.
inline std::string sentence(std::size_t n, bool escapes = false) {
    std::mt19937 draw(4711);
    std::string text;
    while (text.size() < n) {
        const unsigned letter = draw() % 30;
        text += letter < 26 ? static_cast<char>('a' + letter) : letter == 29 && escapes ? '"' : ' ';
    }
    return text;
}

}  // namespace bench

#endif
