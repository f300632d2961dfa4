// What both sides know of sockets that do not block.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_NONBLOCKING_H
#define NAMES_NONBLOCKING_H

#include <cerrno>

namespace names {

// Whether a transfer that failed with `error` may be tried again.
inline bool would_block(int error) { return error == EAGAIN || error == EWOULDBLOCK || error == EINTR; }

}  // namespace names

#endif
