// Sockets of the system for tests that want to see bytes travel: loopback and this machine only.
//
//   Descriptor            closes a descriptor at the end of the scope
//   Listener              a server on a port of the system's choice, made without the library
//   has_ipv6_loopback     whether ::1 can be bound here
//   read_text             what one read gives
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_LOOPBACK_H
#define KEL_TESTS_OS_LOOPBACK_H

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <string>

#include "tests/os/fake_net.h"

namespace kel {
namespace test {

class Descriptor {
public:
    explicit Descriptor(int fd) : _fd(fd) {}
    ~Descriptor() { close(_fd); }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;

    int fd() const { return _fd; }

private:
    int _fd;
};

// The address at which the system has bound `fd`, as "127.0.0.1:4711".
inline std::string bound_address(int fd) {
    SocketAddress address = {};
    socklen_t size = sizeof address;
    EXPECT_EQ(getsockname(fd, &address.any, &size), 0);
    return to_text(&address.any);
}

inline int bind_to(int fd, const std::string& host) {
    const std::string bracketed = host.find(':') == std::string::npos ? host : "[" + host + "]";
    const SocketAddress address = socket_address(bracketed + ":0");
    return bind(fd, &address.any, address.size());
}

class Listener {
public:
    // `host` is a literal address.
    explicit Listener(const std::string& host)
        : _socket(socket(host.find(':') == std::string::npos ? AF_INET : AF_INET6, SOCK_STREAM, 0)) {
        EXPECT_EQ(bind_to(fd(), host), 0) << host;
        EXPECT_EQ(listen(fd(), 8), 0);
    }

    int fd() const { return _socket.fd(); }
    unsigned short port() const {
        const std::string address = bound_address(fd());
        return static_cast<unsigned short>(std::stoi(address.substr(address.rfind(':') + 1)));
    }

private:
    Descriptor _socket;
};

inline bool has_ipv6_loopback() {
    const Descriptor probe(socket(AF_INET6, SOCK_STREAM, 0));
    return probe.fd() >= 0 && bind_to(probe.fd(), "::1") == 0;
}

inline std::string read_text(int fd) {
    char buffer[64];
    const ssize_t n = read(fd, buffer, sizeof buffer);
    return n < 0 ? "failed" : std::string(buffer, static_cast<std::size_t>(n));
}

}  // namespace test
}  // namespace kel

#endif
