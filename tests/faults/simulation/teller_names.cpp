// Names, addresses and endings.
//
// SPDX-License-Identifier: MIT
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "tests/faults/simulation/teller.h"

namespace kel {
namespace sim {

namespace {

const std::uint32_t small = 0xfff;  // minor codes up to here belong to the common set
const std::uint32_t common_set = 0x4f4d0000;
const unsigned completed_no = 1;
const unsigned most_tries = 5;

}  // namespace

// --- How the call ends ---------------------------------------------------------------------

void Teller::left(int fd, int error) {
    _ending.descriptor = fd;
    _ending.error = error;
}

void Teller::fail(Thrown thrown, long minor) {
    _ending.thrown = thrown;
    _ending.minor = static_cast<std::uint32_t>(minor);
    if ((_ending.minor & ~small) == 0) _ending.minor |= common_set;
    _ending.completed = completed_no;
}

void Teller::fail_with_error(int error, bool transient) {
    const bool scarce = error == ENOMEM || error == EMFILE;
    fail(scarce ? Thrown::no_resources : (transient ? Thrown::transient : Thrown::comm_failure), error);
}

// --- Names ---------------------------------------------------------------------------------

ListAnswer Teller::nodes(unsigned host, unsigned port) {
    if (name(host).kind != Kind::none) {
        const ListAnswer list = world.list(host, port);
        if (list.code != 0) turns.note(Turn::list_failed);
        return list;
    }
    ListAnswer both{};
    both.count = 2;
    both.nodes[0] = Address::of(v6_family, Ip{}, port);
    both.nodes[1] = Address::of(v4_family, Ip{}, port);
    return both;
}

void Teller::release_nodes(unsigned host) {
    if (name(host).kind == Kind::none) {
        world.release_own_list();
    } else {
        world.release_list();
    }
}

bool Teller::look_up(unsigned index, int family, Address& address) {
    const LookUp answer = world.look_up(index, family);
    if (answer.code != 0) return false;
    address = answer.address;
    world.release_list();
    return true;
}

bool Teller::ask_for_v4(unsigned index, Ip& ip) {
    for (unsigned tries = 0; tries < most_tries; ++tries) {
        bool again = false;
        HostEntry answer{};
        if (world.host_entry(index, again, answer)) {
            ip = answer.ip;
            return true;
        }
        if (!again) return false;
    }
    turns.note(Turn::try_again_5_times);
    return false;
}

bool own_v4(const Machine& machine, Ip& ip) {
    if (machine.name.kind == Kind::v4) {
        ip = machine.name.ip;
        return true;
    }
    ip = machine.entry.ip;
    return machine.entry.again < most_tries && machine.entry.entry == Entry::found;
}

// The address that stands for a name as a dotted text.
bool Teller::text_v4(unsigned index, Ip& ip) {
    const Name& asked = name(index);
    if (asked.kind != Kind::v4) return ask_for_v4(index, ip);
    ip = asked.ip;
    return true;
}

bool Teller::bytes_v4(unsigned index, Ip& ip) {
    const Name& asked = name(index);
    if (asked.kind == Kind::none) return false;
    if (asked.kind == Kind::v4 || asked.kind == Kind::all_ones) {
        ip = asked.ip;
        return true;
    }
    Address address{};
    if (!look_up(index, v4_family, address)) return false;
    std::memcpy(ip.bytes, address.ip(), 4);
    return true;
}

// An IPv4 address comes as a mapped one.
bool Teller::bytes_v6(unsigned index, Ip& ip) {
    const Name& asked = name(index);
    if (asked.kind == Kind::none) return false;
    if (asked.kind != Kind::name) {
        ip = asked.kind == Kind::v6 ? asked.ip : mapped(asked.ip);
        return true;
    }
    Address address{};
    if (!look_up(index, v6_family, address)) return false;
    std::memcpy(ip.bytes, address.ip(), 16);
    return true;
}

bool Teller::is_local(unsigned host) {
    if (name(host).kind == Kind::none) return true;
    Ip own{};
    Ip its{};
    const bool own_known = own_v4(*world.task().machine, own);
    if (text_v4(host, its)) {
        const Ip loopback = ip4(127, 0, 0, 1);
        if (std::memcmp(its.bytes, loopback.bytes, 4) == 0) return true;
        if (own_known && std::memcmp(its.bytes, own.bytes, 4) == 0) return true;
    }
    const Ip loopback = ip6(0, 1);
    if (!bytes_v6(host, its)) return false;
    if (std::memcmp(its.bytes, loopback.bytes, 16) == 0) return true;
    const bool local = bytes_v6(own_name, own) && std::memcmp(its.bytes, own.bytes, 16) == 0;
    if (local) turns.note(Turn::local_by_ipv6);
    return local;
}

// --- Addresses -----------------------------------------------------------------------------

bool Teller::is_loopback(const Address& address) const {
    const Ip four = ip4(127, 0, 0, 1);
    const Ip six = ip6(0, 1);
    if (address.family() == v4_family) return std::memcmp(address.ip(), four.bytes, 4) == 0;
    return address.family() == v6_family && std::memcmp(address.ip(), six.bytes, 16) == 0;
}

void Teller::set_loopback(Address& address) const {
    if (address.family() == v4_family) address.ip(ip4(127, 0, 0, 1));
    if (address.family() == v6_family) address.ip(ip6(0, 1));
}

void Teller::set_own_address(Address& address) {
    Ip own{};
    const bool known = address.family() == v6_family ? bytes_v6(own_name, own) : bytes_v4(own_name, own);
    if (known) address.ip(own);
    if (!known) turns.note(Turn::own_address_unknown);
}

// fe80::/10, and multicast addresses whose scope is the link.
void Teller::set_link_local(Address& address) {
    if (address.family() != v6_family) return;
    const std::uint8_t first = address.ip()[0];
    const std::uint8_t second = address.ip()[1];
    const bool unicast = first == 0xfe && (second & 0xc0) == 0x80;
    const bool multicast = first == 0xff && (second & 0x0f) == 0x02;
    if (!unicast && !multicast) return;
    const unsigned index = world.interface_index();
    turns.note(index != 0 ? Turn::link_local_scope : Turn::link_local_scope_zero);
    address.scope(index);
}

}  // namespace sim
}  // namespace kel
