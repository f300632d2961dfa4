// Scenes that need a process in which nothing of the library has been used yet.
//
//     const FreshScene first_id("first_id", [] { std::cout << KELUniqueId().value(); });
//     TEST(UniqueId, StartsAtZero) { EXPECT_EQ(first_id.play().out, "0"); }
//
// play() starts this program again; there the scene runs in place of main and the process exits.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_FRESH_H
#define KEL_TESTS_CORE_FRESH_H

#include <cerrno>
#include <cstdlib>
#include <iostream>
#include <new>
#include <string>

#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

// Arms every thread until the process is gone, the exit included.
inline void arm_until_the_end() {
    alignas(ArmedEverywhere) static unsigned char place[sizeof(ArmedEverywhere)];
    new (place) ArmedEverywhere;
}

// Takes an exit inside an initialiser for what it is: the address sanitizer's check of their order
// would see the destructors use objects of units whose turn has not come.
const char* const exit_in_an_initialiser = "ASAN_OPTIONS=check_initialization_order=0";

class FreshScene {
public:
    FreshScene(const char* name, void (*scene)()) : _name(name) {
        const char* const wanted = std::getenv("KEL_FRESH_SCENE");
        if (wanted == nullptr || _name != wanted) return;
        scene();
        std::exit(0);
    }

    // By its name rather than /proc/self/exe, which is the tool when a tool runs the tests.
    Outcome play() const {
        return run_program({program_invocation_name}, {"KEL_FRESH_SCENE=" + _name, exit_in_an_initialiser});
    }

private:
    std::string _name;
};

}  // namespace test
}  // namespace kel

#endif
