// Ports, port ranges, lengths of addresses and time-outs of connections.
// SPDX-License-Identifier: MIT
#include <arpa/inet.h>
#include <kel/os/address.h>
#include <kel/os/portable.h>
#include <netinet/in.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "tests/faults/bounds/bounds.h"
#include "tests/os/fake_net.h"

using namespace kel::test;
using testing::ElementsAre;

namespace {

const char address_header[] = "kel/os/address.h";
const char header[] = "kel/os/portable.h";

// Ports have 16 bits; what a wider parameter has beyond them is cut off.
unsigned short port_of(std::uint32_t n) { return static_cast<unsigned short>(n); }
int as_int(std::uint32_t n) { return static_cast<int>(n); }

typedef std::vector<int> Ports;

// The ports that the sockets of `net` were bound to or connected with, by `call`.
Ports ports(const FakeNet& net, const std::string& call) {
    Ports found;
    for (std::string arguments : net.log(call)) {
        arguments = arguments.substr(arguments.rfind(':') + 1);
        found.push_back(std::stoi(arguments));
    }
    return found;
}

// A fake network of two hosts: this machine, and "one", which has one address.
struct Net : FakeNet {
    Net() {
        install();
        resolve("one", {"10.1.1.1"});
    }
    ~Net() { check_balance(); }
};

// Every address is refused until the time is used up. The sum of the pauses, in milliseconds.
long long time_of_refusals(std::uint32_t timeout) {
    Net net;
    net.connects = {ECONNREFUSED};
    const auto refusal =
        thrown<CORBA_TRANSIENT>([&] { KELPortable::tcpConnect("one", 80, timeout, nullptr); });
    EXPECT_EQ(refusal.minor(), 0x4f4d0000u + ECONNREFUSED);
    return net.now_ms;
}

}  // namespace

// ---- socket addresses ----

// The address ends where its block ends.
AT_BOUNDS(SocketAddress, KeepsTheLow16BitsOfItsPort, header, "port") {
    const std::unique_ptr<char[]> bytes(new char[sizeof(sockaddr_in)]());
    sockaddr* const sa = reinterpret_cast<sockaddr*>(bytes.get());
    sa->sa_family = AF_INET;
    KELPortable::saSetPort(sa, as_int(n));
    EXPECT_EQ(KELPortable::saGetPort(sa), port_of(n));
    sockaddr_in expected = {};
    expected.sin_family = AF_INET;
    expected.sin_port = htons(port_of(n));
    EXPECT_EQ(std::memcmp(&expected, sa, sizeof expected), 0);
}

AT_BOUNDS(WildcardAddress, KeepsTheLow16BitsOfItsPort, address_header, "port") {
    for (const int family : {AF_INET, AF_INET6}) {
        addrinfo* const node = newAddrInfo(family, as_int(n), SOCK_STREAM);
        EXPECT_EQ(KELPortable::saGetPort(node->ai_addr), port_of(n));
        Freeaddrinfo(node);
    }
}

AT_BOUNDS(AddressList, AsksForItsPortAsAnUnsignedNumber, address_header, "port") {
    Net net;
    net.run([&] {
        Freeaddrinfo(Getaddrinfo("one", as_int(n), SOCK_STREAM, 0));
        return 0;
    });
    EXPECT_THAT(net.log("getaddrinfo"), ElementsAre("one " + std::to_string(n) + " 0 1 0"));
}

AT_BOUNDS(WildcardList, KeepsTheLow16BitsOfItsPort, address_header, "port") {
    addrinfo* const list = Getaddrinfo(nullptr, as_int(n), SOCK_STREAM, 0);
    EXPECT_EQ(KELPortable::saGetPort(list->ai_addr), port_of(n));
    EXPECT_EQ(KELPortable::saGetPort(list->ai_next->ai_addr), port_of(n));
    Freeaddrinfo(list);
}

AT_BOUNDS(ConvertedHost, HasItsPortInNetworkOrder, header, "port") {
    sockaddr_in sa;
    KELPortable::convert("", port_of(n), sa);
    EXPECT_EQ(sa.sin_port, htons(port_of(n)));
}

// ---- listening ----

// Port 0 is the system's choice and has no range.
AT_BOUNDS(Listener, TriesItsPortFirst, header, "port") {
    Net net;
    const int fd = net.run([&] { return KELPortable::createTcpListenerSocket("one", port_of(n), 10); });
    EXPECT_THAT(ports(net, "bind"), ElementsAre(port_of(n)));
    net.forget(fd);
}

// A range ends at the last port there is; a sum beyond 32 bits leaves no port to try.
AT_BOUNDS(Listener, TriesNoPortBeyondTheLast, header, "range") {
    Net net;
    net.binds = {EADDRINUSE};
    const auto failure =
        thrown<CORBA_COMM_FAILURE>([&] { KELPortable::createTcpListenerSocket("one", 65533, n); });
    const Ports expected[] = {{65533}, {65533, 65534}, {65533, 65534, 65535}, {}};
    const bool wraps = n >= 0xfffffffe;
    EXPECT_EQ(ports(net, "bind"), expected[wraps ? 3 : std::min<std::uint32_t>(n, 2)]);
    EXPECT_EQ(failure.minor(), 0x4f4d0000u + (wraps ? 0 : EADDRINUSE));
}

// ---- connecting ----

AT_BOUNDS(Connection, GoesToItsPort, header, "port") {
    Net net;
    net.forget(net.run([&] { return KELPortable::tcpConnect("one", port_of(n), 0, nullptr); }));
    EXPECT_THAT(ports(net, "connect"), ElementsAre(port_of(n)));
}

// The wait takes 32 bits as a signed number; zero connects without a time-out.
AT_BOUNDS(Connection, WaitsItsMilliseconds, header, "timeout") {
    Net net;
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    const int fd = net.run([&] { return KELPortable::tcpConnect("one", 80, n, nullptr); });
    EXPECT_THAT(net.log("poll"),
                ElementsAre(std::to_string(fd) + " 0x100 " + std::to_string(static_cast<std::int32_t>(n))));
    EXPECT_EQ(net.log("fcntl").empty(), n == 0);
    net.forget(fd);
}

TEST(Connection, WaitsTheLow32BitsOfMoreMilliseconds) {
    reset_faults();
    Net net;
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    const int fd = net.run([] { return KELPortable::tcpConnect("one", 80, 0x100000005, nullptr); });
    EXPECT_THAT(net.log("poll"), ElementsAre(std::to_string(fd) + " 0x100 5"));
    net.forget(fd);
    reset_faults();
}

AT_BOUNDS(RefusedConnection, IsTriedForExactlyItsMilliseconds, header, "timeout") {
    EXPECT_EQ(time_of_refusals(n), n);
}

AT_BOUNDS(ConnectingSocket, WaitsItsMilliseconds, header, "timeout") {
    Net net;
    net.connects = {EINPROGRESS};
    net.waits = {{1, 0}};
    int fd = net.open_socket();
    int err = -1;
    SocketAddress peer = socket_address("10.1.1.1:80");
    net.run([&] {
        KELPortable::tcpConnect(fd, err, &peer.any, sizeof peer.v4, n);
        return 0;
    });
    EXPECT_EQ(err, 0);
    EXPECT_THAT(net.log("poll"),
                ElementsAre(std::to_string(fd) + " 0x100 " + std::to_string(static_cast<std::int32_t>(n))));
    net.forget(fd);
}

// The address ends where its block ends: of a length beyond every address no more is looked at than
// the largest address has, and of a negative one nothing.
AT_BOUNDS(ConnectingSocket, LooksAtNoMoreThanTheGivenAddress, header, "addrlen") {
    Net net;
    socklen_t asked = ~n;
    seams::connect.script([&](int, const sockaddr*, socklen_t size) {
        asked = size;
        return 0;
    });
    const int size = std::clamp<int>(as_int(n), 0, sizeof(sockaddr_in6));
    const std::unique_ptr<char[]> bytes(new char[static_cast<std::size_t>(size)]());
    int fd = net.open_socket();
    int err = -1;
    net.run([&] {
        KELPortable::tcpConnect(fd, err, reinterpret_cast<sockaddr*>(bytes.get()), as_int(n), 0);
        return 0;
    });
    EXPECT_EQ(asked, n);
    EXPECT_EQ(err, 0);
    net.forget(fd);
}
