// How far characters go that stand for themselves in a quoted string.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_RUNS_H
#define KEL_STREAMS_INTERNAL_RUNS_H

#include <cstddef>

namespace kel {
namespace internal {

// For its writer: how many of the first of `n` characters are graphic characters of ASCII or blanks, which
// every locale can print, and none of the escaped ones.
std::size_t plain_run(const char* s, std::size_t n);

// For its reader: how many of the first of `n` characters are no quote, backslash or newline.
std::size_t quoted_run(const char* s, std::size_t n);

}  // namespace internal
}  // namespace kel

#endif
