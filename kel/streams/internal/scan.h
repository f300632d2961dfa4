// Numbers read off the characters that a string buffer holds, with the digits and signs that programs write.
// Whatever looks different is left to the ordinary way, and so is a number behind which nothing stands yet:
// more of it may come.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_SCAN_H
#define KEL_STREAMS_INTERNAL_SCAN_H

#include <kel/core/internal/attributes.h>
#include <kel/streams/internal/decimals.h>

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
    const char* end() const { return _end; }
    bool at_end() const { return _at == _end; }
    bool is(char c) const { return _at != _end && *_at == c; }

    void skip_blanks() {
        for (; _at != _end; ++_at) {
            const unsigned char c = static_cast<unsigned char>(*_at);
            if (c > ' ' || (c != ' ' && (c < '\t' || c > '\r'))) break;
        }
    }

    // Goes on to the next character. There is one now.
    void advance() { ++_at; }

    void go_on_at(const char* at) { _at = at; }

    bool accept(char c) {
        if (!is(c)) return false;
        advance();
        return true;
    }

    // The value of the digit that comes next; any other character, and none, gives 10 or more.
    unsigned digit() const { return _at != _end ? digit_at(0) : 10; }

    // The number of the digits that come next, at most `most` of them; gives how many they are. Where there
    // is room for all of them their steps are laid out in a row: counting and comparing took a third of the
    // time.
    template <int most>
    int read_digits(std::uint32_t& number) {
        std::uint32_t value = 0;
        int n = 0;
        if (_end - _at >= most) {
#pragma GCC unroll 9
            for (; n != most; ++n) {
                const unsigned digit = digit_at(n);
                if (digit >= 10) break;
                value = value * 10 + digit;
            }
        } else {
            const int room = static_cast<int>(_end - _at);
            for (unsigned digit; n != room && (digit = digit_at(n)) < 10; ++n) value = value * 10 + digit;
        }
        _at += n;
        number = value;
        return n;
    }

private:
    unsigned digit_at(int i) const { return static_cast<unsigned>(_at[i]) - '0'; }

    const char* _at;
    const char* const _end;
};

// Digits whose number fits into 32 bits whatever they are.
struct FewDigits {
    static constexpr int most = 9;

    explicit FewDigits(Scan& scan) : count(scan.read_digits<most>(number)) {}

    std::uint32_t number;
    int count;
};

// As many digits as 64 bits hold whatever they are.
struct Digits {
    explicit Digits(Scan& scan) {
        KEL_UNINITIALIZED const FewDigits first(scan);
        number = first.number;
        count = first.count;
        if (count == FewDigits::most) add(scan);
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
};

// The most that a T may be away from 0 on the one side and on the other.
template <class T>
std::uint64_t largest(bool negative) {
    const std::uint64_t positive = static_cast<std::uint64_t>(std::numeric_limits<T>::max());
    if (!negative) return positive;
    return std::is_signed_v<T> ? positive + 1 : 0;
}

// The functions named scan_number and scan_rest give the value, or false for a number of the ordinary way.
// The scan has then gone anywhere.
//
// A number that may be too large, of which `number` has the first digits, as many as always fit: one digit
// more where they are nine. With more still it is too large or begins with zeros.
template <class T>
std::enable_if_t<sizeof(T) <= 4, bool> scan_rest(Scan& scan, bool negative, std::uint32_t number, T& value) {
    if (scan.digit() < 10) {
        if (__builtin_mul_overflow(number, 10u, &number)) return false;
        if (__builtin_add_overflow(number, scan.digit(), &number)) return false;
        scan.advance();
    }
    if (scan.at_end() || scan.digit() < 10 || number > largest<T>(negative)) return false;
    value = static_cast<T>(negative ? 0 - number : number);
    return true;
}

// Where they are eighteen, as many more as 64 bits hold, by a function of its own. It gives the end of the
// number, null for one of the ordinary way, and is handed no scan: one without an address stays in registers.
template <class T>
[[gnu::noinline]] const char* scan_last_digits(const char* at, const char* end, bool negative,
                                               std::uint64_t number, T& value) {
    Scan rest(at, end);
    for (; rest.digit() < 10; rest.advance()) {
        if (__builtin_mul_overflow(number, 10u, &number)) return nullptr;
        if (__builtin_add_overflow(number, rest.digit(), &number)) return nullptr;
    }
    if (rest.at_end() || number > largest<T>(negative)) return nullptr;
    value = static_cast<T>(negative ? 0 - number : number);
    return rest.at();
}

template <class T>
std::enable_if_t<sizeof(T) == 8, bool> scan_rest(Scan& scan, bool negative, std::uint64_t number, T& value) {
    const char* const behind = scan_last_digits(scan.at(), scan.end(), negative, number, value);
    if (behind == nullptr) return false;
    scan.go_on_at(behind);
    return true;
}

template <class T>
std::enable_if_t<std::is_integral_v<T>, bool> scan_number(Scan& scan, T& value) {
    const bool negative = std::is_signed_v<T> && scan.accept('-');
    KEL_UNINITIALIZED const std::conditional_t<sizeof(T) <= 4, FewDigits, Digits> first(scan);
    if (scan.at_end() || first.count == 0) return false;
    // So many digits fit into 32 and into 64 bits.
    if (sizeof(T) < 4 || scan.digit() < 10) return scan_rest(scan, negative, first.number, value);
    value = static_cast<T>(negative ? 0 - first.number : first.number);
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
