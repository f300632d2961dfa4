// Address lists, the scope of link-local addresses and what is read from and written to a sockaddr.
//
// SPDX-License-Identifier: MIT
#include <arpa/inet.h>
#include <kel/core/portlib.h>
#include <kel/exceptions/standard.h>
#include <kel/os/address.h>
#include <kel/os/portable.h>
#include <netinet/in.h>
#include <unistd.h>

#include <cstring>
#include <iostream>
#include <new>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/support/child.h"
#include "tests/support/failing_calloc.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class AddressList : public FaultTest {};
class LinkLocal : public FaultTest {};
class SocketAddress : public FaultTest {};

// A socket address of either family; 28 bytes.
union AnyAddress {
    sockaddr any;
    sockaddr_in ipv4;
    sockaddr_in6 ipv6;
};

AnyAddress address_of(int family, const char* text) {
    AnyAddress address;
    std::memset(&address, 0, sizeof address);
    address.any.sa_family = static_cast<sa_family_t>(family);
    if (family == AF_INET) inet_pton(family, text, &address.ipv4.sin_addr);
    if (family == AF_INET6) inet_pton(family, text, &address.ipv6.sin6_addr);
    return address;
}

std::string text_of(const AnyAddress& address) {
    const bool is_ipv4 = address.any.sa_family == AF_INET;
    const void* const bytes =
        is_ipv4 ? static_cast<const void*>(&address.ipv4.sin_addr) : &address.ipv6.sin6_addr;
    char text[INET6_ADDRSTRLEN];
    return inet_ntop(address.any.sa_family, bytes, text, sizeof text);
}

bool same_bytes(const AnyAddress& a, const AnyAddress& b) { return std::memcmp(&a, &b, sizeof a) == 0; }

// A family that is not handled, with every other byte set.
AnyAddress foreign_address() {
    AnyAddress address;
    std::memset(&address, 0x5a, sizeof address);
    address.any.sa_family = AF_UNIX;
    return address;
}

// --- Lists ------------------------------------------------------------------------------------

void expect_wildcard(const addrinfo* node, int family, socklen_t size, int port, int socktype) {
    ASSERT_NE(node, nullptr);
    EXPECT_EQ(node->ai_family, family);
    EXPECT_EQ(node->ai_socktype, socktype);
    EXPECT_EQ(node->ai_addrlen, size);
    EXPECT_EQ(node->ai_flags, 0);
    EXPECT_EQ(node->ai_protocol, 0);
    EXPECT_EQ(node->ai_canonname, nullptr);
    ASSERT_NE(node->ai_addr, nullptr);
    AnyAddress expected = address_of(family, family == AF_INET ? "0.0.0.0" : "::");
    (family == AF_INET ? expected.ipv4.sin_port : expected.ipv6.sin6_port) =
        htons(static_cast<std::uint16_t>(port));
    EXPECT_EQ(std::memcmp(node->ai_addr, &expected, size), 0);
}

TEST_F(AddressList, WithoutAHostIsTheIPv6AndThenTheIPv4Wildcard) {
    for (const char* host : {static_cast<const char*>(nullptr), ""}) {
        Armed armed;
        addrinfo* const list = Getaddrinfo(host, 8000, SOCK_STREAM, 0);
        expect_wildcard(list, AF_INET6, 28, 8000, SOCK_STREAM);
        expect_wildcard(list->ai_next, AF_INET, 16, 8000, SOCK_STREAM);
        EXPECT_EQ(list->ai_next->ai_next, nullptr);
        EXPECT_EQ(seams::getaddrinfo.calls(), 0);
        Freeaddrinfo(list);
    }
}

TEST_F(AddressList, WithoutAHostHasTheSocketTypeInBothEntries) {
    addrinfo* const list = Getaddrinfo(nullptr, 0, SOCK_DGRAM, 1);
    EXPECT_EQ(list->ai_socktype, SOCK_DGRAM);
    EXPECT_EQ(list->ai_next->ai_socktype, SOCK_DGRAM);
    Freeaddrinfo(list);
}

TEST_F(AddressList, OfAHostIsAskedForWithThePortAsTextAndTheTypeAlone) {
    addrinfo second = addrinfo();
    addrinfo first = addrinfo();
    first.ai_next = &second;
    seams::getaddrinfo.script(
        [&](const char* host, const char* service, const addrinfo* hints, addrinfo** list) {
            addrinfo expected = addrinfo();
            expected.ai_socktype = SOCK_STREAM;
            EXPECT_STREQ(host, "somewhere");
            EXPECT_STREQ(service, "8000");
            EXPECT_EQ(hints->ai_family, 0);
            EXPECT_EQ(std::memcmp(hints, &expected, sizeof expected), 0);
            *list = &first;
            return 0;
        });
    Armed armed;
    EXPECT_EQ(Getaddrinfo("somewhere", 8000, SOCK_STREAM, 1), &first);
    EXPECT_EQ(first.ai_next, &second);
}

TEST_F(AddressList, WritesThePortAsAnUnsignedNumber) {
    std::string text;
    seams::getaddrinfo.script([&](const char*, const char* service, const addrinfo*, addrinfo** list) {
        text = service;
        *list = nullptr;
        return 0;
    });
    Armed armed;
    Getaddrinfo("somewhere", -1, SOCK_STREAM, 1);
    EXPECT_EQ(text, "4294967295");
}

TEST_F(AddressList, OfAnUnknownHostIsTransientWithTheResolversCode) {
    seams::getaddrinfo.fail(1, EAI_NONAME);
    Armed armed;
    try {
        Getaddrinfo("nowhere", 80, SOCK_STREAM, 1);
        FAIL();
    } catch (const CORBA_TRANSIENT& e) {
        EXPECT_EQ(e.minor(), 0xfffffffeUL);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
    }
}

TEST_F(AddressList, OfAnUnknownHostIsACommunicationFailureWithTheResolversCode) {
    seams::getaddrinfo.fail(1, EAI_AGAIN);
    Armed armed;
    try {
        Getaddrinfo("nowhere", 80, SOCK_STREAM, 0);
        FAIL();
    } catch (const CORBA_COMM_FAILURE& e) {
        EXPECT_EQ(e.minor(), 0xfffffffdUL);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
    }
}

TEST_F(AddressList, OfAnUnknownHostPutsASmallCodeIntoTheCommonSetOfMinorCodes) {
    seams::getaddrinfo.fail(1, 5);
    Armed armed;
    try {
        Getaddrinfo("nowhere", 80, SOCK_STREAM, 1);
        FAIL();
    } catch (const CORBA_TRANSIENT& e) {
        EXPECT_EQ(e.minor(), 0x4f4d0005UL);
    }
}

TEST_F(AddressList, WithoutAHostReleasesTheFirstEntryWhenThereIsNoMemoryForTheSecond) {
    seams::freeaddrinfo.script([](addrinfo* list) {
        EXPECT_EQ(list->ai_family, AF_INET6);
        EXPECT_EQ(list->ai_next, nullptr);
        seams::freeaddrinfo.real(list);
    });
    const FailingCalloc second(2);
    Armed armed;
    EXPECT_THROW(Getaddrinfo(nullptr, 80, SOCK_STREAM, 1), std::bad_alloc);
    EXPECT_EQ(second.calls(), 2);
    EXPECT_EQ(seams::freeaddrinfo.calls(), 1);
}

TEST_F(AddressList, WithoutAHostReleasesNothingWhenThereIsNoMemoryAtAll) {
    const FailingCalloc first(1);
    Armed armed;
    EXPECT_THROW(Getaddrinfo("", 80, SOCK_STREAM, 0), std::bad_alloc);
    EXPECT_EQ(first.calls(), 1);
    EXPECT_EQ(seams::freeaddrinfo.calls(), 0);
}

TEST_F(AddressList, OfOneWildcardHasItsFamilysSize) {
    addrinfo* const ipv6 = newAddrInfo(AF_INET6, 1234, SOCK_STREAM);
    addrinfo* const ipv4 = newAddrInfo(AF_INET, 65535, SOCK_DGRAM);
    expect_wildcard(ipv6, AF_INET6, 28, 1234, SOCK_STREAM);
    expect_wildcard(ipv4, AF_INET, 16, 65535, SOCK_DGRAM);
    EXPECT_EQ(ipv6->ai_next, nullptr);
    EXPECT_EQ(ipv4->ai_next, nullptr);
    Freeaddrinfo(ipv6);
    Freeaddrinfo(ipv4);
}

TEST_F(AddressList, OfAForeignFamilyHasNoAddress) {
    addrinfo* const node = newAddrInfo(AF_UNIX, 1234, SOCK_STREAM);
    EXPECT_EQ(node->ai_family, AF_UNIX);
    EXPECT_EQ(node->ai_socktype, SOCK_STREAM);
    EXPECT_EQ(node->ai_addr, nullptr);
    EXPECT_EQ(node->ai_addrlen, 0u);
    Freeaddrinfo(node);
}

TEST_F(AddressList, IsReleasedByTheSystem) {
    addrinfo* const list = Getaddrinfo(nullptr, 80, SOCK_STREAM, 0);
    addrinfo* released = nullptr;
    seams::freeaddrinfo.script([&](addrinfo* asked) {
        released = asked;
        seams::freeaddrinfo.real(asked);
    });
    Armed armed;
    Freeaddrinfo(list);
    EXPECT_EQ(released, list);
    EXPECT_EQ(seams::freeaddrinfo.calls(), 1);
}

// --- Link-local scope -------------------------------------------------------------------------

// The scope that an address has afterwards, with interface 7 there and scope 99 before.
std::uint32_t scope_of(const char* text) {
    seams::if_nametoindex.script([](const char*) { return 7u; });
    AnyAddress address = address_of(AF_INET6, text);
    address.ipv6.sin6_scope_id = 99;
    addrinfo node = addrinfo();
    node.ai_family = AF_INET6;
    node.ai_addr = &address.any;
    Armed armed;
    KELSetLinkLocal(&node);
    return address.ipv6.sin6_scope_id;
}

TEST_F(LinkLocal, AddressesGetTheScopeOfTheInterface) {
    for (const char* text : {"fe80::1", "febf::1", "ff02::1", "ff12::1", "fff2::1"})
        EXPECT_EQ(scope_of(text), 7u) << text;
}

TEST_F(LinkLocal, NoOtherAddressIsChanged) {
    for (const char* text :
         {"ff05::1", "2001:db8::1", "fe7f::1", "fec0::1", "ff01::1", "fd80::1", "fe02::1", "::1", "::"}) {
        EXPECT_EQ(scope_of(text), 99u) << text;
    }
    EXPECT_EQ(seams::if_nametoindex.calls(), 0);
}

TEST_F(LinkLocal, AnotherFamilyIsLeftAlone) {
    AnyAddress address = address_of(AF_INET, "169.254.0.1");
    const AnyAddress before = address;
    addrinfo node = addrinfo();
    node.ai_family = AF_INET;
    node.ai_addr = &address.any;
    KELSetLinkLocal(&node);
    EXPECT_TRUE(same_bytes(address, before));
    addrinfo* const foreign = newAddrInfo(AF_UNIX, 0, SOCK_STREAM);
    KELSetLinkLocal(foreign);
    Freeaddrinfo(foreign);
}

TEST_F(LinkLocal, OnlyTheGivenEntryIsChanged) {
    AnyAddress address = address_of(AF_INET6, "fe80::1");
    AnyAddress next_address = address;
    addrinfo next = addrinfo();
    next.ai_family = AF_INET6;
    next.ai_addr = &next_address.any;
    addrinfo node = next;
    node.ai_addr = &address.any;
    node.ai_next = &next;
    seams::if_nametoindex.script([](const char*) { return 7u; });
    Armed armed;
    KELSetLinkLocal(&node);
    EXPECT_EQ(address.ipv6.sin6_scope_id, 7u);
    EXPECT_EQ(next_address.ipv6.sin6_scope_id, 0u);
}

TEST_F(LinkLocal, OfAMissingInterfaceIsZero) {
    AnyAddress address = address_of(AF_INET6, "fe80::1");
    address.ipv6.sin6_scope_id = 99;
    addrinfo node = addrinfo();
    node.ai_family = AF_INET6;
    node.ai_addr = &address.any;
    seams::if_nametoindex.script([](const char*) { return 0u; });
    Armed armed;
    KELSetLinkLocal(&node);
    EXPECT_EQ(address.ipv6.sin6_scope_id, 0u);
}

// The interface asked for when `name` is configured.
std::string interface_asked_for(const std::string& name) {
    char before[sizeof KELPortLibManager::ifname];
    std::memcpy(before, KELPortLibManager::ifname, sizeof before);
    std::memset(KELPortLibManager::ifname, 0, sizeof before);
    std::memcpy(KELPortLibManager::ifname, name.data(), name.size());
    std::string asked;
    seams::if_nametoindex.script([&](const char* interface) {
        asked = interface;
        return 1u;
    });
    AnyAddress address = address_of(AF_INET6, "fe80::1");
    addrinfo node = addrinfo();
    node.ai_family = AF_INET6;
    node.ai_addr = &address.any;
    {
        Armed armed;
        KELSetLinkLocal(&node);
    }
    std::memcpy(KELPortLibManager::ifname, before, sizeof before);
    return asked;
}

TEST_F(LinkLocal, ScopeIsThatOfTheConfiguredInterface) {
    EXPECT_EQ(interface_asked_for("eth0"), "eth0");
    EXPECT_EQ(interface_asked_for("lo"), "lo");
}

TEST_F(LinkLocal, AnInterfaceNameWithoutAnEndIsEnded) {
    EXPECT_EQ(interface_asked_for(std::string(80, 'x')), std::string(80, 'x'));
}

// --- Socket addresses -------------------------------------------------------------------------

TEST_F(SocketAddress, HoldsThePortInNetworkOrder) {
    for (const int family : {AF_INET, AF_INET6}) {
        AnyAddress address = address_of(family, family == AF_INET ? "192.0.2.1" : "2001:db8::1");
        const AnyAddress before = address;
        KELPortable::saSetPort(&address.any, 0x1234);
        EXPECT_EQ(KELPortable::saGetPort(&address.any), 0x1234);
        const auto* const bytes = reinterpret_cast<const unsigned char*>(&address);
        EXPECT_EQ(bytes[2], 0x12);
        EXPECT_EQ(bytes[3], 0x34);
        AnyAddress port_taken_out = address;
        port_taken_out.ipv4.sin_port = 0;
        EXPECT_TRUE(same_bytes(port_taken_out, before));
    }
}

TEST_F(SocketAddress, HasNoPortInAForeignFamily) {
    AnyAddress address = foreign_address();
    KELPortable::saSetPort(&address.any, 0x1234);
    EXPECT_TRUE(same_bytes(address, foreign_address()));
    EXPECT_EQ(KELPortable::saGetPort(&address.any), -1);
}

TEST_F(SocketAddress, PortsAboveTheSignedRangeStayPositive) {
    AnyAddress address = address_of(AF_INET, "0.0.0.0");
    KELPortable::saSetPort(&address.any, 65535);
    EXPECT_EQ(KELPortable::saGetPort(&address.any), 65535);
}

TEST_F(SocketAddress, OfADescriptorIsAskedForIntoTwentyEightZeroBytes) {
    seams::getsockname.script([](int fd, sockaddr* address, socklen_t* size) {
        const AnyAddress zero = {};
        EXPECT_EQ(fd, 17);
        EXPECT_EQ(*size, 28u);
        EXPECT_EQ(std::memcmp(address, &zero, 28), 0);
        address->sa_family = AF_INET6;
        KELPortable::saSetPort(address, 4711);
        return 0;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::saGetPort(17), 4711);
}

TEST_F(SocketAddress, OfADescriptorIsReadWhateverTheCallReturned) {
    seams::getsockname.script([](int, sockaddr* address, socklen_t*) {
        address->sa_family = AF_INET;
        KELPortable::saSetPort(address, 4711);
        return -1;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::saGetPort(17), 4711);
}

TEST_F(SocketAddress, OfABadDescriptorHasNoPort) { EXPECT_EQ(KELPortable::saGetPort(-1), -1); }

TEST_F(SocketAddress, OfABoundSocketHasThePortThatTheSystemChose) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    AnyAddress address = address_of(AF_INET, "127.0.0.1");
    ASSERT_EQ(bind(fd, &address.any, sizeof address.ipv4), 0);
    EXPECT_GT(KELPortable::saGetPort(fd), 0);
    close(fd);
}

bool is_loopback(int family, const char* text) {
    AnyAddress address = address_of(family, text);
    return KELPortable::saIsLoopback(&address.any);
}

TEST_F(SocketAddress, OnlyOneIPv4AddressIsLoopback) {
    EXPECT_TRUE(is_loopback(AF_INET, "127.0.0.1"));
    EXPECT_FALSE(is_loopback(AF_INET, "127.0.0.2"));
    EXPECT_FALSE(is_loopback(AF_INET, "127.1.0.1"));
    EXPECT_FALSE(is_loopback(AF_INET, "0.0.0.0"));
    EXPECT_FALSE(is_loopback(AF_INET, "1.0.0.127"));
}

TEST_F(SocketAddress, OnlyOneIPv6AddressIsLoopback) {
    EXPECT_TRUE(is_loopback(AF_INET6, "::1"));
    EXPECT_FALSE(is_loopback(AF_INET6, "::"));
    EXPECT_FALSE(is_loopback(AF_INET6, "::2"));
    EXPECT_FALSE(is_loopback(AF_INET6, "0:0:0:0:1::1"));
    EXPECT_FALSE(is_loopback(AF_INET6, "0:0:1::1"));
    EXPECT_FALSE(is_loopback(AF_INET6, "1::1"));
    EXPECT_FALSE(is_loopback(AF_INET6, "::ffff:127.0.0.1"));
}

TEST_F(SocketAddress, OfAForeignFamilyIsNoLoopback) {
    AnyAddress address = foreign_address();
    EXPECT_FALSE(KELPortable::saIsLoopback(&address.any));
    address = address_of(AF_INET6, "::1");
    address.any.sa_family = AF_UNIX;
    EXPECT_FALSE(KELPortable::saIsLoopback(&address.any));
}

// What an address of `family` is after `set`; nothing but the address may change.
std::string set_by(void (*set)(sockaddr*), int family) {
    AnyAddress address;
    std::memset(&address, 0x5a, sizeof address);
    address.any.sa_family = static_cast<sa_family_t>(family);
    const AnyAddress before = address;
    set(&address.any);
    AnyAddress put_back = address;
    if (family == AF_INET) put_back.ipv4.sin_addr = before.ipv4.sin_addr;
    if (family == AF_INET6) put_back.ipv6.sin6_addr = before.ipv6.sin6_addr;
    EXPECT_TRUE(same_bytes(put_back, before));
    return text_of(address);
}

TEST_F(SocketAddress, CanBeSetToLoopback) {
    EXPECT_EQ(set_by(KELPortable::saSetLoopback, AF_INET), "127.0.0.1");
    EXPECT_EQ(set_by(KELPortable::saSetLoopback, AF_INET6), "::1");
}

TEST_F(SocketAddress, CanBeSetToAnyAddress) {
    EXPECT_EQ(set_by(KELPortable::saSetWild, AF_INET), "0.0.0.0");
    EXPECT_EQ(set_by(KELPortable::saSetWild, AF_INET6), "::");
}

TEST_F(SocketAddress, CanBeSetToThisMachinesOwn) {
    const Outcome outcome = in_child([] {
        name_machine("192.0.2.7");
        Armed armed;
        std::cout << set_by(KELPortable::saSetLocal, AF_INET) << ' '
                  << set_by(KELPortable::saSetLocal, AF_INET6);
    });
    EXPECT_EQ(outcome.out, "192.0.2.7 ::ffff:192.0.2.7");
}

TEST_F(SocketAddress, StaysAsItWasWhenThisMachineHasNoAddress) {
    const Outcome outcome = in_child([] {
        name_machine("");
        Armed armed;
        std::cout << set_by(KELPortable::saSetLocal, AF_INET);
    });
    EXPECT_EQ(outcome.out, "90.90.90.90");
}

TEST_F(SocketAddress, OfAForeignFamilyIsNeverChanged) {
    for (void (*set)(sockaddr*) :
         {KELPortable::saSetLoopback, KELPortable::saSetWild, KELPortable::saSetLocal}) {
        AnyAddress address = foreign_address();
        set(&address.any);
        EXPECT_TRUE(same_bytes(address, foreign_address()));
    }
}

}  // namespace
