// SPDX-License-Identifier: MIT
#include <kel/core/internal/attributes.h>
#include <kel/core/internal/digits.h>
#include <kel/streams/internal/decimals.h>

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
        : whole((bits >> surplus) + (bits >> (surplus - 1) & 1)),
          decided((bits & ((one << surplus) - 1)) - (half(surplus) - 1) > 1) {}
    static constexpr std::uint64_t one = 1;
    static constexpr std::uint64_t half(int surplus) { return one << (surplus - 1); }

    std::uint64_t whole;
    bool decided;  // the number is not so close to the middle that its error matters
};

// The same where the upper half of the number has the last bit that stays and `surplus` more: one word takes
// a third of the steps at 32 bits.
struct RoundedInUpperHalf {
    RoundedInUpperHalf(std::uint64_t bits, int surplus) {
        const std::uint32_t half = std::uint32_t(1) << (surplus - 1);
        const std::uint32_t rest = upper_half(bits) & (2 * half - 1);
        whole = (upper_half(bits) >> surplus) + (rest >> (surplus - 1));
        decided = (std::uint64_t(rest - half) << 32 | lower_half(bits)) + 1 > 1;
    }

    std::uint32_t whole;
    bool decided;
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

// One to seven characters, the first one lowest. They are put together in a word and stored from there in two
// pieces that overlap: loading what was stored in other pieces just before takes as long as all digits.
struct FewCharacters {
    char* put(char* at) const {
        if (count >= 4) {
            store<4>(at, 0);
            store<4>(at + count - 4, count - 4);
        } else if (count >= 2) {
            store<2>(at, 0);
            store<2>(at + count - 2, count - 2);
        } else {
            *at = static_cast<char>(word);
        }
        return at + count;
    }

    // `n` of them from the one with the number `first` on, which is three at most.
    template <int n>
    void store(char* at, int first) const {
        const std::uint32_t part = static_cast<std::uint32_t>(word >> (8 * first & 31));
        copy_bytes<n>(at, &part);
    }

    std::uint64_t word;
    int count;
};

// Six digits without the zeros at the end.
FewCharacters significant_digits(std::uint32_t six) {
    const std::uint32_t first = six / 10000;
    const std::uint32_t last_four = six - first * 10000;
    const std::uint32_t second = hundreds_of(last_four);
    const std::uint32_t four = pair_of_digits(first) | pair_of_digits(second) << 16;
    const std::uint32_t two = pair_of_digits(last_four - second * 100);
    const std::uint64_t word = std::uint64_t(two) << 32 | four;
    const unsigned zeros = static_cast<unsigned>(__builtin_clzll(word & 0x0f0f0f0f0f0f)) / 8;
    return {word, static_cast<int>(8 - zeros)};
}

// For a point behind so many characters: what stands before it, and itself.
struct Points {
    constexpr Points() : whole(), point() {
        for (int before = 0; before < shown_digits; ++before) {
            whole[before] = (std::uint64_t(1) << 8 * before) - 1;
            point[before] = std::uint64_t('.') << 8 * before;
        }
    }
    std::uint64_t whole[shown_digits];
    std::uint64_t point[shown_digits];
};
constexpr Points points;

// The same with a point behind the first `before` digits, where others follow; with zeros up to there
// otherwise.
FewCharacters with_point(FewCharacters digits, int before) {
    if (digits.count <= before) return {digits.word, before};
    const std::uint64_t whole = digits.word & points.whole[before];
    return {whole | points.point[before] | (digits.word ^ whole) << 8, digits.count + 1};
}

// "0.", and more zeros: two to five characters. One character more may be spoilt behind two.
char* put_zeros(char* at, int count) {
    at[2] = at[count - 2] = at[count - 1] = '0';
    copy_bytes<2>(at, "0.");
    return at + count;
}

char* put_exponent(char* at, int exponent) {
    const std::uint32_t size = static_cast<std::uint32_t>(exponent < 0 ? -exponent : exponent);
    const std::uint32_t sign = exponent < 0 ? '-' : '+';
    const std::uint32_t word = 'e' | sign << 8 | pair_of_digits(size) << 16;
    copy_bytes<4>(at, &word);
    return at + 4;
}

// Six digits of which the first stands for 10^exponent, as "%g" shows them: without zeros at the end,
// and with an exponent only below -4 and from 6 on.
char* put_general(char* at, std::uint32_t six, int exponent) {
    const FewCharacters digits = significant_digits(six);
    if (exponent < -4 || exponent >= shown_digits)
        return put_exponent(with_point(digits, 1).put(at), exponent);
    if (exponent < 0) return digits.put(put_zeros(at, 1 - exponent));
    return with_point(digits, exponent + 1).put(at);
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
        const int surplus = 30 - top - twos_in_ten_to(power);  // six or seven digits are less than 25 bits
        if (upper_half(scaled) >> surplus >= smallest_above) continue;
        KEL_UNINITIALIZED const RoundedInUpperHalf rounded(scaled, surplus);
        six = rounded.whole;
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

char* show_decimal(char* at, const double& value) {
    std::uint64_t bits;
    std::memcpy(&bits, &value, sizeof bits);
    const int negative = static_cast<int>(bits >> 63);
    bits <<= 1;
    if (bits == 0) {
        *at = '-';
        at[negative] = '0';
        return at + negative + 1;
    }
    const int stored_exponent = static_cast<int>(bits >> 53);
    if (stored_exponent == 0 || !rounds_to_nearest())
        return nullptr;  // the smallest numbers have another form
    std::uint32_t six;
    int exponent;
    const std::uint64_t significand = bits << 10 | std::uint64_t(1) << 63;
    if (!six_digits(significand, stored_exponent - 1023, six, exponent)) return nullptr;
    *at = '-';
    return put_general(at + negative, six, exponent);
}

bool decimal_value(bool negative, std::uint64_t digits, int exponent, double& value) {
    return nearest<double, std::uint64_t>(negative, digits, exponent, value);
}

bool decimal_value(bool negative, std::uint64_t digits, int exponent, float& value) {
    return nearest<float, std::uint32_t>(negative, digits, exponent, value);
}

}  // namespace internal
}  // namespace kel
