// What the tests of both pollers share: the six waits as a list, and a pipe to wait for.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_POLL_FORMS_H
#define KEL_TESTS_OS_POLL_FORMS_H

#include <gtest/gtest.h>
#include <kel/os/poll.h>
#include <unistd.h>

#include <memory>
#include <vector>

namespace kel {
namespace test {

const short read_and_write = KELPoll::evMaskRead | KELPoll::evMaskWrite;

inline std::unique_ptr<KELPoll> make(int capacity, KELPoll::SupportedAPIs api) {
    return std::unique_ptr<KELPoll>(KELPoll::create(capacity, api));
}

inline std::vector<int> descriptors(const KELPoll& poller) {
    std::vector<int> found;
    for (int i = 0; i < poller.count(); ++i) found.push_back(poller.descriptor(i));
    return found;
}

// A pipe of the system, closed at the end of the scope.
struct Channel {
    Channel() { EXPECT_EQ(pipe(ends), 0); }
    ~Channel() {
        close(ends[0]);
        close(ends[1]);
    }
    void fill() { EXPECT_EQ(write(ends[1], "x", 1), 1); }
    int reader() const { return ends[0]; }
    int writer() const { return ends[1]; }

    int ends[2];
};

// The six waits with the same limit of `ms`, so that one test goes through all of them.
struct Form {
    const char* name;
    int (*wait)(KELPoll&, int ms);
    bool reports;
};

inline timeval to_timeval(int ms) {
    timeval tv;
    tv.tv_sec = ms / 1000;
    tv.tv_usec = ms % 1000 * 1000;
    return tv;
}

template <int (KELPoll::*Wait)(timeval*)>
int by_timeval(KELPoll& poller, int ms) {
    timeval tv = to_timeval(ms);
    return (poller.*Wait)(ms < 0 ? nullptr : &tv);
}

template <int (KELPoll::*Wait)(int)>
int by_number(KELPoll& poller, int ms) {
    return (poller.*Wait)(ms);
}

template <int (KELPoll::*Wait)(const KELPoll::TimeVal&)>
int by_prepared(KELPoll& poller, int ms) {
    KELPoll::TimeVal time;
    time.set(ms);
    return (poller.*Wait)(time);
}

const Form wait_forms[] = {
    {"_waitForEvents(timeval*)", by_timeval<&KELPoll::_waitForEvents>, false},
    {"waitForEvents(timeval*)", by_timeval<&KELPoll::waitForEvents>, true},
    {"_waitForEvents(int)", by_number<&KELPoll::_waitForEvents>, false},
    {"waitForEvents(int)", by_number<&KELPoll::waitForEvents>, true},
    {"_waitForEvents(TimeVal)", by_prepared<&KELPoll::_waitForEvents>, false},
    {"waitForEvents(TimeVal)", by_prepared<&KELPoll::waitForEvents>, true},
};

}  // namespace test
}  // namespace kel

#endif
