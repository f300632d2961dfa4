// Quoted strings read from a string buffer by the block instead of by the character.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_QUOTED_BLOCK_H
#define KEL_STREAMS_INTERNAL_QUOTED_BLOCK_H

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

enum class AfterBlock {
    closed,  // the closing quote has been consumed
    open,    // more of the string follows, or the end of the input
    odd      // the next character has to be read by itself
};

// Reads the characters before the next quote, backslash or newline, as far as there is room and input. For
// a stream over a string.
void read_run(std::istream& in, QuotedTarget& to);

// The room from which on a block is faster than a run.
constexpr std::uint32_t smallest_block = 64;

// Reads some of the string behind its opening quote, never more than its room takes. For a scannable
// stream and a room above 0.
AfterBlock read_block(std::istream& in, QuotedTarget& to);

}  // namespace internal
}  // namespace kel

#endif
