// The texts that stand for hosts, and the machines on which a simulated process runs.
//
//   Name       a text and what it is: a literal address or a name to look up
//   Machine    what stays the same while a process lives, as the library keeps it: the own name
//              and the IPv4 address behind it
//
//     const Name& host = name_of(machine, task.host);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_NAMES_H
#define KEL_TESTS_FAULTS_SIMULATION_NAMES_H

#include "tests/faults/simulation/address.h"

namespace kel {
namespace sim {

enum class Kind : std::uint8_t {
    none,      // null or empty
    v4,        // a dotted IPv4 address
    all_ones,  // 255.255.255.255, which reads like a failure
    v6,        // an IPv6 address
    name,      // to be looked up
};

struct Name {
    const char* text;
    Kind kind;
    Ip ip;
};

// What the resolver says about the IPv4 address of a name.
enum class Entry : std::uint8_t { found, unknown, foreign, no_address, no_room };

struct HostEntry {
    unsigned again;  // how often it first says "try again"; from 5 on for ever
    Entry entry;
    Ip ip;
};

struct Machine {
    Name name;        // what gethostname writes
    bool readable;    // false: gethostname fails
    HostEntry entry;  // the answer when the library asks for its own address, once
};

const unsigned machines = 8;
const Machine& machine_of(unsigned number);

// Indices into the names; the last one is the machine's own name.
const unsigned null_name = 0;
const unsigned empty_name = 1;
const unsigned fixed_names = 18;
const unsigned own_name = fixed_names;
const unsigned all_names = fixed_names + 1;

const Name& name_of(const Machine& machine, unsigned index);

// The index of `text`, or -1. The own name comes first: a machine may be called like a fixed name.
int index_of(const Machine& machine, const char* text);

}  // namespace sim
}  // namespace kel

#endif
