// The memory of the fuzz targets, and their end when a promise is broken.
//
// SPDX-License-Identifier: MIT
#include <sys/mman.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <new>

#include "fuzz/target.h"

namespace kel {
namespace fuzz {

std::size_t largest_block = most_memory;

void broken(const char* promise, const char* file, int line) {
    std::fprintf(stderr, "%s:%d: broken: %s\n", file, line, promise);
    std::abort();
}

// One page lies in front, so that there is something before the largest block too.
Guarded::Guarded(std::size_t size) {
    const auto page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
    const std::size_t room = page + (size + page - 1) / page * page;
    void* const start =
        mmap(nullptr, room + page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    KEL_REQUIRE(start != MAP_FAILED);
    _end = static_cast<char*>(start) + room;
    KEL_REQUIRE(mprotect(_end, page, PROT_NONE) == 0);
}

namespace {

void* allocate(std::size_t n) {
    if (n > largest_block) return nullptr;
    return std::malloc(n == 0 ? 1 : n);
}

void* allocate_or_throw(std::size_t n) {
    void* const block = allocate(n);
    if (block == nullptr) throw std::bad_alloc();
    return block;
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

void* operator new(std::size_t n) { return kel::fuzz::allocate_or_throw(n); }
void* operator new[](std::size_t n) { return kel::fuzz::allocate_or_throw(n); }
void* operator new(std::size_t n, const std::nothrow_t&) noexcept { return kel::fuzz::allocate(n); }
void* operator new[](std::size_t n, const std::nothrow_t&) noexcept { return kel::fuzz::allocate(n); }
void operator delete(void* p) noexcept { std::free(p); }
void operator delete[](void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t) noexcept { std::free(p); }

// The operators above hide from the sanitizer which form of new a block came from. A small quarantine
// and short call stacks keep a run short; ASAN_OPTIONS=malloc_context_size=30 shows a finding whole. With
// a stack of one call no leak is reported at all.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options() {
    return "alloc_dealloc_mismatch=0:quarantine_size_mb=4:malloc_context_size=4";
}
