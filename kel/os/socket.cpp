// SPDX-License-Identifier: MIT
#include <arpa/inet.h>
#include <errno.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/internal/owners.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>
#include <netinet/in.h>
#include <string.h>
#include <sys/socket.h>

#include <algorithm>
#include <string>

using kel::internal::AddressList;
using kel::internal::Descriptor;

// --- Errors ----------------------------------------------------------------------------------------

void KELPortable::socketError(int err, unsigned char transient) {
    const std::uint32_t minor = static_cast<std::uint32_t>(err);
    if (err == ENOMEM || err == EMFILE) throw CORBA_NO_RESOURCES(minor, CORBA::COMPLETED_NO);
    if (transient) throw CORBA_TRANSIENT(minor, CORBA::COMPLETED_NO);
    throw CORBA_COMM_FAILURE(minor, CORBA::COMPLETED_NO);
}

// --- Listening -------------------------------------------------------------------------------------

namespace {

const int listen_backlog = 1024;

// The last port to try. Port 0 asks the system for a port and has no range; a range ends at the last
// port there is. A sum that wraps lies below `port` and leaves no port to try.
std::uint32_t last_port(unsigned short port, unsigned long range) {
    if (port == 0) return 0;
    const std::uint32_t last = port + static_cast<std::uint32_t>(range);
    return std::min<std::uint32_t>(last, 65535);
}

// A socket of the first address of `host` that could be bound, on the first free port.
//
// Deliberate: it is not closed on exec; a server may hand its listeners to the programs it starts.
// Pinned by ListeningReal.ChildrenInheritTheListenerAndItsConnections.
Descriptor bound_socket(const char* host, unsigned short port, std::uint32_t last) {
    int err = 0;
    const AddressList list(Getaddrinfo(host, port, SOCK_STREAM, 0));
    for (addrinfo* node = list.get(); node != nullptr; node = node->ai_next) {
        Descriptor fd(socket(node->ai_family, SOCK_STREAM, 0));
        if (!fd.is_open()) {
            err = errno;
            continue;
        }
        KELSetLinkLocal(node);
        const int on = 1;
        setsockopt(fd.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on));
        for (std::uint32_t candidate = port; candidate <= last; ++candidate) {
            KELPortable::saSetPort(node->ai_addr, static_cast<int>(candidate));
            if (bind(fd.get(), node->ai_addr, node->ai_addrlen) == 0) return fd;
            err = errno;
        }
    }
    KELPortable::socketError(err, 0);
}

}  // namespace

int KELPortable::createTcpListenerSocket(const char* host, unsigned short port, unsigned long range) {
    Descriptor listener = bound_socket(host, port, last_port(port, range));
    if (listen(listener.get(), listen_backlog) != 0) {
        // Deliberate: the minor code is the errno that is left after the close. Pinned by
        // Listening.AFailedListenReportsTheErrnoReadAfterTheClose.
        listener.reset(-1);
        throw CORBA_COMM_FAILURE(static_cast<std::uint32_t>(errno), CORBA::COMPLETED_NO);
    }
    return listener.release();
}

// Deliberate: an interrupted accept is a failure. Pinned by Accepting.AnInterruptionIsNotRepeated.
int KELPortable::socketAccept(int fd) {
    sockaddr_in6 peer;
    socklen_t size = sizeof(peer);
    const int accepted = accept(fd, reinterpret_cast<sockaddr*>(&peer), &size);
    if (accepted < 0) socketError(errno, 0);
    return accepted;
}

// --- Bind name -------------------------------------------------------------------------------------

namespace {

[[noreturn]] void bind_name_error(const char* name, const char* cause) {
    const std::string text = std::string("client bind on [") + name + "] failed; " + cause;
    throw CORBA_BAD_PARAM(8, CORBA::COMPLETED_NO, text.c_str());
}

sockaddr_in6 ipv6_bind_address(const char* name) {
    sockaddr_in6 address = {};
    address.sin6_family = AF_INET6;
    if (inet_pton(AF_INET6, name, &address.sin6_addr) == 1) return address;

    addrinfo hints = {};
    hints.ai_family = AF_INET6;
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    const int rc = getaddrinfo(name, nullptr, &hints, &found);
    if (rc != 0) bind_name_error(name, "improper bind name for IPv6 socket.");
    const AddressList list(found);
    memcpy(&address, found->ai_addr, sizeof(address));
    return address;
}

sockaddr_in ipv4_bind_address(const char* name) {
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = inet_addr(name);
    if (address.sin_addr.s_addr != INADDR_NONE) return address;

    const CORBA_String_var text(KELPortable::ip_addr(name));
    if (text.in() == nullptr) bind_name_error(name, "improper bind name for IPv4 socket.");
    address.sin_addr.s_addr = inet_addr(text.in());
    return address;
}

void bind_to(int fd, const void* address, socklen_t size, const char* name) {
    const int rc = bind(fd, static_cast<const sockaddr*>(address), size);
    if (rc != 0) bind_name_error(name, strerror(errno));
}

}  // namespace

// Deliberate: a failure leaves the socket open; whoever made it closes it. Pinned by
// BindName.AFailureLeavesTheSocketOpen.
void KELSetBindName(int& fd, const char* bindName, int family) {
    if (bindName == nullptr || *bindName == '\0') return;
    if (family == AF_INET6) {
        const sockaddr_in6 address = ipv6_bind_address(bindName);
        bind_to(fd, &address, sizeof(address), bindName);
    } else {
        const sockaddr_in address = ipv4_bind_address(bindName);
        bind_to(fd, &address, sizeof(address), bindName);
    }
}
