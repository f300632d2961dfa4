// Whether a standard stream is a plain one, on which numbers and quoted strings may be shown and read
// without its facets: nobody can tell, for the text, the states and what reaches the buffer are the same.
//
//   is_plain          good, with the flags, width and locale that streams are born with, and no observer
//   is_over_string    reads or writes a std::stringbuf and nothing derived from it
//
// Only a std::stringbuf is known well enough to be given several pieces as one: no derived class sees the
// calls, nothing but lack of memory stops it, and then it holds every character there was room for.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_PLAIN_H
#define KEL_STREAMS_INTERNAL_PLAIN_H

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

// What the classic locale holds, as soon as a stream was asked for it.
extern const void* known_classic;
bool learn_classic(const std::ios_base& stream);

inline bool has_classic_locale(const std::ios_base& stream) {
    const void* const known = __atomic_load_n(&known_classic, __ATOMIC_RELAXED);
    return held_by(stream._M_getloc()) == known || learn_classic(stream);
}

// Has no tied stream to flush, no flush of its own after each piece (a flag), and throws nothing.
inline bool is_plain(const std::ios& stream) {
    const std::ios_base::fmtflags flags = std::ios_base::skipws | std::ios_base::dec;
    return (stream.rdstate() | stream.exceptions()) == std::ios_base::goodbit && stream.flags() == flags &&
           stream.width() == 0 && stream.tie() == nullptr && has_classic_locale(stream);
}

// Doubles are shown with as many digits as streams are born with.
inline bool has_plain_precision(const std::ios_base& stream) { return stream.precision() == 6; }

inline bool is_over_string(const std::ios& stream) {
    const std::streambuf* const buffer = stream.rdbuf();
    return buffer != nullptr && &typeid(*buffer) == &typeid(std::stringbuf);
}

}  // namespace internal
}  // namespace kel

#endif
