// SPDX-License-Identifier: MIT
#include <kel/core/internal/attributes.h>
#include <kel/streams/internal/decimals.h>
#include <kel/streams/internal/digits.h>

#include <cfenv>
#include <cstring>
#include <limits>

namespace kel {
namespace internal {

namespace {

// ---- powers of ten ----

constexpr int largest_power = 27;  // 5^27 is the last power of five in 63 bits

// Ten to the power of -27 to 27 as a number of 64 bits, the first of them set, times a power of two.
// Cut off behind the last bit, and thereby exact from 0 on.
struct Powers {
    constexpr Powers() : significands() {
        std::uint64_t five = 1;
        for (int power = 0; power <= largest_power; ++power, five *= 5) {
            const int unused = __builtin_clzll(five);
            significands[largest_power + power] = five << unused;
            if (power > 0) significands[largest_power - power] = reciprocal(five, 63 - unused);
        }
    }

    // 2^(64 + top) / divisor, bit after bit. `top` is the divisor's first bit.
    static constexpr std::uint64_t reciprocal(std::uint64_t divisor, int top) {
        std::uint64_t rest = std::uint64_t(1) << top;
        std::uint64_t quotient = 0;
        for (int bit = 0; bit < 64; ++bit) {
            rest *= 2;
            quotient = quotient * 2 + (rest >= divisor);
            if (rest >= divisor) rest -= divisor;
        }
        return quotient;
    }

    std::uint64_t significands[2 * largest_power + 1];
};
constexpr Powers powers;

std::uint64_t significand_of_power(int power) { return powers.significands[largest_power + power]; }

// The exponent of the greatest power of two in 10^power, and that of the greatest power of ten in 2^power.
int twos_in_ten_to(int power) { return power * 217706 >> 16; }
int tens_in_two_to(int power) { return power * 78913 >> 18; }

// ---- rounding ----

// A number that is `bits` or more and less than bits + 2, without its last `surplus` bits. A power that is
// cut off and a product that is cut off each take away less than one: that is all the error there is.
struct Rounded {
    Rounded(std::uint64_t bits, int surplus)
        : whole(bits >> surplus), decided((bits & ((one << surplus) - 1)) - (half(surplus) - 1) > 1) {
        if ((bits >> (surplus - 1) & 1) != 0) ++whole;
    }
    static constexpr std::uint64_t one = 1;
    static constexpr std::uint64_t half(int surplus) { return one << (surplus - 1); }

    std::uint64_t whole;
    bool decided;  // the number is not so close to the middle that its error matters
};

// The C library rounds as the thread has told the processor to. Asked as std::fegetround does, whose call
// would take longer than a number's digits.
bool rounds_to_nearest() {
    std::uint16_t control;
    __asm__ volatile("fnstcw %0" : "=m"(control));
    return (control & (FE_DOWNWARD | FE_UPWARD | FE_TOWARDZERO)) == FE_TONEAREST;
}

// ---- showing ----

constexpr int shown_digits = 6;
constexpr std::uint32_t smallest_shown = 100000;   // of six digits
constexpr std::uint32_t smallest_above = 1000000;  // of seven

// Copies of a fixed length are single moves, and what they bring too much is written over or left out.
char* put_digits(char* at, const char* digits, int n) {
    copy_bytes<shown_digits>(at, digits);
    return at + n;
}

char* put_fraction(char* at, const char* digits, int n) {
    if (n <= 0) return at;
    *at = '.';
    return put_digits(at + 1, digits, n);
}

char* put_exponent(char* at, int exponent) {
    const int size = exponent < 0 ? -exponent : exponent;
    at[0] = 'e';
    at[1] = exponent < 0 ? '-' : '+';
    at[2] = static_cast<char>('0' + size / 10);
    at[3] = static_cast<char>('0' + size % 10);
    return at + 4;
}

// Six digits of which the first stands for 10^exponent, as "%g" shows them: without zeros at the end,
// and with an exponent only below -4 and from 6 on.
char* put_general(char* at, std::uint32_t six, int exponent) {
    KEL_UNINITIALIZED char eight[2 + 2 * shown_digits];
    put_eight(eight, six);
    const char* const digits = eight + 2;
    int n = shown_digits;
    while (digits[n - 1] == '0') --n;

    if (exponent < -4 || exponent >= shown_digits) {
        *at = digits[0];
        return put_exponent(put_fraction(at + 1, digits + 1, n - 1), exponent);
    }
    if (exponent < 0) return put_digits(put_digits(at, "0.0000", 1 - exponent), digits, n);
    put_digits(at, digits, shown_digits);
    return put_fraction(at + exponent + 1, digits + exponent + 1, n - exponent - 1);
}

// The six digits of the number with the given first 64 bits, the first of them set, and the exponent of
// the first bit. `exponent` becomes that of the first digit. False for a number of the ordinary way.
bool six_digits(std::uint64_t bits, int top, std::uint32_t& six, int& exponent) {
    // Scaled so that six or seven digits stand before the point; seven have one too many.
    exponent = tens_in_two_to(top);
    for (;; ++exponent) {
        const int power = shown_digits - 1 - exponent;
        if (power < -largest_power || power > largest_power) return false;
        const std::uint64_t scaled = high_product(bits, significand_of_power(power));
        const int surplus = 62 - top - twos_in_ten_to(power);
        if (scaled >> surplus >= smallest_above) continue;
        KEL_UNINITIALIZED const Rounded rounded(scaled, surplus);
        six = static_cast<std::uint32_t>(rounded.whole);
        if (six == smallest_above) {
            six = smallest_shown;
            ++exponent;
        }
        return rounded.decided;
    }
}

// ---- reading ----

// The value is put together and stored as an integer: a processor that was to load it as a float just then
// would wait for both halves.
template <class Float, class Bits>
bool nearest(bool negative, std::uint64_t digits, int exponent, Float& value) {
    constexpr int precision = std::numeric_limits<Float>::digits;
    constexpr int bias = std::numeric_limits<Float>::max_exponent - 1;
    const Bits sign = static_cast<Bits>(negative) << (8 * sizeof(Bits) - 1);
    if (digits == 0) {
        std::memcpy(&value, &sign, sizeof value);
        return true;
    }
    if (exponent < -largest_power || exponent > largest_power || !rounds_to_nearest()) return false;
    const int unused = __builtin_clzll(digits);
    const std::uint64_t product = high_product(digits << unused, significand_of_power(exponent));
    const int first = static_cast<int>(product >> 63);
    const int top = 63 - unused + twos_in_ten_to(exponent) + first;
    if (top >= bias) return false;
    KEL_UNINITIALIZED const Rounded rounded(product, 63 - precision + first);
    if (!rounded.decided) return false;
    // The first bit is not stored: it raises the exponent by one, and by two when all bits were rounded up.
    const Bits bits =
        sign + (static_cast<Bits>(top + bias - 1) << (precision - 1)) + static_cast<Bits>(rounded.whole);
    std::memcpy(&value, &bits, sizeof value);
    return true;
}

}  // namespace

char* show_decimal(char* at, double value) {
    std::uint64_t bits;
    std::memcpy(&bits, &value, sizeof bits);
    if (bits >> 63 != 0) *at++ = '-';
    bits <<= 1;
    if (bits == 0) {
        *at = '0';
        return at + 1;
    }
    const int stored_exponent = static_cast<int>(bits >> 53);
    if (stored_exponent == 0 || !rounds_to_nearest())
        return nullptr;  // the smallest numbers have another form
    std::uint32_t six;
    int exponent;
    const std::uint64_t significand = bits << 10 | std::uint64_t(1) << 63;
    if (!six_digits(significand, stored_exponent - 1023, six, exponent)) return nullptr;
    return put_general(at, six, exponent);
}

bool decimal_value(bool negative, std::uint64_t digits, int exponent, double& value) {
    return nearest<double, std::uint64_t>(negative, digits, exponent, value);
}

bool decimal_value(bool negative, std::uint64_t digits, int exponent, float& value) {
    return nearest<float, std::uint32_t>(negative, digits, exponent, value);
}

}  // namespace internal
}  // namespace kel
