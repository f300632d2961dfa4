// Numbers read off the characters that a string buffer holds, with the digits and signs that programs write.
// Whatever looks different is left to the ordinary way, and so is a number behind which nothing stands yet:
// more of it may come.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_SCAN_H
#define KEL_STREAMS_INTERNAL_SCAN_H

#include <kel/streams/internal/decimals.h>
#include <kel/streams/internal/uninitialized.h>

#include <cstdint>
#include <limits>
#include <type_traits>

namespace kel {
namespace internal {

// A look at some characters, one at a time.
class Scan {
public:
    Scan(const char* begin, const char* end) : _at(begin), _end(end) {}

    const char* at() const { return _at; }
    bool at_end() const { return _at == _end; }
    bool is(char c) const { return _at != _end && *_at == c; }

    void skip_blanks() {
        while (_at != _end && (*_at == ' ' || (*_at >= '\t' && *_at <= '\r'))) ++_at;
    }

    // Goes on to the next character. There is one now.
    void advance() { ++_at; }

    bool accept(char c) {
        if (!is(c)) return false;
        advance();
        return true;
    }

    // The value of the digit that comes next; any other character, and none, gives 10 or more.
    unsigned digit() const { return _at != _end ? static_cast<unsigned>(*_at) - '0' : 10; }

private:
    const char* _at;
    const char* const _end;
};

// Digits whose number fits into 32 bits whatever they are.
struct FewDigits {
    static constexpr int most = 9;

    explicit FewDigits(Scan& scan) {
        for (unsigned digit; count < most && (digit = scan.digit()) < 10; ++count) {
            number = number * 10 + digit;
            scan.advance();
        }
    }

    std::uint32_t number = 0;
    int count = 0;
};

// As many digits as 64 bits hold whatever they are; `whole` tells that no more follow.
struct Digits {
    explicit Digits(Scan& scan) {
        KEL_UNINITIALIZED const FewDigits first(scan);
        number = first.number;
        count = first.count;
        if (count == FewDigits::most) add(scan);
        whole = scan.digit() >= 10;
    }

    // Appends up to as many digits again.
    void add(Scan& scan) {
        static constexpr std::uint32_t powers[] = {1,      10,      100,      1000,      10000,
                                                   100000, 1000000, 10000000, 100000000, 1000000000};
        KEL_UNINITIALIZED const FewDigits more(scan);
        number = number * powers[more.count] + more.number;
        count += more.count;
    }

    std::uint64_t number;
    int count;
    bool whole;
};

// The most that a T may be away from 0 on the one side and on the other.
template <class T>
std::uint64_t largest(bool negative) {
    const std::uint64_t positive = static_cast<std::uint64_t>(std::numeric_limits<T>::max());
    if (!negative) return positive;
    return std::is_signed_v<T> ? positive + 1 : 0;
}

// Each gives the value, or false for a number of the ordinary way. The scan has then gone anywhere.
template <class T>
std::enable_if_t<std::is_integral_v<T>, bool> scan_number(Scan& scan, T& value) {
    const bool negative = std::is_signed_v<T> && scan.accept('-');
    KEL_UNINITIALIZED Digits digits(scan);
    if (!digits.whole) {
        // The nineteenth digit and the twentieth, which fits only at times.
        std::uint64_t number = digits.number;
        for (; scan.digit() < 10; scan.advance()) {
            if (__builtin_mul_overflow(number, 10u, &number)) return false;
            if (__builtin_add_overflow(number, scan.digit(), &number)) return false;
        }
        digits.number = number;
    }
    if (scan.at_end() || digits.count == 0 || digits.number > largest<T>(negative)) return false;
    value = static_cast<T>(negative ? 0 - digits.number : digits.number);
    return true;
}

template <class T>
std::enable_if_t<std::is_floating_point_v<T>, bool> scan_number(Scan& scan, T& value) {
    const bool negative = scan.accept('-');
    KEL_UNINITIALIZED Digits digits(scan);
    int exponent = 0;
    if (digits.count == 0) return false;
    if (scan.accept('.')) {
        const int before = digits.count;
        if (before > FewDigits::most) return false;
        digits.add(scan);
        if (digits.count == before) return false;
        exponent = before - digits.count;
    }
    if (scan.digit() < 10 || scan.is('E')) return false;
    if (scan.accept('e')) {
        const bool down = scan.accept('-');
        if (!down) scan.accept('+');
        KEL_UNINITIALIZED const FewDigits power(scan);
        if (power.count == 0 || power.count > 3) return false;
        exponent += static_cast<int>(down ? 0 - power.number : power.number);
    }
    return !scan.at_end() && decimal_value(negative, digits.number, exponent, value);
}

}  // namespace internal
}  // namespace kel

#endif
