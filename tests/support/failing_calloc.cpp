// calloc of the test executable: the system's own, or the sanitizer's, unless it is to fail.
//
// SPDX-License-Identifier: MIT
#include "tests/support/failing_calloc.h"

#include <cerrno>
#include <cstddef>

#include "tests/support/fault.h"

extern "C" void* __libc_calloc(std::size_t n, std::size_t size);
// Defined where a sanitizer replaces the allocator: what it frees must come from its own calloc.
extern "C" __attribute__((weak)) void* __interceptor_calloc(std::size_t n, std::size_t size);

namespace kel {
namespace test {

namespace {

long failing_call = 0;
long armed_calls = 0;

KEL_TEST_BEFORE_SANITIZER bool calloc_fails() {
    if (!armed()) return false;
    const long n = __atomic_add_fetch(&armed_calls, 1, __ATOMIC_RELAXED);
    return n == __atomic_load_n(&failing_call, __ATOMIC_RELAXED);
}

}  // namespace

FailingCalloc::FailingCalloc(long nth) {
    __atomic_store_n(&armed_calls, 0, __ATOMIC_RELAXED);
    __atomic_store_n(&failing_call, nth, __ATOMIC_RELAXED);
}

FailingCalloc::~FailingCalloc() { __atomic_store_n(&failing_call, 0, __ATOMIC_RELAXED); }

long FailingCalloc::calls() const { return __atomic_load_n(&armed_calls, __ATOMIC_RELAXED); }

}  // namespace test
}  // namespace kel

// The leak sanitizer knows the dynamic linker's own blocks by their caller, which this function must
// not hide.
#ifdef __clang__
#define KEL_TAIL_CALL [[clang::musttail]]
#else
#define KEL_TAIL_CALL
#endif

#define KEL_CALLOC_SYMBOL __attribute__((visibility("default"))) KEL_TEST_BEFORE_SANITIZER

extern "C" KEL_CALLOC_SYMBOL void* kel_seam_calloc(std::size_t n, std::size_t size) __asm__("calloc");
extern "C" void* kel_seam_calloc(std::size_t n, std::size_t size) {
    if (kel::test::calloc_fails()) {
        errno = ENOMEM;
        return nullptr;
    }
    if (__interceptor_calloc != nullptr) KEL_TAIL_CALL return __interceptor_calloc(n, size);
    return __libc_calloc(n, size);
}
