// operator new and delete of the test executable: count, and fail by the allocation plan.
// In a file of its own because a sanitizer that defines these operators itself must leave it out.
//
// SPDX-License-Identifier: MIT
#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <cstring>
#include <new>

#include "tests/support/fault.h"

namespace kel {
namespace test {

namespace {

std::atomic<long> plan_calls{0};
std::atomic<long> plan_nth{0};
std::atomic<bool> plan_persistent{false};
std::atomic<long> live{0};

bool allocation_fails() {
    if (!armed()) return false;
    const long n = ++plan_calls;
    const long nth = plan_nth;
    return nth != 0 && (n == nth || (plan_persistent && n > nth));
}

void* allocate(std::size_t n) {
    if (allocation_fails()) return nullptr;
    void* block = std::malloc(n == 0 ? 1 : n);
    if (block == nullptr) return nullptr;
    ++live;
    return std::memset(block, AllocationPlan::fresh_byte, std::min<std::size_t>(n, 4096));
}

void* allocate_or_throw(std::size_t n) {
    void* block = allocate(n);
    if (block == nullptr) throw std::bad_alloc();
    return block;
}

void release(void* block) {
    if (block == nullptr) return;
    --live;
    std::free(block);
}

}  // namespace

void reset_allocation_plan();
void reset_allocation_count();

void reset_allocation_count() { plan_calls = 0; }

void reset_allocation_plan() {
    plan_calls = 0;
    plan_nth = 0;
    plan_persistent = false;
}

void AllocationPlan::fail(long nth, bool from_then_on) {
    plan_nth = nth;
    plan_persistent = from_then_on;
}

long AllocationPlan::calls() { return plan_calls; }
long AllocationPlan::live_blocks() { return live; }

}  // namespace test
}  // namespace kel

void* operator new(std::size_t n) { return kel::test::allocate_or_throw(n); }
void* operator new[](std::size_t n) { return kel::test::allocate_or_throw(n); }
void* operator new(std::size_t n, const std::nothrow_t&) noexcept { return kel::test::allocate(n); }
void* operator new[](std::size_t n, const std::nothrow_t&) noexcept { return kel::test::allocate(n); }
void operator delete(void* p) noexcept { kel::test::release(p); }
void operator delete[](void* p) noexcept { kel::test::release(p); }
void operator delete(void* p, std::size_t) noexcept { kel::test::release(p); }
void operator delete[](void* p, std::size_t) noexcept { kel::test::release(p); }
