// SPDX-License-Identifier: MIT
#include <cpuid.h>
#include <emmintrin.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/runs.h>

namespace kel {
namespace internal {

#ifndef __x86_64__
std::atomic<Sse2> sse2{Sse2::not_asked};
#endif

namespace {

// The characters that end a run, or do not.
struct Characters {
    bool in_plain_run[256];
    bool in_quoted_run[256];
};

constexpr Characters told_apart() {
    Characters all{};
    for (int c = ' '; c <= '~'; ++c) all.in_plain_run[c] = true;
    for (const Escape& escape : escapes) all.in_plain_run[static_cast<unsigned char>(escape.byte)] = false;
    for (bool& in_run : all.in_quoted_run) in_run = true;
    const char ends[] = {'"', '\\', '\n'};
    for (char c : ends) all.in_quoted_run[static_cast<unsigned char>(c)] = false;
    return all;
}
constexpr Characters characters = told_apart();

#ifdef __x86_64__
bool found_to_compare_blocks() { return true; }
#else
[[gnu::cold]] bool found_to_compare_blocks() {
    if (sse2.load(std::memory_order_relaxed) == Sse2::not_asked) {
        unsigned a, b, c, d;
        const bool has_it = __get_cpuid(1, &a, &b, &c, &d) != 0 && (d & bit_SSE2) != 0;
        sse2.store(has_it ? Sse2::present : Sse2::absent, std::memory_order_relaxed);
    }
    return known_to_compare_blocks();
}
#endif

KEL_BLOCKS __m128i block_at(const char* s) { return _mm_loadu_si128(reinterpret_cast<const __m128i*>(s)); }
KEL_BLOCKS __m128i equal(__m128i block, char c) { return _mm_cmpeq_epi8(block, _mm_set1_epi8(c)); }

// The characters of a block that end a run, as bytes of ones.
template <Run>
__m128i ends_of(__m128i block);

// What follows 'z' is seldom and ends a plain run here as well: to tell the braces apart would take a sixth
// of the time of a long string.
template <>
KEL_BLOCKS __m128i ends_of<Run::plain>(__m128i block) {
    const __m128i low = _mm_cmplt_epi8(block, _mm_set1_epi8(' '));  // bytes above 0x7f are negative
    const __m128i high = _mm_cmpgt_epi8(block, _mm_set1_epi8('z'));
    return _mm_or_si128(_mm_or_si128(low, high), _mm_or_si128(equal(block, '"'), equal(block, '\\')));
}

template <>
KEL_BLOCKS __m128i ends_of<Run::quoted>(__m128i block) {
    return _mm_or_si128(_mm_or_si128(equal(block, '"'), equal(block, '\\')), equal(block, '\n'));
}

KEL_BLOCKS void put_block(char* to, __m128i block) {
    _mm_storeu_si128(reinterpret_cast<__m128i*>(to), block);
}

std::size_t first_of(int places) {
    return static_cast<std::size_t>(__builtin_ctz(static_cast<unsigned>(places)));
}

// Copies the rest of a run of which the first `i` characters have been copied, one by one. In line, its loop
// would be set up for where blocks are all there is.
template <Run run>
[[gnu::noinline]] std::size_t copy_rest(char* to, const char* s, std::size_t n, std::size_t i) {
    const bool* const in_run = run == Run::plain ? characters.in_plain_run : characters.in_quoted_run;
    for (; i < n && in_run[static_cast<unsigned char>(s[i])]; ++i) to[i] = s[i];
    return i;
}

// Copies the last block of `n` characters, where those before it have been copied; all of them where they are
// less than a block.
KEL_BLOCKS void copy_last(char* to, const char* s, std::size_t n) {
    if (n >= block_size) {
        put_block(to + n - block_size, block_at(s + n - block_size));
    } else {
        for (std::size_t i = 0; i < n; ++i) to[i] = s[i];
    }
}

}  // namespace

// Copies the run at the beginning of `n` characters, a block at least, in blocks, and four of them at once as
// long as they are all in it. Long strings take an eighth of the time of single characters. The last block
// lies upon others where `n` is no multiple of its size. What ends_of() tells may be in a plain run all the
// same.
template <Run run>
KEL_BLOCKS KEL_ALIGN_STACK std::size_t copy_blocks(char* to, const char* s, std::size_t n) {
    std::size_t i = 0;
    for (; n - i >= 4 * block_size; i += 4 * block_size) {
        const __m128i a = block_at(s + i), b = block_at(s + i + block_size);
        const __m128i c = block_at(s + i + 2 * block_size), d = block_at(s + i + 3 * block_size);
        const __m128i some_end = _mm_or_si128(_mm_or_si128(ends_of<run>(a), ends_of<run>(b)),
                                              _mm_or_si128(ends_of<run>(c), ends_of<run>(d)));
        if (_mm_movemask_epi8(some_end) != 0) break;
        put_block(to + i, a);
        put_block(to + i + block_size, b);
        put_block(to + i + 2 * block_size, c);
        put_block(to + i + 3 * block_size, d);
    }
    for (; i < n; i += block_size) {
        if (n - i < block_size) i = n - block_size;
        const __m128i block = block_at(s + i);
        if (const int places = _mm_movemask_epi8(ends_of<run>(block))) {
            const std::size_t end = i + first_of(places);
            copy_last(to, s, end);
            return run == Run::plain ? copy_rest<run>(to, s, n, end) : end;
        }
        put_block(to + i, block);
    }
    return n;
}

template <Run run>
std::size_t copy_any(char* to, const char* s, std::size_t n) {
    if (n >= block_size && found_to_compare_blocks()) return copy_blocks<run>(to, s, n);
    return copy_rest<run>(to, s, n, 0);
}

#define KEL_COPIED(run)                                                            \
    template std::size_t copy_blocks<run>(char* to, const char* s, std::size_t n); \
    template std::size_t copy_any<run>(char* to, const char* s, std::size_t n)
KEL_COPIED(Run::plain);
KEL_COPIED(Run::quoted);

}  // namespace internal
}  // namespace kel
