// TCP sockets: listening over a range of ports, accepting, connecting.
//
//   KELPortable::createTcpListenerSocket   a bound, listening descriptor
//   KELPortable::socketAccept              the next connection of a listener
//   KELPortable::tcpConnect                a connected descriptor, with time-out and back-off
//   KELPortable::socketError               the exception that an errno value stands for
//   KELSetBindName                         the local address of a socket that is yet to connect
//
//     int server = KELPortable::createTcpListenerSocket("", 5000, 10);    // 5000 to 5010
//     int client = KELPortable::tcpConnect("host", 5000, 2000, "");       // 2,000 ms
//
// Descriptors belong to the caller, who closes them; children inherit them. Any thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_SOCKET_H
#define KEL_OS_SOCKET_H

#include <kel/config.h>
#include <kel/os/portable.h>

// Binds `fd` to the local address `bindName`: a host name or a literal address of `family`, without
// a port. Null and the empty text do nothing. BAD_PARAM, minor code 8, with the name and the cause
// as its reason when the name gives no address or the address cannot be bound; `fd` stays open.
KEL_API void KELSetBindName(int& fd, const char* bindName, int family);

#endif
