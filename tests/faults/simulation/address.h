// A socket address as bytes, read and changed by position. The oracle works on these and shares no
// code with the library.
//
//   Address    up to 28 bytes in the layout of sockaddr_in or sockaddr_in6
//
//     const Address peer = Address::v4(10, 1, 2, 3, 5000);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_ADDRESS_H
#define KEL_TESTS_FAULTS_SIMULATION_ADDRESS_H

#include <cstdint>
#include <cstring>

namespace kel {
namespace sim {

const int v4_family = 2;
const int v6_family = 10;

// The bytes of an IPv6 address, or of an IPv4 address in the first four.
struct Ip {
    std::uint8_t bytes[16];
};

inline Ip ip4(unsigned a, unsigned b, unsigned c, unsigned d) {
    Ip ip{};
    const unsigned parts[4] = {a, b, c, d};
    for (int i = 0; i < 4; ++i) ip.bytes[i] = static_cast<std::uint8_t>(parts[i]);
    return ip;
}

// Two bytes at the front and one at the end: enough for every address used here.
inline Ip ip6(unsigned first, unsigned last) {
    Ip ip{};
    ip.bytes[0] = static_cast<std::uint8_t>(first >> 8);
    ip.bytes[1] = static_cast<std::uint8_t>(first);
    ip.bytes[15] = static_cast<std::uint8_t>(last);
    return ip;
}

inline Ip mapped(const Ip& v4) {
    Ip ip{};
    ip.bytes[10] = ip.bytes[11] = 0xff;
    std::memcpy(ip.bytes + 12, v4.bytes, 4);
    return ip;
}

struct Address {
    std::uint8_t bytes[28];
    std::uint8_t size;  // how many of the bytes count

    static Address of(int family, const Ip& ip, unsigned port) {
        Address made{};
        made.size = family == v6_family ? 28 : 16;
        const std::uint16_t stored = static_cast<std::uint16_t>(family);
        std::memcpy(made.bytes, &stored, 2);
        made.port(port);
        made.ip(ip);
        return made;
    }

    int family() const {
        std::uint16_t stored;
        std::memcpy(&stored, bytes, 2);
        return stored;
    }

    unsigned port() const { return bytes[2] * 256u + bytes[3]; }
    void port(unsigned p) {
        bytes[2] = static_cast<std::uint8_t>(p >> 8);
        bytes[3] = static_cast<std::uint8_t>(p);
    }

    const std::uint8_t* ip() const { return bytes + (family() == v6_family ? 8 : 4); }
    void ip(const Ip& ip) { std::memcpy(bytes + (family() == v6_family ? 8 : 4), ip.bytes, ip_size()); }
    unsigned ip_size() const { return family() == v6_family ? 16 : 4; }

    std::uint32_t scope() const {
        std::uint32_t stored;
        std::memcpy(&stored, bytes + 24, 4);
        return stored;
    }
    void scope(std::uint32_t s) { std::memcpy(bytes + 24, &s, 4); }

    bool operator==(const Address& other) const {
        return size == other.size && std::memcmp(bytes, other.bytes, size) == 0;
    }
};

}  // namespace sim
}  // namespace kel

#endif
