// Copies of the characters that stand for themselves in a quoted string, as far as they go.
//
//   copy_plain_run     for its writer
//   copy_quoted_run    for its reader
//
// Both change nothing behind what they copy, and return how many characters that were.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_STREAMS_INTERNAL_RUNS_H
#define KEL_STREAMS_INTERNAL_RUNS_H

#include <kel/config.h>

#include <cstddef>

#ifndef __x86_64__
#include <atomic>
#endif

namespace kel {
namespace internal {

enum class Run { plain, quoted };

constexpr std::size_t block_size = 16;

// Every x86-64 processor compares sixteen characters at once, and every 32-bit one that tells so. It is asked
// when that is not known, apart from the short way of a run.
#ifdef __x86_64__
inline bool known_to_compare_blocks() { return true; }
#else
enum class Sse2 { not_asked, absent, present };

// No static of a function: a look at its guard, in a call, would take as long as a block.
KEL_LOCAL extern std::atomic<Sse2> sse2;

inline bool known_to_compare_blocks() { return sse2.load(std::memory_order_relaxed) == Sse2::present; }
#endif

#define KEL_BLOCKS __attribute__((target("sse2")))

// Blocks that do not fit into registers are kept on the stack, which a 32-bit program may have aligned to
// four bytes only.
#ifdef __i386__
#define KEL_ALIGN_STACK __attribute__((force_align_arg_pointer))
#else
#define KEL_ALIGN_STACK
#endif

// The run at the beginning of `n` characters. The first takes a block of them at least, on a processor that
// is known to compare blocks; the second takes any number, and asks the processor where that is not known.
template <Run run>
KEL_BLOCKS KEL_ALIGN_STACK std::size_t copy_blocks(char* to, const char* s, std::size_t n);
template <Run run>
std::size_t copy_any(char* to, const char* s, std::size_t n);

// In line: a call that did no more than choose would take a thirtieth of the time of a short string.
template <Run run>
std::size_t copy_run(char* to, const char* s, std::size_t n) {
    if (n >= block_size && known_to_compare_blocks()) return copy_blocks<run>(to, s, n);
    return copy_any<run>(to, s, n);
}

// Those of the first of `n` characters that are graphic characters of ASCII or blanks, which
// every locale can print, and none of the escaped ones.
inline std::size_t copy_plain_run(char* to, const char* s, std::size_t n) {
    return copy_run<Run::plain>(to, s, n);
}

// Those of the first of `n` characters that are no quote, backslash or newline.
inline std::size_t copy_quoted_run(char* to, const char* s, std::size_t n) {
    return copy_run<Run::quoted>(to, s, n);
}

}  // namespace internal
}  // namespace kel

#endif
