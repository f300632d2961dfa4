// The allocations that a sweep makes fail: those of operator new in one program, those of malloc, and so
// the C library's own too, in another.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_MATRIX_MEMORY_H
#define KEL_TESTS_FAULTS_MATRIX_MEMORY_H

namespace kel {
namespace test {

// Defined by each of the two programs.
struct Memory {
    static const char* const suite;
    static const bool of_the_c_library;

    // The `nth` armed allocation from now on fails, or all from it on. Called right before act().
    static void fail(long nth, bool from_then_on);
    // No more do; gives how many there were.
    static long stop();
};

}  // namespace test
}  // namespace kel

#endif
