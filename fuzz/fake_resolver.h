// Answers the resolver and names the machine, in place of the system: nothing leaves the process.
//
//   own_name    the name of this machine
//   known_of    what the resolver knows of a name
//   Socket      what the calls that take a descriptor answer, and what bind was given
//
//     const Known known = known_of("localhost");
//     if (known.has_ipv4) ...
//
// A literal address stands for itself; an IPv6 one may carry "%scope". Of other names the first byte
// decides, so that a few bytes lead to every answer.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_FAKE_RESOLVER_H
#define KEL_FUZZ_FAKE_RESOLVER_H

#include <netinet/in.h>
#include <sys/socket.h>

#include <cstddef>

namespace kel {
namespace fuzz {

constexpr char own_name[] = "this-machine";

struct Known {
    bool has_ipv4;
    bool has_ipv6;
    in_addr ipv4;
    sockaddr_in6 ipv6;
    int tries_again;  // how often a look-up of the name for IPv4 is answered with "try again" first
    bool odd_entry;   // and then with an entry that has no IPv4 address
};

Known known_of(const char* name);

// How often the resolver was asked by name since this was last set to 0.
extern int asked_by_name;

// What if_nametoindex answers: the index follows from the name's length.
inline unsigned index_of_interface(std::size_t length) { return static_cast<unsigned>(1000 + length); }

struct Socket {
    int error;                  // what bind, getsockname and getpeername fail with; 0 when they do not
    unsigned char address[28];  // what the latter two give
    socklen_t size;

    unsigned char bound[28];  // what bind was given
    socklen_t bound_size;
    int bound_fd;
};
extern Socket the_socket;

}  // namespace fuzz
}  // namespace kel

#endif
