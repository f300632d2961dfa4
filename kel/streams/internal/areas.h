// The characters that a stream over a string holds in memory: those that come next for its reader, and the
// room for those that its writer appends. With them a value is read or written without a call.
//
//   ReadArea     characters to be read; more may come from the buffer when they are used up
//   WriteArea    room to be filled; the buffer makes more when it is used up
//   peek, take   in.peek() and in.get(), for such a stream
//
// A string buffer's own functions use its areas just so. They are protected, which keeps other classes from
// them, but a pointer to a protected member may be formed in a class that derives.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_AREAS_H
#define KEL_STREAMS_INTERNAL_AREAS_H

#include <cstddef>
#include <istream>
#include <limits>
#include <streambuf>

namespace kel {
namespace internal {

constexpr int largest_step = std::numeric_limits<int>::max();  // of a buffer's pointers

// Both hold for a stream with a buffer, until the next call of any other function that reads or writes.

class ReadArea : std::streambuf {
public:
    static const char* begin(const std::ios& stream) { return (stream.rdbuf()->*(&ReadArea::gptr))(); }
    static const char* end(const std::ios& stream) { return (stream.rdbuf()->*(&ReadArea::egptr))(); }
    static void consume(std::ios& stream, std::ptrdiff_t n) {
        for (; n > largest_step; n -= largest_step) (stream.rdbuf()->*(&ReadArea::gbump))(largest_step);
        (stream.rdbuf()->*(&ReadArea::gbump))(static_cast<int>(n));
    }
};

class WriteArea : std::streambuf {
public:
    static char* begin(const std::ios& stream) { return (stream.rdbuf()->*(&WriteArea::pptr))(); }
    static char* end(const std::ios& stream) { return (stream.rdbuf()->*(&WriteArea::epptr))(); }
    static std::size_t room(const std::ios& stream) {
        return static_cast<std::size_t>(end(stream) - begin(stream));
    }
    static void fill(std::ios& stream, std::size_t n) {
        for (; n > largest_step; n -= largest_step) fill_few(stream, largest_step);
        fill_few(stream, static_cast<int>(n));
    }
    static void fill_few(std::ios& stream, int n) { (stream.rdbuf()->*(&WriteArea::pbump))(n); }
};

// The count of characters that the last unformatted input took.
class InputCount : std::istream {
public:
    static void set(std::istream& in, std::streamsize n) { in.*(&InputCount::_M_gcount) = n; }
};

// Tells the next character as in.peek() does. For a stream over a string with nothing tied to it.
inline int peek(std::istream& in) {
    const char* const at = ReadArea::begin(in);
    if (!in.good() || at == ReadArea::end(in)) return in.peek();
    InputCount::set(in, 0);
    return static_cast<unsigned char>(*at);
}

// Consumes the next character as in.get() does. For a stream over a string that throws nothing.
inline int take(std::istream& in) {
    const char* const at = ReadArea::begin(in);
    if (!in.good() || at == ReadArea::end(in)) return in.get();
    const int c = static_cast<unsigned char>(*at);
    ReadArea::consume(in, 1);
    InputCount::set(in, 1);
    return c;
}

}  // namespace internal
}  // namespace kel

#endif
