// SPDX-License-Identifier: MIT
#include <errno.h>
#include <fcntl.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/internal/owners.h>
#include <kel/os/poll.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>
#include <netinet/in.h>
#include <stddef.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <memory>

using kel::internal::AddressList;
using kel::internal::Descriptor;

// --- One socket ------------------------------------------------------------------------------------

namespace {

// The library's own minor codes begin at 0x4b450000; this one says that a connect took too long.
const std::uint32_t connect_timed_out = 0x4b450001;

// A socket address of either family, and what both have in common.
union SocketAddress {
    sockaddr_in6 v6;
    sockaddr_in v4;
    sockaddr any;
};

void close_and_forget(int& fd) {
    close(fd);
    fd = -1;
}

// Deliberate: nothing clears the flag again; whoever connects with a time-out gets a non-blocking
// socket. Pinned by Connect.WithATimeOutTheSocketStaysNonBlocking.
void make_non_blocking(int fd) {
    const int flags = fcntl(fd, F_GETFL, 0);
    if (flags != -1) fcntl(fd, F_SETFL, flags | O_NONBLOCK);
}

// Other threads may set the default at this moment.
KELPoll::SupportedAPIs default_api() {
    KELPoll::SupportedAPIs api;
    __atomic_load(&KELPoll::_defaultAPI, &api, __ATOMIC_RELAXED);
    return api;
}

// How the pending connect of `fd` ended, as its socket tells.
int pending_error(int fd) {
    int err = 0;
    socklen_t size = sizeof(err);
    if (getsockopt(fd, SOL_SOCKET, SO_ERROR, &err, &size) != 0) return ECONNREFUSED;
    return err;
}

// Waits for the pending connect of `fd` and returns its error. When the time is over `fd` is closed
// and set to -1, and TIMEOUT is thrown; without memory for the poller `fd` stays as it is.
//
// Deliberate: only the low 32 bits of the time-out count; a connect that is pending although it has
// no time-out is over at once; every interrupted wait starts again in full; a result other than 0, 1
// and -1 counts as connected. Pinned by Connect.TheTimeOutIsItsLowThirtyTwoBits,
// Connect.APendingConnectWithoutATimeOutTimesOutAtOnce, Connect.AnInterruptedWaitStartsAgainInFull
// and Connect.APollResultAboveOneCountsAsConnected.
int wait_until_connected(int& fd, unsigned long long timeout) {
    const std::unique_ptr<KELPoll> poller(KELPoll::create(1, default_api()));
    poller->add(fd, KELPoll::evMaskWrite, nullptr);
    const int ms = static_cast<std::int32_t>(static_cast<std::uint32_t>(timeout));
    int ready;
    do {
        ready = poller->_waitForEvents(ms);
    } while (ready < 0 && errno == EINTR);

    if (ready == -1) return errno;
    if (ready == 1) return pending_error(fd);
    if (ready != 0) return 0;
    close_and_forget(fd);
    throw CORBA_TIMEOUT(connect_timed_out, CORBA::COMPLETED_NO);
}

// A connect to a port of this machine's own ephemeral range on which nobody listens can meet itself:
// both ends of the connection are then the same socket.
//
// Deliberate: a socket whose own address is unknown counts as one that met itself. Pinned by
// Connect.AnUnknownLocalAddressCountsAsRefused.
bool is_connected_to_itself(int fd, const sockaddr* addr, int addrlen) {
    SocketAddress local = {};
    socklen_t size = sizeof(local.v6);
    if (getsockname(fd, &local.any, &size) != 0) return true;

    // Family and port come first. The address is behind them, in IPv6 behind a flow label that may differ.
    const char* const peer = reinterpret_cast<const char*>(addr);
    const int ipv4_size = offsetof(sockaddr_in, sin_zero);
    const int ipv6_size = offsetof(sockaddr_in6, sin6_scope_id);
    const int ipv6_start = offsetof(sockaddr_in6, sin6_addr);
    switch (local.any.sa_family) {
        case AF_INET:
            return addrlen >= ipv4_size && memcmp(&local, peer, ipv4_size) == 0;
        case AF_INET6:
            return addrlen >= ipv6_size && memcmp(&local, peer, offsetof(sockaddr_in6, sin6_flowinfo)) == 0 &&
                   memcmp(&local.v6.sin6_addr, peer + ipv6_start, sizeof(in6_addr)) == 0;
        default:
            return false;
    }
}

}  // namespace

// Deliberate: a failure closes the caller's socket, which cannot be connected again. Pinned by
// Connect.AFailedConnectClosesTheSocketAndReportsTheError.
void KELPortable::tcpConnect(int& fd, int& err, sockaddr* addr, int addrlen, unsigned long long timeout) {
    err = 0;
    if (timeout != 0) make_non_blocking(fd);
    if (connect(fd, addr, static_cast<socklen_t>(addrlen)) != 0) err = errno;
    if (err == EINPROGRESS || err == EAGAIN) {
        err = 0;  // what the caller sees when the wait throws
        err = wait_until_connected(fd, timeout);
    }
    if (err == 0 && is_connected_to_itself(fd, addr, addrlen)) err = ECONNREFUSED;
    if (err != 0) close_and_forget(fd);
}

// --- A host ----------------------------------------------------------------------------------------

namespace {

// Per address, while the system finds no free local port. Deliberate: the first attempt and sixteen
// more, without a pause. Pinned by HostConnect.AnAddressInUseIsTriedSeventeenTimes.
const int most_attempts_in_use = 17;

// What a refused address leaves to the next one.
struct BackOff {
    unsigned long long remaining;  // milliseconds; 0 connects without a time-out
    unsigned long long delay = 1;  // seconds until the next attempt
    bool first_refusal = true;
};

// Makes one attempt and returns its error. A failed attempt leaves `fd` closed.
int attempt(Descriptor& fd, addrinfo& node, const char* bind_name, unsigned long long timeout) {
    if (!fd.is_open()) {
        fd.reset(socket(node.ai_family, SOCK_STREAM, 0));
        if (!fd.is_open()) KELPortable::socketError(errno, 1);
    }
    KELSetBindName(fd.ref(), bind_name, node.ai_family);
    KELSetLinkLocal(&node);
    int err = 0;
    KELPortable::tcpConnect(fd.ref(), err, node.ai_addr, static_cast<int>(node.ai_addrlen), timeout);
    return err;
}

// Prepares a refused address for another attempt: at once after the first refusal, then after pauses
// that double. False when the time is used up.
bool wait_after_refusal(addrinfo& node, BackOff& back_off) {
    if (back_off.first_refusal) {
        // A server of this machine may listen on its outward address only.
        if (KELPortable::saIsLoopback(node.ai_addr)) KELPortable::saSetLocal(node.ai_addr);
        back_off.first_refusal = false;
        return true;
    }
    const unsigned long long pause = back_off.delay * 1000;
    if (back_off.remaining > pause) {
        back_off.remaining -= pause;
        KELPortable::vsleep(static_cast<unsigned long>(back_off.delay));
        back_off.delay *= 2;
        return true;
    }
    // Deliberate: with nothing left the addresses that follow are connected without a time-out, and
    // a connect without one ends here at its second refusal. Pinned by
    // HostConnect.AfterTheTimeIsUsedUpTheNextAddressHasNoTimeOut and
    // HostConnect.WithoutATimeOutTheSecondRefusalEndsTheAddress.
    KELPortable::sleep(static_cast<unsigned long>(back_off.remaining));
    back_off.remaining = 0;
    return false;
}

// Connects to one address, again and again while that may help; returns the last error.
//
// Deliberate: an interrupted connect is an error like any other and ends the address. Pinned by
// HostConnectError.EndsTheAddress.
int connect_node(Descriptor& fd, addrinfo& node, const char* bind_name, BackOff& back_off) {
    int in_use = 0;
    for (;;) {
        const int err = attempt(fd, node, bind_name, back_off.remaining);
        const bool again = (err == EADDRINUSE && ++in_use < most_attempts_in_use) ||
                           (err == ECONNREFUSED && wait_after_refusal(node, back_off));
        if (!again) return err;
    }
}

}  // namespace

// Deliberate: without a host the wildcard addresses are listed, which become loopback addresses here.
// Pinned by HostConnect.ANullHostIsThisMachine.
int KELPortable::tcpConnect(const char* host, unsigned short port, unsigned long long timeout,
                            const char* bindName) {
    const AddressList list(Getaddrinfo(host, port, SOCK_STREAM, 1));
    BackOff back_off = {timeout};
    int err = 0;
    for (addrinfo* node = list.get(); node != nullptr; node = node->ai_next) {
        Descriptor fd(socket(node->ai_family, SOCK_STREAM, 0));
        if (!fd.is_open()) {
            err = errno;
            continue;
        }
        if (isLocal(host)) saSetLoopback(node->ai_addr);
        err = connect_node(fd, *node, bindName, back_off);
        if (err == 0) return fd.release();
    }
    socketError(err, 1);
}
