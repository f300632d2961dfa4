// The short way of a single value: on a plain stream over a string it goes straight into the memory of the
// string or comes out of it. These are in line in the streams' operators, where nothing but the digits takes
// longer than a call.
//
//   show_in_memory    writes one value and its separator
//   scan_in_memory    reads one value, alone or with the character behind it
//
// Both return false, and have written and read nothing, where the value has to go another way.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_SHORT_WAY_H
#define KEL_STREAMS_INTERNAL_SHORT_WAY_H

#include <kel/core/internal/attributes.h>
#include <kel/core/internal/digits.h>
#include <kel/streams/internal/areas.h>
#include <kel/streams/internal/decimals.h>
#include <kel/streams/internal/plain.h>
#include <kel/streams/internal/scan.h>
#include <kel/streams/internal/text.h>

namespace kel {
namespace internal {

constexpr std::size_t longest_value = longest_integer;
static_assert(longest_decimal <= longest_value, "both kinds of numbers have room");

// Each gives the end of the text without its separator; null when only the inserter knows it.
template <class T>
char* show(const std::ios_base&, char* at, T value) {
    return show_integer(at, value);
}
inline char* show(const std::ios_base& stream, char* at, const double& value) {
    return has_plain_precision(stream) ? show_decimal(at, value) : nullptr;
}
inline char* show(const std::ios_base&, char* at, char c) {
    *at = c;
    return at + 1;
}

template <class T>
bool show_in_memory(std::ostream& out, const T& value) {
    std::streambuf* const string = plain_string(out);
    if (string == nullptr || WriteArea::room(*string) <= longest_value) return false;
    char* const begin = WriteArea::begin(*string);
    char* const end = show(out, begin, shown(value));
    if (std::is_floating_point_v<T> && end == nullptr) return false;
    *end = ' ';
    WriteArea::fill_few(*string, static_cast<int>(end + 1 - begin));
    return true;
}

template <class T>
bool scan_next(Scan& scan, T& value) {
    return scan_number(scan, value);
}

// Reads what operator>> stores in the low byte, whatever the number.
inline bool scan_next(Scan& scan, unsigned char& value) {
    int number;
    if (!scan_number(scan, number)) return false;
    value = static_cast<unsigned char>(number);
    return true;
}

// A character that nothing follows is left to the ordinary way, as a number is.
inline bool scan_next(Scan& scan, char& c) {
    if (scan.at_end()) return false;
    c = *scan.at();
    scan.advance();
    return !scan.at_end();
}

// A value and `behind` characters after it, one or none, from the string of a plain stream.
template <int behind, class T>
bool scan_in_string(std::istream& in, std::streambuf& string, T& value) {
    const char* const begin = ReadArea::begin(string);
    KEL_UNINITIALIZED Scan scan(begin, ReadArea::end(string));
    scan.skip_blanks();
    if (!scan_next(scan, value)) return false;
    ReadArea::consume(string, scan.at() + behind - begin);
    if (behind > 0) InputCount::set(in, behind);
    return true;
}

// The same of any stream.
template <int behind, class T>
bool scan_in_memory(std::istream& in, T& value) {
    std::streambuf* const string = plain_string(in);
    return string != nullptr && scan_in_string<behind>(in, *string, value);
}

// Reads a value in the shortest way that it has.
template <class T>
void read_value(std::istream& in, T& value) {
    if (!scan_in_memory<0>(in, value)) extract_value(in, value);
}

}  // namespace internal
}  // namespace kel

#endif
