// A network that exists in the test only: sockets, resolver, waits and clock answer from queues.
//
//   FakeNet        scripts the seams of socket, connect, poll, select, sleep, getaddrinfo, ...
//   FakeNetTest    a fixture that holds one and checks the balance at the end
//
//     net.resolve("two", {"10.1.1.1", "10.1.1.2"});
//     net.connects = {ECONNREFUSED, 0};                    // what the calls of connect answer
//     const int fd = net.run([] { return KELPortable::tcpConnect("two", 80, 0, ""); });
//     EXPECT_THAT(net.log("connect"), ElementsAre("500 10.1.1.1:80", "501 10.1.1.1:80"));
//     net.forget(fd);
//
// Descriptors are numbers from 500 on, each given out once: closing one twice, using a closed one and
// leaving one open fail the test, as does an address list that is not released. Time is virtual.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_FAKE_NET_H
#define KEL_TESTS_OS_FAKE_NET_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netdb.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <deque>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "tests/os/thrown.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

union SocketAddress {
    sockaddr any;
    sockaddr_in v4;
    sockaddr_in6 v6;

    socklen_t size() const { return any.sa_family == AF_INET6 ? sizeof(v6) : sizeof(v4); }
};

// From "10.0.0.1:80" or "[::1]:80".
SocketAddress socket_address(const std::string& text);

// Back to such a text; a scope shows as in "[fe80::1%3]:80".
std::string to_text(const sockaddr* address);

class FakeNet {
public:
    // Puts the scripts into the seams. This machine then has the addresses 192.0.2.7 and 2001:db8::7.
    void install();
    // Fails the test when a descriptor or an address list is left.
    void check_balance() const;

    // From now on `host` has these addresses, in this order. Any other name is unknown.
    void resolve(const std::string& host, const std::vector<std::string>& addresses);

    // The errors of the calls to come, 0 for success. An empty queue answers with the last value that
    // it held; one that never held any answers 0.
    struct Errors {
        std::deque<int> queue;
        int last = 0;
        Errors& operator=(std::deque<int> errors);
        int next();
    };
    Errors sockets, connects, binds, listens, accepts, getsockopts, getsocknames, fcntls;

    // What waits for a pending connect answer: a result, and an error where that is -1.
    struct Wait {
        int result;
        int error;
    };
    std::deque<Wait> waits;

    int so_error = 0;                            // what getsockopt tells
    std::string local_address = "10.9.9.9:999";  // what getsockname tells
    std::uint32_t resolved_scope = 0;            // the scope of the IPv6 addresses that getaddrinfo finds
    int errno_after_close = 0;                   // set by close where it is not 0
    long long now_ms = 0;                        // the virtual clock
    std::vector<std::string> sleeps;             // each with its call: "sleep 1", "select 3.000000"

    // Runs `body` armed and returns its result.
    template <class Body>
    auto run(Body body) {
        Armed armed;
        return body();
    }

    // The arguments of every call of `name`, in order.
    std::vector<std::string> log(const std::string& name) const;
    // The names of the calls among `names`, in order.
    std::vector<std::string> order(const std::set<std::string>& names) const;

    // A socket that no test code closes is handed over to the caller here.
    int open_socket(int family = AF_INET);
    void forget(int fd);
    bool is_open(int fd) const { return _open.count(fd) != 0; }
    std::size_t open_count() const { return _open.size(); }
    std::size_t live_lists() const { return _lists.size(); }
    int flags(int fd) const { return _open.at(fd).flags; }

private:
    struct Socket {
        int family;
        int flags;
    };
    struct Call {
        std::string name;
        std::string arguments;
    };

    void script_sockets();
    void script_options();
    void script_waits();
    void script_resolver();
    void note(const char* name, const std::string& arguments) { _calls.push_back({name, arguments}); }
    Socket& known(int fd);
    int answer(Errors& errors);
    int wait_answer(long long limit_ms);

    std::map<int, Socket> _open;
    std::set<const addrinfo*> _lists;
    std::map<std::string, std::vector<std::string>> _hosts;
    std::vector<Call> _calls;
    int _next_fd = 500;
};

class FakeNetTest : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        net.install();
    }
    void TearDown() override {
        net.check_balance();
        FaultTest::TearDown();
    }

    FakeNet net;
};

}  // namespace test
}  // namespace kel

#endif
