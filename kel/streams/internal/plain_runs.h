// How far the characters of a quoted string go as they are.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_PLAIN_RUNS_H
#define KEL_STREAMS_INTERNAL_PLAIN_RUNS_H

#include <cstddef>

namespace kel {
namespace internal {

// How many of the first of `n` characters are graphic characters of ASCII or blanks, which every locale
// can print, and none of the escaped ones.
std::size_t plain_run(const char* s, std::size_t n);

}  // namespace internal
}  // namespace kel

#endif
