// SPDX-License-Identifier: MIT
#include <kel/core/internal/attributes.h>
#include <kel/core/internal/digits.h>
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/decimals.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/scan.h>
#include <kel/streams/internal/short_way.h>
#include <kel/streams/internal/text.h>

namespace kel {
namespace internal {

// ---- writing ----

namespace {

// Writes the `n` characters of values and their separators as insertions would, of which the last one writes
// the last separator: when one fails, those behind it are refused, and that sets failbit too.
void write_through_buffer(std::ostream& out, const char* text, std::size_t n) {
    std::streambuf& to = *out.rdbuf();
    const std::streamsize all_but_one = static_cast<std::streamsize>(n - 1);
    std::ios_base::iostate state = std::ios_base::badbit | std::ios_base::failbit;
    try {
        if (to.sputn(text, all_but_one) == all_but_one) {
            state = std::ios_base::badbit;
            if (to.sputc(text[n - 1]) != std::char_traits<char>::eof()) return;
        }
    } catch (...) {
        // No memory for the characters: an inserter keeps that to itself as well.
    }
    out.setstate(state);
}

// Writes to a stream over a string in which there may be too little room.
template <class T>
bool show_and_grow(std::ostream& out, T value) {
    KEL_UNINITIALIZED char text[longest_value + 1];
    char* const end = show(out, text, shown(value));
    if (end == nullptr) return false;
    *end = ' ';
    write_through_buffer(out, text, static_cast<std::size_t>(end + 1 - text));
    return true;
}

// Writes to any other stream, as one piece and one more for the separator.
template <class T>
bool show_as_one_piece(std::ostream& out, T value) {
    KEL_UNINITIALIZED char text[longest_value];
    char* const end = show(out, text, shown(value));
    if (end == nullptr) return false;
    out.write(text, end - text) << " ";
    return true;
}

}  // namespace

template <class T>
void write_value(std::ostream& out, T value) {
    if (is_plain(out)) {
        if (is_over_string(out)) {
            if (show_and_grow(out, value)) return;
        } else if (!std::is_same_v<T, char> && show_as_one_piece(out, value)) {
            return;
        }
    }
    out << shown(value) << " ";
}

namespace {

// Shows values one behind the other from `at` on, up to where one might not fit in front of `end`. Moves `at`
// behind the last one and returns how many there are.
template <class T>
unsigned int show_between(const std::ios_base& stream, char*& at, const char* end, const T* values,
                          unsigned int n) {
    unsigned int count = 0;
    for (; count < n && end - at > static_cast<std::ptrdiff_t>(longest_value); ++count) {
        char* const value_end = show(stream, at, shown(values[count]));
        if (std::is_floating_point_v<T> && value_end == nullptr) break;
        *value_end = ' ';
        at = value_end + 1;
    }
    return count;
}

}  // namespace

// Straight into the memory of the string while there is room in it; what the string has to grow for goes
// through a block.
template <class T>
KEL_FLATTEN unsigned int show_values(std::ostream& out, const T* values, unsigned int n) {
    std::streambuf* const string = plain_string(out);
    if (string == nullptr) return 0;
    char* const begin = WriteArea::begin(*string);
    char* at = begin;
    unsigned int count = show_between(out, at, WriteArea::end(*string), values, n);
    WriteArea::fill(*string, static_cast<std::size_t>(at - begin));
    if (count > 0 || WriteArea::room(*string) > longest_value) return count;

    KEL_UNINITIALIZED char block[512];
    at = block;
    count = show_between(out, at, block + sizeof block, values, n);
    if (count > 0) write_through_buffer(out, block, static_cast<std::size_t>(at - block));
    return count;
}

#define KEL_SHOWN(T) template void write_value(std::ostream&, T)
#define KEL_SHOWN_IN_ARRAYS(T) \
    KEL_SHOWN(T);              \
    template unsigned int show_values(std::ostream&, const T*, unsigned int)
KEL_SHOWN(char);
KEL_SHOWN(unsigned char);
KEL_SHOWN_IN_ARRAYS(short);
KEL_SHOWN_IN_ARRAYS(unsigned short);
KEL_SHOWN_IN_ARRAYS(int);
KEL_SHOWN_IN_ARRAYS(unsigned int);
KEL_SHOWN_IN_ARRAYS(long);
KEL_SHOWN_IN_ARRAYS(unsigned long);
KEL_SHOWN_IN_ARRAYS(long long);
KEL_SHOWN_IN_ARRAYS(unsigned long long);
KEL_SHOWN_IN_ARRAYS(wchar_t);
KEL_SHOWN_IN_ARRAYS(float);
KEL_SHOWN_IN_ARRAYS(double);

KEL_FLATTEN void write_bare(std::ostream& out, unsigned long value) {
    if (!is_plain(out)) {
        out << value;
        return;
    }
    std::streambuf& buffer = *out.rdbuf();
    if (is_over_string(out) && WriteArea::room(buffer) >= longest_integer) {
        char* const begin = WriteArea::begin(buffer);
        WriteArea::fill(buffer, static_cast<std::size_t>(show_integer(begin, value) - begin));
        return;
    }
    KEL_UNINITIALIZED char text[longest_integer];
    out.write(text, show_integer(text, value) - text);
}

// ---- reading ----

template <class T>
KEL_FLATTEN unsigned int scan_values(std::istream& in, T* values, unsigned int n) {
    std::streambuf* const string = plain_string(in);
    if (string == nullptr) return 0;
    const char* const begin = ReadArea::begin(*string);
    KEL_UNINITIALIZED Scan scan(begin, ReadArea::end(*string));
    const char* taken = begin;
    unsigned int count = 0;
    for (; count < n; ++count) {
        scan.skip_blanks();
        if (!scan_next(scan, values[count])) break;
        taken = scan.at();
    }
    ReadArea::consume(*string, taken - begin);
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
