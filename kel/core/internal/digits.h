// The decimal digits of integers, without a locale.
//
//     char room[longest_integer];
//     char* const end = show_integer(room, -4711);
//
// Digits are looked up two at a time, and put together in one word where it matters how many they are.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_INTERNAL_DIGITS_H
#define KEL_CORE_INTERNAL_DIGITS_H

#include <kel/core/internal/attributes.h>

#include <cstdint>
#include <type_traits>

namespace kel {
namespace internal {

constexpr int longest_integer = 24;  // room that show_integer needs; the longest text has 20 characters

// For copies whose length the compiler knows. The library's calls of memcpy are checked at run time
// wherever the compiler cannot tell that the room is enough, which takes longer than these copies.
template <int n>
void copy_bytes(void* to, const void* from) {
    __builtin_memcpy(to, from, n);
}

// The numbers below 100 as two characters each.
struct Pairs {
    constexpr Pairs() : characters() {
        for (int n = 0; n < 100; ++n) {
            characters[n][0] = static_cast<char>('0' + n / 10);
            characters[n][1] = static_cast<char>('0' + n % 10);
        }
    }
    char characters[100][2];
};
constexpr Pairs pairs;

// Both characters of a number below 100, the first one lower.
inline std::uint32_t pair_of_digits(std::uint32_t n) {
    KEL_UNINITIALIZED std::uint16_t both;
    copy_bytes<2>(&both, pairs.characters[n]);
    return both;
}

// The upper two digits of a number below 10,000, by one multiplication.
inline std::uint32_t hundreds_of(std::uint32_t n) { return n * 5243 >> 19; }

// Numbers below 10,000 and 100,000,000 with leading zeros.
inline void put_four(char* at, std::uint32_t n) {
    const std::uint32_t hundreds = hundreds_of(n);
    copy_bytes<2>(at, pairs.characters[hundreds]);
    copy_bytes<2>(at + 2, pairs.characters[n - hundreds * 100]);
}

inline void put_eight(char* at, std::uint32_t n) {
    const std::uint32_t upper = n / 10000;
    put_four(at, upper);
    put_four(at + 4, n - upper * 10000);
}

// The digits of a number below 10,000 without leading zeros, the first one lowest, and how many they are.
struct UpToFour {
    explicit UpToFour(std::uint32_t n) {
        const std::uint32_t hundreds = hundreds_of(n);
        characters = pair_of_digits(hundreds) | pair_of_digits(n - hundreds * 100) << 16;
        const int zeros = __builtin_ctz((characters & 0x000f0f0f) | 1 << 24) / 8;
        characters >>= 8 * zeros;
        count = 4 - zeros;
    }
    std::uint32_t characters;
    int count;
};

// The uppermost digits of a larger number. Four characters are written, for others follow.
inline char* put_uppermost(char* at, std::uint32_t n) {
    const UpToFour digits(n);
    copy_bytes<4>(at, &digits.characters);
    return at + digits.count;
}

// A number below 100. A single digit is stored twice at the same place.
inline char* put_up_to_two(char* at, std::uint32_t n) {
    const int zeros = n < 10;
    const char* const digits = pairs.characters[n];
    at[0] = digits[zeros];
    at[1 - zeros] = digits[1];
    return at + 2 - zeros;
}

// A number below 10,000: its last two digits lie upon its first two. One digit is what flags, states and most
// counts have.
inline char* put_up_to_four(char* at, std::uint32_t n) {
    if (n < 10) {
        *at = static_cast<char>('0' + n);
        return at + 1;
    }
    const UpToFour digits(n);
    const std::uint32_t last_two = digits.characters >> 8 * (digits.count - 2);
    copy_bytes<2>(at, &digits.characters);
    copy_bytes<2>(at + digits.count - 2, &last_two);
    return at + digits.count;
}

// The halves of a number.
inline std::uint32_t upper_half(std::uint64_t n) { return static_cast<std::uint32_t>(n >> 32); }
inline std::uint32_t lower_half(std::uint64_t n) { return static_cast<std::uint32_t>(n); }

// The upper half of a product, from the four products of halves: nothing wider is needed at 32 bits.
inline std::uint64_t product(std::uint32_t a, std::uint32_t b) { return std::uint64_t(a) * b; }
inline std::uint64_t high_product(std::uint64_t a, std::uint64_t b) {
    const std::uint32_t a1 = upper_half(a), a0 = lower_half(a);
    const std::uint32_t b1 = upper_half(b), b0 = lower_half(b);
    const std::uint64_t cross = product(a1, b0) + upper_half(product(a0, b0));
    const std::uint64_t other = product(a0, b1) + lower_half(cross);
    return product(a1, b1) + upper_half(cross) + upper_half(other);
}

constexpr std::uint32_t eight_digits = 100000000;  // the first number of nine

// The last eight digits of a number of 64 bits, and what stands before them. Its upper half is below 10^8.
struct LastEight {
    LastEight(std::uint32_t upper, std::uint32_t lower) {
#ifdef __i386__
        // One instruction, which the compiler does not use: it would have to know that the quotient fits.
        __asm__("divl %[by]"
                : "=a"(first), "=d"(last)
                : "a"(lower), "d"(upper), [by] "r"(eight_digits)
                : "cc");
#else
        const std::uint64_t n = std::uint64_t(upper) << 32 | lower;
        first = static_cast<std::uint32_t>(n / eight_digits);
        last = static_cast<std::uint32_t>(n % eight_digits);
#endif
    }
    std::uint32_t first;
    std::uint32_t last;
};

// Each of these gives the end of the text, and changes nothing behind it.
inline char* show_integer(char* at, std::uint32_t n) {
    if (n < 10000) return put_up_to_four(at, n);
    if (n < 100000000) {
        at = put_uppermost(at, n / 10000);
        put_four(at, n % 10000);
        return at + 4;
    }
    at = put_up_to_two(at, n / 100000000);
    put_eight(at, n % 100000000);
    return at + 8;
}

inline char* show_integer(char* at, std::uint64_t n) {
    const std::uint32_t upper = upper_half(n);
    const std::uint32_t lower = lower_half(n);
    if (upper == 0) return show_integer(at, lower);
    if (upper < eight_digits) {
        KEL_UNINITIALIZED const LastEight ends(upper, lower);
        at = show_integer(at, ends.first);
        put_eight(at, ends.last);
        return at + 8;
    }
    KEL_UNINITIALIZED const LastEight ends(upper % eight_digits, lower);
    KEL_UNINITIALIZED const LastEight middle(upper / eight_digits, ends.first);
    at = show_integer(at, middle.first);
    put_eight(at, middle.last);
    put_eight(at + 8, ends.last);
    return at + 16;
}

// Every other integer as the smallest of the two above that holds it.
template <class T>
char* show_integer(char* at, T value) {
    typedef std::conditional_t<sizeof(T) <= 4, std::uint32_t, std::uint64_t> Unsigned;
    Unsigned size = static_cast<Unsigned>(value);
    if constexpr (std::is_signed_v<T>) {
        *at = '-';
        at += value < 0;
        size = value < 0 ? 0 - size : size;
    }
    return show_integer(at, size);
}

}  // namespace internal
}  // namespace kel

#endif
