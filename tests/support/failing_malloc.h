// Makes malloc, calloc and realloc fail, also where the C library itself calls them.
//
//   MallocPlan           which armed call of the three finds no memory
//   live_malloc_blocks   blocks that are in use in the whole process
//
//     MallocPlan::fail(2);
//     { Armed armed; EXPECT_EQ(std::fopen(path, "r"), nullptr); }
//     EXPECT_EQ(MallocPlan::calls(), 2);
//
// In a program of its own that leaves failing_calloc.cpp out; not where a sanitizer brings an allocator.
// operator new fails by this plan too, as it calls malloc.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_FAILING_MALLOC_H
#define KEL_TESTS_SUPPORT_FAILING_MALLOC_H

namespace kel {
namespace test {

struct MallocPlan {
    // The `nth` armed call from now on fails; with `from_then_on` all later ones too. 0 fails none.
    static void fail(long nth, bool from_then_on = false);
    static long calls();  // armed calls since the plan was made
};

}  // namespace test
}  // namespace kel

long live_malloc_blocks();

#endif
