// Numbers read off a string buffer character by character, with the digits and signs that programs write.
// Whatever looks different is left in the buffer as it was found, for the ordinary way.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_SCAN_H
#define KEL_STREAMS_INTERNAL_SCAN_H

#include <kel/streams/internal/decimals.h>

#include <cstdint>
#include <limits>
#include <streambuf>
#include <type_traits>

namespace kel {
namespace internal {

// A look at the characters of a string buffer, one at a time, that can be undone.
class Scan {
public:
    explicit Scan(std::streambuf& from) : _from(from), _c(from.sgetc()) {}

    // White space is gone for good: the ordinary way skips it as well.
    void skip_blanks() {
        _consumed = 0;
        while (_c == ' ' || (_c >= '\t' && _c <= '\r')) _c = _from.snextc();
    }

    bool at_end() const { return is(std::char_traits<char>::eof()); }
    bool is(int c) const { return _c == c; }

    // Consumes one character, whatever it is, and does not look at the next one.
    bool take(char& c) {
        if (at_end()) return false;
        c = static_cast<char>(_from.sbumpc());
        return true;
    }

    // Consumes the character `c` if it comes next.
    bool accept(char c) {
        if (!is(c)) return false;
        advance();
        return true;
    }

    // The value of the digit that comes next; any other character gives 10 or more.
    unsigned digit() const { return static_cast<unsigned>(_c) - '0'; }

    void advance() {
        _c = _from.snextc();
        ++_consumed;
    }

    // Puts back what was consumed behind the blanks. Gives false, for the caller to hand on.
    bool undo() {
        for (; _consumed > 0; --_consumed) _from.sungetc();
        return false;
    }

private:
    std::streambuf& _from;
    int _c;
    int _consumed = 0;
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
        const FewDigits first(scan);
        number = first.number;
        count = first.count;
        if (count == FewDigits::most) add(scan);
        whole = scan.digit() >= 10;
    }

    // Appends up to as many digits again.
    void add(Scan& scan) {
        static constexpr std::uint32_t powers[] = {1,      10,      100,      1000,      10000,
                                                   100000, 1000000, 10000000, 100000000, 1000000000};
        const FewDigits more(scan);
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

template <class T>
std::enable_if_t<std::is_integral_v<T>, bool> scan_number(Scan& scan, T& value) {
    const bool negative = std::is_signed_v<T> && scan.accept('-');
    Digits digits(scan);
    if (!digits.whole) {
        // The nineteenth digit and the twentieth, which fits only at times.
        std::uint64_t number = digits.number;
        for (; scan.digit() < 10; scan.advance()) {
            if (__builtin_mul_overflow(number, 10u, &number)) return scan.undo();
            if (__builtin_add_overflow(number, scan.digit(), &number)) return scan.undo();
        }
        digits.number = number;
    }
    if (digits.count == 0 || digits.number > largest<T>(negative)) return scan.undo();
    value = static_cast<T>(negative ? 0 - digits.number : digits.number);
    return true;
}

template <class T>
std::enable_if_t<std::is_floating_point_v<T>, bool> scan_number(Scan& scan, T& value) {
    const bool negative = scan.accept('-');
    Digits digits(scan);
    int exponent = 0;
    if (digits.count == 0) return scan.undo();
    if (scan.accept('.')) {
        const int before = digits.count;
        if (before > FewDigits::most) return scan.undo();
        digits.add(scan);
        if (digits.count == before) return scan.undo();
        exponent = before - digits.count;
    }
    if (scan.digit() < 10 || scan.is('E')) return scan.undo();
    if (scan.accept('e')) {
        const bool down = scan.accept('-');
        if (!down) scan.accept('+');
        const FewDigits power(scan);
        if (power.count == 0 || power.count > 3) return scan.undo();
        exponent += static_cast<int>(down ? 0 - power.number : power.number);
    }
    T result;
    if (!decimal_value(digits.number, exponent, result)) return scan.undo();
    value = negative ? -result : result;
    return true;
}

}  // namespace internal
}  // namespace kel

#endif
