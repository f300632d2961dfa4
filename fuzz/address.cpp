// Addresses and names as texts: every function that takes one gives what the resolver and the rules
// say, with literals, scopes, names of any kind and socket addresses of any family.
//
// SPDX-License-Identifier: MIT
#include <kel/core/portlib.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/portable.h>
#include <kel/os/socket.h>

#include <cerrno>
#include <cstdio>
#include <string>

#include "fuzz/address_model.h"
#include "fuzz/fake_resolver.h"
#include "fuzz/target.h"

namespace kel {
namespace fuzz {
namespace {

Guarded texts(largest_input);
Guarded addresses(sizeof(sockaddr_in6));

constexpr int families[] = {AF_INET, AF_INET6, AF_UNSPEC, AF_UNIX};

bool is(char* taken, const std::string& expected) {
    const CORBA_String_var text(taken);
    return text.in() == nullptr ? expected.empty() : expected == text.in();
}

// ---- names and literals ----

void check_texts(const char* host, int family) {
    asked_by_name = 0;
    KEL_REQUIRE(is(KELPortable::ip_addr(host), expect_ip_addr(host)));
    KEL_REQUIRE(asked_by_name <= 5);
    KEL_REQUIRE(is(KELPortable::ipAddr(family, host), expect_text(family, host)));
    int found = -1;
    char* const text = KELPortable::host2ip(found, host);
    KEL_REQUIRE(found == (!is_empty(host) && is_literal(AF_INET6, host) ? AF_INET6 : AF_INET));
    KEL_REQUIRE(is(text, expect_text(found, host)));
}

void check_bytes(const char* host, int family) {
    unsigned char expected[16];
    const std::size_t size = family == AF_INET6 ? 16 : 4;
    char* const address = addresses.block(size);
    const bool found = KELPortable::ipAddr(family, address, host);
    KEL_REQUIRE(found == expect_address(family, expected, host));
    KEL_REQUIRE(found ? std::memcmp(address, expected, size) == 0
                      : Guarded::untouched(address, address + size));
    KEL_REQUIRE(Guarded::untouched_before(address));
}

// IPv6 comes first, but for the literal of the other family.
void check_either_family(const char* host) {
    unsigned char expected[16];
    const bool ipv4 =
        (!is_empty(host) && is_literal(AF_INET, host)) || !expect_address(AF_INET6, expected, host);
    const bool known = ipv4 ? expect_address(AF_INET, expected, host) : true;
    char* const address = addresses.block(16);
    int size = -1;
    KEL_REQUIRE(KELPortable::ipAddr(address, size, host) == known && size == (ipv4 ? 4 : 16));
    KEL_REQUIRE(!known || std::memcmp(address, expected, static_cast<std::size_t>(size)) == 0);
}

bool expect_local(const char* host) {
    const std::string text = expect_ip_addr(host);
    return text == "127.0.0.1" || (!text.empty() && text == expect_ip_addr(nullptr));
}

void check_locality(const char* host) {
    asked_by_name = 0;
    KEL_REQUIRE(KELPortable::is_local(host) == expect_local(host));
    unsigned char address[16];
    unsigned char own[16];
    const bool by_ipv6 =
        expect_address(AF_INET6, address, host) && expect_address(AF_INET6, own, nullptr) &&
        (std::memcmp(address, &in6addr_loopback, 16) == 0 || std::memcmp(address, own, 16) == 0);
    asked_by_name = 0;
    KEL_REQUIRE(KELPortable::isLocal(host) == (is_empty(host) || expect_local(host) || by_ipv6));
    if (host == nullptr) return;
    KEL_REQUIRE(KELPortable::isValidIP(AF_INET, host) == is_literal(AF_INET, host));
    KEL_REQUIRE(KELPortable::isValidIP(AF_INET6, host) == is_literal(AF_INET6, host));
}

void check_ipv4_address(const char* host, std::uint16_t port) {
    auto* const address = reinterpret_cast<sockaddr_in*>(addresses.block(sizeof(sockaddr_in)));
    const bool local = !is_empty(host) && expect_local(host);
    in_addr expected = in_addr();
    bool known = true;
    if (local) {
        expected.s_addr = htonl(INADDR_LOOPBACK);
    } else if (!is_empty(host) && (expected.s_addr = inet_addr(host)) == INADDR_NONE) {
        // The question whether the host is local has used up the answers "try again", up to five.
        const Known k = known_of(host);
        known = k.has_ipv4 && k.tries_again <= 5;
        expected = k.ipv4;
    }
    asked_by_name = 0;
    try {
        KELPortable::convert(host, port, *address);
        KEL_REQUIRE(known && address->sin_family == 0 && address->sin_port == htons(port));
        KEL_REQUIRE(address->sin_addr.s_addr == expected.s_addr);
        std::uint16_t read_port = 0;
        KEL_REQUIRE(is(KELPortable::convert(*address, read_port), text_of(AF_INET, &expected)) &&
                    read_port == port);
    } catch (const CORBA_COMM_FAILURE&) {
        KEL_REQUIRE(!known);
    }
}

// ---- lists ----

bool is_link_local(const unsigned char* a) {
    return (a[0] == 0xfe && a[1] / 64 == 2) || (a[0] == 0xff && a[1] % 16 == 2);
}

void check_entry(addrinfo* entry, std::uint16_t port, std::size_t name_length) {
    KEL_REQUIRE(KELPortable::saGetPort(entry->ai_addr) == port);
    auto* const ipv6 = reinterpret_cast<sockaddr_in6*>(entry->ai_addr);
    if (entry->ai_family != AF_INET6) return KELSetLinkLocal(entry);
    const std::uint32_t before = ipv6->sin6_scope_id;
    KELSetLinkLocal(entry);
    const bool scoped = is_link_local(ipv6->sin6_addr.s6_addr);
    KEL_REQUIRE(ipv6->sin6_scope_id == (scoped ? index_of_interface(name_length) : before));
}

void check_list(const char* host, Bytes& input) {
    const std::uint16_t port = input.number<std::uint16_t>();
    const std::uint8_t choice = input.byte();
    char* const name = KELPortLibManager::ifname;
    const std::size_t length = choice % (sizeof KELPortLibManager::ifname + 1);
    std::memset(name, 0, sizeof KELPortLibManager::ifname);
    std::memset(name, 'n', length);  // to its last byte, as clients may
    const bool transient = choice >= 128;
    const Known known = is_empty(host) ? Known() : known_of(host);
    const int expected = is_empty(host) ? 2 : known.has_ipv4 + known.has_ipv6;
    std::uint32_t minor = 0;
    try {
        addrinfo* const list = Getaddrinfo(host, port, SOCK_STREAM, transient);
        int count = 0;
        for (addrinfo* entry = list; entry != nullptr; entry = entry->ai_next, ++count) {
            check_entry(entry, port, length);
        }
        Freeaddrinfo(list);
        KEL_REQUIRE(count == expected);
        return;
    } catch (const CORBA_TRANSIENT& e) {
        KEL_REQUIRE(transient);
        minor = static_cast<std::uint32_t>(e.minor());
    } catch (const CORBA_COMM_FAILURE& e) {
        KEL_REQUIRE(!transient);
        minor = static_cast<std::uint32_t>(e.minor());
    }
    KEL_REQUIRE(expected == 0 && minor == static_cast<std::uint32_t>(EAI_NONAME));
}

// ---- bind names ----

struct Bound {
    unsigned char address[sizeof(sockaddr_in6)];
    socklen_t size;  // 0 when the name gives no address
};

Bound expect_bound(const char* name, int family) {
    Bound bound = Bound();
    sockaddr_in6 ipv6 = known_of(name).ipv6;
    if (family == AF_INET6) {
        if (!known_of(name).has_ipv6) return bound;
        bound.size = sizeof ipv6;
        std::memcpy(bound.address, &ipv6, sizeof ipv6);
        return bound;
    }
    const std::string text = expect_ip_addr(name);
    if (text.empty()) return bound;
    sockaddr_in ipv4 = sockaddr_in();
    ipv4.sin_family = AF_INET;
    ipv4.sin_addr.s_addr = inet_addr(text.c_str());
    bound.size = sizeof ipv4;
    std::memcpy(bound.address, &ipv4, sizeof ipv4);
    return bound;
}

void check_bind_name(const char* name, int family, std::uint8_t choice) {
    const int errors[] = {0, 0, EADDRINUSE, EACCES};
    the_socket = Socket();
    the_socket.error = errors[choice % 4];
    int fd = 7;
    const Bound expected = is_empty(name) ? Bound() : expect_bound(name, family);
    asked_by_name = 0;
    std::string reason;
    try {
        KELSetBindName(fd, name, family);
    } catch (const CORBA_BAD_PARAM& e) {
        KEL_REQUIRE(e.minor() == (CORBA::OMGVMCID | 8));
        reason = e.reason();
    }
    KEL_REQUIRE(fd == 7 && the_socket.bound_size == expected.size);
    KEL_REQUIRE(std::memcmp(the_socket.bound, expected.address, sizeof expected.address) == 0);
    if (is_empty(name) || (expected.size != 0 && the_socket.error == 0)) return KEL_REQUIRE(reason.empty());
    std::string cause = strerror(the_socket.error);
    if (expected.size == 0) {
        cause = family == AF_INET6 ? "improper bind name for IPv6 socket."
                                   : "improper bind name for IPv4 socket.";
    }
    KEL_REQUIRE(reason == std::string("client bind on [") + name + "] failed; " + cause);
}

// ---- socket addresses ----

// An address of the size that its family has; of a foreign one the family alone can be looked at.
void check_socket_address(int family, Bytes& input) {
    const std::size_t size = family == AF_INET    ? sizeof(sockaddr_in)
                             : family == AF_INET6 ? sizeof(sockaddr_in6)
                                                  : 2;
    char* const start = addresses.block(size);
    for (std::size_t i = 0; i < size; ++i) start[i] = static_cast<char>(input.byte());
    auto* const address = reinterpret_cast<sockaddr*>(start);
    address->sa_family = static_cast<sa_family_t>(family);
    const bool handled = size != 2;
    const std::uint16_t port = input.number<std::uint16_t>();
    KELPortable::saSetPort(address, port);
    KEL_REQUIRE(KELPortable::saGetPort(address) == (handled ? port : -1));
    KELPortable::saSetWild(address);
    KEL_REQUIRE(!KELPortable::saIsLoopback(address));
    KELPortable::saSetLoopback(address);
    KEL_REQUIRE(KELPortable::saIsLoopback(address) == handled);
    KELPortable::saSetLocal(address);
    const char* const bytes = start + (family == AF_INET ? 4 : 8);
    KEL_REQUIRE(!handled || text_of(family, bytes) == expect_text(family, nullptr));
    KEL_REQUIRE(Guarded::untouched_before(start) && address->sa_family == family);
}

// What the system says of a descriptor.
void check_descriptor(int family, Bytes& input) {
    the_socket = Socket();
    the_socket.error = input.byte() % 8 == 1 ? ENOTCONN : 0;
    the_socket.size = sizeof the_socket.address;
    for (unsigned char& c : the_socket.address) c = input.byte();
    reinterpret_cast<sockaddr*>(the_socket.address)->sa_family = static_cast<sa_family_t>(family);
    const bool handled = the_socket.error == 0 && (family == AF_INET || family == AF_INET6);
    const int port = the_socket.address[2] * 256 + the_socket.address[3];
    KEL_REQUIRE(KELPortable::saGetPort(7) == (handled ? port : -1));
    unsigned short unwritten = 1;
    const char* const text = handled ? text_of(family, the_socket.address + (family == AF_INET ? 4 : 8)) : "";
    KEL_REQUIRE(is(KELPortable::peer_addr(7, unwritten), text) && unwritten == 1);
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kel::fuzz;
    if (size > largest_input) return 0;
    Bytes input(data, size);
    const std::uint8_t choice = input.byte();
    const int family = families[choice >> 4 & 3];
    const char* const host = choice < 250 ? texts.text(input.text()) : nullptr;
    switch (choice % 8) {
        case 0:
            check_texts(host, family);
            break;
        case 1:
            check_bytes(host, family);
            break;
        case 2:
            check_either_family(host);
            break;
        case 3:
            check_locality(host);
            break;
        case 4:
            check_ipv4_address(host, input.number<std::uint16_t>());
            break;
        case 5:
            check_list(host, input);
            break;
        case 6:
            check_bind_name(host, choice >= 128 ? AF_INET6 : AF_INET, input.byte());
            break;
        default:
            check_socket_address(family, input);
            check_descriptor(family, input);
    }
    return 0;
}
