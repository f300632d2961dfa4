// What the address functions must give for a name, by the rules and by what the resolver knows.
//
//   expect_ip_addr   the IPv4 address of a host as text
//   expect_address   its address in a family, as bytes
//   expect_text      its address in a family, as text
//
// A null or empty host is this machine; an empty text is no address.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_FUZZ_ADDRESS_MODEL_H
#define KEL_FUZZ_ADDRESS_MODEL_H

#include <arpa/inet.h>

#include <cstring>
#include <string>

#include "fuzz/fake_resolver.h"

namespace kel {
namespace fuzz {

inline bool is_empty(const char* host) { return host == nullptr || *host == '\0'; }

inline bool is_literal(int family, const char* text) {
    unsigned char address[16];
    return inet_pton(family, text, address) == 1;
}

// A text in the family's form, in a buffer that the next call overwrites.
inline const char* text_of(int family, const void* address) {
    static char text[INET6_ADDRSTRLEN];
    return inet_ntop(family, address, text, sizeof text);
}

// The address of a name for which the resolver is asked up to `tries` times; null when it has none.
inline const char* expect_look_up(const char* host, int tries) {
    const Known known = known_of(host);
    return known.has_ipv4 && known.tries_again < tries ? text_of(AF_INET, &known.ipv4) : nullptr;
}

inline std::string expect_ip_addr(const char* host) {
    if (is_empty(host)) host = own_name;
    if (inet_addr(host) != INADDR_NONE) return host;
    const char* const found = expect_look_up(host, 5);
    return found == nullptr ? "" : found;
}

inline bool expect_address(int family, unsigned char* address, const char* host) {
    if (is_empty(host)) host = own_name;
    if (inet_pton(family, host, address) == 1) return true;
    if (family == AF_INET6 && is_literal(AF_INET, host)) {
        std::memset(address, 0, 10);
        std::memset(address + 10, 0xff, 2);
        return inet_pton(AF_INET, host, address + 12) == 1;
    }
    const Known known = known_of(host);
    if (family == AF_INET && known.has_ipv4) std::memcpy(address, &known.ipv4, sizeof known.ipv4);
    if (family == AF_INET6 && known.has_ipv6) std::memcpy(address, &known.ipv6.sin6_addr, 16);
    return (family == AF_INET && known.has_ipv4) || (family == AF_INET6 && known.has_ipv6);
}

// Empty for none.
inline std::string expect_text(int family, const char* host) {
    unsigned char address[16];
    if (!is_empty(host) && is_literal(family, host)) return host;
    if (expect_address(family, address, host)) return text_of(family, address);
    return family == AF_INET ? expect_ip_addr(nullptr) : "";
}

}  // namespace fuzz
}  // namespace kel

#endif
