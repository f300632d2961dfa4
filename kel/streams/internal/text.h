// How single values stand in the text form. Scalar and array operations share these functions, so
// an array is the sequence of its values.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_TEXT_H
#define KEL_STREAMS_INTERNAL_TEXT_H

#include <cstddef>
#include <istream>
#include <ostream>

namespace kel {
namespace internal {

// Ends the process: a text operation was called on a stream that has no standard stream.
[[noreturn]] void no_standard_stream(const char* operations);

// The standard stream behind a text operation. Only a base for other encodings has none, and its
// derived class has then left an operation out; that is a mistake in the program, in every build.
inline std::ostream& text(std::ostream* stream) {
    if (stream == nullptr) no_standard_stream("KELostream");
    return *stream;
}

inline std::istream& text(std::istream* stream) {
    if (stream == nullptr) no_standard_stream("KEListream");
    return *stream;
}

// What is handed to the standard inserter: bytes and wide characters go as numbers, single
// precision as double.
template <class T>
const T& shown(const T& value) {
    return value;
}
inline int shown(unsigned char value) { return value; }
inline int shown(wchar_t value) { return static_cast<int>(value); }
inline double shown(float value) { return value; }

// Writes one value and its separator.
template <class T>
void write_value(std::ostream& out, T value);

// Writes as many of `n` values as have a short way on this stream and fit into the memory of its string, or
// into one block, and returns how many. When there is none, the next one has to be written by itself.
template <class T>
unsigned int show_values(std::ostream& out, const T* values, unsigned int n);

// Writes a number without a separator.
void write_bare(std::ostream& out, unsigned long value);

// Reads as many of `n` values as have a short way on this stream, and returns how many. The next one, if
// there is one to read, is left to the standard extractor, which finds what it would have found.
template <class T>
unsigned int scan_values(std::istream& in, T* values, unsigned int n);

template <class T>
void extract_value(std::istream& in, T& value) {
    in >> value;
}

// Reads a number into a type that the standard extractor would take for a character. It starts as
// the old value, because the extractor leaves its target alone on a stream that has already failed.
template <class T>
void extract_number(std::istream& in, T& value) {
    int number = static_cast<int>(value);
    in >> number;
    value = static_cast<T>(number);
}
inline void extract_value(std::istream& in, unsigned char& value) { extract_number(in, value); }
inline void extract_value(std::istream& in, wchar_t& value) { extract_number(in, value); }

}  // namespace internal
}  // namespace kel

#endif
