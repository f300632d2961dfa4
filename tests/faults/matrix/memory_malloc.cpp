// The allocations of malloc, calloc and realloc.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/memory.h"
#include "tests/support/failing_malloc.h"

namespace kel {
namespace test {

const char* const Memory::suite = "Malloc";
const bool Memory::of_the_c_library = true;

void Memory::fail(long nth, bool from_then_on) { MallocPlan::fail(nth, from_then_on); }

long Memory::stop() {
    const long calls = MallocPlan::calls();
    MallocPlan::fail(0);
    return calls;
}

}  // namespace test
}  // namespace kel
