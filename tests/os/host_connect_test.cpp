// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/containers/strings.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>
#include <unistd.h>

#include <algorithm>
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
using Strings = std::vector<std::string>;

namespace {

class HostConnect : public FakeNetTest {
protected:
    void SetUp() override {
        FakeNetTest::SetUp();
        net.resolve("one", {"10.1.1.1"});
        net.resolve("two", {"10.1.1.1", "10.1.1.2"});
    }

    // Connects to port 80 and takes the socket over.
    int connect(const char* host, unsigned long long timeout = 0, const char* bind_name = "") {
        const int fd = net.run([&] { return KELPortable::tcpConnect(host, 80, timeout, bind_name); });
        net.forget(fd);
        return fd;
    }

    template <class E>
    E fails(const char* host, unsigned long long timeout = 0, const char* bind_name = "") {
        return thrown<E>([&] { KELPortable::tcpConnect(host, 80, timeout, bind_name); });
    }

    // The addresses of the attempts, without the descriptors.
    Strings attempts() const {
        Strings found;
        for (const std::string& call : net.log("connect")) found.push_back(call.substr(call.find(' ') + 1));
        return found;
    }
};

class HostConnectError : public HostConnect, public ::testing::WithParamInterface<int> {};

// Fails every allocation of `body` in turn until it makes fewer; `prepare` runs before each attempt.
template <class Prepare, class Body>
void sweep_allocations(FakeNet& net, Prepare prepare, Body body) {
    for (long nth = 1; nth < 100; ++nth) {
        reset_faults();
        net.install();
        prepare();
        AllocationPlan::fail(nth);
        try {
            body();
            EXPECT_GT(nth, 1) << "there is nothing to allocate";
            return;
        } catch (const std::bad_alloc&) {
            net.check_balance();
        }
    }
    ADD_FAILURE() << "there is always one more allocation";
}

}  // namespace

TEST_F(HostConnect, ReturnsTheConnectedSocket) {
    EXPECT_EQ(connect("one"), 500);
    EXPECT_THAT(net.log("socket"), ElementsAre("inet 1 0"));
    EXPECT_THAT(net.log("connect"), ElementsAre("500 10.1.1.1:80"));
}

TEST_F(HostConnect, ResolvesTheHostOnceForBothFamilies) {
    connect("one");
    const Strings calls = net.log("getaddrinfo");
    ASSERT_FALSE(calls.empty());
    EXPECT_EQ(calls.front(), "one 80 0 1 0");
    EXPECT_EQ(std::count(calls.begin(), calls.end(), calls.front()), 1);
}

TEST_F(HostConnect, AnUnknownHostIsTransientWithTheResolversCode) {
    EXPECT_EQ(fails<CORBA_TRANSIENT>("nobody").minor(), 0xfffffffeu);  // EAI_NONAME is -2
    EXPECT_THAT(net.log("socket"), IsEmpty());
}

TEST_F(HostConnect, TriesTheAddressesInTheirOrder) {
    net.connects = {EHOSTUNREACH, 0};
    connect("two");
    EXPECT_THAT(net.log("connect"), ElementsAre("500 10.1.1.1:80", "501 10.1.1.2:80"));
}

TEST_F(HostConnect, StopsAtTheFirstConnectedAddress) {
    connect("two");
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80"));
}

TEST_F(HostConnect, AnAddressWithoutASocketIsPassedOver) {
    net.sockets = {EAFNOSUPPORT, 0};
    connect("two");
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.2:80"));
}

TEST_F(HostConnect, WithoutAnySocketTheLastErrorIsTransient) {
    net.sockets = {EACCES, EAFNOSUPPORT};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("two").minor(), 0x4f4d0061u);
}

TEST_F(HostConnect, WithoutDescriptorsThrowsNoResources) {
    net.sockets = {EMFILE};
    EXPECT_EQ(fails<CORBA_NO_RESOURCES>("two").minor(), 0x4f4d0018u);
}

TEST_F(HostConnect, WhenAllAddressesFailTheLastErrorIsTransient) {
    net.connects = {EHOSTUNREACH, ENETUNREACH};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("two").minor(), 0x4f4d0065u);
}

TEST_F(HostConnect, WithoutMemoryInTheSystemThrowsNoResources) {
    net.connects = {ENOMEM};
    EXPECT_EQ(fails<CORBA_NO_RESOURCES>("one").minor(), 0x4f4d000cu);
}

TEST_F(HostConnect, AFailedSocketOfTheLastAddressIsTheLastError) {
    net.connects = {EHOSTUNREACH};
    net.sockets = {0, EAFNOSUPPORT};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("two").minor(), 0x4f4d0061u);
}

TEST_F(HostConnect, ThisMachineIsReachedOverItsLoopbackAddresses) {
    net.connects = {EHOSTUNREACH, 0};
    connect(KELPortable::host_name());
    EXPECT_THAT(attempts(), ElementsAre("127.0.0.1:80", "[::1]:80"));
}

TEST_F(HostConnect, ANullHostIsThisMachine) {
    net.connects = {EHOSTUNREACH, 0};
    connect(nullptr);
    EXPECT_THAT(attempts(), ElementsAre("[::1]:80", "127.0.0.1:80"));
}

TEST_F(HostConnect, ARefusalOnLoopbackIsTriedOnTheOwnAddress) {
    net.connects = {ECONNREFUSED, 0};
    connect("127.0.0.1");
    EXPECT_THAT(attempts(), ElementsAre("127.0.0.1:80", "192.0.2.7:80"));
    EXPECT_THAT(net.sleeps, IsEmpty());
}

TEST_F(HostConnect, ARefusalOnIPv6LoopbackIsTriedOnTheOwnAddress) {
    net.connects = {ECONNREFUSED, 0};
    connect("::1");
    EXPECT_THAT(attempts(), ElementsAre("[::1]:80", "[2001:db8::7]:80"));
}

TEST_F(HostConnect, WithoutAnOwnAddressLoopbackIsTriedAgain) {
    net.resolve(KELPortable::host_name(), {});
    net.connects = {ECONNREFUSED, 0};
    connect("127.0.0.1");
    EXPECT_THAT(attempts(), ElementsAre("127.0.0.1:80", "127.0.0.1:80"));
}

TEST_F(HostConnect, TheFirstRefusalElsewhereIsTriedAgainAtOnce) {
    net.connects = {ECONNREFUSED, 0};
    connect("one", 10000);
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80", "10.1.1.1:80"));
    EXPECT_THAT(net.sleeps, IsEmpty());
}

TEST_F(HostConnect, EveryAttemptHasItsOwnSocket) {
    net.connects = {ECONNREFUSED, 0};
    EXPECT_EQ(connect("one"), 501);
    EXPECT_THAT(net.order({"socket", "connect", "close"}),
                ElementsAre("socket", "connect", "close", "socket", "connect"));
}

TEST_F(HostConnect, TheNextSocketIsOfTheFamilyOfItsAddress) {
    net.connects = {ECONNREFUSED, 0};
    connect("::1");
    EXPECT_THAT(net.log("socket"), ElementsAre("inet6 1 0", "inet6 1 0"));
}

TEST_F(HostConnect, WithoutASocketForTheNextAttemptThrowsAtOnce) {
    net.connects = {ECONNREFUSED};
    net.sockets = {0, EACCES};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("two").minor(), 0x4f4d000du);
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80"));
}

TEST_F(HostConnect, WithoutADescriptorForTheNextAttemptThrowsNoResources) {
    net.connects = {ECONNREFUSED};
    net.sockets = {0, EMFILE};
    EXPECT_EQ(fails<CORBA_NO_RESOURCES>("two").minor(), 0x4f4d0018u);
}

TEST_F(HostConnect, AnAddressInUseIsTriedSeventeenTimes) {
    net.connects = {EADDRINUSE};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("one").minor(), 0x4f4d0062u);
    EXPECT_THAT(attempts(), SizeIs(17));
    EXPECT_THAT(net.sleeps, IsEmpty());
}

TEST_F(HostConnect, TheSeventeenthAttemptMaySucceed) {
    std::deque<int> errors(16, EADDRINUSE);
    errors.push_back(0);
    net.connects = errors;
    EXPECT_EQ(connect("one"), 516);
}

TEST_F(HostConnect, EveryAddressHasItsSeventeenAttempts) {
    net.connects = {EADDRINUSE};
    fails<CORBA_TRANSIENT>("two");
    const Strings all = attempts();
    EXPECT_EQ(std::count(all.begin(), all.end(), "10.1.1.1:80"), 17);
    EXPECT_EQ(std::count(all.begin(), all.end(), "10.1.1.2:80"), 17);
}

TEST_F(HostConnect, ARefusalDoesNotForgetTheAttemptsInUse) {
    std::deque<int> errors(16, EADDRINUSE);
    errors.push_back(ECONNREFUSED);
    errors.push_back(EADDRINUSE);
    net.connects = errors;
    fails<CORBA_TRANSIENT>("one");
    EXPECT_THAT(attempts(), SizeIs(18));
}

TEST_F(HostConnect, RefusalsAreTriedAgainAfterPausesThatDouble) {
    net.connects = {ECONNREFUSED};
    EXPECT_EQ(fails<CORBA_TRANSIENT>("one", 10000).minor(), 0x4f4d006fu);
    EXPECT_THAT(net.sleeps, ElementsAre("sleep 1", "sleep 2", "sleep 4", "select 3.000000"));
    EXPECT_THAT(attempts(), SizeIs(5));
    EXPECT_EQ(net.now_ms, 10000);
}

TEST_F(HostConnect, ARefusedConnectMaySucceedAfterAPause) {
    net.connects = {ECONNREFUSED, ECONNREFUSED, ECONNREFUSED, 0};
    connect("one", 10000);
    EXPECT_THAT(net.sleeps, ElementsAre("sleep 1", "sleep 2"));
}

TEST_F(HostConnect, EveryAttemptHasTheTimeThatRemains) {
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}, {1, 0}, {1, 0}, {1, 0}, {1, 0}};
    net.so_error = ECONNREFUSED;
    fails<CORBA_TRANSIENT>("one", 10000);
    EXPECT_THAT(net.log("poll"), ElementsAre("500 0x100 10000", "501 0x100 10000", "502 0x100 9000",
                                             "503 0x100 7000", "504 0x100 3000"));
}

TEST_F(HostConnect, ARemainderEqualToThePauseEndsTheAddress) {
    net.connects = {ECONNREFUSED};
    fails<CORBA_TRANSIENT>("one", 1000);
    EXPECT_THAT(net.sleeps, ElementsAre("select 1.000000"));
    EXPECT_THAT(attempts(), SizeIs(2));
}

TEST_F(HostConnect, ARemainderJustAboveThePauseIsKept) {
    net.connects = {ECONNREFUSED};
    fails<CORBA_TRANSIENT>("one", 1001);
    EXPECT_THAT(net.sleeps, ElementsAre("sleep 1", "select 0.001000"));
    EXPECT_THAT(attempts(), SizeIs(3));
}

TEST_F(HostConnect, WithoutATimeOutTheSecondRefusalEndsTheAddress) {
    net.connects = {ECONNREFUSED};
    fails<CORBA_TRANSIENT>("one");
    EXPECT_THAT(net.sleeps, ElementsAre("select 0.000000"));
    EXPECT_THAT(attempts(), SizeIs(2));
}

TEST_F(HostConnect, AfterTheTimeIsUsedUpTheNextAddressHasNoTimeOut) {
    net.connects = {ECONNREFUSED, ECONNREFUSED, 0};
    const int fd = net.run([] { return KELPortable::tcpConnect("two", 80, 1000, ""); });
    EXPECT_EQ(fd, 502);
    EXPECT_EQ(net.flags(fd), O_RDWR);
    net.forget(fd);
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80", "10.1.1.1:80", "10.1.1.2:80"));
}

TEST_F(HostConnect, AfterTheTimeIsUsedUpTheNextAddressIsRefusedOnce) {
    net.connects = {ECONNREFUSED};
    fails<CORBA_TRANSIENT>("two", 1000);
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80", "10.1.1.1:80", "10.1.1.2:80"));
    EXPECT_THAT(net.sleeps, ElementsAre("select 1.000000", "select 0.000000"));
}

TEST_F(HostConnect, TheNextAddressGoesOnWithThePausesOfTheLast) {
    net.connects = {ECONNREFUSED, ECONNREFUSED, EHOSTUNREACH, ECONNREFUSED, 0};
    connect("two", 10000);
    EXPECT_THAT(attempts(),
                ElementsAre("10.1.1.1:80", "10.1.1.1:80", "10.1.1.1:80", "10.1.1.2:80", "10.1.1.2:80"));
    EXPECT_THAT(net.sleeps, ElementsAre("sleep 1", "sleep 2"));
}

TEST_F(HostConnect, OnlyTheFirstRefusalOfAllAddressesMovesToTheOwnAddress) {
    net.connects = {ECONNREFUSED, EHOSTUNREACH, ECONNREFUSED, 0};
    connect(KELPortable::host_name(), 10000);
    EXPECT_THAT(attempts(), ElementsAre("127.0.0.1:80", "192.0.2.7:80", "[::1]:80", "[::1]:80"));
    EXPECT_THAT(net.sleeps, ElementsAre("sleep 1"));
}

TEST_F(HostConnect, ALongTimeOutIsCountedInSixtyFourBits) {
    net.connects = {ECONNREFUSED};
    fails<CORBA_TRANSIENT>("one", 33554436000ull);  // pauses of 1, 2, 4, ... 16777216 s, and 5 s
    EXPECT_EQ(net.now_ms, 33554436000ll);
    ASSERT_EQ(net.sleeps.size(), 26u);
    EXPECT_EQ(net.sleeps[24], "sleep 16777216");
    EXPECT_EQ(net.sleeps[25], "select 5.000000");
}

INSTANTIATE_TEST_SUITE_P(Other, HostConnectError, ::testing::Values(EINTR, ETIMEDOUT, EACCES, EADDRNOTAVAIL));

TEST_P(HostConnectError, EndsTheAddress) {
    net.connects = {GetParam(), 0};
    connect("two", 10000);
    EXPECT_THAT(attempts(), ElementsAre("10.1.1.1:80", "10.1.1.2:80"));
    EXPECT_THAT(net.sleeps, IsEmpty());
}

TEST_F(HostConnect, ASocketThatMetItselfIsTriedAgain) {
    net.local_address = "10.1.1.1:80";
    fails<CORBA_TRANSIENT>("one");
    EXPECT_THAT(attempts(), SizeIs(2));
}

TEST_F(HostConnect, ATimeOutEndsTheWholeConnect) {
    net.connects = {EINPROGRESS};
    net.waits = {{0, 0}};
    EXPECT_EQ(fails<CORBA_TIMEOUT>("two", 2000).minor(), 0x4b450001u);
    EXPECT_THAT(attempts(), SizeIs(1));
    EXPECT_EQ(net.now_ms, 2000);
}

TEST_F(HostConnect, BindsEverySocketBeforeItConnects) {
    net.connects = {ECONNREFUSED, 0};
    connect("one", 0, "10.9.9.9");
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.9.9.9:0 16", "501 10.9.9.9:0 16"));
    EXPECT_THAT(net.order({"socket", "bind", "connect"}),
                ElementsAre("socket", "bind", "connect", "socket", "bind", "connect"));
}

TEST_F(HostConnect, WithoutABindNameNothingIsBound) {
    connect("one", 0, nullptr);
    connect("one", 0, "");
    EXPECT_THAT(net.log("bind"), IsEmpty());
}

TEST_F(HostConnect, ABadBindNameClosesTheSocketAndReleasesTheList) {
    const auto e = fails<CORBA_BAD_PARAM>("two", 0, "no.such.name");
    EXPECT_EQ(e.minor(), 0x4f4d0008u);
    EXPECT_THAT(net.log("close"), ElementsAre("500"));
    EXPECT_THAT(net.log("connect"), IsEmpty());
}

TEST_F(HostConnect, AFailedBindClosesTheSocketAndReleasesTheList) {
    net.binds = {EADDRNOTAVAIL};
    fails<CORBA_BAD_PARAM>("two", 0, "10.9.9.9");
    EXPECT_THAT(net.log("close"), ElementsAre("500"));
}

TEST_F(HostConnect, ALinkLocalAddressHasTheScopeOfTheInterface) {
    net.resolve("link", {"fe80::1"});
    connect("link");
    EXPECT_THAT(attempts(), ElementsAre("[fe80::1%7]:80"));
}

TEST_F(HostConnect, BindsInTheFamilyOfTheAddressBeforeItSetsTheScope) {
    net.resolve("link", {"fe80::1"});
    connect("link", 0, "2001:db8::5");
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [2001:db8::5]:0 28"));
    EXPECT_THAT(net.order({"bind", "if_nametoindex", "connect"}),
                ElementsAre("bind", "if_nametoindex", "connect"));
}

TEST_F(HostConnect, ATimeOutMakesTheSocketNonBlocking) {
    const int fd = net.run([] { return KELPortable::tcpConnect("one", 80, 2000, ""); });
    EXPECT_EQ(net.flags(fd), O_RDWR | O_NONBLOCK);
    net.forget(fd);
}

TEST_F(HostConnect, TheErrorIsReadBeforeTheSocketIsClosed) {
    net.connects = {EHOSTUNREACH};
    net.errno_after_close = EIO;
    EXPECT_EQ(fails<CORBA_TRANSIENT>("one").minor(), 0x4f4d0071u);
}

TEST_F(HostConnect, WithoutMemoryNothingIsLeftBehind) {
    const auto prepare = [this] {
        net.connects = {ECONNREFUSED, EINPROGRESS, 0};
        net.waits = {{1, 0}};
    };
    sweep_allocations(net, prepare, [this] { connect("one", 2000, "10.9.9.9"); });
}

TEST_F(HostConnect, WithoutMemoryForTheBindErrorNothingIsLeftBehind) {
    const auto prepare = [this] { net.binds = {EADDRNOTAVAIL}; };
    sweep_allocations(net, prepare, [] {
        try {
            Armed armed;
            KELPortable::tcpConnect("one", 80, 2000, "10.9.9.9");
        } catch (const CORBA_BAD_PARAM&) {
        }
    });
}

// --- The system's own sockets ----------------------------------------------------------------------

TEST(RealConnect, ReachesAServerOnIPv4) {
    const Listener server("127.0.0.1");
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", server.port(), 0, ""));
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    EXPECT_EQ(write(client.fd(), "ping", 4), 4);
    EXPECT_EQ(read_text(peer.fd()), "ping");
}

TEST(RealConnect, ReachesAServerOnIPv6) {
    if (!has_ipv6_loopback()) GTEST_SKIP() << "no IPv6 here";
    const Listener server("::1");
    const Descriptor client(KELPortable::tcpConnect("::1", server.port(), 2000, ""));
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    EXPECT_EQ(write(client.fd(), "ping", 4), 4);
    EXPECT_EQ(read_text(peer.fd()), "ping");
}

TEST(RealConnect, ATimeOutLeavesTheSocketNonBlocking) {
    const Listener server("127.0.0.1");
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", server.port(), 2000, ""));
    EXPECT_NE(fcntl(client.fd(), F_GETFL) & O_NONBLOCK, 0);
}

TEST(RealConnect, WithoutATimeOutTheSocketBlocks) {
    const Listener server("127.0.0.1");
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", server.port(), 0, ""));
    EXPECT_EQ(fcntl(client.fd(), F_GETFL) & O_NONBLOCK, 0);
}

TEST(RealConnect, ChildrenInheritTheSocket) {
    const Listener server("127.0.0.1");
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", server.port(), 0, ""));
    EXPECT_EQ(fcntl(client.fd(), F_GETFD), 0);
}

TEST(RealConnect, APortWithoutAServerIsRefused) {
    int port;
    {
        const Listener server("127.0.0.1");
        port = server.port();
    }
    const auto e = thrown<CORBA_TRANSIENT>(
        [&] { KELPortable::tcpConnect("127.0.0.1", static_cast<unsigned short>(port), 0, ""); });
    EXPECT_EQ(e.minor(), 0x4f4d006fu);
}

TEST(RealConnect, AServerOnTheOwnAddressOnlyIsReached) {
    // This machine's name leads to 127.0.0.9, where the server is; nobody serves 127.0.0.1.
    const Listener server("127.0.0.9");
    seams::getaddrinfo.script(
        [](const char* host, const char* service, const addrinfo* hints, addrinfo** list) {
            const bool own = std::strcmp(host, KELPortable::host_name()) == 0;
            return seams::getaddrinfo.real(own ? "127.0.0.9" : host, service, hints, list);
        });
    int fd = -1;
    {
        Armed armed;
        fd = KELPortable::tcpConnect("127.0.0.1", server.port(), 0, "");
    }
    reset_faults();
    const Descriptor client(fd);
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    EXPECT_EQ(write(client.fd(), "ping", 4), 4);
    EXPECT_EQ(read_text(peer.fd()), "ping");
}

TEST(RealConnect, TheBindNameIsWhereTheServerSeesTheClient) {
    const Listener server("127.0.0.1");
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", server.port(), 0, "127.0.0.3"));
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    unsigned short unused = 0;
    const CORBA_String_var seen(KELPortable::peer_addr(peer.fd(), unused));
    EXPECT_STREQ(seen.in(), "127.0.0.3");
}

TEST(RealConnect, ABusyServerTimesOut) {
    // A full queue of waiting connections leaves the next one without an answer.
    const Listener server("127.0.0.1");
    ASSERT_EQ(listen(server.fd(), 0), 0);
    const Descriptor waiting(KELPortable::tcpConnect("127.0.0.1", server.port(), 0, ""));
    const auto e =
        thrown<CORBA_TIMEOUT>([&] { KELPortable::tcpConnect("127.0.0.1", server.port(), 30, ""); });
    EXPECT_EQ(e.minor(), 0x4b450001u);
}
