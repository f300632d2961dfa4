// SPDX-License-Identifier: MIT
#include "tests/faults/soak/connections.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <kel/kel.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <new>

#include "tests/faults/soak/faults.h"
#include "tests/support/fault.h"

namespace kel {
namespace soak {

namespace {

const unsigned long nobody_waits = CORBA::OMGVMCID | EAGAIN;

// Resets the connection, so that neither end keeps its port for minutes.
void close_at_once(int fd) {
    const linger at_once = {1, 0};
    setsockopt(fd, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
    close(fd);
}

}  // namespace

// The listeners do not block: an accept that finds nobody fails, which tells that all were accepted.
Connections::Connections() : _listeners{{"127.0.0.1", -1, 0}, {"::1", -1, 0}} {
    for (Listener& listener : _listeners) {
        try {
            listener.fd = KELPortable::createTcpListenerSocket(listener.host, 0, 0);
            listener.port = static_cast<unsigned short>(KELPortable::saGetPort(listener.fd));
            fcntl(listener.fd, F_SETFL, fcntl(listener.fd, F_GETFL) | O_NONBLOCK);
        } catch (const CORBA_SystemException&) {
            listener = _listeners[0];  // a machine without this family
        }
    }
}

Connections::~Connections() {
    if (_listeners[1].fd != _listeners[0].fd) close(_listeners[1].fd);
    close(_listeners[0].fd);
}

void Connections::make_until(std::chrono::steady_clock::time_point end) {
    for (unsigned long n = 0; std::chrono::steady_clock::now() < end; ++n) make_one(n);
}

void Connections::make_one(unsigned long n) {
    KELPoll::defaultAPI(n % 2 == 0 ? KELPoll::API_POLL : KELPoll::API_SELECT);
    if (n % 32 == 0) plan_lost_memory();
    if (n % 64 == 0) listen_once();
    const Listener& listener = _listeners[n / 2 % 2];
    int fd = -1;
    try {
        fd = connect(listener, n);
    } catch (const CORBA_SystemException&) {
    } catch (const std::bad_alloc&) {
    }
    if (fd < 0) ++_figures.failed;
    accept_all(listener);
    if (fd < 0) return;
    check(listener, fd);
    close_at_once(fd);
    ++_figures.made;
}

// With and without a time-out, with and without a bind name, to a host and with a socket.
int Connections::connect(const Listener& listener, unsigned long n) {
    const unsigned long long timeout = n / 4 % 4 == 0 ? 0 : 2000;
    if (n % 8 == 7) return connect_socket(listener, timeout);
    const char* const bind_name = n % 16 == 1 ? listener.host : nullptr;
    test::Armed armed;
    return KELPortable::tcpConnect(listener.host, listener.port, timeout, bind_name);
}

// A connect that throws for lack of memory leaves the socket to its caller.
int Connections::connect_socket(const Listener& listener, unsigned long long timeout) {
    sockaddr_in6 address = {};
    socklen_t size = sizeof address;
    sockaddr* const any = reinterpret_cast<sockaddr*>(&address);
    getsockname(listener.fd, any, &size);
    int fd = socket(address.sin6_family, SOCK_STREAM, 0);
    int err = 0;
    try {
        test::Armed armed;
        KELPortable::tcpConnect(fd, err, any, static_cast<int>(size), timeout);
    } catch (const std::bad_alloc&) {
        close(fd);
        throw;
    }
    return fd;
}

void Connections::accept_all(const Listener& listener) {
    for (;;) {
        try {
            test::Armed armed;
            const int fd = KELPortable::socketAccept(listener.fd);
            test::Disarmed pause;
            close_at_once(fd);
            ++_figures.accepted;
        } catch (const CORBA_SystemException& failure) {
            if (failure.minor() == nobody_waits) return;
        }
    }
}

void Connections::check(const Listener& listener, int fd) {
    unsigned short port = 0;
    const CORBA_String_var peer(KELPortable::peer_addr(fd, port));
    // Once the other end was reset there is no peer any more.
    if (peer.in() != nullptr && std::strcmp(peer.in(), listener.host) != 0) ++_figures.wrong;
    if (KELPortable::saGetPort(fd) <= 0) ++_figures.wrong;
}

void Connections::listen_once() {
    try {
        test::Armed armed;
        const int fd = KELPortable::createTcpListenerSocket(_listeners[0].host, 0, 10);
        test::Disarmed pause;
        close(fd);
        ++_figures.listened;
    } catch (const CORBA_SystemException&) {
    } catch (const std::bad_alloc&) {
    }
}

}  // namespace soak
}  // namespace kel
