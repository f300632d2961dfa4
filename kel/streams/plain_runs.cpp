// SPDX-License-Identifier: MIT
#include <cpuid.h>
#include <emmintrin.h>
#include <kel/streams/internal/escapes.h>
#include <kel/streams/internal/plain_runs.h>

namespace kel {
namespace internal {

namespace {

struct PlainCharacters {
    constexpr PlainCharacters() : is_plain() {
        for (int c = ' '; c <= '~'; ++c) is_plain[c] = true;
        for (const Escape& escape : escapes) is_plain[static_cast<unsigned char>(escape.byte)] = false;
    }
    bool is_plain[256];
};
constexpr PlainCharacters characters;

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

// The plain run at the beginning of the blocks that `n` characters fill, or a shorter one: what follows
// 'z' is seldom and not told apart here. Long strings take a fourth of the time of single characters.
__attribute__((target("sse2"))) std::size_t plain_run_in_blocks(const char* s, std::size_t n) {
    std::size_t i = 0;
    for (; n - i >= block_size; i += block_size) {
        const __m128i c = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s + i));
        __m128i odd = _mm_cmplt_epi8(c, _mm_set1_epi8(' '));  // bytes above 0x7f are negative
        odd = _mm_or_si128(odd, _mm_cmpgt_epi8(c, _mm_set1_epi8('z')));
        odd = _mm_or_si128(odd, _mm_cmpeq_epi8(c, _mm_set1_epi8('"')));
        odd = _mm_or_si128(odd, _mm_cmpeq_epi8(c, _mm_set1_epi8('\\')));
        const int places = _mm_movemask_epi8(odd);
        if (places != 0) return i + static_cast<std::size_t>(__builtin_ctz(static_cast<unsigned>(places)));
    }
    return i;
}

}  // namespace

std::size_t plain_run(const char* s, std::size_t n) {
    std::size_t i = n >= block_size && compares_blocks() ? plain_run_in_blocks(s, n) : 0;
    while (i < n && characters.is_plain[static_cast<unsigned char>(s[i])]) ++i;
    return i;
}

}  // namespace internal
}  // namespace kel
