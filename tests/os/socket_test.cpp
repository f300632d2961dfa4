// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/containers/strings.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>

#include <algorithm>
#include <cstring>
#include <deque>
#include <string>
#include <vector>

#include "tests/os/fake_net.h"
#include "tests/os/loopback.h"

using namespace kel::test;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// --- Errors ----------------------------------------------------------------------------------------

TEST(SocketError, ShortOfMemoryOrDescriptorsIsNoResources) {
    for (const unsigned char transient : {0, 1}) {
        const auto memory = thrown<CORBA_NO_RESOURCES>([=] { KELPortable::socketError(ENOMEM, transient); });
        EXPECT_EQ(memory.minor(), 0x4f4d000cu);
        const auto files = thrown<CORBA_NO_RESOURCES>([=] { KELPortable::socketError(EMFILE, transient); });
        EXPECT_EQ(files.minor(), 0x4f4d0018u);
    }
}

TEST(SocketError, AnyOtherErrorIsACommFailure) {
    for (const int error : {EAGAIN, ENFILE, ENOBUFS, ECONNREFUSED}) {
        const auto e = thrown<CORBA_COMM_FAILURE>([=] { KELPortable::socketError(error, 0); });
        EXPECT_EQ(e.minor(), 0x4f4d0000u + static_cast<unsigned>(error));
    }
}

TEST(SocketError, AnyOtherErrorIsTransientWhereThatIsAsked) {
    for (const unsigned char transient : {1, 2, 255}) {
        const auto e = thrown<CORBA_TRANSIENT>([=] { KELPortable::socketError(ECONNREFUSED, transient); });
        EXPECT_EQ(e.minor(), 0x4f4d006fu);
    }
}

TEST(SocketError, NoErrorIsAnErrorToo) {
    EXPECT_EQ(thrown<CORBA_COMM_FAILURE>([] { KELPortable::socketError(0, 0); }).minor(), 0x4f4d0000u);
}

TEST(SocketError, ANegativeErrorKeepsItsThirtyTwoBits) {
    EXPECT_EQ(thrown<CORBA_TRANSIENT>([] { KELPortable::socketError(-2, 1); }).minor(), 0xfffffffeu);
}

// --- Listening -------------------------------------------------------------------------------------

namespace {

class Listening : public FakeNetTest {
protected:
    // Opens a listener and takes the socket over.
    int listen(const char* host, unsigned short port, unsigned long range) {
        const int fd = net.run([=] { return KELPortable::createTcpListenerSocket(host, port, range); });
        net.forget(fd);
        return fd;
    }

    template <class E>
    E fails(const char* host, unsigned short port, unsigned long range) {
        return thrown<E>([=] { KELPortable::createTcpListenerSocket(host, port, range); });
    }
};

}  // namespace

TEST_F(Listening, ReturnsAListeningSocket) {
    EXPECT_EQ(listen("10.0.0.1", 5000, 0), 500);
    EXPECT_THAT(net.log("socket"), ElementsAre("inet 1 0"));
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:5000 16"));
    EXPECT_THAT(net.log("listen"), ElementsAre("500 1024"));
}

TEST_F(Listening, ReusesTheAddressBeforeItBinds) {
    listen("10.0.0.1", 5000, 0);
    EXPECT_THAT(net.log("setsockopt"), ElementsAre("500 1 2 1 4"));  // SOL_SOCKET, SO_REUSEADDR
    EXPECT_THAT(net.order({"socket", "setsockopt", "bind", "listen"}),
                ElementsAre("socket", "setsockopt", "bind", "listen"));
}

TEST_F(Listening, ReusesTheAddressOfEverySocket) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("", 5000, 1);
    EXPECT_THAT(net.log("setsockopt"), ElementsAre("500 1 2 1 4", "501 1 2 1 4"));
}

TEST_F(Listening, AFailedOptionIsIgnored) {
    seams::setsockopt.fail(1, EINVAL);
    listen("10.0.0.1", 5000, 0);
}

TEST_F(Listening, AnEmptyHostStartsWithTheIPv6Wildcard) {
    listen("", 5000, 0);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [::]:5000 28"));
}

TEST_F(Listening, ANullHostIsAnEmptyHost) {
    listen(nullptr, 5000, 0);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [::]:5000 28"));
}

TEST_F(Listening, WithoutIPv6TheIPv4WildcardIsBound) {
    net.sockets = {EAFNOSUPPORT, 0};
    listen("", 5000, 0);
    EXPECT_THAT(net.log("socket"), ElementsAre("inet6 1 0", "inet 1 0"));
    EXPECT_THAT(net.log("bind"), ElementsAre("500 0.0.0.0:5000 16"));
}

TEST_F(Listening, TriesTheWholeRangeOnEachAddress) {
    net.binds = {EADDRINUSE};
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("", 5000, 2).minor(), 0x4f4d0062u);
    EXPECT_THAT(net.log("bind"),
                ElementsAre("500 [::]:5000 28", "500 [::]:5001 28", "500 [::]:5002 28", "501 0.0.0.0:5000 16",
                            "501 0.0.0.0:5001 16", "501 0.0.0.0:5002 16"));
}

TEST_F(Listening, StopsAtTheFirstFreePort) {
    net.binds = {EADDRINUSE, 0};
    listen("", 5000, 2);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [::]:5000 28", "500 [::]:5001 28"));
}

TEST_F(Listening, AFreePortOnALaterAddressIsFound) {
    net.binds = {EADDRINUSE, EADDRINUSE, 0};
    EXPECT_EQ(listen("", 5000, 1), 501);
    EXPECT_THAT(net.log("close"), ElementsAre("500"));
    EXPECT_THAT(net.log("listen"), ElementsAre("501 1024"));
}

TEST_F(Listening, PortZeroIsBoundOnceWhateverTheRange) {
    listen("10.0.0.1", 0, 10);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:0 16"));
}

TEST_F(Listening, PortZeroThatCannotBeBoundIsNotTriedAgain) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("10.0.0.1", 0, 10);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:0 16"));
}

TEST_F(Listening, TheRangeEndsAtTheLastPortThereIs) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("10.0.0.1", 65534, 10);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:65534 16", "500 10.0.0.1:65535 16"));
}

TEST_F(Listening, TheLastPortIsTriedOnce) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("10.0.0.1", 65535, 0);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:65535 16"));
}

TEST_F(Listening, ARangeThatWrapsLeavesNoPortToTry) {
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("10.0.0.1", 5000, 0xffffffff).minor(), 0x4f4d0000u);
    EXPECT_THAT(net.log("bind"), IsEmpty());
    EXPECT_THAT(net.log("close"), ElementsAre("500"));
}

TEST_F(Listening, TheLargestRangeThatDoesNotWrapEndsAtTheLastPort) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("10.0.0.1", 65535, 0xffff0000);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.1:65535 16"));
}

TEST_F(Listening, TheLastErrorIsReported) {
    net.binds = {EACCES};
    net.sockets = {0, EAFNOSUPPORT};
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("", 80, 0).minor(), 0x4f4d0061u);
}

TEST_F(Listening, WithoutDescriptorsThrowsNoResources) {
    net.sockets = {EMFILE};
    EXPECT_EQ(fails<CORBA_NO_RESOURCES>("", 5000, 0).minor(), 0x4f4d0018u);
}

TEST_F(Listening, TheErrorIsReadBeforeTheSocketIsClosed) {
    net.binds = {EACCES};
    net.errno_after_close = EIO;
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("10.0.0.1", 80, 0).minor(), 0x4f4d000du);
}

TEST_F(Listening, AnUnknownHostIsACommFailureWithTheResolversCode) {
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("nobody", 5000, 0).minor(), 0xfffffffeu);
    EXPECT_THAT(net.log("getaddrinfo"), ElementsAre("nobody 5000 0 1 0"));
}

TEST_F(Listening, ALinkLocalAddressHasTheScopeOfTheInterface) {
    listen("fe80::1", 5000, 0);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [fe80::1%7]:5000 28"));
}

TEST_F(Listening, TheScopeIsSetOnceBeforeTheFirstPort) {
    net.binds = {EADDRINUSE};
    fails<CORBA_COMM_FAILURE>("fe80::1", 5000, 1);
    EXPECT_THAT(net.order({"socket", "if_nametoindex", "setsockopt", "bind"}),
                ElementsAre("socket", "if_nametoindex", "setsockopt", "bind", "bind"));
}

TEST_F(Listening, AFailedListenIsACommFailureAndClosesTheSocket) {
    net.listens = {ENOMEM};
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("10.0.0.1", 5000, 0).minor(), 0x4f4d000cu);
    EXPECT_THAT(net.order({"listen", "close"}), ElementsAre("listen", "close"));
}

TEST_F(Listening, AFailedListenReportsTheErrnoReadAfterTheClose) {
    net.listens = {EADDRINUSE};
    net.errno_after_close = EIO;
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>("10.0.0.1", 5000, 0).minor(), 0x4f4d0005u);
}

TEST_F(Listening, TheListIsReleasedBeforeItListens) {
    listen("10.0.0.1", 5000, 0);
    EXPECT_THAT(net.order({"bind", "freeaddrinfo", "listen"}), ElementsAre("bind", "freeaddrinfo", "listen"));
}

TEST_F(Listening, TheListOfWildcardsIsReleasedToo) {
    listen("", 5000, 0);
    EXPECT_THAT(net.log("freeaddrinfo"), SizeIs(1));
}

TEST(ListeningReal, ThePortIsFoundAfterwards) {
    const Descriptor server(KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0));
    const int port = KELPortable::saGetPort(server.fd());
    EXPECT_EQ(bound_address(server.fd()), "127.0.0.1:" + std::to_string(port));
}

TEST(ListeningReal, ATakenPortIsPassedOver) {
    const Descriptor first(KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0));
    const int port = KELPortable::saGetPort(first.fd());
    const Descriptor second(
        KELPortable::createTcpListenerSocket("127.0.0.1", static_cast<unsigned short>(port), 50));
    EXPECT_GT(KELPortable::saGetPort(second.fd()), port);
}

TEST(ListeningReal, TheAddressMayBeReused) {
    const Descriptor server(KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0));
    int reuse = 0;
    socklen_t size = sizeof reuse;
    EXPECT_EQ(getsockopt(server.fd(), SOL_SOCKET, SO_REUSEADDR, &reuse, &size), 0);
    EXPECT_EQ(reuse, 1);
}

TEST(ListeningReal, ChildrenInheritTheListenerAndItsConnections) {
    const Descriptor server(KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0));
    const auto port = static_cast<unsigned short>(KELPortable::saGetPort(server.fd()));
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", port, 0, ""));
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    EXPECT_EQ(fcntl(server.fd(), F_GETFD), 0);
    EXPECT_EQ(fcntl(peer.fd(), F_GETFD), 0);
}

TEST(ListeningReal, AnEmptyHostServesIPv4Clients) {
    const Descriptor server(KELPortable::createTcpListenerSocket("", 0, 0));
    const auto port = static_cast<unsigned short>(KELPortable::saGetPort(server.fd()));
    const Descriptor client(KELPortable::tcpConnect("127.0.0.1", port, 0, ""));
    const Descriptor peer(KELPortable::socketAccept(server.fd()));
    EXPECT_EQ(write(client.fd(), "ping", 4), 4);
    EXPECT_EQ(read_text(peer.fd()), "ping");
}

// --- Accepting -------------------------------------------------------------------------------------

namespace {

class Accepting : public FakeNetTest {
protected:
    void SetUp() override {
        FakeNetTest::SetUp();
        server = net.open_socket();
    }
    void TearDown() override {
        net.forget(server);
        FakeNetTest::TearDown();
    }

    template <class E>
    E fails(int error) {
        net.accepts = std::deque<int>{error};
        return thrown<E>([this] { KELPortable::socketAccept(server); });
    }

    int server = -1;
};

}  // namespace

TEST_F(Accepting, ReturnsTheAcceptedSocket) {
    const int fd = net.run([this] { return KELPortable::socketAccept(server); });
    EXPECT_EQ(fd, 501);
    EXPECT_THAT(net.log("accept"), ElementsAre("500 28"));
    net.forget(fd);
}

TEST_F(Accepting, AFailureIsACommFailure) {
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>(ECONNABORTED).minor(), 0x4f4d0067u);
}

TEST_F(Accepting, WithoutDescriptorsThrowsNoResources) {
    EXPECT_EQ(fails<CORBA_NO_RESOURCES>(EMFILE).minor(), 0x4f4d0018u);
}

TEST_F(Accepting, AnInterruptionIsNotRepeated) {
    EXPECT_EQ(fails<CORBA_COMM_FAILURE>(EINTR).minor(), 0x4f4d0004u);
    EXPECT_THAT(net.log("accept"), SizeIs(1));
}

TEST(AcceptingReal, ABadDescriptorIsACommFailure) {
    EXPECT_EQ(thrown<CORBA_COMM_FAILURE>([] { KELPortable::socketAccept(-1); }).minor(), 0x4f4d0009u);
}

// --- Bind name -------------------------------------------------------------------------------------

namespace {

class BindName : public FakeNetTest {
protected:
    void SetUp() override {
        FakeNetTest::SetUp();
        fd = net.open_socket();
    }
    void TearDown() override {
        EXPECT_EQ(fd, 500);
        net.forget(500);  // open, whatever happened
        FakeNetTest::TearDown();
    }

    void bind(const char* name, int family) {
        Armed armed;
        KELSetBindName(fd, name, family);
    }

    // The reason of the failure.
    std::string fails(const std::string& name, int family) {
        const auto e = thrown<CORBA_BAD_PARAM>([&] { KELSetBindName(fd, name.c_str(), family); });
        EXPECT_EQ(e.minor(), 0x4f4d0008u);
        return e.reason() == nullptr ? "" : e.reason();
    }

    int fd = -1;
};

}  // namespace

TEST_F(BindName, ANullOrEmptyNameDoesNothing) {
    for (const int family : {AF_INET, AF_INET6}) {
        bind(nullptr, family);
        bind("", family);
    }
    EXPECT_THAT(net.log("bind"), IsEmpty());
    EXPECT_THAT(net.log("getaddrinfo"), IsEmpty());
}

TEST_F(BindName, AnIPv4AddressIsBoundToAnyPort) {
    bind("10.0.0.9", AF_INET);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.9:0 16"));
}

TEST_F(BindName, AnIPv4NameIsResolved) {
    net.resolve("client", {"10.0.0.8"});
    bind("client", AF_INET);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.8:0 16"));
}

TEST_F(BindName, AnUnknownIPv4NameIsABadParameter) {
    EXPECT_EQ(fails("no.such.name", AF_INET),
              "client bind on [no.such.name] failed; improper bind name for IPv4 socket.");
    EXPECT_THAT(net.log("bind"), IsEmpty());
}

TEST_F(BindName, AnIPv6AddressIsNoIPv4Name) {
    EXPECT_EQ(fails("::1", AF_INET), "client bind on [::1] failed; improper bind name for IPv4 socket.");
}

TEST_F(BindName, TheBroadcastAddressIsAskedOfTheResolver) {
    net.resolve("255.255.255.255", {"10.0.0.7"});
    bind("255.255.255.255", AF_INET);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.7:0 16"));
}

TEST_F(BindName, AnyOtherFamilyCountsAsIPv4) {
    bind("10.0.0.9", AF_UNSPEC);
    bind("10.0.0.9", AF_UNIX);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 10.0.0.9:0 16", "500 10.0.0.9:0 16"));
}

TEST_F(BindName, AnIPv6AddressIsBoundToAnyPort) {
    bind("2001:db8::5", AF_INET6);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [2001:db8::5]:0 28"));
    EXPECT_THAT(net.log("getaddrinfo"), IsEmpty());
}

TEST_F(BindName, AnIPv6NameIsResolved) {
    net.resolve("client", {"10.0.0.8", "2001:db8::8", "2001:db8::9"});
    bind("client", AF_INET6);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [2001:db8::8]:0 28"));
    EXPECT_THAT(net.log("getaddrinfo"), ElementsAre("client null 10 1 0"));
    EXPECT_THAT(net.log("freeaddrinfo"), SizeIs(1));
}

TEST_F(BindName, AnIPv6NameKeepsTheScopeThatTheResolverGave) {
    net.resolve("client", {"fe80::8"});
    net.resolved_scope = 3;
    bind("client", AF_INET6);
    EXPECT_THAT(net.log("bind"), ElementsAre("500 [fe80::8%3]:0 28"));
}

TEST_F(BindName, AnUnknownIPv6NameIsABadParameter) {
    EXPECT_EQ(fails("no.such.name", AF_INET6),
              "client bind on [no.such.name] failed; improper bind name for IPv6 socket.");
    EXPECT_THAT(net.log("bind"), IsEmpty());
}

TEST_F(BindName, AnIPv4AddressIsNoIPv6Name) {
    EXPECT_EQ(fails("10.0.0.9", AF_INET6),
              "client bind on [10.0.0.9] failed; improper bind name for IPv6 socket.");
}

TEST_F(BindName, AFailedBindTellsTheErrorText) {
    net.binds = {EADDRNOTAVAIL};
    EXPECT_EQ(fails("10.0.0.9", AF_INET),
              std::string("client bind on [10.0.0.9] failed; ") + std::strerror(EADDRNOTAVAIL));
    EXPECT_EQ(fails("2001:db8::5", AF_INET6),
              std::string("client bind on [2001:db8::5] failed; ") + std::strerror(EADDRNOTAVAIL));
}

TEST_F(BindName, AFailureAfterResolvingReleasesTheList) {
    net.resolve("client", {"2001:db8::8"});
    net.binds = {EACCES};
    fails("client", AF_INET6);
    EXPECT_THAT(net.log("freeaddrinfo"), SizeIs(1));
}

TEST_F(BindName, AFailureLeavesTheSocketOpen) {
    net.binds = {EACCES};
    fails("10.0.0.9", AF_INET);
    fails("no.such.name", AF_INET6);
    EXPECT_EQ(fd, 500);
    EXPECT_TRUE(net.is_open(500));
    EXPECT_THAT(net.log("close"), IsEmpty());
}

TEST_F(BindName, ALongNameIsInTheReasonAsAWhole) {
    const std::string name(10000, 'n');
    EXPECT_EQ(fails(name, AF_INET6),
              "client bind on [" + name + "] failed; improper bind name for IPv6 socket.");
}

TEST_F(BindName, ANameIsNeverReadAsAFormat) {
    EXPECT_EQ(fails("%s%n%1000000d", AF_INET),
              "client bind on [%s%n%1000000d] failed; improper bind name for IPv4 socket.");
}
