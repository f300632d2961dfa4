// The allocations of operator new.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/memory.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

const char* const Memory::suite = "OperatorNew";
const bool Memory::of_the_c_library = false;

void Memory::fail(long nth, bool from_then_on) { AllocationPlan::fail(nth, from_then_on); }

long Memory::stop() {
    AllocationPlan::fail(0);
    return AllocationPlan::calls();
}

}  // namespace test
}  // namespace kel
