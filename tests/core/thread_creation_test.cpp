// How threads are created: attributes, their order, and what happens when the system refuses.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/core/thread.h>

#include <csignal>
#include <string>
#include <vector>

#include "tests/core/reports.h"
#include "tests/core/threads.h"

namespace {

using namespace kel::test;
using ::testing::ElementsAre;

using Thread = ThreadFixture;

void* nothing(void*) { return nullptr; }

// Answers pthread_create and notes what it is given.
class ThreadCreation : public Thread {
protected:
    void SetUp() override {
        Thread::SetUp();
        seams::pthread_attr_setstacksize.script([this](pthread_attr_t* a, size_t n) {
            calls.push_back("stack size " + std::to_string(n));
            return stacksize_is_real ? seams::pthread_attr_setstacksize.real(a, n) : 0;
        });
        seams::pthread_attr_init.script([this](pthread_attr_t* a) {
            calls.push_back("init");
            return seams::pthread_attr_init.real(a);
        });
        seams::pthread_attr_setdetachstate.script([this](pthread_attr_t* a, int state) {
            calls.push_back("detach state " + std::to_string(state));
            return seams::pthread_attr_setdetachstate.real(a, state);
        });
        seams::pthread_attr_setinheritsched.script([this](pthread_attr_t* a, int inherit) {
            calls.push_back("inherit " + std::to_string(inherit));
            return seams::pthread_attr_setinheritsched.real(a, inherit);
        });
        seams::pthread_create.script(
            [this](pthread_t*, const pthread_attr_t* a, void* (*start)(void*), void* arg) {
                calls.push_back("create");
                given_start = start;
                given_arg = arg;
                pthread_attr_getstacksize(a, &stacksize);
                pthread_attr_getdetachstate(a, &detach_state);
                pthread_attr_getinheritsched(a, &inheritance);
                return 0;
            });
        seams::pthread_attr_destroy.script([this](pthread_attr_t* a) {
            calls.push_back("destroy");
            return seams::pthread_attr_destroy.real(a);
        });
    }

    void create(unsigned long size, void* arg = nullptr) {
        Armed armed;
        KELThread::_create_thread(size, &nothing, arg);
    }

    std::vector<std::string> calls;
    bool stacksize_is_real = true;
    void* (*given_start)(void*) = nullptr;
    void* given_arg = nullptr;
    std::size_t stacksize = 0;
    int detach_state = -1;
    int inheritance = -1;
};

TEST_F(ThreadCreation, SetsTheDetachStateOnlyByDefault) {
    create(0);
    EXPECT_THAT(calls, ElementsAre("init", "detach state 1", "create", "destroy"));
}

TEST_F(ThreadCreation, SetsTheAttributesInOrder) {
    KELThread::_inheritsched = 1;
    create(262144);
    EXPECT_THAT(calls,
                ElementsAre("init", "stack size 262144", "detach state 1", "inherit 1", "create", "destroy"));
}

TEST_F(ThreadCreation, StackSizeZeroMeansTheSystemsDefault) {
    pthread_attr_t defaults;
    pthread_attr_init(&defaults);
    std::size_t default_size = 0;
    pthread_attr_getstacksize(&defaults, &default_size);
    pthread_attr_destroy(&defaults);
    create(0);
    EXPECT_EQ(stacksize, default_size);
}

TEST_F(ThreadCreation, OtherStackSizesAreSet) {
    create(262144);
    EXPECT_EQ(stacksize, 262144u);
}

TEST_F(ThreadCreation, NegativeStackSizeGoesToTheSystemAsItIs) {
    stacksize_is_real = false;
    Body thread([] {}, -4096);
    Armed armed;
    thread.run();
    EXPECT_EQ(calls.at(1), "stack size " + std::to_string(static_cast<std::size_t>(-4096)));
}

TEST_F(ThreadCreation, ThreadsAreDetached) {
    create(0);
    EXPECT_EQ(detach_state, PTHREAD_CREATE_DETACHED);
}

TEST_F(ThreadCreation, InheritanceZeroIsSet) {
    KELThread::_inheritsched = 0;
    create(0);
    EXPECT_THAT(calls, ElementsAre("init", "detach state 1", "inherit 0", "create", "destroy"));
    EXPECT_EQ(inheritance, 0);
}

TEST_F(ThreadCreation, InheritanceOneIsSet) {
    KELThread::_inheritsched = 1;
    create(0);
    EXPECT_EQ(inheritance, 1);
}

TEST_F(ThreadCreation, PassesStartRoutineAndArgumentOn) {
    create(0, &calls);
    EXPECT_EQ(given_start, &nothing);
    EXPECT_EQ(given_arg, &calls);
}

const char* const create_thread_text =
    "static void KELThread::_create_thread(long unsigned int, void*(*)(void*), void*)";

// Lets `call` fail in _create_thread with a stack size and an inheritance set.
void expect_create_thread_report(SeamBase& call, const std::string& expression) {
    const auto use = [&] {
        KELThread::_inheritsched = 0;
        fail_use(call, EINVAL);
        KELThread::_create_thread(262144, &nothing, nullptr);
    };
    expect_use_failure(use, call.name(), expression, create_thread_text);
}

TEST_F(Thread, FailedAttributesEndTheProcess) {
    expect_create_thread_report(seams::pthread_attr_init, "(rc == 0)");
}

TEST_F(Thread, FailedStackSizeEndsTheProcess) {
    expect_create_thread_report(seams::pthread_attr_setstacksize, "(rc == 0)");
}

TEST_F(Thread, FailedDetachStateEndsTheProcess) {
    expect_create_thread_report(seams::pthread_attr_setdetachstate, "(rc == 0)");
}

TEST_F(Thread, FailedInheritschedEndsTheProcess) {
    expect_create_thread_report(seams::pthread_attr_setinheritsched, "(rc ==0)");
}

TEST_F(Thread, StackSizeBelowTheMinimumAborts) {
    const Outcome seen = in_child([] { Body([] {}, 1).run(); });
    EXPECT_EQ(seen.signal, SIGABRT);
    EXPECT_THAT(seen.err, ::testing::HasSubstr("pthread_attr_setstacksize: "));
}

TEST_F(Thread, FailedCreationThrowsNoResourcesFromRun) {
    expect_no_resources(seams::pthread_create, [] { Body().run(); });
}

TEST_F(Thread, FailedCreationLeavesTheAttributesUndestroyed) {
    fail_creation(seams::pthread_create, EAGAIN, 0, [] { Body().run(); });
    EXPECT_EQ(seams::pthread_attr_init.calls(), 1);
    EXPECT_EQ(seams::pthread_attr_destroy.calls(), 0);
}

TEST_F(Thread, FailedCreationLeavesTheObjectRegisteredAndUsable) {
    Gate done;
    Body thread([&] { done.open(); });
    fail_creation(seams::pthread_create, EAGAIN, 0, [&] { thread.run(); });
    EXPECT_EQ(first(), &thread);
    thread.run();
    done.wait();
}

}  // namespace
