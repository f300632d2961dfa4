// Every number of the public interface that says how much, how many, how long or which port, at the
// ends of its range.
//
//   AT_BOUNDS    a test whose body runs once for each of the six numbers, which it calls `n`
//   bounded()    the parameters that have such a test
//   refused      whether a call finds no memory and leaves none behind
//
//     AT_BOUNDS(NarrowStrings, HaveRoomForTheirTerminator, "kel/containers/strings.h", "len") {
//         if (n > 1) {
//             EXPECT_TRUE(refused([&] { CORBA::string_alloc(n); }));
//             return;
//         }
//         ...
//     }
//
// Header and parameter are what numbers.inc lists; completeness_test.cpp compares both with the headers.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_BOUNDS_BOUNDS_H
#define KEL_TESTS_FAULTS_BOUNDS_BOUNDS_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <ios>
#include <string>
#include <vector>

#include "tests/support/fault.h"
#include "tests/support/guard_alloc.h"

namespace kel {
namespace test {

const std::uint32_t bounds[] = {0, 1, 0x7fffffff, 0x80000000, 0xfffffffe, 0xffffffff};

// Whether a standard stream takes `n` for a negative count, as it does in a program of 32 bits.
inline bool is_negative_count(std::uint32_t n) { return sizeof(std::streamsize) == sizeof n && n >> 31 != 0; }

// One parameter that is tested at its bounds. Constructing it adds it to bounded().
struct Bounded {
    Bounded(const char* in_header, const char* its_name);

    std::string header;
    std::string name;
};

const std::vector<Bounded>& bounded();

// Runs `body` once for each bound, with the seams reset before and after.
void at_bounds(void (*body)(std::uint32_t n));

// Whether `body` throws std::bad_alloc with as many blocks in use as before.
bool refused(const std::function<void()>& body);

#define AT_BOUNDS(suite, sentence, header, name)                                    \
    static void suite##_##sentence(std::uint32_t n);                                \
    static const ::kel::test::Bounded suite##_##sentence##_parameter(header, name); \
    TEST(suite, sentence) { ::kel::test::at_bounds(&suite##_##sentence); }          \
    static void suite##_##sentence(std::uint32_t n)

}  // namespace test
}  // namespace kel

#endif
