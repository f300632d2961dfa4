// Names and addresses of hosts, of this machine and of sockets.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/os/address.h>
#include <kel/os/portable.h>

#include <cstring>

#include "tests/faults/matrix/net_scenario.h"
#include "tests/os/fake_resolver.h"
#include "tests/os/fresh_process.h"

namespace {

using namespace kel::test;

// --- what is found out once --------------------------------------------------------------------------

// A process that does not know its machine yet.
class UnknownMachine : public Scenario {
    void prepare() override {
        name_machine("kelhost");
        _addresses.knows("kelhost", AF_INET, "192.0.2.7");
        _addresses.knows("kelhost", AF_INET6, "2001:db8::7");
    }
    const FakeResolver _resolver{{}, "192.0.2.7"};
    FakeAddressInfo _addresses;

protected:
    void gives_and_frees(char* text) {
        gives("%s", text != nullptr ? text : "null");
        CORBA::string_free(text);
    }
};

class FirstHostName : public UnknownMachine {
    void act() override { gives("<%s>", KELPortable::host_name()); }
};
KEL_SCENARIO(FirstHostName).giving("<kelhost>").in_a_fresh_process();

class FirstOwnAddress : public UnknownMachine {
    void act() override { gives_and_frees(KELPortable::ip_addr(nullptr)); }
};
KEL_SCENARIO(FirstOwnAddress).giving("192.0.2.7").in_a_fresh_process().and_retried();

class FirstOwnIpv4Address : public UnknownMachine {
    void act() override { gives_and_frees(KELPortable::ipAddr(AF_INET, nullptr)); }
};
KEL_SCENARIO(FirstOwnIpv4Address).giving("192.0.2.7").in_a_fresh_process().and_retried();

class FirstOwnIpv6Address : public UnknownMachine {
    void act() override { gives_and_frees(KELPortable::ipAddr(AF_INET6, nullptr)); }
};
KEL_SCENARIO(FirstOwnIpv6Address).giving("2001:db8::7").in_a_fresh_process().and_retried();

// --- texts and bytes ---------------------------------------------------------------------------------

class AddressText : public NetScenario {
protected:
    void gives_and_frees(char* text) {
        gives("%s", text != nullptr ? text : "null");
        CORBA::string_free(text);
    }
};

class OwnAddressText : public AddressText {
    void act() override { gives_and_frees(KELPortable::ip_addr(nullptr)); }
};
KEL_NET_SCENARIO(OwnAddressText).giving("192.0.2.7").and_retried();

class Ipv4Text : public AddressText {
    void act() override { gives_and_frees(KELPortable::ip_addr("one")); }
};
KEL_NET_SCENARIO(Ipv4Text).giving("10.1.1.1").and_retried();

class TextInFamilyIpv4 : public AddressText {
    void act() override { gives_and_frees(KELPortable::ipAddr(AF_INET, "one")); }
};
KEL_NET_SCENARIO(TextInFamilyIpv4).giving("10.1.1.1").and_retried();

class TextInFamilyIpv6 : public AddressText {
    void act() override { gives_and_frees(KELPortable::ipAddr(AF_INET6, "six")); }
};
KEL_NET_SCENARIO(TextInFamilyIpv6).giving("2001:db8::9").and_retried();

class TextAndFamily : public AddressText {
    void act() override {
        int family = 0;
        gives_and_frees(KELPortable::host2ip(family, "one"));
    }
};
KEL_NET_SCENARIO(TextAndFamily).giving("10.1.1.1").and_retried();

class TextOfASocketAddress : public AddressText {
    void act() override {
        unsigned short port = 0;
        gives_and_frees(KELPortable::convert(_address.v4, port));
    }
    const SocketAddress _address = socket_address("10.8.8.8:80");
};
KEL_NET_SCENARIO(TextOfASocketAddress).giving("10.8.8.8").and_retried();

template <int family>
class AddressBytes : public NetScenario {
    void act() override {
        unsigned char bytes[16] = {};
        const bool known = KELPortable::ipAddr(family, bytes, "both");
        gives("%d, %d", known, bytes[family == AF_INET ? 3 : 15]);
    }
};
using BytesInIpv4 = AddressBytes<AF_INET>;
using BytesInIpv6 = AddressBytes<AF_INET6>;
KEL_NET_SCENARIO(BytesInIpv4).giving("1, 3");
KEL_NET_SCENARIO(BytesInIpv6).giving("1, 3");

class MappedBytes : public NetScenario {
    void act() override {
        unsigned char bytes[16] = {};
        const bool known = KELPortable::ipAddr(AF_INET6, bytes, "10.1.2.3");
        gives("%d, %d", known, bytes[15]);
    }
};
KEL_NET_SCENARIO(MappedBytes).giving("1, 3").and_retried();

class BytesInEitherFamily : public NetScenario {
    void act() override {
        unsigned char bytes[16] = {};
        int length = 0;
        const bool known = KELPortable::ipAddr(bytes, length, "both");
        gives("%d, %d bytes", known, length);
    }
};
KEL_NET_SCENARIO(BytesInEitherFamily).giving("1, 16 bytes");

class SocketAddressOfAHost : public NetScenario {
    void act() override {
        sockaddr_in address;
        KELPortable::convert("one", 80, address);
        const Disarmed pause;
        gives("%s", bytes_text(AF_INET, &address.sin_addr).c_str());
    }
};
KEL_NET_SCENARIO(SocketAddressOfAHost).giving("10.1.1.1").and_retried();

// --- locality ----------------------------------------------------------------------------------------

class WeakLocality : public NetScenario {
    void act() override { gives("%d", KELPortable::is_local("kelhost")); }
};
KEL_NET_SCENARIO(WeakLocality).giving("1").and_retried();

// Local by its IPv6 address only.
class StrongLocality : public NetScenario {
    void set_up() override { net.resolve("myself", {"2001:db8::7"}); }
    void act() override { gives("%d", KELPortable::isLocal("myself")); }
};
KEL_NET_SCENARIO(StrongLocality).giving("1").and_retried();

// --- socket addresses --------------------------------------------------------------------------------

class PeerAddress : public AddressText {
    void set_up() override {
        seams::getpeername.script([](int, sockaddr* address, socklen_t* size) {
            const SocketAddress peer = socket_address("10.5.5.5:80");
            std::memcpy(address, &peer, peer.size());
            *size = peer.size();
            return 0;
        });
    }
    void act() override {
        unsigned short port = 0;
        gives_and_frees(KELPortable::peer_addr(500, port));
    }
};
KEL_NET_SCENARIO(PeerAddress).giving("10.5.5.5").and_retried();

class LocalPort : public NetScenario {
    void set_up() override { _fd = open_socket(); }
    void act() override { gives("%d", KELPortable::saGetPort(_fd)); }
    int _fd = -1;
};
KEL_NET_SCENARIO(LocalPort).giving("999");

class ScopeOfALinkLocalAddress : public NetScenario {
    void act() override {
        addrinfo node = {};
        node.ai_family = AF_INET6;
        node.ai_addr = &_address.any;
        KELSetLinkLocal(&node);
        gives("%u", _address.v6.sin6_scope_id);
    }
    SocketAddress _address = socket_address("[fe80::1]:80");
};
KEL_NET_SCENARIO(ScopeOfALinkLocalAddress).giving("7");

// The address stays as it is when the own one is not known.
class AddressBecomesTheOwn : public NetScenario {
    void act() override {
        KELPortable::saSetLocal(&_address.any);
        const Disarmed pause;
        gives("%s", to_text(&_address.any).c_str());
    }
    SocketAddress _address = socket_address("127.0.0.1:80");
};
KEL_NET_SCENARIO(AddressBecomesTheOwn).giving("192.0.2.7:80");

// --- lists -------------------------------------------------------------------------------------------

template <unsigned char transient>
class AddressListOfAHost : public NetScenario {
    void act() override {
        addrinfo* const list = Getaddrinfo("two", 80, SOCK_STREAM, transient);
        gives("%s", list->ai_next != nullptr ? "two" : "one");
        Freeaddrinfo(list);
    }
};
using ListToListen = AddressListOfAHost<0>;
using ListToConnect = AddressListOfAHost<1>;
KEL_NET_SCENARIO(ListToListen).giving("two").and_retried();
KEL_NET_SCENARIO(ListToConnect).giving("two").and_retried();

// Of the system itself, for the texts of addresses.
class ListForReal : public Scenario {
    void act() override {
        Freeaddrinfo(Getaddrinfo("127.0.0.1", 80, SOCK_STREAM, 0));
        Freeaddrinfo(Getaddrinfo("::1", 80, SOCK_STREAM, 0));
    }
};
KEL_SCENARIO(ListForReal).and_retried();

class ListOfWildcards : public NetScenario {
    void act() override {
        addrinfo* const list = Getaddrinfo(nullptr, 80, SOCK_STREAM, 0);
        gives("%s", list->ai_next != nullptr ? "two" : "one");
        Freeaddrinfo(list);
    }
};
KEL_NET_SCENARIO(ListOfWildcards).giving("two").and_retried();

}  // namespace
