// What a seed means: the one call made into the library, and how the system answers during it.
//
//   Task       the call and its arguments
//   task_of    the task of a seed
//   ..._of     the answer to the nth call of one kind, each from 0
//
//     const Task task = task_of(4711);
//     const ConnectAnswer answer = connect_of(task, 0);      // what the first connect meets
//
// Nothing here remembers anything: the answers are the same for whoever asks.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_NATURE_H
#define KEL_TESTS_FAULTS_SIMULATION_NATURE_H

#include "tests/faults/simulation/dice.h"
#include "tests/faults/simulation/names.h"

namespace kel {
namespace sim {

enum class Job : std::uint8_t { connect_host, connect_socket, listen_on, accept_one, bind_name };

// How connections tend to go, so that long rows of the same answer come up.
enum class Mood : std::uint8_t { friendly, refusing, refusing_at_once, in_use, silent, mixed };

struct Task {
    std::uint64_t seed;
    const Machine* machine;
    Job job;
    Mood mood;
    bool selecting;        // the poller waits with select
    int first_descriptor;  // numbers are given out upwards from here and never twice
    unsigned host;         // index of a name
    unsigned bind_host;    // index of a name
    unsigned port;
    std::uint32_t range;
    std::uint64_t timeout;  // milliseconds
    int family;             // of the socket that is bound to a name
    Address peer;           // of the socket that is connected
    bool many_signals;      // most waits are interrupted
    bool ports_taken;       // no port can be bound
    bool long_interface;    // the interface name fills its field without an end
    int starved_wait;       // from this started connection on, counted from 0, there is no memory
};

Task task_of(std::uint64_t seed);
const char* interface_of(const Task& task);

// --- Names ---------------------------------------------------------------------------------

const unsigned longest_list = 5;

struct ListAnswer {
    int code;  // 0, or what the resolver returns
    std::uint32_t delay;
    unsigned count;
    Address nodes[longest_list];
};

struct LookUp {
    int code;
    std::uint32_t delay;
    Address address;
};

ListAnswer list_of(const Task& task);
LookUp look_up_of(const Task& task, int family, unsigned name);
HostEntry host_entry_of(const Task& task, unsigned name);
std::uint32_t host_entry_delay(const Task& task, unsigned name);
unsigned interface_index_of(const Task& task);

// --- Sockets: 0 or an error number ------------------------------------------------------------

int socket_of(const Task& task, unsigned n, int family);
int reuse_of(const Task& task, unsigned n);
int bind_of(const Task& task, unsigned n);
int listen_of(const Task& task, unsigned n);
int accept_of(const Task& task, unsigned n);

// A descriptor is gone after close, whatever close says; `error` is what errno reads afterwards,
// 0 when it stays as it was.
struct CloseAnswer {
    int result;
    int error;
};
CloseAnswer close_of(const Task& task, unsigned n);

struct FlagsAnswer {
    int flags;  // -1: they cannot be read
    int error;  // of writing them
};
FlagsAnswer flags_of(const Task& task, unsigned n);

// --- Connections ----------------------------------------------------------------------------

const std::uint32_t silence = 127000;  // a peer that never answers: the system gives up

struct ConnectAnswer {
    int error;            // 0 or the error of connect itself
    bool started;         // `error` says that the connection goes on by itself
    bool whatever_flags;  // it says so to a blocking socket too
    std::uint32_t delay;  // until the connection ends
    int end;              // 0, or the error it ends with
};
ConnectAnswer connect_of(const Task& task, unsigned n);

struct WaitAnswer {
    bool natural;         // ends with the connection or with the time-out
    std::uint32_t delay;  // until a signal comes
    int result;
    int error;
};
WaitAnswer wait_of(const Task& task, unsigned n);

int so_error_of(const Task& task, unsigned n);

struct LocalName {
    int error;
    Address address;
};
LocalName local_name_of(const Task& task, unsigned n, const Address& peer);

// --- Sleeps: what part of the time passes, in quarters, and how the call ends -------------------

struct SleepAnswer {
    unsigned quarters;
    int error;
};
SleepAnswer sleep_of(const Task& task, unsigned n);
SleepAnswer pause_of(const Task& task, unsigned n);

inline std::uint64_t slept(const SleepAnswer& answer, std::uint64_t ms) {
    return ms / 4 * answer.quarters + (answer.quarters == 4 ? ms % 4 : 0);
}

}  // namespace sim
}  // namespace kel

#endif
