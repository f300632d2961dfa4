// What holds its value before any initialiser of the library has run.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <string>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::start;

class BeforeInitialisers : public testing::Test {
protected:
    static void SetUpTestSuite() { _outcome = new Outcome(start({"early"})); }
    static void TearDownTestSuite() { delete _outcome; }

    // Whether the program printed exactly this line.
    static bool says(const std::string& line) {
        return ("\n" + _outcome->out).find("\n" + line + "\n") != std::string::npos;
    }

    static const Outcome* _outcome;
};

const Outcome* BeforeInitialisers::_outcome = nullptr;

TEST_F(BeforeInitialisers, ProgramRuns) {
    EXPECT_EQ(_outcome->exit_code, 0);
    EXPECT_EQ(_outcome->err, "");
}

TEST_F(BeforeInitialisers, InterfaceNameIsEth0) { EXPECT_TRUE(says("ifname eth0")); }
TEST_F(BeforeInitialisers, DebugLevelIsZero) { EXPECT_TRUE(says("debug_level 0")); }
TEST_F(BeforeInitialisers, LibraryIsNotMarkedInitialised) { EXPECT_TRUE(says("inited 0")); }
TEST_F(BeforeInitialisers, NoThreadIsRegistered) { EXPECT_TRUE(says("_first is null 1")); }
TEST_F(BeforeInitialisers, SchedulingIsNotInherited) { EXPECT_TRUE(says("_inheritsched -1")); }
TEST_F(BeforeInitialisers, ThreadFactoryIsTheLibrarysOwn) {
    EXPECT_TRUE(says("_factory is _create_thread 1"));
}
TEST_F(BeforeInitialisers, NoThreadLocalIsRegistered) { EXPECT_TRUE(says("_key_dict is null 1")); }
TEST_F(BeforeInitialisers, FirstFreeSlotIsOne) { EXPECT_TRUE(says("_cnt 1")); }
TEST_F(BeforeInitialisers, SharingIsOn) { EXPECT_TRUE(says("_init_sharing 1")); }
TEST_F(BeforeInitialisers, FirstUniqueIdIsZero) { EXPECT_TRUE(says("_globalId 0")); }

TEST_F(BeforeInitialisers, LookUpFindsNothing) { EXPECT_TRUE(says("registry is empty 1")); }
TEST_F(BeforeInitialisers, DescriptionsAreZero) { EXPECT_TRUE(says("description is zero 1")); }

TEST_F(BeforeInitialisers, ReadingAnExceptionIsRefused) {
    EXPECT_TRUE(says("refused with minor 0x4f4d0004 status 2"));
    EXPECT_TRUE(says("pointer was cleared 1"));
}

}  // namespace
