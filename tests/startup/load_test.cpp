// Opening and closing the library, and libraries that define exceptions.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <string>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::start;

TEST(Load, StartsNoThreadAndTheLibraryStays) {
    const Outcome o = start({"load", KEL_STARTUP_LIBRARY}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "threads 1\nthreads 1\nresident\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Load, TraceIsPrintedWhileTheLibraryIsOpened) {
    const Outcome o = start({"load", KEL_STARTUP_LIBRARY}, {"DEBUG_STATIC=1"});
    EXPECT_EQ(o.out.rfind("threads 1\nStatically initializing class: CORBA::UNKNOWN, ", 0), 0u);
    EXPECT_EQ(o.out.substr(o.out.size() - 20), "\nthreads 1\nresident\n");
}

TEST(Load, ProgramsOfAnOlderKindGoOnWorking) {
    const Outcome o = start({"old_style"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "factories agree\ntexts agree\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Plugin, ExceptionIsRegisteredWhileItsLibraryIsLoaded) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "visit", "1"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "registered\ncaught PluginError\ngone\n");
}

TEST(Plugin, LibraryCanBeLoadedManyTimes) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "visit", "100"}, {"DEBUG_STATIC"});
    std::string expected;
    for (int i = 0; i < 100; ++i) expected += "registered\ncaught PluginError\ngone\n";
    EXPECT_EQ(o.out, expected);
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Plugin, IdOfItsExceptionReadsAsUnknownOnceItIsUnloaded) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "wire"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "read PluginError\nread CORBA::UNKNOWN\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Plugin, HandlersCatchAcrossItsBorderInBothDirections) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "borders"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out,
              "TRANSIENT caught CORBA::TRANSIENT\n"
              "KELStdException caught CORBA::TRANSIENT\n"
              "SystemException caught CORBA::TRANSIENT\n"
              "Exception caught CORBA::TRANSIENT\n"
              "plug-in caught CORBA::MARSHAL\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Plugin, CopyOfASystemExceptionOutlivesThePluginThatThrewIt) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "keep"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "1330446341 2 from the plug-in\n");
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Plugin, DescriptionIsTracedWhenTheProcessTraces) {
    const Outcome o = start({"plugin_host", KEL_STARTUP_PLUGIN, "visit", "1"}, {"DEBUG_STATIC="});
    const std::size_t block = o.out.find("Statically initializing class: PluginError, 0x");
    ASSERT_NE(block, std::string::npos);
    EXPECT_NE(o.out.find("The class has the following base:\nCORBA::UserException, 0x", block),
              std::string::npos);
}

}  // namespace
