// malloc and its family of the test executable: the C library's own, unless one of them is to fail.
//
// SPDX-License-Identifier: MIT
#include "tests/support/failing_malloc.h"

#include <cerrno>
#include <cstddef>

#include "tests/support/fault.h"

extern "C" {
void* __libc_malloc(std::size_t n);
void* __libc_calloc(std::size_t n, std::size_t size);
void* __libc_realloc(void* block, std::size_t n);
void* __libc_memalign(std::size_t alignment, std::size_t n);
void __libc_free(void* block);
}

namespace {

long armed_calls = 0;
long failing_call = 0;
bool fails_from_then_on = false;
long live = 0;

// All plain data and builtins: these functions run before any initialiser.
bool fails() {
    if (!kel::test::armed()) return false;
    const long n = __atomic_add_fetch(&armed_calls, 1, __ATOMIC_RELAXED);
    const long nth = __atomic_load_n(&failing_call, __ATOMIC_RELAXED);
    if (nth == 0 || (n != nth && !(fails_from_then_on && n > nth))) return false;
    errno = ENOMEM;
    return true;
}

void count(int change) { __atomic_add_fetch(&live, change, __ATOMIC_RELAXED); }

void* counted(void* block) {
    if (block != nullptr) count(1);
    return block;
}

}  // namespace

long live_malloc_blocks() { return __atomic_load_n(&live, __ATOMIC_RELAXED); }

namespace kel {
namespace test {

void MallocPlan::fail(long nth, bool from_then_on) {
    __atomic_store_n(&armed_calls, 0, __ATOMIC_RELAXED);
    fails_from_then_on = from_then_on;
    __atomic_store_n(&failing_call, nth, __ATOMIC_RELAXED);
}

long MallocPlan::calls() { return __atomic_load_n(&armed_calls, __ATOMIC_RELAXED); }

}  // namespace test
}  // namespace kel

#define KEL_MALLOC_SYMBOL __attribute__((visibility("default")))

extern "C" KEL_MALLOC_SYMBOL void* kel_seam_malloc(std::size_t n) __asm__("malloc");
extern "C" void* kel_seam_malloc(std::size_t n) { return fails() ? nullptr : counted(__libc_malloc(n)); }

extern "C" KEL_MALLOC_SYMBOL void* kel_seam_calloc(std::size_t n, std::size_t size) __asm__("calloc");
extern "C" void* kel_seam_calloc(std::size_t n, std::size_t size) {
    return fails() ? nullptr : counted(__libc_calloc(n, size));
}

extern "C" KEL_MALLOC_SYMBOL void* kel_seam_realloc(void* block, std::size_t n) __asm__("realloc");
extern "C" void* kel_seam_realloc(void* block, std::size_t n) {
    if (fails()) return nullptr;
    void* const other = __libc_realloc(block, n);
    if (block == nullptr) return counted(other);
    if (other == nullptr && n == 0) count(-1);  // that was a free
    return other;
}

extern "C" KEL_MALLOC_SYMBOL void* kel_seam_aligned_alloc(std::size_t alignment,
                                                          std::size_t n) __asm__("aligned_alloc");
extern "C" void* kel_seam_aligned_alloc(std::size_t alignment, std::size_t n) {
    return fails() ? nullptr : counted(__libc_memalign(alignment, n));
}

extern "C" KEL_MALLOC_SYMBOL void kel_seam_free(void* block) __asm__("free");
extern "C" void kel_seam_free(void* block) {
    if (block != nullptr) count(-1);
    __libc_free(block);
}
