// Floating-point numbers and their decimal text, in whole numbers of 64 bits: without a locale, and
// several times as fast as the C library.
//
// Nothing is guessed. What 64 bits cannot decide, and what lies outside 1e-22 to 1e32 or so, is left to
// the ordinary way.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_DECIMALS_H
#define KEL_STREAMS_INTERNAL_DECIMALS_H

#include <cstdint>

namespace kel {
namespace internal {

constexpr int longest_decimal = 12;  // -1.23456e-22

// The text of "%.6g" and its end, behind which nothing is changed. Null, and no text, for a number of the
// ordinary way. The value is looked at where it lies: a 32-bit processor that loads a double whose halves
// were stored apart, as arguments are, waits as long as for its digits.
char* show_decimal(char* at, const double& value);

// `digits` * 10^`exponent`, rounded to nearest, or what is as far below 0. False, and no value, for a number
// of the ordinary way.
bool decimal_value(bool negative, std::uint64_t digits, int exponent, double& value);
bool decimal_value(bool negative, std::uint64_t digits, int exponent, float& value);

}  // namespace internal
}  // namespace kel

#endif
