// The escapes of quoted strings, one list for the writer and the reader.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_ESCAPES_H
#define KEL_STREAMS_INTERNAL_ESCAPES_H

namespace kel {
namespace internal {

struct Escape {
    char byte;
    char letter;  // what follows the backslash
};

// Deliberate: braces travel as brackets, so that a quoted string never contains a raw brace. Pinned by
// StringEscapes.BracesTravelAsBracketEscapes.
constexpr Escape escapes[] = {
    {'\b', 'b'}, {'\t', 't'},  {'\n', 'n'}, {'\f', 'f'}, {'\r', 'r'},
    {'"', '"'},  {'\\', '\\'}, {'{', '['},  {'}', ']'},
};

}  // namespace internal
}  // namespace kel

#endif
