// The end of a process that still uses the library.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::round_environment;
using kel::test::start;

TEST(Exit, EverythingThatIsSharedWorksAfterTheDestructors) {
    const Outcome o = start({"exit", "late"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out,
              "nothing registered\n"
              "named locks\n"
              "pooled mutexes\n"
              "counters\n"
              "services\n"
              "threads\n"
              "exceptions\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Exit, ThreadsMayBeBusyWhenMainReturns) {
    for (int i = 0; i < 200; ++i) {
        const Outcome o = start({"exit", "threads"}, round_environment(i));
        ASSERT_EQ(o.err, "") << "round " << i;
        ASSERT_EQ(o.signal, 0) << "round " << i;
        ASSERT_EQ(o.exit_code, 0) << "round " << i;
    }
}

}  // namespace
