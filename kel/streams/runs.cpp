// SPDX-License-Identifier: MIT
#include <cpuid.h>
#include <emmintrin.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/runs.h>

namespace kel {
namespace internal {

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

constexpr std::size_t block_size = 16;

// Every x86-64 processor compares sixteen characters at once, and every 32-bit one that tells so.
bool compares_blocks() {
#ifdef __x86_64__
    return true;
#else
    static const bool has_sse2 = [] {
        unsigned a, b, c, d;
        return __get_cpuid(1, &a, &b, &c, &d) != 0 && (d & bit_SSE2) != 0;
    }();
    return has_sse2;
#endif
}

#define KEL_BLOCKS __attribute__((target("sse2")))

KEL_BLOCKS __m128i block_at(const char* s) { return _mm_loadu_si128(reinterpret_cast<const __m128i*>(s)); }
KEL_BLOCKS __m128i equal(__m128i block, char c) { return _mm_cmpeq_epi8(block, _mm_set1_epi8(c)); }

// The characters of a block that end a run, as bytes of ones. What follows 'z' is seldom and ends a plain run
// here as well.
KEL_BLOCKS __m128i ends_of_plain_run(__m128i block) {
    const __m128i low = _mm_cmplt_epi8(block, _mm_set1_epi8(' '));  // bytes above 0x7f are negative
    const __m128i high = _mm_cmpgt_epi8(block, _mm_set1_epi8('z'));
    return _mm_or_si128(_mm_or_si128(low, high), _mm_or_si128(equal(block, '"'), equal(block, '\\')));
}

KEL_BLOCKS __m128i ends_of_quoted_run(__m128i block) {
    return _mm_or_si128(_mm_or_si128(equal(block, '"'), equal(block, '\\')), equal(block, '\n'));
}

std::size_t first_of(int places) {
    return static_cast<std::size_t>(__builtin_ctz(static_cast<unsigned>(places)));
}

// The run at the beginning of `n` characters, a block at least, in blocks, and four of them at once as long
// as they are all in it. Long strings take an eighth of the time of single characters.
template <__m128i ends(__m128i)>
KEL_BLOCKS std::size_t run_in_blocks(const char* s, std::size_t n) {
    std::size_t i = 0;
    for (; n - i >= 4 * block_size; i += 4 * block_size) {
        const char* const at = s + i;
        const __m128i first = _mm_or_si128(ends(block_at(at)), ends(block_at(at + block_size)));
        const __m128i last =
            _mm_or_si128(ends(block_at(at + 2 * block_size)), ends(block_at(at + 3 * block_size)));
        if (_mm_movemask_epi8(_mm_or_si128(first, last)) != 0) break;
    }
    for (; n - i >= block_size; i += block_size) {
        const int places = _mm_movemask_epi8(ends(block_at(s + i)));
        if (places != 0) return i + first_of(places);
    }
    if (i == n) return n;
    // The rest lies in a block with characters that are in the run.
    const int places = _mm_movemask_epi8(ends(block_at(s + n - block_size)));
    return places == 0 ? n : n - block_size + first_of(places);
}

// The rest of a run of which the first `i` characters are known.
std::size_t whole_run(const char* s, std::size_t n, std::size_t i, const bool* in_run) {
    while (i < n && in_run[static_cast<unsigned char>(s[i])]) ++i;
    return i;
}

}  // namespace

std::size_t plain_run(const char* s, std::size_t n) {
    const bool by_blocks = n >= block_size && compares_blocks();
    return whole_run(s, n, by_blocks ? run_in_blocks<ends_of_plain_run>(s, n) : 0, characters.in_plain_run);
}

std::size_t quoted_run(const char* s, std::size_t n) {
    const bool by_blocks = n >= block_size && compares_blocks();
    return whole_run(s, n, by_blocks ? run_in_blocks<ends_of_quoted_run>(s, n) : 0, characters.in_quoted_run);
}

}  // namespace internal
}  // namespace kel
