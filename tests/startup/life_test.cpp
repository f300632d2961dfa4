// Libraries that come and go, and static objects that use the library before main and after it.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <string>

#include "tests/startup/start.h"

namespace {

using kel::test::Outcome;
using kel::test::round_environment;
using kel::test::start;

// The lines of `o` without the headers of the log, whose time differs.
std::string without_headers(const Outcome& o) {
    std::string rest;
    for (std::size_t at = 0; at < o.out.size();) {
        const std::size_t end = o.out.find('\n', at) + 1;
        if (o.out.compare(at, 3, "=> ") != 0) rest += o.out.substr(at, end - at);
        at = end;
    }
    return rest;
}

void expect_a_whole_life(const Outcome& o) {
    EXPECT_EQ(without_headers(o), "built\nmain\ndestroyed\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.signal, 0);
    EXPECT_EQ(o.exit_code, 0);
}

TEST(StaticObjects, UseTheLibraryWhenLinkedBeforeIt) {
    expect_a_whole_life(start({"client_before"}, {"DEBUG_STATIC"}));
}

TEST(StaticObjects, UseTheLibraryWhenLinkedAfterIt) {
    expect_a_whole_life(start({"client_after"}, {"DEBUG_STATIC"}));
}

// A loose client does not say that it needs the library, so nothing makes the loader initialise the
// library first.
TEST(StaticObjects, OfALooseClientUseTheLibraryWhenLinkedBeforeIt) {
    expect_a_whole_life(start({"loose_before"}, {"DEBUG_STATIC"}));
}

TEST(StaticObjects, OfALooseClientUseTheLibraryWhenLinkedAfterIt) {
    expect_a_whole_life(start({"loose_after"}, {"DEBUG_STATIC"}));
}

TEST(StaticObjects, UseTheLibraryThatTheirOwnBroughtAlong) {
    expect_a_whole_life(start({"host", KEL_STARTUP_CLIENT}, {"DEBUG_STATIC"}));
}

TEST(StaticObjects, UseTheLibraryThatWasOpenedBefore) {
    expect_a_whole_life(start({"host", KEL_STARTUP_LIBRARY, KEL_STARTUP_CLIENT}, {"DEBUG_STATIC"}));
    expect_a_whole_life(start({"host", KEL_STARTUP_LIBRARY, KEL_STARTUP_LOOSE_CLIENT}, {"DEBUG_STATIC"}));
}

TEST(StaticObjects, AreDestroyedWhenTheirLibraryIsClosed) {
    const Outcome o = start({"load", KEL_STARTUP_CLIENT}, {"DEBUG_STATIC"});
    EXPECT_EQ(without_headers(o), "threads 1\nbuilt\nthreads 1\ndestroyed\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.exit_code, 0);
}

// Each time in a process of its own: a library that stays is closed in earnest only once.
TEST(Unload, ThreadsMayBeInsideWhenTheLibraryIsClosed) {
    for (int i = 0; i < 200; ++i) {
        const Outcome o = start({"unload", KEL_STARTUP_LIBRARY, "1"}, round_environment(i));
        ASSERT_EQ(o.err, "") << "round " << i;
        ASSERT_EQ(o.signal, 0) << "round " << i;
        ASSERT_EQ(o.exit_code, 0) << "round " << i;
    }
}

TEST(Unload, LibraryMayBeOpenedAndClosedManyTimes) {
    const Outcome o = start({"unload", KEL_STARTUP_LIBRARY, "200"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.signal, 0);
    EXPECT_EQ(o.exit_code, 0);
}

TEST(Unload, FiveThousandPluginsLeaveNeitherDescriptionsNorMemory) {
    const Outcome o = start({"churn", KEL_STARTUP_PLUGIN, "5000"}, {"DEBUG_STATIC"});
    EXPECT_EQ(o.out, "registered 5000\ngone 5000\nheap +0\n");
    EXPECT_EQ(o.err, "");
    EXPECT_EQ(o.exit_code, 0);
}

}  // namespace
