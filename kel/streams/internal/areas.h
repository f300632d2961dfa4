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

// Both hold until the next call of any other function that reads or writes.

class ReadArea : std::streambuf {
public:
    static const char* begin(const std::streambuf& buffer) { return (buffer.*(&ReadArea::gptr))(); }
    static const char* end(const std::streambuf& buffer) { return (buffer.*(&ReadArea::egptr))(); }
    static void consume(std::streambuf& buffer, std::ptrdiff_t n) {
        for (; n > largest_step; n -= largest_step) (buffer.*(&ReadArea::gbump))(largest_step);
        (buffer.*(&ReadArea::gbump))(static_cast<int>(n));
    }
};

class WriteArea : std::streambuf {
public:
    static char* begin(const std::streambuf& buffer) { return (buffer.*(&WriteArea::pptr))(); }
    static char* end(const std::streambuf& buffer) { return (buffer.*(&WriteArea::epptr))(); }
    static std::size_t room(const std::streambuf& buffer) {
        return static_cast<std::size_t>(end(buffer) - begin(buffer));
    }
    static void fill(std::streambuf& buffer, std::size_t n) {
        for (; n > largest_step; n -= largest_step) fill_few(buffer, largest_step);
        fill_few(buffer, static_cast<int>(n));
    }
    static void fill_few(std::streambuf& buffer, int n) { (buffer.*(&WriteArea::pbump))(n); }
};

// The count of characters that the last unformatted input took.
class InputCount : std::istream {
public:
    static void set(std::istream& in, std::streamsize n) { in.*(&InputCount::_M_gcount) = n; }
};

// Tells the next character as in.peek() does. For a stream over a string with nothing tied to it.
inline int peek(std::istream& in) {
    if (!in.good()) return in.peek();
    const char* const at = ReadArea::begin(*in.rdbuf());
    if (at == ReadArea::end(*in.rdbuf())) return in.peek();
    InputCount::set(in, 0);
    return static_cast<unsigned char>(*at);
}

// Consumes the next character as in.get() does. For a stream over a string that throws nothing.
inline int take(std::istream& in) {
    if (!in.good()) return in.get();
    const char* const at = ReadArea::begin(*in.rdbuf());
    if (at == ReadArea::end(*in.rdbuf())) return in.get();
    const int c = static_cast<unsigned char>(*at);
    ReadArea::consume(*in.rdbuf(), 1);
    InputCount::set(in, 1);
    return c;
}

}  // namespace internal
}  // namespace kel

#endif
