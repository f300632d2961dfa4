// SPDX-License-Identifier: MIT
// A connection to a literal address with a time-out, over the loopback interface.
#include <arpa/inet.h>
#include <bench/support/bench.h>
#include <fcntl.h>
#include <kel/os/portable.h>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <string>

#ifdef KEL_BENCH_ACE
#include <ace/SOCK_Connector.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

const int time_out = 5000;

// One port that listens. Each connection is taken and closed again outside of the measured time; it
// is reset and not shut down, so that no port stays occupied behind it.
class Listener {
public:
    Listener() : _fd(socket(AF_INET, SOCK_STREAM, 0)) {
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof(address);
        if (bind(_fd, reinterpret_cast<sockaddr*>(&address), size) != 0 || listen(_fd, 16) != 0) std::abort();
        getsockname(_fd, reinterpret_cast<sockaddr*>(&address), &size);
    }
    ~Listener() { close(_fd); }

    void hang_up(int connected) const {
        const linger at_once = {1, 0};
        setsockopt(connected, SOL_SOCKET, SO_LINGER, &at_once, sizeof(at_once));
        close(connected);
        close(accept(_fd, nullptr, nullptr));
    }

    sockaddr_in address = {};
    unsigned short port() const { return ntohs(address.sin_port); }

private:
    int _fd;
};

bool finished_in_time(int fd, const sockaddr* address, socklen_t size) {
    fcntl(fd, F_SETFL, fcntl(fd, F_GETFL) | O_NONBLOCK);
    if (connect(fd, address, size) == 0) return true;
    if (errno != EINPROGRESS) return false;
    pollfd entry = {fd, POLLOUT, 0};
    if (poll(&entry, 1, time_out) != 1) return false;
    int error = 0;
    socklen_t error_size = sizeof(error);
    getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &error_size);
    return error == 0;
}

int connect_raw(const Listener& listener) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    if (!finished_in_time(fd, reinterpret_cast<const sockaddr*>(&listener.address),
                          sizeof(listener.address))) {
        std::abort();
    }
    return fd;
}

// What one writes by hand, for any host.
int connect_by_name(const Listener& listener) {
    addrinfo hints = {};
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (getaddrinfo("127.0.0.1", std::to_string(listener.port()).c_str(), &hints, &found) != 0) std::abort();
    const int fd = socket(found->ai_family, found->ai_socktype, found->ai_protocol);
    if (!finished_in_time(fd, found->ai_addr, found->ai_addrlen)) std::abort();
    freeaddrinfo(found);
    return fd;
}

int connect_kel(const Listener& listener) {
    return KELPortable::tcpConnect("127.0.0.1", listener.port(), time_out, nullptr);
}

#ifdef KEL_BENCH_ACE
int connect_ace(const Listener& listener) {
    ACE_SOCK_Stream stream;
    const ACE_Time_Value limit(time_out / 1000);
    if (ACE_SOCK_Connector().connect(stream, ACE_INET_Addr(listener.port(), "127.0.0.1"), &limit) != 0) {
        std::abort();
    }
    return stream.get_handle();
}
#endif

template <int (*connected)(const Listener&)>
void measure(benchmark::State& state) {
    const Listener listener;
    for (auto _ : state) {
        const int fd = connected(listener);
        state.PauseTiming();
        listener.hang_up(fd);
        state.ResumeTiming();
    }
}

const bool registered = [] {
    line("connect to a literal address", kLimit, measure<connect_raw>);
    line("connect to a literal address", "getaddrinfo + connect + poll", measure<connect_by_name>);
    line("connect to a literal address", kKel, measure<connect_kel>);
#ifdef KEL_BENCH_ACE
    line("connect to a literal address", "ACE_SOCK_Connector", measure<connect_ace>);
#endif
    return true;
}();

}  // namespace
