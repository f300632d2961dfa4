// Lists of socket addresses, and the scope of link-local ones.
//
//   Getaddrinfo        the addresses of a host, or every address of this machine
//   Freeaddrinfo       releases a list
//   newAddrInfo        one "any address" entry
//   KELSetLinkLocal    gives a link-local address the interface it belongs to
//
//     addrinfo* list = Getaddrinfo("server", 2809, SOCK_STREAM, 1);
//     for (addrinfo* node = list; node; node = node->ai_next) KELSetLinkLocal(node);
//     Freeaddrinfo(list);
//
// Ports are in host order. Any thread; none of the functions keeps state. The functions that turn
// names into addresses and work on one socket address are those of KELPortable.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_ADDRESS_H
#define KEL_OS_ADDRESS_H

#include <kel/config.h>
#include <netdb.h>
#include <sys/socket.h>

// The addresses of `host` with the given port, in the system's order. A null or empty host gives the
// IPv6 and then the IPv4 "any" address. The caller releases the list with Freeaddrinfo. An unknown
// host throws TRANSIENT when `transient` is set, else COMM_FAILURE, with the resolver's code as minor.
KEL_API addrinfo* Getaddrinfo(const char* host, int port, int socktype, unsigned char transient);

// Releases a list of Getaddrinfo or an entry of newAddrInfo.
KEL_API void Freeaddrinfo(addrinfo* list);

// An entry with the "any" address of `family` and the given port; a family other than AF_INET and
// AF_INET6 has no address. The caller releases it with Freeaddrinfo.
KEL_API addrinfo* newAddrInfo(int family, int port, int socktype);

// Scopes the address of `ai` to the interface KELPortLibManager::ifname if it is a link-local IPv6
// address, unicast or multicast; leaves any other entry alone. The scope is 0 when there is no such
// interface.
KEL_API void KELSetLinkLocal(addrinfo* ai);

#endif
