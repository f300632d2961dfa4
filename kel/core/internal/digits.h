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

// The halves of a number, and the product of two halves.
inline std::uint32_t upper_half(std::uint64_t n) { return static_cast<std::uint32_t>(n >> 32); }
inline std::uint32_t lower_half(std::uint64_t n) { return static_cast<std::uint32_t>(n); }
inline std::uint64_t product(std::uint32_t a, std::uint32_t b) { return std::uint64_t(a) * b; }

// The upper two digits of a number below 10,000, by one multiplication.
inline std::uint32_t hundreds_of(std::uint32_t n) { return n * 5243 >> 19; }

// A number below 10,000 with leading zeros.
inline void put_four(char* at, std::uint32_t n) {
    const std::uint32_t hundreds = hundreds_of(n);
    copy_bytes<2>(at, pairs.characters[hundreds]);
    copy_bytes<2>(at + 2, pairs.characters[n - hundreds * 100]);
}

// Both halves of a product.
struct Product {
    Product(std::uint32_t a, std::uint32_t b) {
#ifdef __i386__
        // One instruction; the compiler would put the halves together and take them apart again.
        __asm__("mull %[b]" : "=a"(lower), "=d"(upper) : "a"(a), [b] "r"(b) : "cc");
#else
        const std::uint64_t n = product(a, b);
        lower = lower_half(n);
        upper = upper_half(n);
#endif
    }
    std::uint32_t lower;
    std::uint32_t upper;
};

// A number below 100,000,000 with leading zeros: its upper two digits and a fraction, of which each
// multiplication by 100 brings the next two in front of the point. There is no remainder to wait for, which
// spares a long integer a thirtieth of its time. The fraction, of 24 bits at first, is too large by less than
// the last digit.
inline void put_eight(char* at, std::uint32_t n) {
    const std::uint32_t millionth = (std::uint64_t(1) << (24 + 27)) / 1000000 + 1;
    const std::uint32_t first = Product(n << 5, millionth).upper + 1;
    copy_bytes<2>(at, pairs.characters[first >> 24]);
    KEL_UNINITIALIZED const Product second(first << 8, 100);
    copy_bytes<2>(at + 2, pairs.characters[second.upper]);
    KEL_UNINITIALIZED const Product third(second.lower, 100);
    copy_bytes<2>(at + 4, pairs.characters[third.upper]);
    KEL_UNINITIALIZED const Product fourth(third.lower, 100);
    copy_bytes<2>(at + 6, pairs.characters[fourth.upper]);
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

// The upper half of a product, from the four products of halves: nothing wider is needed at 32 bits.
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

inline char* show_halves(char* at, std::uint32_t upper, std::uint32_t lower) {
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

inline char* show_integer(char* at, std::uint64_t n) { return show_halves(at, upper_half(n), lower_half(n)); }

// Every other integer as the smallest of the two above that holds it.
template <class T>
char* show_integer(char* at, T value) {
    if constexpr (std::is_signed_v<T>) {
        *at = '-';
        at += value < 0;
    }
    if constexpr (sizeof(T) <= 4) {
        const std::uint32_t size = static_cast<std::uint32_t>(value);
        return show_integer(at, value < 0 ? 0 - size : size);
    } else {
        // By halves: a 32-bit compiler would have the number in memory while it turns the sign.
        std::uint32_t upper = upper_half(static_cast<std::uint64_t>(value));
        std::uint32_t lower = lower_half(static_cast<std::uint64_t>(value));
        if (value < 0) {
            lower = 0 - lower;
            upper = ~upper + (lower == 0);
        }
        return show_halves(at, upper, lower);
    }
}

}  // namespace internal
}  // namespace kel

#endif
