// operator new and delete of a test program whose arrays are guarded; see guard_alloc.h.
//
// A guarded block is a page that holds its size, the pages of the array and the page that cannot be
// touched. The array ends with its last page, so it begins in its first one, right behind the size.
//
// SPDX-License-Identifier: MIT
#include "tests/support/guard_alloc.h"

#include <sys/mman.h>
#include <unistd.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <new>

// What the leak sanitizer calls them: it does not look for pointers in mapped memory by itself.
extern "C" __attribute__((weak)) void __lsan_register_root_region(const void* begin, std::size_t size);
extern "C" __attribute__((weak)) void __lsan_unregister_root_region(const void* begin, std::size_t size);

namespace kel {
namespace test {

namespace {

std::atomic<long> live_blocks{0};

const std::size_t page = 4096;
const std::size_t window = 1024 * 1024;  // of the memory behind an aliased room

std::size_t whole_pages(std::size_t n) { return (n + page - 1) / page * page; }

void* map(std::size_t bytes, int protection) {
    void* const found = mmap(nullptr, bytes, protection, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    return found == MAP_FAILED ? nullptr : found;
}

// The first page of the block, which holds the size of the array.
std::size_t* size_of(void* array) {
    const std::uintptr_t first_page = reinterpret_cast<std::uintptr_t>(array) / page * page;
    return reinterpret_cast<std::size_t*>(first_page - page);
}

void* allocate_array(std::size_t n) {
    if (n > GuardedArrays::limit) return nullptr;
    const std::size_t usable = page + whole_pages(n);
    char* const block = static_cast<char*>(map(usable + page, PROT_READ | PROT_WRITE));
    if (block == nullptr) return nullptr;
    if (mprotect(block + usable, page, PROT_NONE) != 0) std::abort();
    *reinterpret_cast<std::size_t*>(block) = n;
    if (__lsan_register_root_region != nullptr) __lsan_register_root_region(block, usable);
    ++live_blocks;
    return block + usable - n;
}

void release_array(void* array) {
    if (array == nullptr) return;
    std::size_t* const block = size_of(array);
    const std::size_t usable = page + whole_pages(*block);
    if (__lsan_unregister_root_region != nullptr) __lsan_unregister_root_region(block, usable);
    --live_blocks;
    munmap(block, usable + page);
}

void* allocate_object(std::size_t n) {
    void* const block = n > GuardedArrays::limit ? nullptr : std::malloc(n == 0 ? 1 : n);
    if (block != nullptr) ++live_blocks;
    return block;
}

void release_object(void* object) {
    if (object == nullptr) return;
    --live_blocks;
    std::free(object);
}

void* or_throw(void* block) {
    if (block == nullptr) throw std::bad_alloc();
    return block;
}

}  // namespace

long GuardedArrays::live() { return live_blocks; }

// Here no allocation fails by plan, but the seams reset plan and count with everything else.
void reset_allocation_plan();
void reset_allocation_count();
void reset_allocation_plan() {}
void reset_allocation_count() {}

void UnmapRoom::operator()(char* room) const {
    munmap(room + bytes - whole_pages(bytes), whole_pages(bytes) + page);
}

// Every window of the room shows the same memory, which lies in a file without a name.
AliasedRoom aliased_room(std::size_t n) {
    const std::size_t usable = whole_pages(n);
    char* const room = static_cast<char*>(map(usable + page, PROT_NONE));
    AliasedRoom owned(room == nullptr ? nullptr : room + usable - n, UnmapRoom{n});
    const int file = memfd_create("room", 0);
    bool mapped = room != nullptr && ftruncate(file, window) == 0;
    for (std::size_t at = 0; at < usable && mapped; at += window) {
        const std::size_t bytes = usable - at < window ? usable - at : window;
        mapped = mmap(room + at, bytes, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_FIXED | MAP_POPULATE, file,
                      0) != MAP_FAILED;
    }
    close(file);
    if (!mapped) owned.reset();
    return owned;
}

}  // namespace test
}  // namespace kel

using namespace kel::test;

void* operator new(std::size_t n) { return or_throw(allocate_object(n)); }
void* operator new(std::size_t n, const std::nothrow_t&) noexcept { return allocate_object(n); }
void operator delete(void* p) noexcept { release_object(p); }
void operator delete(void* p, std::size_t) noexcept { release_object(p); }

void* operator new[](std::size_t n) { return or_throw(allocate_array(n)); }
void* operator new[](std::size_t n, const std::nothrow_t&) noexcept { return allocate_array(n); }
void operator delete[](void* p) noexcept { release_array(p); }
void operator delete[](void* p, std::size_t) noexcept { release_array(p); }
