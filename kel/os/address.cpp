// SPDX-License-Identifier: MIT
#include <arpa/inet.h>
#include <kel/core/internal/digits.h>
#include <kel/core/portlib.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/internal/owners.h>
#include <kel/os/portable.h>
#include <net/if.h>
#include <netinet/in.h>

#include <cstdlib>
#include <cstring>
#include <new>

namespace {

// What a socket address of the family takes; 0 for a family that is not handled.
socklen_t size_of_address(int family) {
    if (family == AF_INET) return sizeof(sockaddr_in);
    if (family == AF_INET6) return sizeof(sockaddr_in6);
    return 0;
}

// `sa` as an address of the one family, or null when it is of another.
sockaddr_in* as_ipv4(sockaddr* sa) {
    return sa->sa_family == AF_INET ? reinterpret_cast<sockaddr_in*>(sa) : nullptr;
}

sockaddr_in6* as_ipv6(sockaddr* sa) {
    return sa->sa_family == AF_INET6 ? reinterpret_cast<sockaddr_in6*>(sa) : nullptr;
}

in_port_t* port_field(sockaddr* sa) {
    if (sockaddr_in* const ipv4 = as_ipv4(sa)) return &ipv4->sin_port;
    if (sockaddr_in6* const ipv6 = as_ipv6(sa)) return &ipv6->sin6_port;
    return nullptr;
}

// IPv6 comes first, so that a listener serves both families where the system lets it.
addrinfo* new_wildcard_list(int port, int socktype) {
    kel::internal::AddressList list(newAddrInfo(AF_INET6, port, socktype));
    list->ai_next = newAddrInfo(AF_INET, port, socktype);
    return list.release();
}

// fe80::/10, or a multicast address of link-local scope.
bool is_link_local(const in6_addr& address) {
    const unsigned char first = address.s6_addr[0];
    const unsigned char second = address.s6_addr[1];
    return (first == 0xfe && (second & 0xc0) == 0x80) || (first == 0xff && (second & 0x0f) == 0x02);
}

// The index of the interface that scopes link-local addresses, 0 when there is none. Clients may fill
// the name to its last byte, so it is ended in a copy.
unsigned scope_of_link_local() {
    char name[sizeof KELPortLibManager::ifname + 1] = "";
    std::memcpy(name, KELPortLibManager::ifname, sizeof KELPortLibManager::ifname);
    return if_nametoindex(name);
}

}  // namespace

addrinfo* Getaddrinfo(const char* host, int port, int socktype, unsigned char transient) {
    if (host == nullptr || *host == '\0') return new_wildcard_list(port, socktype);
    char service[kel::internal::longest_integer + 1];
    *kel::internal::show_integer(service, static_cast<unsigned>(port)) = '\0';
    addrinfo hints = addrinfo();
    hints.ai_family = AF_UNSPEC;
    hints.ai_socktype = socktype;
    addrinfo* list = nullptr;
    const int rc = getaddrinfo(host, service, &hints, &list);
    if (rc == 0) return list;
    // The resolver's codes are negative; a minor code holds their 32 bits.
    const auto minor_code = static_cast<std::uint32_t>(rc);
    if (transient) throw CORBA_TRANSIENT(minor_code, CORBA::COMPLETED_NO);
    throw CORBA_COMM_FAILURE(minor_code, CORBA::COMPLETED_NO);
}

void Freeaddrinfo(addrinfo* list) { freeaddrinfo(list); }

addrinfo* newAddrInfo(int family, int port, int socktype) {
    // The address lies in the block of its entry, as in the lists that the system makes, whose
    // freeaddrinfo releases these too.
    const socklen_t size = size_of_address(family);
    auto* const node = static_cast<addrinfo*>(std::calloc(1, sizeof(addrinfo) + size));
    if (node == nullptr) throw std::bad_alloc();
    node->ai_family = family;
    node->ai_socktype = socktype;
    if (size == 0) return node;
    node->ai_addrlen = size;
    node->ai_addr = reinterpret_cast<sockaddr*>(node + 1);
    node->ai_addr->sa_family = static_cast<sa_family_t>(family);
    KELPortable::saSetPort(node->ai_addr, port);
    return node;
}

void KELSetLinkLocal(addrinfo* ai) {
    if (ai->ai_family != AF_INET6) return;
    auto* const ipv6 = reinterpret_cast<sockaddr_in6*>(ai->ai_addr);
    if (is_link_local(ipv6->sin6_addr)) ipv6->sin6_scope_id = scope_of_link_local();
}

void KELPortable::saSetPort(sockaddr* sa, int port) {
    if (in_port_t* const field = port_field(sa)) *field = htons(static_cast<std::uint16_t>(port));
}

int KELPortable::saGetPort(sockaddr* sa) {
    const in_port_t* const field = port_field(sa);
    return field != nullptr ? ntohs(*field) : -1;
}

int KELPortable::saGetPort(int fd) {
    // A failed call leaves the zeros, which are no family and so have no port.
    sockaddr_in6 local = sockaddr_in6();
    socklen_t size = sizeof local;
    getsockname(fd, reinterpret_cast<sockaddr*>(&local), &size);
    return saGetPort(reinterpret_cast<sockaddr*>(&local));
}

bool KELPortable::saIsLoopback(sockaddr* sa) {
    // Deliberate: the rest of 127.0.0.0/8 is not loopback; a refused connection to such an address is
    // not tried again on the machine's own one. Pinned by SocketAddress.OnlyOneIPv4AddressIsLoopback.
    if (const sockaddr_in* const ipv4 = as_ipv4(sa)) return ipv4->sin_addr.s_addr == htonl(INADDR_LOOPBACK);
    if (const sockaddr_in6* const ipv6 = as_ipv6(sa)) return IN6_IS_ADDR_LOOPBACK(&ipv6->sin6_addr);
    return false;
}

void KELPortable::saSetLoopback(sockaddr* sa) {
    if (sockaddr_in* const ipv4 = as_ipv4(sa)) ipv4->sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (sockaddr_in6* const ipv6 = as_ipv6(sa)) ipv6->sin6_addr = in6addr_loopback;
}

void KELPortable::saSetWild(sockaddr* sa) {
    if (sockaddr_in* const ipv4 = as_ipv4(sa)) ipv4->sin_addr.s_addr = htonl(INADDR_ANY);
    if (sockaddr_in6* const ipv6 = as_ipv6(sa)) ipv6->sin6_addr = in6addr_any;
}

void KELPortable::saSetLocal(sockaddr* sa) {
    if (sockaddr_in* const ipv4 = as_ipv4(sa)) ipAddr(AF_INET, &ipv4->sin_addr, nullptr);
    if (sockaddr_in6* const ipv6 = as_ipv6(sa)) ipAddr(AF_INET6, &ipv6->sin6_addr, nullptr);
}
