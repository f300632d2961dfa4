// Whether a standard stream is a plain one, on which numbers and quoted strings may be shown and read
// without its facets: nobody can tell, for the text, the states and what reaches the buffer are the same.
//
//   is_plain          good, with the flags, width and locale that streams are born with, and no observer
//   is_over_string    reads or writes a std::stringbuf and nothing derived from it
//   plain_string      the buffer of a stream of which both hold, which then has one; null of any other
//
// Only a std::stringbuf is known well enough to be given several pieces as one: no derived class sees the
// calls, nothing but lack of memory stops it, and then it holds every character there was room for.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_PLAIN_H
#define KEL_STREAMS_INTERNAL_PLAIN_H

#include <cstdint>
#include <cstring>
#include <ios>
#include <locale>
#include <sstream>
#include <typeinfo>

namespace kel {
namespace internal {

// What a locale holds is one pointer, and two that hold the same are equal. Comparing them by operator==
// takes as long as a number's digits do; other ways of being equal only miss the short way. The standard
// library's _M_getloc spares the copy that getloc() counts.
static_assert(sizeof(std::locale) == sizeof(void*), "a locale holds a pointer");
inline const void* held_by(const std::locale& locale) {
    const void* const object = &locale;
    const void* held;
    std::memcpy(&held, object, sizeof held);
    return held;
}

// What the classic locale holds. Null until the library is initialised: no stream is plain before.
extern const void* classic_locale_holds;

inline bool has_classic_locale(const std::ios_base& stream) {
    return held_by(stream._M_getloc()) == __atomic_load_n(&classic_locale_holds, __ATOMIC_RELAXED);
}

// Has no tied stream to flush, no flush of its own after each piece (a flag), and throws nothing. What would
// speak against it is put together before it is looked at: with one question for each, the questions took a
// tenth of the time of a number. A stream that another one was moved into may be good without a buffer.
inline bool is_plain(const std::ios& stream) {
    const std::ios_base::fmtflags born_with = std::ios_base::skipws | std::ios_base::dec;
    const std::uintptr_t unusual = static_cast<std::uintptr_t>(stream.rdstate() | stream.exceptions()) |
                                   static_cast<std::uintptr_t>(stream.flags() ^ born_with) |
                                   static_cast<std::uintptr_t>(stream.width()) |
                                   reinterpret_cast<std::uintptr_t>(stream.tie());
    return unusual == 0 && has_classic_locale(stream) && stream.rdbuf() != nullptr;
}

// Doubles are shown with as many digits as streams are born with.
inline bool has_plain_precision(const std::ios_base& stream) { return stream.precision() == 6; }

// For plain streams, which have a buffer.
inline bool is_over_string(const std::ios& stream) {
    const std::streambuf& buffer = *stream.rdbuf();
    return &typeid(buffer) == &typeid(std::stringbuf);
}

inline std::streambuf* plain_string(const std::ios& stream) {
    return is_plain(stream) && is_over_string(stream) ? stream.rdbuf() : nullptr;
}

}  // namespace internal
}  // namespace kel

#endif
