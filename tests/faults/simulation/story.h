// What happened during one task: the calls in their order, and what was left at the end. The world
// writes one down while the library acts in it, the oracle another from what should happen.
//
//   Event    one call into the system with its arguments, its answer and the time after it
//   Ending   what the caller got and what stayed behind
//   Story    both
//
//     if (!(acted == foretold)) print_side_by_side(std::cout, task, acted, foretold);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_STORY_H
#define KEL_TESTS_FAULTS_SIMULATION_STORY_H

#include <iosfwd>
#include <vector>

#include "tests/faults/simulation/nature.h"

namespace kel {
namespace sim {

enum class Call : std::uint8_t {
    list,        // index of the host, port
    look_up,     // index of the name, family
    host_entry,  // index of the name
    interface_index,
    socket,      // family, type and protocol
    reuse,       // descriptor, value
    nonblock,    // descriptor
    bind,        // descriptor
    listen,      // descriptor, backlog
    accept,      // descriptor, room for the address
    connect,     // descriptor
    wait,        // descriptor, milliseconds
    so_error,    // descriptor
    local_name,  // descriptor, room for the address
    sleep,       // milliseconds, of the wait in whole seconds
    pause,       // milliseconds, of the wait through select
    close,       // descriptor
};

struct Event {
    Call call;
    std::int64_t a;
    std::int64_t b;
    std::int64_t result;
    int error;           // errno when the result says that the call failed
    std::uint64_t time;  // virtual milliseconds since the task began
    Address address;     // of bind and connect

    bool operator==(const Event& other) const;
};

enum class Thrown : std::uint8_t {
    nothing,
    no_resources,
    transient,
    comm_failure,
    timeout,
    bad_param,
    bad_alloc,
    something_else,
};
const unsigned kinds_thrown = 8;

struct Ending {
    Thrown thrown;
    std::uint32_t minor;
    unsigned completed;
    int descriptor;    // returned, or left in the caller's variable
    int error;         // left in the caller's variable
    int open;          // descriptors that are open
    bool nonblocking;  // the descriptor that the caller holds
    int lists;         // lists of the resolver that are not released
    int own_lists;     // lists that were released and not made by the resolver
    int blocks;        // allocated and not freed
    std::uint64_t time;
    char reason[700];

    bool operator==(const Ending& other) const;
};

struct Story {
    std::vector<Event> events;
    Ending ending;

    void clear();
    bool operator==(const Story& other) const { return ending == other.ending && events == other.events; }
};

// "CORBA::TIMEOUT" and so on, "nothing" when the call returned.
const char* name_of(Thrown thrown);

void print(std::ostream& out, const Task& task);
void print_side_by_side(std::ostream& out, const Task& task, const Story& acted, const Story& foretold);

}  // namespace sim
}  // namespace kel

#endif
