// The process-wide settings.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/core/portlib.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <type_traits>

#include "tests/core/fresh.h"

namespace {

class PortLib : public ::testing::Test {
protected:
    void TearDown() override {
        KELPortLibManager::inited = 0;
        KELPortLibManager::debug_level = 0;
        std::strcpy(KELPortLibManager::ifname, "eth0");
    }
};

// The priority puts it before the initialisers of the program's other units.
__attribute__((constructor(101))) void print_initial_values() {
    if (std::getenv("KEL_PRINT_INITIAL_VALUES") == nullptr) return;
    std::printf("%d %d %s", KELPortLibManager::debug_level, KELPortLibManager::inited,
                KELPortLibManager::ifname);
    std::exit(0);
}

TEST_F(PortLib, HoldsItsValuesBeforeAnythingRuns) {
    const auto seen = kel::test::run_program(
        {program_invocation_name}, {"KEL_PRINT_INITIAL_VALUES=1", kel::test::exit_in_an_initialiser});
    EXPECT_EQ(seen.out, "0 0 eth0");
}

TEST_F(PortLib, InitializeSetsInited) {
    KELPortLibManager::initialize();
    EXPECT_EQ(KELPortLibManager::inited, 1);
}

TEST_F(PortLib, InitializeTwiceLeavesInitedAtOne) {
    KELPortLibManager::initialize();
    KELPortLibManager::initialize();
    EXPECT_EQ(KELPortLibManager::inited, 1);
}

TEST_F(PortLib, InitializeChangesNothingElse) {
    KELPortLibManager::debug_level = 3;
    std::strcpy(KELPortLibManager::ifname, "wlan1");
    KELPortLibManager::initialize();
    EXPECT_EQ(KELPortLibManager::debug_level, 3);
    EXPECT_STREQ(KELPortLibManager::ifname, "wlan1");
}

TEST_F(PortLib, DebugLevelIsSigned) {
    KELPortLibManager::debug_level = -1;
    EXPECT_LT(KELPortLibManager::debug_level, 0);
}

TEST_F(PortLib, InterfaceNameHoldsSeventyNineCharacters) {
    const std::string name(79, 'x');
    std::strcpy(KELPortLibManager::ifname, name.c_str());
    EXPECT_EQ(KELPortLibManager::ifname, name);
    EXPECT_EQ(sizeof KELPortLibManager::ifname, 80u);
}

TEST_F(PortLib, HasNoInstances) { EXPECT_FALSE(std::is_default_constructible<KELPortLibManager>::value); }

TEST_F(PortLib, MembersAreThirtyTwoBitIntegers) {
    EXPECT_EQ(sizeof KELPortLibManager::debug_level, 4u);
    EXPECT_EQ(sizeof KELPortLibManager::inited, 4u);
}

}  // namespace
