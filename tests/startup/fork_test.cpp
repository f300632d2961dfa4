// Processes that fork while they use the library, and the programs that they start.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <string>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::start;

TEST(Fork, ProcessWithoutThreadsMayUseTheLibraryOnBothSides) {
    const Outcome o = start({"forks", "alone"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "child\nparent\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.exit_code, 0);
}

// The locks that the threads hold at that moment are held in the child for ever. The new program has
// its own.
TEST(Fork, ChildOfAThreadedProcessMayStartAProgram) {
    const Outcome o = start({"forks", "busy", "100"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "fresh 100\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.signal, 0);
    EXPECT_EQ(o.exit_code, 0);
}

// A server may hand its sockets on; a pipe belongs to one process.
TEST(Fork, StartedProgramHasTheSocketsAndTheLogButNoPipe) {
    const std::string log = testing::TempDir() + "kel-forks-" + std::to_string(::getpid()) + ".log";
    const Outcome o = start({"forks", "descriptors", log}, {"DEBUG_STATIC"});
    std::remove(log.c_str());
    EXPECT_EQ(o.out,
              "read closed\n"
              "write closed\n"
              "return-read closed\n"
              "return-write closed\n"
              "listener open\n"
              "connected open\n"
              "accepted open\n"
              "log open\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.exit_code, 0);
}

}  // namespace
