// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/os/pipe.h>
#include <kel/os/poll.h>
#include <sys/resource.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <type_traits>
#include <vector>

#include "tests/os/thrown.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

using namespace kel::test;
using ::testing::ElementsAre;

namespace {

class Pipe : public FaultTest {
protected:
    static std::vector<int> descriptors(const KELPipe& pipe) {
        return {pipe._read_fd, pipe._write_fd, pipe._return_read_fd, pipe._return_write_fd};
    }
    static bool is_open(int fd) { return fcntl(fd, F_GETFD) != -1; }
};

std::string read_some(KELPipe& pipe, int (KELPipe::*read)(char*, unsigned long)) {
    char buffer[16];
    const int n = (pipe.*read)(buffer, sizeof buffer);
    return n < 0 ? "failed" : std::string(buffer, static_cast<std::size_t>(n));
}

void set_non_blocking(int fd) { fcntl(fd, F_SETFL, O_NONBLOCK); }

}  // namespace

TEST_F(Pipe, BytesWrittenForwardAreReadInOrder) {
    KELPipe pipe;
    EXPECT_EQ(pipe.write("abc", 3), 3);
    EXPECT_EQ(pipe.write("de", 2), 2);
    EXPECT_EQ(read_some(pipe, &KELPipe::read), "abcde");
}

TEST_F(Pipe, BytesWrittenToTheWriterComeBackOnTheReturnChannel) {
    KELPipe pipe;
    EXPECT_EQ(pipe.write_to_writer("xyz", 3), 3);
    EXPECT_EQ(read_some(pipe, &KELPipe::read_from_writer), "xyz");
}

TEST_F(Pipe, TheReturnChannelNeverShowsInTheForwardOne) {
    KELPipe pipe;
    set_non_blocking(pipe._read_fd);
    pipe.write_to_writer("x", 1);
    EXPECT_EQ(read_some(pipe, &KELPipe::read), "failed");
    EXPECT_EQ(errno, EAGAIN);
}

TEST_F(Pipe, TheForwardChannelNeverShowsInTheReturnOne) {
    KELPipe pipe;
    set_non_blocking(pipe._return_read_fd);
    pipe.write("x", 1);
    EXPECT_EQ(read_some(pipe, &KELPipe::read_from_writer), "failed");
    EXPECT_EQ(errno, EAGAIN);
}

TEST_F(Pipe, ItsFieldsAreTheFourDescriptorsInOrder) {
    EXPECT_EQ(sizeof(KELPipe), 16u);
    KELPipe pipe;
    const auto* field = reinterpret_cast<const std::int32_t*>(&pipe);
    EXPECT_EQ(std::vector<int>(field, field + 4), descriptors(pipe));
}

TEST_F(Pipe, AllDescriptorsCloseOnExec) {
    KELPipe pipe;
    for (const int fd : descriptors(pipe)) EXPECT_EQ(fcntl(fd, F_GETFD), FD_CLOEXEC) << fd;
}

TEST_F(Pipe, AllDescriptorsBlock) {
    KELPipe pipe;
    for (const int fd : descriptors(pipe)) EXPECT_EQ(fcntl(fd, F_GETFL) & O_NONBLOCK, 0) << fd;
}

TEST_F(Pipe, EachPipeIsMarkedReadEndFirstBeforeTheNextIsMade) {
    std::vector<std::string> calls;
    int next = 700;
    seams::pipe.script([&](int* ends) {
        ends[0] = next++;
        ends[1] = next++;
        calls.push_back("pipe");
        return 0;
    });
    seams::fcntl64.script([&](int fd, int command, void* argument) {
        EXPECT_EQ(command, F_SETFD);
        EXPECT_EQ(reinterpret_cast<std::intptr_t>(argument), 1);
        calls.push_back(std::to_string(fd));
        return 0;
    });
    seams::close.script([](int) { return 0; });
    {
        Armed armed;
        KELPipe pipe;
    }
    EXPECT_THAT(calls, ElementsAre("pipe", "700", "701", "pipe", "702", "703"));
}

TEST_F(Pipe, AFailedFcntlIsIgnored) {
    seams::fcntl64.fail(1, EBADF, true);
    std::unique_ptr<KELPipe> pipe;
    {
        Armed armed;
        EXPECT_NO_THROW(pipe.reset(new KELPipe));
    }
    EXPECT_EQ(seams::fcntl64.calls(), 4);
    EXPECT_EQ(pipe->write("x", 1), 1);
}

TEST_F(Pipe, DestructionClosesInFieldOrder) {
    std::vector<int> closed;
    seams::close.script([&](int fd) {
        closed.push_back(fd);
        return seams::close.real(fd);
    });
    auto* pipe = new KELPipe;
    const std::vector<int> expected = descriptors(*pipe);
    {
        Armed armed;
        delete pipe;
    }
    EXPECT_EQ(closed, expected);
    for (const int fd : expected) EXPECT_FALSE(is_open(fd));
}

TEST_F(Pipe, AFailedCloseDoesNotStopTheOthers) {
    auto* pipe = new KELPipe;
    const std::vector<int> all = descriptors(*pipe);
    seams::close.fail(1, EIO);
    {
        Armed armed;
        delete pipe;
    }
    EXPECT_EQ(seams::close.calls(), 4);
    close(all[0]);
}

TEST_F(Pipe, AReaderSeesTheEndOnceTheObjectIsGone) {
    auto* pipe = new KELPipe;
    const int reader = dup(pipe->_read_fd);
    delete pipe;
    char c;
    EXPECT_EQ(read(reader, &c, 1), 0);
    close(reader);
}

// Only the calls of the pipe itself fail below: a sanitizer makes pipes of its own when it looks at an
// exception for the first time.

TEST_F(Pipe, WithoutAForwardPipeThrowsNoResourcesAndMakesNothing) {
    seams::pipe.fail(1, EMFILE);
    const auto e = thrown<CORBA_NO_RESOURCES>([] { KELPipe pipe; });
    EXPECT_EQ(e.minor(), 0x4f4d0018u);
    EXPECT_EQ(seams::fcntl64.calls(), 0);
}

TEST_F(Pipe, AFailedReturnPipeLeavesTheForwardPipeOpen) {
    std::vector<int> forward;
    seams::pipe.fail(2, ENFILE);
    seams::pipe.script([&](int* ends) {
        const int rc = seams::pipe.real(ends);
        if (forward.empty()) forward = {ends[0], ends[1]};
        return rc;
    });
    const auto e = thrown<CORBA_NO_RESOURCES>([] { KELPipe pipe; });
    EXPECT_EQ(e.minor(), 0x4f4d0017u);
    EXPECT_EQ(seams::close.calls(), 0);
    ASSERT_EQ(forward.size(), 2u);
    for (const int fd : forward) {
        EXPECT_EQ(fcntl(fd, F_GETFD), FD_CLOEXEC);
        close(fd);
    }
}

TEST_F(Pipe, WithNoDescriptorsLeftThrowsNoResourcesWithEmfile) {
    const Outcome child = in_child([] {
        // A sanitizer needs descriptors when it looks at an exception for the first time.
        EXPECT_EQ(thrown<CORBA_NO_RESOURCES>([] { throw CORBA_NO_RESOURCES(); }).minor(), 0x4f4d0000u);
        const int next = dup(0);
        close(next);
        const rlimit none = {static_cast<rlim_t>(next), static_cast<rlim_t>(next)};
        setrlimit(RLIMIT_NOFILE, &none);
        try {
            KELPipe pipe;
        } catch (const CORBA_NO_RESOURCES& e) {
            _exit(e.minor() == 0x4f4d0018u && e.completed() == CORBA::COMPLETED_NO ? 42 : 1);
        }
        _exit(2);
    });
    EXPECT_EQ(child.exit_code, 42);
}

TEST_F(Pipe, TransfersPassTheirArgumentsToTheSystem) {
    KELPipe pipe;
    std::vector<std::string> calls;
    const char out[] = "out";
    char in[8];
    seams::write.script([&](int fd, const void* buf, std::size_t n) {
        EXPECT_EQ(buf, out);
        calls.push_back("write " + std::to_string(fd) + " " + std::to_string(n));
        return static_cast<ssize_t>(n);
    });
    seams::read.script([&](int fd, void* buf, std::size_t n) {
        EXPECT_EQ(buf, in);
        calls.push_back("read " + std::to_string(fd) + " " + std::to_string(n));
        return static_cast<ssize_t>(n);
    });
    {
        Armed armed;
        pipe.write(out, 1);
        pipe.read(in, 2);
        pipe.write_to_writer(out, 3);
        pipe.read_from_writer(in, 4);
    }
    const std::vector<int> fd = descriptors(pipe);
    EXPECT_THAT(calls,
                ElementsAre("write " + std::to_string(fd[1]) + " 1", "read " + std::to_string(fd[0]) + " 2",
                            "write " + std::to_string(fd[3]) + " 3", "read " + std::to_string(fd[2]) + " 4"));
}

TEST_F(Pipe, AShortTransferIsReturnedAsItIs) {
    KELPipe pipe;
    seams::write.script([](int, const void*, std::size_t) { return ssize_t{2}; });
    seams::read.script([](int, void*, std::size_t) { return ssize_t{1}; });
    char buffer[8];
    Armed armed;
    EXPECT_EQ(pipe.write("abcdef", 6), 2);
    EXPECT_EQ(pipe.write_to_writer("abcdef", 6), 2);
    EXPECT_EQ(pipe.read(buffer, 8), 1);
    EXPECT_EQ(pipe.read_from_writer(buffer, 8), 1);
}

TEST_F(Pipe, AnInterruptedTransferIsNotRepeated) {
    KELPipe pipe;
    seams::write.fail(1, EINTR, true);
    seams::read.fail(1, EINTR, true);
    char buffer[8];
    const auto interrupted = [](int result) { return result == -1 && errno == EINTR; };
    {
        Armed armed;
        EXPECT_TRUE(interrupted(pipe.write("a", 1)));
        EXPECT_TRUE(interrupted(pipe.write_to_writer("a", 1)));
        EXPECT_TRUE(interrupted(pipe.read(buffer, 8)));
        EXPECT_TRUE(interrupted(pipe.read_from_writer(buffer, 8)));
    }
    EXPECT_EQ(seams::write.calls(), 2);
    EXPECT_EQ(seams::read.calls(), 2);
}

TEST_F(Pipe, ItsDescriptorsCanBeWatchedByAPoller) {
    KELPipe pipe;
    const std::unique_ptr<KELPoll> poller(KELPoll::create(1, KELPoll::API_POLL));
    poller->add(pipe._read_fd, KELPoll::evMaskRead, nullptr);
    EXPECT_EQ(poller->waitForEvents(0), 0);
    pipe.write("x", 1);
    EXPECT_EQ(poller->waitForEvents(-1), 1);
}

TEST_F(Pipe, IsNeverCopied) {
    EXPECT_FALSE(std::is_copy_constructible<KELPipe>::value);
    EXPECT_FALSE(std::is_copy_assignable<KELPipe>::value);
    EXPECT_FALSE(std::is_polymorphic<KELPipe>::value);
}
