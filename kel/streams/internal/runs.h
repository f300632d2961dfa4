// Copies of the characters that stand for themselves in a quoted string, as far as they go. Both change
// nothing behind what they copy, and return how many that were.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_RUNS_H
#define KEL_STREAMS_INTERNAL_RUNS_H

#include <cstddef>

namespace kel {
namespace internal {

// For its writer: those of the first of `n` characters that are graphic characters of ASCII or blanks, which
// every locale can print, and none of the escaped ones.
std::size_t copy_plain_run(char* to, const char* s, std::size_t n);

// For its reader: those of the first of `n` characters that are no quote, backslash or newline.
std::size_t copy_quoted_run(char* to, const char* s, std::size_t n);

}  // namespace internal
}  // namespace kel

#endif
