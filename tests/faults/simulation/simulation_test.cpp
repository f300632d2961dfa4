// That the simulation itself notices what it is there to notice.
//
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <csignal>
#include <iostream>
#include <sstream>

#include "tests/faults/simulation/run.h"
#include "tests/support/child.h"

namespace kel {
namespace sim {

namespace {

// The first task of a kind; every kind is among the first hundred seeds.
Task first_task(Job job) {
    std::uint64_t seed = 0;
    while (task_of(seed).job != job) ++seed;
    return task_of(seed);
}

Story foretold(const Task& task) {
    World world;
    Turns turns;
    foretell(task, world, turns);
    return world.story();
}

TEST(Simulation, ClosingADescriptorTwiceEndsTheProcess) {
    const test::Outcome outcome = test::in_child([] {
        const Task task = first_task(Job::connect_socket);
        World world;
        world.begin(task);
        const int fd = world.given();
        world.close(fd);
        world.close(fd);
    });
    EXPECT_EQ(outcome.signal, SIGABRT);
    EXPECT_NE(outcome.out.find("close: seed"), std::string::npos) << outcome.out;
}

TEST(Simulation, UsingAClosedDescriptorEndsTheProcess) {
    const test::Outcome outcome = test::in_child([] {
        const Task task = first_task(Job::listen_on);
        World world;
        world.begin(task);
        const int fd = world.given();
        world.close(fd);
        world.listen(fd, 1);
    });
    EXPECT_EQ(outcome.signal, SIGABRT);
    EXPECT_NE(outcome.out.find("listen: seed"), std::string::npos) << outcome.out;
}

TEST(Simulation, ADescriptorAndAListThatAreLeftAreInTheEnding) {
    const Task task = first_task(Job::connect_host);
    World world;
    world.begin(task);
    world.given();
    for (unsigned name = 0; world.look_up(name, v4_family).code != 0; ++name) {
    }
    world.finish(-1);
    EXPECT_EQ(world.story().ending.open, 1);
    EXPECT_EQ(world.story().ending.lists, 1);
}

TEST(Simulation, TheSameSeedTellsTheSameStory) {
    for (std::uint64_t seed = 0; seed < 500; ++seed) {
        EXPECT_TRUE(foretold(task_of(seed)) == foretold(task_of(seed))) << "seed " << seed;
    }
}

TEST(Simulation, AnotherAnswerOfTheSystemTellsAnotherStory) {
    unsigned different = 0;
    for (std::uint64_t seed = 0; seed < 500; ++seed) {
        const Task task = task_of(seed);
        Task other = task;  // the same call, answered from another seed
        other.seed += machines;
        if (!(foretold(task) == foretold(other))) ++different;
    }
    EXPECT_GT(different, 400u);
}

TEST(Simulation, AnEventLessMakesADifference) {
    Story story = foretold(first_task(Job::connect_socket));
    const Story whole = story;
    ASSERT_FALSE(story.events.empty());
    story.events.pop_back();
    EXPECT_FALSE(story == whole);
}

TEST(Simulation, ASeedIsReplayedWithBothStories) {
    const test::Outcome outcome = test::in_child([] {
        if (!replay(4711)) std::cerr << "different";
    });
    EXPECT_EQ(outcome.err, "");
    EXPECT_NE(outcome.out.find("what should happen, seed 4711"), std::string::npos) << outcome.out;
    EXPECT_NE(outcome.out.find("equal"), std::string::npos);
}

TEST(Simulation, NamesTheDecisionsThatNoSeedReached) {
    Figures figures{};
    std::ostringstream names;
    EXPECT_EQ(figures.turns_missed(&names), static_cast<unsigned>(Turn::count));
    EXPECT_NE(names.str().find("no seed reaches in_use_17_times"), std::string::npos);
}

}  // namespace

}  // namespace sim
}  // namespace kel
