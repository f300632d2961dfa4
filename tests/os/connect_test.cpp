// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/os/poll.h>
#include <kel/os/portable.h>
#include <netinet/in.h>
#include <sys/mman.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "tests/os/fake_net.h"
#include "tests/os/loopback.h"

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

namespace {

class Connect : public FakeNetTest {
protected:
    void TearDown() override {
        KELPoll::defaultAPI(KELPoll::API_POLL);
        FakeNetTest::TearDown();
    }

    // Connects a new socket to `address`, e.g. "10.1.1.1:80", and leaves the outcome in fd and err.
    void connect(const std::string& address, unsigned long long timeout) {
        SocketAddress to = socket_address(address);
        fd = net.open_socket(to.any.sa_family);
        err = -1;
        Armed armed;
        KELPortable::tcpConnect(fd, err, &to.any, static_cast<int>(to.size()), timeout);
    }

    // A socket that stays open counts as connected and belongs to the test.
    void expect_connected() {
        EXPECT_EQ(err, 0);
        EXPECT_EQ(fd, 500);
        net.forget(500);
    }

    void expect_failed(int error) {
        EXPECT_EQ(err, error);
        EXPECT_EQ(fd, -1);
        EXPECT_THAT(net.log("close"), ElementsAre("500"));
    }

    void expect_timeout(const std::string& address, unsigned long long timeout) {
        const auto e = thrown<CORBA_TIMEOUT>([&] { connect(address, timeout); });
        EXPECT_EQ(e.minor(), 0x4b450001u);
        expect_failed(0);
    }

    int fd = -1;
    int err = -1;
};

}  // namespace

TEST_F(Connect, PassesTheAddressOn) {
    connect("10.1.1.1:80", 0);
    expect_connected();
    EXPECT_THAT(net.log("connect"), ElementsAre("500 10.1.1.1:80"));
}

TEST_F(Connect, PassesAnIPv6AddressOn) {
    connect("[2001:db8::1]:80", 0);
    expect_connected();
    EXPECT_THAT(net.log("connect"), ElementsAre("500 [2001:db8::1]:80"));
}

TEST_F(Connect, WithoutATimeOutTheFlagsAreNotTouched) {
    connect("10.1.1.1:80", 0);
    EXPECT_EQ(net.flags(fd), O_RDWR);
    expect_connected();
    EXPECT_THAT(net.log("fcntl"), IsEmpty());
}

TEST_F(Connect, WithATimeOutTheSocketStaysNonBlocking) {
    connect("10.1.1.1:80", 2000);
    EXPECT_EQ(net.flags(fd), O_RDWR | O_NONBLOCK);
    expect_connected();
    EXPECT_THAT(net.log("fcntl"), ElementsAre("500 F_GETFL", "500 4 0x802"));
}

TEST_F(Connect, TheFlagIsSetBeforeTheConnect) {
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.order({"fcntl", "connect", "getsockname"}),
                ElementsAre("fcntl", "fcntl", "connect", "getsockname"));
}

TEST_F(Connect, FailuresOfFcntlAreIgnored) {
    net.fcntls = {EBADF};
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("fcntl"), ElementsAre("500 F_GETFL"));  // unknown flags are not written back
}

TEST_F(Connect, AConnectThatSucceedsAtOnceDoesNotWait) {
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("poll"), IsEmpty());
    EXPECT_THAT(net.log("getsockopt"), IsEmpty());
}

TEST_F(Connect, AFailedConnectClosesTheSocketAndReportsTheError) {
    net.connects = {EHOSTUNREACH};
    connect("10.1.1.1:80", 0);
    expect_failed(EHOSTUNREACH);
    EXPECT_THAT(net.log("getsockname"), IsEmpty());
}

TEST_F(Connect, TheErrorIsThatOfTheConnectAndNotOfTheClose) {
    net.connects = {ENETUNREACH};
    net.errno_after_close = EIO;
    connect("10.1.1.1:80", 0);
    expect_failed(ENETUNREACH);
}

TEST_F(Connect, AnInterruptedConnectIsAFailure) {
    net.connects = {EINTR};
    connect("10.1.1.1:80", 2000);
    expect_failed(EINTR);
    EXPECT_THAT(net.log("connect"), SizeIs(1));
}

TEST_F(Connect, APendingConnectWaitsUntilTheSocketIsWritable) {
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("poll"), ElementsAre("500 0x100 2000"));
}

TEST_F(Connect, EagainIsAPendingConnectToo) {
    net.connects = {EAGAIN};
    net.waits = {{1, 0}};
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("poll"), ElementsAre("500 0x100 2000"));
}

TEST_F(Connect, TheWaitUsesTheDefaultApi) {
    KELPoll::defaultAPI(KELPoll::API_SELECT);
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    connect("10.1.1.1:80", 2500);
    expect_connected();
    EXPECT_THAT(net.log("select"), ElementsAre("500 2.500000"));
    EXPECT_THAT(net.log("poll"), IsEmpty());
}

TEST_F(Connect, AnInterruptedWaitStartsAgainInFull) {
    net.connects = {EINPROGRESS};
    net.waits = {{-1, EINTR}, {-1, EINTR}, {1, 0}};
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("poll"), ElementsAre("500 0x100 2000", "500 0x100 2000", "500 0x100 2000"));
}

TEST_F(Connect, WhenTheTimeIsOverThrowsTimeoutAndClosesTheSocket) {
    net.connects = {EINPROGRESS};
    net.waits = {{0, 0}};
    expect_timeout("10.1.1.1:80", 2000);
    EXPECT_EQ(net.now_ms, 2000);
}

TEST_F(Connect, WhenTheTimeIsOverThePollerIsDestroyed) {
    // Answers that allocate nothing themselves.
    seams::connect.script([](int, const sockaddr*, socklen_t) { return errno = EINPROGRESS, -1; });
    seams::poll.script([](pollfd*, nfds_t, int) { return 0; });
    seams::close.script([](int) { return 0; });
    SocketAddress to = socket_address("10.1.1.1:80");
    int socket = 500;
    const long before = AllocationPlan::live_blocks();
    try {
        Armed armed;
        KELPortable::tcpConnect(socket, err, &to.any, static_cast<int>(to.size()), 0);
        ADD_FAILURE() << "threw nothing";
    } catch (const CORBA_TIMEOUT&) {
        EXPECT_GT(AllocationPlan::calls(), 0);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(Connect, ReadsTheErrorOfThePendingConnectFromTheSocket) {
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    net.so_error = EHOSTUNREACH;
    connect("10.1.1.1:80", 2000);
    expect_failed(EHOSTUNREACH);
    EXPECT_THAT(net.log("getsockopt"), ElementsAre("500 1 4 4"));  // SOL_SOCKET, SO_ERROR
}

TEST_F(Connect, AnUnreadableErrorOfThePendingConnectCountsAsRefused) {
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    net.getsockopts = {ENOBUFS};
    connect("10.1.1.1:80", 2000);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, AFailedWaitReportsItsError) {
    net.connects = {EINPROGRESS};
    net.waits = {{-1, ENOMEM}};
    connect("10.1.1.1:80", 2000);
    expect_failed(ENOMEM);
    EXPECT_THAT(net.log("getsockopt"), IsEmpty());
}

TEST_F(Connect, APollResultAboveOneCountsAsConnected) {
    net.connects = {EINPROGRESS};
    net.waits = {{2, 0}};
    net.so_error = ECONNREFUSED;
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("getsockopt"), IsEmpty());
}

TEST_F(Connect, APollResultBelowMinusOneCountsAsConnected) {
    net.connects = {EINPROGRESS};
    net.waits = {{-2, EBADF}};
    connect("10.1.1.1:80", 2000);
    expect_connected();
}

TEST_F(Connect, APollResultBelowMinusOneIsRepeatedWhenInterrupted) {
    net.connects = {EINPROGRESS};
    net.waits = {{-2, EINTR}, {1, 0}};
    connect("10.1.1.1:80", 2000);
    expect_connected();
    EXPECT_THAT(net.log("poll"), SizeIs(2));
}

TEST_F(Connect, APendingConnectWithoutATimeOutTimesOutAtOnce) {
    net.connects = {EINPROGRESS};
    net.waits = {{0, 0}};
    expect_timeout("10.1.1.1:80", 0);
    EXPECT_THAT(net.log("poll"), ElementsAre("500 0x100 0"));
    EXPECT_THAT(net.log("fcntl"), IsEmpty());
}

TEST_F(Connect, TheTimeOutIsItsLowThirtyTwoBits) {
    net.connects = {EINPROGRESS};
    for (const unsigned long long timeout : {0x100000000ull, 0x1000007d0ull, 0x80000000ull, 0xffffffffull}) {
        net.waits.push_back({1, 0});
        connect("10.1.1.1:80", timeout);
        EXPECT_EQ(net.flags(fd), O_RDWR | O_NONBLOCK);
        net.forget(fd);
    }
    EXPECT_THAT(net.log("poll"),
                ElementsAre("500 0x100 0", "501 0x100 2000", "502 0x100 -2147483648", "503 0x100 -1"));
}

TEST_F(Connect, WithSelectANegativeTimeOutIsPassedAsItIs) {
    KELPoll::defaultAPI(KELPoll::API_SELECT);
    net.connects = {EINPROGRESS};
    net.waits = {{-1, EINVAL}};
    connect("10.1.1.1:80", 0x80000000ull);
    expect_failed(EINVAL);
    EXPECT_THAT(net.log("select"), ElementsAre("500 -2147483.-648000"));
}

TEST_F(Connect, WithoutMemoryForThePollerTheCallerKeepsTheSocket) {
    net.connects = {EINPROGRESS};
    AllocationPlan::fail(1);
    EXPECT_THROW(connect("10.1.1.1:80", 2000), std::bad_alloc);
    EXPECT_EQ(fd, 500);
    EXPECT_TRUE(net.is_open(500));
    net.forget(500);
}

TEST_F(Connect, ASocketThatMetItselfCountsAsRefused) {
    net.local_address = "10.1.1.1:80";
    connect("10.1.1.1:80", 0);
    expect_failed(ECONNREFUSED);
    EXPECT_THAT(net.log("getsockname"), ElementsAre("500 28"));
}

TEST_F(Connect, AnIPv6SocketThatMetItselfCountsAsRefused) {
    net.local_address = "[2001:db8::1]:80";
    connect("[2001:db8::1]:80", 0);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, ASocketThatMetItselfIsRecognisedByAddressAndPortAlone) {
    net.local_address = "10.1.1.1:80";
    SocketAddress to = socket_address("10.1.1.1:80");
    fd = net.open_socket();
    seams::connect.script([](int, const sockaddr*, socklen_t) { return 0; });
    Armed armed;
    KELPortable::tcpConnect(fd, err, &to.any, offsetof(sockaddr_in, sin_zero), 0);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, AnIPv6SocketThatMetItselfIsRecognisedByAddressAndPortAlone) {
    net.local_address = "[2001:db8::1]:80";
    SocketAddress to = socket_address("[2001:db8::1]:80");
    to.v6.sin6_flowinfo = htonl(7);
    fd = net.open_socket(AF_INET6);
    seams::connect.script([](int, const sockaddr*, socklen_t) { return 0; });
    Armed armed;
    KELPortable::tcpConnect(fd, err, &to.any, offsetof(sockaddr_in6, sin6_scope_id), 0);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, ASocketThatMetItselfAfterAWaitCountsAsRefused) {
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    net.local_address = "10.1.1.1:80";
    connect("10.1.1.1:80", 2000);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, TheSameAddressWithAnotherPortStands) {
    net.local_address = "10.1.1.1:81";
    connect("10.1.1.1:80", 0);
    expect_connected();
}

TEST_F(Connect, TheSamePortOfAnotherAddressStands) {
    net.local_address = "10.1.1.2:80";
    connect("10.1.1.1:80", 0);
    expect_connected();
}

TEST_F(Connect, IPv6AddressesThatDifferInTheirLastByteStand) {
    net.local_address = "[2001:db8::1]:80";
    connect("[2001:db8::2]:80", 0);
    expect_connected();
}

TEST_F(Connect, TheSamePortInAnotherFamilyStands) {
    net.local_address = "[::ffff:10.1.1.1]:80";
    connect("10.1.1.1:80", 0);
    expect_connected();
}

TEST_F(Connect, AnotherFamilyStandsEvenWhereItsBytesAreTheSame) {
    // The flow of an IPv6 address lies where an IPv4 address has its host.
    SocketAddress to = socket_address("[2001:db8::1]:80");
    const SocketAddress local = socket_address("10.1.1.1:80");
    to.v6.sin6_flowinfo = local.v4.sin_addr.s_addr;
    net.local_address = "10.1.1.1:80";
    fd = net.open_socket(AF_INET6);
    {
        Armed armed;
        KELPortable::tcpConnect(fd, err, &to.any, static_cast<int>(to.size()), 0);
    }
    expect_connected();
}

TEST_F(Connect, AnUnknownLocalAddressCountsAsRefused) {
    net.getsocknames = {ENOBUFS};
    connect("10.1.1.1:80", 0);
    expect_failed(ECONNREFUSED);
}

TEST_F(Connect, ReadsNoMoreThanTheGivenAddress) {
    // The address ends where the readable memory ends.
    const long page = sysconf(_SC_PAGESIZE);
    const std::size_t size = static_cast<std::size_t>(page);
    auto* memory = static_cast<char*>(
        mmap(nullptr, 2 * size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0));
    ASSERT_NE(memory, MAP_FAILED);
    mprotect(memory + size, size, PROT_NONE);
    seams::connect.script([](int, const sockaddr*, socklen_t) { return 0; });
    fd = net.open_socket();
    const struct {
        const char* end;
        std::vector<int> sizes;
    } ends[] = {{"10.1.1.1:80", {-1, 0, 2, 7}}, {"[2001:db8::1]:80", {-1, 0, 2, 7, 23}}};
    for (const auto& [end, sizes] : ends) {
        net.local_address = end;
        const SocketAddress to = socket_address(end);
        for (const int given : sizes) {
            const int readable = std::max(given, 0);
            char* const address = memory + size - readable;
            std::memcpy(address, &to, static_cast<std::size_t>(readable));
            Armed armed;
            KELPortable::tcpConnect(fd, err, reinterpret_cast<sockaddr*>(address), given, 0);
            EXPECT_EQ(err, 0) << end << ' ' << given;
        }
    }
    munmap(memory, 2 * size);
    expect_connected();
}

TEST(ConnectReal, ASocketOfAnotherFamilyConnects) {
    sockaddr_un name = {};
    name.sun_family = AF_UNIX;
    std::snprintf(name.sun_path + 1, sizeof name.sun_path - 1, "kel-connect-%d", static_cast<int>(getpid()));
    auto* const address = reinterpret_cast<sockaddr*>(&name);
    const int server = socket(AF_UNIX, SOCK_STREAM, 0);
    ASSERT_EQ(bind(server, address, sizeof name), 0);
    ASSERT_EQ(listen(server, 1), 0);
    int client = socket(AF_UNIX, SOCK_STREAM, 0);
    int err = -1;
    KELPortable::tcpConnect(client, err, address, sizeof name, 0);
    EXPECT_EQ(err, 0);
    EXPECT_NE(client, -1);
    close(client);
    close(server);
}

TEST(ConnectReal, ASocketThatMeetsItselfIsRefused) {
    for (const std::string host : {"127.0.0.1", "::1"}) {
        const bool ipv6 = host == "::1";
        if (ipv6 && !has_ipv6_loopback()) continue;
        int fd = socket(ipv6 ? AF_INET6 : AF_INET, SOCK_STREAM, 0);
        ASSERT_EQ(bind_to(fd, host), 0);
        SocketAddress own = socket_address(bound_address(fd));
        int err = -1;
        KELPortable::tcpConnect(fd, err, &own.any, static_cast<int>(own.size()), 2000);
        EXPECT_EQ(err, ECONNREFUSED) << host;
        EXPECT_EQ(fd, -1) << host;
    }
}
