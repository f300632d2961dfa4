// Times that are waited or converted, and lengths that go to the system as they are.
// SPDX-License-Identifier: MIT
#include <kel/core/condition.h>
#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>
#include <kel/os/base_util.h>
#include <kel/os/pipe.h>
#include <kel/os/portable.h>
#include <netdb.h>
#include <sys/socket.h>

#include <cerrno>
#include <memory>

#include "tests/faults/bounds/bounds.h"
#include "tests/support/child.h"

using namespace kel::test;

namespace {

const char condition_header[] = "kel/core/condition.h";
const char thread_header[] = "kel/core/thread.h";
const char pipe_header[] = "kel/os/pipe.h";
const char portable_header[] = "kel/os/portable.h";

// ---- conditions ----

const unsigned long now = 1000000000;  // seconds, and 700,000 microseconds

// The deadline with which `wait` asks the system, which answers that it has passed.
template <class Wait>
timespec deadline_of(Wait wait) {
    timespec deadline = {};
    seams::gettimeofday.script([](timeval* tv, void*) {
        tv->tv_sec = static_cast<time_t>(now);
        tv->tv_usec = 700000;
        return 0;
    });
    seams::pthread_cond_timedwait.script([&](pthread_cond_t*, pthread_mutex_t*, const timespec* t) {
        deadline = *t;
        return ETIMEDOUT;
    });
    KELMutex mutex;
    KELCondition condition;
    KELMutex_var hold(mutex, 1);
    Armed armed;
    wait(condition, mutex);
    return deadline;
}

// Beyond the system's seconds the sum wraps, into the past.
void expect_seconds(const timespec& deadline, std::uint32_t n) {
    EXPECT_EQ(deadline.tv_sec, static_cast<time_t>(now + n));
    EXPECT_EQ(deadline.tv_nsec, 700000000);
}

void expect_milliseconds(const timespec& deadline, std::uint32_t n) {
    const unsigned microseconds = n % 1000 * 1000 + 700000;
    EXPECT_EQ(deadline.tv_sec, static_cast<time_t>(now + n / 1000 + microseconds / 1000000));
    EXPECT_EQ(deadline.tv_nsec, static_cast<long>(microseconds % 1000000 * 1000));
}

// ---- what goes to the system ----

// The stack sizes that `start` asks for; no thread starts.
template <class Start>
std::vector<std::size_t> stack_sizes(Start start) {
    std::vector<std::size_t> sizes;
    seams::pthread_attr_setstacksize.script([&](pthread_attr_t*, std::size_t size) {
        sizes.push_back(size);
        return 0;
    });
    seams::pthread_create.script(
        [](pthread_t*, const pthread_attr_t*, void* (*)(void*), void*) { return 0; });
    Armed armed;
    start();
    return sizes;
}

// Zero leaves the system its own size.
void expect_stack_size(const std::vector<std::size_t>& sizes, std::size_t size) {
    if (size == 0) {
        EXPECT_TRUE(sizes.empty());
    } else {
        EXPECT_THAT(sizes, testing::ElementsAre(size));
    }
}

class Nothing : public KELThread {
public:
    explicit Nothing(long stacksize) : KELThread(stacksize) {}
    void begin() override {}
};

void* nothing(void*) { return nullptr; }

// The greatest count that one call of the system gives.
const int most_at_once = 0x7ffff000;

// `transfer` is one call of the system with the whole length, and its result.
template <class Buffer, class Transfer>
void expect_one_call(Seam<ssize_t(int, Buffer, std::size_t)>& seam, std::uint32_t n, Transfer transfer) {
    KELPipe pipe;
    char byte = 'x';
    std::size_t asked = ~n;
    seam.script([&](int, Buffer, std::size_t length) {
        asked = length;
        return static_cast<ssize_t>(most_at_once);
    });
    Armed armed;
    EXPECT_EQ(transfer(pipe, &byte), most_at_once);
    EXPECT_EQ(asked, n);
    EXPECT_EQ(seam.calls(), 1);
}

// The system reads as much as there is room for, of three bytes that are there. It is not told of room
// that there is not.
template <class Write, class Read>
void read_with_little_room(std::uint32_t n, Write write, Read read) {
    if (n > 1) return;
    KELPipe pipe;
    EXPECT_EQ(write(pipe), 3);
    const std::unique_ptr<char[]> buffer(new char[n]);
    EXPECT_EQ(read(pipe, buffer.get()), static_cast<int>(n));
    EXPECT_EQ(std::string(buffer.get(), n), std::string("abc", n));
}

}  // namespace

AT_BOUNDS(Condition, AddsSecondsToTheTimeOfDay, condition_header, "seconds") {
    expect_seconds(deadline_of([&](KELCondition& c, KELMutex& m) KEL_NO_THREAD_SAFETY_ANALYSIS {
                       EXPECT_EQ(c.timedwait(m, static_cast<unsigned long>(n)), 1);
                   }),
                   n);
}
AT_BOUNDS(ThrowingCondition, AddsSecondsToTheTimeOfDay, condition_header, "seconds") {
    expect_seconds(deadline_of([&](KELCondition& c, KELMutex& m) KEL_NO_THREAD_SAFETY_ANALYSIS {
                       EXPECT_THROW(c.wait(m, static_cast<unsigned long>(n)), CORBA_TIMEOUT);
                   }),
                   n);
}
AT_BOUNDS(Condition, AddsMillisecondsToTheTimeOfDay, condition_header, "milliseconds") {
    expect_milliseconds(deadline_of([&](KELCondition& c, KELMutex& m) KEL_NO_THREAD_SAFETY_ANALYSIS {
                            EXPECT_EQ(c.timedwait(m, static_cast<unsigned long long>(n)), 1);
                        }),
                        n);
}
AT_BOUNDS(ThrowingCondition, AddsMillisecondsToTheTimeOfDay, condition_header, "milliseconds") {
    expect_milliseconds(deadline_of([&](KELCondition& c, KELMutex& m) KEL_NO_THREAD_SAFETY_ANALYSIS {
                            EXPECT_THROW(c.wait(m, static_cast<unsigned long long>(n)), CORBA_TIMEOUT);
                        }),
                        n);
}

AT_BOUNDS(Thread, HandsItsStackSizeToTheSystem, thread_header, "stacksize") {
    Nothing thread(static_cast<long>(n));
    expect_stack_size(stack_sizes([&] { thread.run(); }), n);
}
AT_BOUNDS(ThreadFactory, HandsItsStackSizeToTheSystem, thread_header, "stacksize") {
    expect_stack_size(stack_sizes([&] { KELThread::_create_thread(n, nothing, nullptr); }), n);
}

TEST(Thread, OfOneByteOfStackEndsTheProcess) {
    const Assertion seen = assertion_of([] { KELThread::_create_thread(1, nothing, nullptr); });
    EXPECT_TRUE(seen.failed);
    EXPECT_EQ(seen.expression, "(rc == 0)");
    EXPECT_EQ(seen.child.err.rfind("pthread_attr_setstacksize", 0), 0u);
}

AT_BOUNDS(Pipe, WritesItsWholeLengthAtOnce, pipe_header, "len") {
    expect_one_call(seams::write, n, [&](KELPipe& p, char* b) { return p.write(b, n); });
}
AT_BOUNDS(ReturnPipe, WritesItsWholeLengthAtOnce, pipe_header, "len") {
    expect_one_call(seams::write, n, [&](KELPipe& p, char* b) { return p.write_to_writer(b, n); });
}
AT_BOUNDS(Pipe, ReadsItsWholeLengthAtOnce, pipe_header, "len") {
    expect_one_call(seams::read, n, [&](KELPipe& p, char* b) { return p.read(b, n); });
    read_with_little_room(
        n, [](KELPipe& p) { return p.write("abc", 3); }, [&](KELPipe& p, char* b) { return p.read(b, n); });
}
AT_BOUNDS(ReturnPipe, ReadsItsWholeLengthAtOnce, pipe_header, "len") {
    expect_one_call(seams::read, n, [&](KELPipe& p, char* b) { return p.read_from_writer(b, n); });
    read_with_little_room(
        n, [](KELPipe& p) { return p.write_to_writer("abc", 3); },
        [&](KELPipe& p, char* b) { return p.read_from_writer(b, n); });
}

AT_BOUNDS(HostByAddress, IsAskedForWithTheLengthAsItIs, "kel/os/base_util.h", "len") {
    socklen_t asked = ~n;
    seams::gethostbyaddr_r.script(
        [&](const void*, socklen_t size, int, hostent*, char*, std::size_t, hostent**, int* error) {
            asked = size;
            *error = HOST_NOT_FOUND;
            return ENOENT;
        });
    vhostname record;
    const std::unique_ptr<char[]> address(new char[4]{127, 0, 0, 1});
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyaddr_r(address.get(), static_cast<int>(n), AF_INET, &record), nullptr);
    EXPECT_EQ(asked, n);
    EXPECT_EQ(record._h_errno, HOST_NOT_FOUND);
}

AT_BOUNDS(Sleep, SplitsItsMilliseconds, portable_header, "ms") {
    timeval asked = {};
    seams::select.script([&](int, fd_set*, fd_set*, fd_set*, timeval* tv) {
        asked = *tv;
        return 0;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::sleep(n), 0);
    EXPECT_EQ(asked.tv_sec, static_cast<time_t>(n / 1000));
    EXPECT_EQ(asked.tv_usec, static_cast<long>(n % 1000 * 1000));
}

AT_BOUNDS(SecondsSleep, HandsItsSecondsToTheSystem, portable_header, "s") {
    unsigned asked = ~n;
    seams::sleep.script([&](unsigned seconds) {
        asked = seconds;
        return 3u;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::vsleep(n), 3u);
    EXPECT_EQ(asked, n);
}

AT_BOUNDS(Milliseconds, SurviveTheWayToATimevalAndBack, portable_header, "ms") {
    timeval tv;
    KELPortable::convert(n, tv);
    EXPECT_EQ(tv.tv_sec, static_cast<time_t>(n / 1000));
    EXPECT_EQ(tv.tv_usec, static_cast<long>(n % 1000 * 1000));
    EXPECT_EQ(KELPortable::convert(tv), n);
}

AT_BOUNDS(Milliseconds, AreComparedByTheirLow32Bits, portable_header, "ms") {
    timeval second = {1, 0};
    EXPECT_EQ(KELPortable::compare_time(second, static_cast<unsigned long long>(n)),
              static_cast<std::int32_t>(1000u - n));
}

AT_BOUNDS(WrappedSelect, HandsItsCountToTheSystemAndKeepsTheTime, portable_header, "nfds") {
    int asked = ~static_cast<int>(n);
    seams::select.script([&](int fds, fd_set*, fd_set*, fd_set*, timeval* tv) {
        asked = fds;
        *tv = {0, 0};
        return 0;
    });
    timeval time = {3, 4};
    Armed armed;
    EXPECT_EQ(wrapped_select(static_cast<int>(n), nullptr, nullptr, nullptr, &time), 0);
    EXPECT_EQ(asked, static_cast<int>(n));
    EXPECT_EQ(time.tv_sec, 3);
    EXPECT_EQ(time.tv_usec, 4);
}
