// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/names.h"

namespace kel {
namespace sim {

namespace {

#define KEL_TEN_LETTERS "abcdefghij"
#define KEL_FIFTY_LETTERS KEL_TEN_LETTERS KEL_TEN_LETTERS KEL_TEN_LETTERS KEL_TEN_LETTERS KEL_TEN_LETTERS
#define KEL_LONG_NAME \
    KEL_FIFTY_LETTERS KEL_FIFTY_LETTERS KEL_FIFTY_LETTERS KEL_FIFTY_LETTERS KEL_FIFTY_LETTERS

const Name names[fixed_names] = {
    {nullptr, Kind::none, {}},
    {"", Kind::none, {}},
    {"peer.test", Kind::name, {}},
    {"other.test", Kind::name, {}},
    {"no.such.name", Kind::name, {}},
    {"10.1.2.3", Kind::v4, ip4(10, 1, 2, 3)},
    {"10.0.0.1", Kind::v4, ip4(10, 0, 0, 1)},
    {"127.0.0.1", Kind::v4, ip4(127, 0, 0, 1)},
    {"127.0.0.2", Kind::v4, ip4(127, 0, 0, 2)},
    {"255.255.255.255", Kind::all_ones, ip4(255, 255, 255, 255)},
    {"::1", Kind::v6, ip6(0, 1)},
    {"fd00::1", Kind::v6, ip6(0xfd00, 1)},
    {"fe80::7", Kind::v6, ip6(0xfe80, 7)},
    {"ff02::1", Kind::v6, ip6(0xff02, 1)},
    {"::ffff:10.1.2.3", Kind::v6, mapped(ip4(10, 1, 2, 3))},
    {"fe80::7%sim0", Kind::name, {}},
    {"%s%n%100d", Kind::name, {}},
    {KEL_LONG_NAME KEL_FIFTY_LETTERS, Kind::name, {}},
};

const Ip own_ip = ip4(10, 0, 0, 1);
const HostEntry known = {0, Entry::found, own_ip};
const HostEntry unknown = {0, Entry::unknown, {}};

// The last name fills the 256 bytes of the call and loses its end there.
const Machine list[machines] = {
    {{"here.test", Kind::name, {}}, true, known},
    {{"here.test", Kind::name, {}}, true, unknown},
    {{"", Kind::none, {}}, false, unknown},
    {{"", Kind::none, {}}, true, unknown},
    {{"here.test", Kind::name, {}}, true, {4, Entry::found, ip4(127, 0, 0, 1)}},
    {{"here.test", Kind::name, {}}, true, {5, Entry::found, own_ip}},
    {{"10.9.8.7", Kind::v4, ip4(10, 9, 8, 7)}, true, unknown},
    {{KEL_LONG_NAME "klmno", Kind::name, {}}, true, {1, Entry::found, own_ip}},
};

}  // namespace

const Machine& machine_of(unsigned number) { return list[number % machines]; }

const Name& name_of(const Machine& machine, unsigned index) {
    return index == own_name ? machine.name : names[index];
}

int index_of(const Machine& machine, const char* text) {
    if (text == nullptr) return null_name;
    if (*text != '\0' && std::strcmp(text, machine.name.text) == 0) return own_name;
    for (unsigned i = 1; i < fixed_names; ++i) {
        if (std::strcmp(text, names[i].text) == 0) return static_cast<int>(i);
    }
    return -1;
}

}  // namespace sim
}  // namespace kel
