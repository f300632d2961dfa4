// The system's calls as symbols of the program, to which the dynamic linker binds the library.
//
// SPDX-License-Identifier: MIT
#include "fuzz/fake_resolver.h"

#include <arpa/inet.h>
#include <netdb.h>

#include <cerrno>
#include <cstdlib>
#include <new>

#include "fuzz/target.h"

namespace kel {
namespace fuzz {

int asked_by_name = 0;
Socket the_socket;

namespace {

void learn_ipv4(Known& known, const char* text) {
    known.has_ipv4 = inet_pton(AF_INET, text, &known.ipv4) == 1;
}

void learn_ipv6(Known& known, const char* text) {
    known.ipv6.sin6_family = AF_INET6;
    known.has_ipv6 = inet_pton(AF_INET6, text, &known.ipv6.sin6_addr) == 1;
}

// A literal address, of which an IPv6 one may have a scope.
bool learn_literal(Known& known, const char* name) {
    learn_ipv4(known, name);
    if (known.has_ipv4) return true;
    char address[INET6_ADDRSTRLEN] = "";
    const std::size_t n = std::strcspn(name, "%");
    if (n >= sizeof address) return false;
    learn_ipv6(known, std::strncpy(address, name, n));
    if (name[n] == '%') known.ipv6.sin6_scope_id = static_cast<std::uint32_t>(std::strlen(name) - n);
    return known.has_ipv6;
}

}  // namespace

Known known_of(const char* name) {
    Known known = Known();
    if (learn_literal(known, name)) return known;
    switch (std::strcmp(name, own_name) == 0 ? 5 : name[0] & 7) {
        case 1:
            learn_ipv4(known, "192.0.2.1");
            break;
        case 2:
            learn_ipv6(known, "2001:db8::2");
            break;
        case 3:
            learn_ipv4(known, "255.255.255.255");
            learn_ipv6(known, "ff12::3");
            break;
        case 4:
            learn_ipv4(known, "192.0.2.4");
            known.tries_again = static_cast<int>(std::strlen(name) % 8);
            break;
        case 5:
            learn_ipv4(known, "192.0.2.5");
            learn_ipv6(known, "2001:db8::5");
            break;
        case 6:
            learn_ipv4(known, "127.0.0.1");
            learn_ipv6(known, "::1");
            break;
        case 7:
            learn_ipv6(known, "fe80::7");
            known.odd_entry = true;
            break;
    }
    return known;
}

namespace {

// One entry, with its address behind it in the same block, as the system makes them.
template <class Address>
addrinfo* new_entry(const Address& address, addrinfo* next) {
    auto* const entry = static_cast<addrinfo*>(std::calloc(1, sizeof(addrinfo) + sizeof address));
    KEL_REQUIRE(entry != nullptr);
    entry->ai_family = reinterpret_cast<const sockaddr&>(address).sa_family;
    entry->ai_addrlen = sizeof address;
    entry->ai_addr = static_cast<sockaddr*>(std::memcpy(entry + 1, &address, sizeof address));
    entry->ai_next = next;
    return entry;
}

int answer_address(void* address, socklen_t* size) {
    errno = the_socket.error;
    if (the_socket.error != 0) return -1;
    std::memcpy(address, the_socket.address, std::min(*size, the_socket.size));
    *size = the_socket.size;
    return 0;
}

// Lays out an entry of one address, or of none, in `buffer`.
void lay_out(hostent* entry, char* buffer, const Known& known, bool empty) {
    char** const lists = reinterpret_cast<char**>(buffer);
    char* const address = buffer + 2 * sizeof(char*);
    std::memcpy(address, &known.ipv4, sizeof known.ipv4);
    lists[0] = empty ? nullptr : address;
    lists[1] = nullptr;
    *entry = hostent();
    entry->h_name = const_cast<char*>(own_name);
    entry->h_aliases = lists + 1;
    entry->h_addrtype = known.odd_entry && !empty ? AF_INET6 : AF_INET;
    entry->h_length = sizeof known.ipv4;
    entry->h_addr_list = lists;
}

}  // namespace
}  // namespace fuzz
}  // namespace kel

using kel::fuzz::Known;
using kel::fuzz::the_socket;

// The assembler name gives the symbol without a second declaration of the system's function.
#define KEL_FAKE(result, name, parameters)                                                          \
    extern "C" __attribute__((visibility("default"))) result fake_##name parameters __asm__(#name); \
    extern "C" result fake_##name parameters

KEL_FAKE(int, gethostname, (char* name, std::size_t size)) {
    KEL_REQUIRE(size >= sizeof kel::fuzz::own_name);
    std::strcpy(name, kel::fuzz::own_name);
    return 0;
}

KEL_FAKE(int, gethostbyname_r,
         (const char* name, hostent* entry, char* buffer, std::size_t size, hostent** found, int* error)) {
    KEL_REQUIRE(size >= 64);
    *found = nullptr;
    const Known known = kel::fuzz::known_of(name);
    if (kel::fuzz::asked_by_name++ < known.tries_again) {
        *error = TRY_AGAIN;
        return EAGAIN;
    }
    if (!known.has_ipv4 && !known.odd_entry) {
        *error = HOST_NOT_FOUND;
        return 0;
    }
    kel::fuzz::lay_out(entry, buffer, known, known.odd_entry && std::strlen(name) % 2 != 0);
    *found = entry;
    return 0;
}

KEL_FAKE(int, getaddrinfo, (const char* host, const char* service, const addrinfo* hints, addrinfo** list)) {
    KEL_REQUIRE(hints->ai_socktype == SOCK_STREAM && hints->ai_flags == 0 && hints->ai_protocol == 0);
    const Known known = kel::fuzz::known_of(host);
    const std::uint16_t port = htons(static_cast<std::uint16_t>(service == nullptr ? 0 : std::atoi(service)));
    addrinfo* first = nullptr;
    if (known.has_ipv4 && hints->ai_family != AF_INET6) {
        sockaddr_in address = sockaddr_in();
        address.sin_family = AF_INET;
        address.sin_addr = known.ipv4;
        address.sin_port = port;
        first = kel::fuzz::new_entry(address, first);
    }
    if (known.has_ipv6 && hints->ai_family != AF_INET) {
        sockaddr_in6 address = known.ipv6;
        address.sin6_port = port;
        first = kel::fuzz::new_entry(address, first);
    }
    if (first == nullptr) return EAI_NONAME;
    *list = first;
    return 0;
}

KEL_FAKE(void, freeaddrinfo, (addrinfo * list)) {
    while (list != nullptr) {
        addrinfo* const next = list->ai_next;
        std::free(list);
        list = next;
    }
}

KEL_FAKE(unsigned, if_nametoindex, (const char* name)) {
    return kel::fuzz::index_of_interface(std::strlen(name));
}

KEL_FAKE(int, bind, (int fd, const sockaddr* address, socklen_t size)) {
    KEL_REQUIRE(size <= sizeof the_socket.bound);
    std::memcpy(the_socket.bound, address, size);
    the_socket.bound_size = size;
    the_socket.bound_fd = fd;
    errno = the_socket.error;
    return the_socket.error == 0 ? 0 : -1;
}

KEL_FAKE(int, getsockname, (int, sockaddr* address, socklen_t* size)) {
    return kel::fuzz::answer_address(address, size);
}

KEL_FAKE(int, getpeername, (int, sockaddr* address, socklen_t* size)) {
    return kel::fuzz::answer_address(address, size);
}

// No function under test makes a socket.
KEL_FAKE(int, socket, (int, int, int)) { kel::fuzz::broken("no socket is made", __FILE__, __LINE__); }
