// SPDX-License-Identifier: MIT
#include <kel/streams/internal/decimals.h>
#include <kel/streams/internal/digits.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/scan.h>
#include <kel/streams/internal/text.h>

namespace kel {
namespace internal {

// One function of a value's way from the check to the buffer, without calls to the next step: a call of
// position-independent 32-bit code takes as long as two digits.
#define KEL_FLATTEN __attribute__((flatten))

// ---- writing ----

namespace {

constexpr std::ptrdiff_t longest_value = longest_integer;
static_assert(longest_decimal <= longest_value, "both kinds of numbers have room");

// Each gives the end of the text without its separator; null when only the inserter knows it.
template <class T>
char* show_value(const std::ios_base&, char* at, T value) {
    return show_integer(at, value);
}
char* show_value(const std::ios_base& stream, char* at, double value) {
    return has_plain_precision(stream) ? show_decimal(at, value) : nullptr;
}
char* show_value(const std::ios_base&, char* at, char c) {
    *at = c;
    return at + 1;
}

}  // namespace

void write_to_string(std::ostream& out, const char* text, std::ptrdiff_t n, char last) {
    std::streambuf& to = *out.rdbuf();
    std::ios_base::iostate state = std::ios_base::badbit | std::ios_base::failbit;
    try {
        if (to.sputn(text, n) == n) {
            state = std::ios_base::badbit;
            if (to.sputc(last) != std::char_traits<char>::eof()) return;
        }
    } catch (...) {
        // No memory for the characters: an inserter keeps that to itself as well.
    }
    out.setstate(state);
}

template <class T>
KEL_FLATTEN unsigned int show_values(std::ostream& out, const T* values, unsigned int n) {
    if (!is_plain(out)) return 0;
    const bool over_string = is_over_string(out);
    if (!over_string) {
        if (std::is_same_v<T, char>) return 0;
        n = 1;
    }

    KEL_UNINITIALIZED char block[512];
    const char* const last_start = block + sizeof block - longest_value - 1;
    char* at = block;
    unsigned int count = 0;
    for (; count < n && at <= last_start; ++count) {
        char* const end = show_value(out, at, shown(values[count]));
        if (end == nullptr) break;
        *end = ' ';
        at = end + 1;
    }
    if (count == 0) return 0;
    if (over_string) {
        write_to_string(out, block, at - 1 - block, ' ');
    } else {
        out.write(block, at - 1 - block) << " ";
    }
    return count;
}

#define KEL_SHOWN(T) template unsigned int show_values(std::ostream&, const T*, unsigned int)
KEL_SHOWN(char);
KEL_SHOWN(unsigned char);
KEL_SHOWN(short);
KEL_SHOWN(unsigned short);
KEL_SHOWN(int);
KEL_SHOWN(unsigned int);
KEL_SHOWN(long);
KEL_SHOWN(unsigned long);
KEL_SHOWN(long long);
KEL_SHOWN(unsigned long long);
KEL_SHOWN(wchar_t);
KEL_SHOWN(float);
KEL_SHOWN(double);

void write_bare(std::ostream& out, unsigned long value) {
    if (!is_plain(out)) {
        out << value;
        return;
    }
    char text[longest_integer];
    out.write(text, show_integer(text, value) - text);
}

// ---- reading ----

namespace {

template <class T>
bool scan_next(Scan& scan, T& value) {
    return scan_number(scan, value);
}

// Reads what operator>> stores in the low byte, whatever the number.
bool scan_next(Scan& scan, unsigned char& value) {
    int number;
    if (!scan_number(scan, number)) return false;
    value = static_cast<unsigned char>(number);
    return true;
}

bool scan_next(Scan& scan, char& c) { return scan.take(c); }

}  // namespace

template <class T>
KEL_FLATTEN unsigned int scan_values(std::istream& in, T* values, unsigned int n) {
    if (!is_plain(in) || !is_over_string(in)) return 0;
    Scan scan(*in.rdbuf());
    unsigned int count = 0;
    for (; count < n; ++count) {
        scan.skip_blanks();
        if (!scan_next(scan, values[count])) return count;
    }
    if (scan.at_end()) in.setstate(std::ios_base::eofbit);
    return count;
}

#define KEL_SCANNED(T) template unsigned int scan_values(std::istream&, T*, unsigned int)
KEL_SCANNED(char);
KEL_SCANNED(unsigned char);
KEL_SCANNED(short);
KEL_SCANNED(unsigned short);
KEL_SCANNED(int);
KEL_SCANNED(unsigned int);
KEL_SCANNED(long);
KEL_SCANNED(unsigned long);
KEL_SCANNED(long long);
KEL_SCANNED(unsigned long long);
KEL_SCANNED(wchar_t);
KEL_SCANNED(float);
KEL_SCANNED(double);

}  // namespace internal
}  // namespace kel
