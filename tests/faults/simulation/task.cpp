// The call that a seed makes into the library.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/nature.h"

namespace kel {
namespace sim {

namespace {

const Job jobs[] = {Job::connect_host, Job::connect_host,   Job::connect_host,   Job::connect_host,
                    Job::connect_host, Job::connect_socket, Job::connect_socket, Job::listen_on,
                    Job::listen_on,    Job::bind_name};
const Mood moods[] = {Mood::friendly, Mood::refusing, Mood::refusing_at_once,
                      Mood::in_use,   Mood::silent,   Mood::mixed};

// The first steps of the back-off, and how long a silent peer lasts.
const std::uint64_t short_timeouts[] = {0,    0,    0,    1,    2,    999,   1000,
                                        1001, 2000, 3000, 3001, 7000, 10000, 127000};
// The edges of what 32 bits hold, with and without a sign, and of 64.
const std::uint64_t long_timeouts[] = {0x7fffffff,  0x80000000,  0x800003e8,  0xfffffc18,
                                       0xffffffff,  0x100000000, 0x100000001, 0x100001388,
                                       0x180000000, ~0ull >> 1,  1ull << 63,  ~0ull};
const unsigned ports[] = {0, 1, 80, 2809, 5000, 40000, 65495, 65533, 65534, 65535};
const std::uint32_t ranges[] = {0, 0, 1, 2, 10, 39, 100, 65535, 65536, 2147483647, 2147483648u, 4294967295u};
const int families[] = {2, 2, 2, 10, 10, 10, 99, 0, -1};
const int first_descriptors[] = {3, 3, 3, 3, 100, 1015, 1023, 1024, 5000};

std::uint64_t draw_timeout(Dice& dice) {
    const std::uint64_t high = static_cast<std::uint64_t>(dice.below(40)) << 30;
    switch (dice.below(4)) {
        case 0:
            return dice.below(20000);
        case 1:
            return high + dice.below(2000);
        case 2:
            return dice.of(long_timeouts);
        default:
            return dice.of(short_timeouts);
    }
}

// Names that stand for this machine and those that must be looked up come more often than by chance.
unsigned draw_name(Dice& dice) {
    switch (dice.below(5)) {
        case 0:
            return dice.below(2);
        case 1:
            return own_name;
        case 2:
            return 2 + dice.below(3);
        default:
            return dice.below(all_names);
    }
}

unsigned draw_port(Dice& dice) { return dice.one_in(3) ? dice.below(65536) : dice.of(ports); }

// Ends of the range that fall just below, on and just above the last port and the last number.
std::uint32_t draw_range(Dice& dice, unsigned port) {
    switch (dice.below(6)) {
        case 0:
            return 65535u - port + dice.below(3);
        case 1:
            return 0u - port - 1 + dice.below(3);
        case 2:
            return dice.below(40);
        default:
            return dice.of(ranges);
    }
}

// How many ports there are to try at most.
std::uint64_t span(const Task& task) {
    const std::uint64_t left = 65535u - task.port;
    return task.range < left ? task.range : left;
}

}  // namespace

Task task_of(std::uint64_t seed) {
    Dice dice(seed, Topic::task);
    Task task{};
    task.seed = seed;
    task.machine = &machine_of(static_cast<unsigned>(seed % machines));
    task.job = dice.one_in(50) ? Job::accept_one : dice.of(jobs);
    task.mood = dice.of(moods);
    task.selecting = dice.one_in(2);
    task.first_descriptor = dice.of(first_descriptors);
    task.host = draw_name(dice);
    task.bind_host = dice.below(3) != 0 && task.job != Job::bind_name ? dice.below(2) : draw_name(dice);
    task.port = draw_port(dice);
    task.range = draw_range(dice, task.port);
    task.timeout = draw_timeout(dice);
    task.family = dice.of(families);
    const bool six = dice.one_in(2);
    task.peer =
        Address::of(six ? v6_family : v4_family, six ? ip6(0xfd00, 5) : ip4(10, 1, 2, 3), draw_port(dice));
    // Shorter than its family: enough for the family and the port, for an IPv4 address, for little.
    const std::uint8_t sizes[] = {2, 3, 4, 7, 8, 15};
    if (dice.one_in(8)) task.peer.size = dice.of(sizes);
    task.many_signals = dice.one_in(10);
    task.ports_taken = span(task) <= 40 && dice.one_in(3);
    task.long_interface = dice.one_in(16);
    task.starved_wait = dice.one_in(32) ? static_cast<int>(dice.below(3)) : -1;
    return task;
}

const char* interface_of(const Task& task) {
    return task.long_interface
               ? "an interface name that is as long as its field, which leaves no room for an end."
               : "sim0";
}

}  // namespace sim
}  // namespace kel
