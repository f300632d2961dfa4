// Quoted strings read off the characters that a string buffer holds, instead of one character after the
// other.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_QUOTED_TEXT_H
#define KEL_STREAMS_INTERNAL_QUOTED_TEXT_H

#include <cstdint>
#include <iosfwd>

namespace kel {
namespace internal {

// Where the contents of a quoted string go, and how far its reader has come.
struct QuotedTarget {
    char* buf;
    std::uint32_t room;  // bytes that may still be stored
    std::uint32_t& offset;
};

// Reads as much of the string as the buffer holds and `to` has room for: up to its closing quote, or up to an
// escape that the writer does not make. For a plain stream over a string.
void read_quoted_text(std::istream& in, QuotedTarget& to);

}  // namespace internal
}  // namespace kel

#endif
