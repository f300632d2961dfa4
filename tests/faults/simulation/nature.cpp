// How the system answers; names and addresses first, then sockets and time.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/nature.h"

#include <cerrno>

namespace kel {
namespace sim {

namespace {

// EAI_NONAME, EAI_AGAIN, EAI_FAIL, EAI_SERVICE, EAI_MEMORY, EAI_SYSTEM; the last two are of no system.
const int resolver_codes[] = {-2, -3, -4, -8, -10, -11, 7, 5000};

const Ip v4_ips[] = {ip4(10, 1, 2, 3), ip4(10, 0, 0, 1), ip4(127, 0, 0, 1), ip4(127, 0, 0, 2),
                     ip4(10, 9, 8, 7)};
const Ip v6_ips[] = {ip6(0, 1),      ip6(0xfd00, 1),           ip6(0xfd00, 5), ip6(0xfe80, 7),
                     ip6(0xfebf, 7), ip6(0xfec0, 7),           ip6(0xff02, 1), ip6(0xff12, 1),
                     ip6(0xff05, 1), mapped(ip4(10, 1, 2, 3)), ip6(0x2001, 9)};

std::uint32_t look_up_delay(Dice& dice) { return dice.one_in(4) ? dice.below(3000) : 0; }

Address draw_address(Dice& dice, int family, unsigned port) {
    Address made = Address::of(family, family == v6_family ? dice.of(v6_ips) : dice.of(v4_ips), port);
    if (family != v6_family) return made;
    if (dice.one_in(3)) made.scope(dice.below(9));
    if (dice.one_in(8)) made.bytes[6] = 0x5a;  // flow information
    return made;
}

}  // namespace

ListAnswer list_of(const Task& task) {
    Dice dice(task.seed, Topic::list);
    ListAnswer answer{};
    answer.delay = look_up_delay(dice);
    if (dice.one_in(20)) {
        answer.code = dice.of(resolver_codes);
        return answer;
    }
    answer.count = dice.one_in(2) ? 1 : 1 + dice.below(longest_list);
    for (unsigned i = 0; i < answer.count; ++i) {
        const int family = dice.one_in(2) ? v4_family : (dice.one_in(12) ? 99 : v6_family);
        answer.nodes[i] = draw_address(dice, family, task.port);
    }
    return answer;
}

LookUp look_up_of(const Task& task, int family, unsigned name) {
    Dice dice(task.seed, Topic::family_look_up, static_cast<std::uint32_t>(family) * 64 + name);
    LookUp answer{};
    answer.delay = look_up_delay(dice);
    if (dice.one_in(3)) {
        answer.code = dice.of(resolver_codes);
    } else {
        answer.address = draw_address(dice, family, 0);
    }
    return answer;
}

HostEntry host_entry_of(const Task& task, unsigned name) {
    Dice dice(task.seed, Topic::host_entry, name);
    const Entry entries[] = {Entry::found,   Entry::found,   Entry::found,      Entry::found,
                             Entry::unknown, Entry::foreign, Entry::no_address, Entry::no_room};
    HostEntry answer{};
    answer.again = dice.one_in(4) ? dice.below(7) : 0;
    answer.entry = dice.of(entries);
    answer.ip = dice.of(v4_ips);
    return answer;
}

std::uint32_t host_entry_delay(const Task& task, unsigned name) {
    Dice dice(task.seed, Topic::own_name, name);
    return look_up_delay(dice);
}

unsigned interface_index_of(const Task& task) {
    if (task.long_interface) return 0;
    Dice dice(task.seed, Topic::interface_index);
    return dice.one_in(4) ? 0 : 1 + dice.below(5);
}

int socket_of(const Task& task, unsigned n, int family) {
    if (family != v4_family && family != v6_family) return EAFNOSUPPORT;
    const int errors[] = {ENOMEM, EMFILE, ENFILE, EACCES, EAFNOSUPPORT, EINVAL, ENOBUFS, EINTR};
    Dice dice(task.seed, Topic::socket, n);
    return dice.one_in(24) ? dice.of(errors) : 0;
}

int reuse_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::options, n);
    return dice.one_in(8) ? ENOPROTOOPT : 0;
}

// A free port turns up sooner or later, or the search through a wide range would fill the seed.
int bind_of(const Task& task, unsigned n) {
    const int errors[] = {EADDRINUSE, EADDRINUSE, EADDRINUSE, EACCES, EADDRNOTAVAIL,
                          EINVAL,     ENOMEM,     EMFILE,     EINTR};
    Dice dice(task.seed, Topic::bind, n);
    if (task.job != Job::listen_on) return dice.one_in(24) ? dice.of(errors) : 0;
    if (task.ports_taken) return dice.of(errors);
    return n < 150 && !dice.one_in(4) ? dice.of(errors) : 0;
}

int listen_of(const Task& task, unsigned n) {
    const int errors[] = {EADDRINUSE, EOPNOTSUPP, ENOMEM, EMFILE, EINTR};
    Dice dice(task.seed, Topic::listen, n);
    return dice.one_in(4) ? dice.of(errors) : 0;
}

int accept_of(const Task& task, unsigned n) {
    const int errors[] = {EINTR, EMFILE, ENOMEM, ENFILE, ECONNABORTED, EINVAL, EAGAIN, ENOBUFS};
    Dice dice(task.seed, Topic::accept, n);
    return dice.one_in(2) ? dice.of(errors) : 0;
}

CloseAnswer close_of(const Task& task, unsigned n) {
    const CloseAnswer answers[] = {{-1, EIO}, {-1, EINTR}, {0, ENOTTY}, {0, ECONNREFUSED}, {-1, EADDRINUSE}};
    Dice dice(task.seed, Topic::close, n);
    return dice.one_in(6) ? dice.of(answers) : CloseAnswer{0, 0};
}

FlagsAnswer flags_of(const Task& task, unsigned n) {
    Dice dice(task.seed, Topic::flags, n);
    const int flags[] = {02, 02, 02, 02 | 02000, 02 | 020000, -1};
    FlagsAnswer answer{};
    answer.flags = dice.of(flags);
    answer.error = dice.one_in(10) ? EPERM : 0;
    return answer;
}

}  // namespace sim
}  // namespace kel
