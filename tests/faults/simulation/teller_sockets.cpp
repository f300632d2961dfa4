// Binding one socket to a name and connecting one socket, as they should go.
//
// SPDX-License-Identifier: MIT
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "tests/faults/simulation/teller.h"

namespace kel {
namespace sim {

namespace {

const long minor_of_bad_name = 8;
const long minor_of_timeout = 0x4b450001;
const int select_limit = 1024;

}  // namespace

// --- Bind names ----------------------------------------------------------------------------

bool Teller::bad_name(unsigned index, const char* format, const char* cause) {
    fail(Thrown::bad_param, minor_of_bad_name);
    std::snprintf(_ending.reason, sizeof _ending.reason, "client bind on [%s] failed; ", name(index).text);
    const std::size_t begun = std::strlen(_ending.reason);
    std::snprintf(_ending.reason + begun, sizeof _ending.reason - begun, format, cause);
    return false;
}

bool Teller::bind_v6(unsigned index, Address& local) {
    const Name& asked = name(index);
    if (asked.kind == Kind::v6) {
        turns.note(Turn::bound_v6_literal);
        local = Address::of(v6_family, asked.ip, 0);
        return true;
    }
    if (!look_up(index, v6_family, local)) {
        turns.note(Turn::bad_v6_name);
        return bad_name(index, "improper bind name for IPv%s socket.", "6");
    }
    turns.note(Turn::bound_v6_name);
    return true;
}

bool Teller::bind_v4(unsigned index, Address& local) {
    Ip ip{};
    if (!text_v4(index, ip)) {
        turns.note(Turn::bad_v4_name);
        return bad_name(index, "improper bind name for IPv%s socket.", "4");
    }
    turns.note(name(index).kind == Kind::v4 ? Turn::bound_v4_literal : Turn::bound_v4_name);
    local = Address::of(v4_family, ip, 0);
    return true;
}

bool Teller::bind_to_name(int fd, unsigned index, int family) {
    if (name(index).kind == Kind::none) return true;
    Address local{};
    if (family == v6_family ? !bind_v6(index, local) : !bind_v4(index, local)) return false;
    if (world.bind(fd, local) == 0) return true;
    turns.note(Turn::bind_name_failed);
    return bad_name(index, "%s", std::strerror(world.error()));
}

// --- Connections ---------------------------------------------------------------------------

bool Teller::connect(int& fd, int& error, const Address& peer, std::uint64_t timeout) {
    error = 0;
    if (timeout != 0) {
        const int flags = world.flags(fd);
        world.nonblock(fd, flags | 04000);
    }
    if (world.connect(fd, peer) != 0) error = world.error();
    if (error == EINPROGRESS || error == EAGAIN) {
        error = 0;
        if (!wait_for(fd, error, timeout)) return false;
    }
    if (error == 0 && connected_to_itself(fd, peer)) error = ECONNREFUSED;
    if (error != 0) give_up(fd);
    return true;
}

void Teller::give_up(int& fd) {
    world.close(fd);
    fd = -1;
}

// The low 32 bits of the time-out count, as a signed number of milliseconds.
bool Teller::wait_for(int& fd, int& error, std::uint64_t timeout) {
    if (world.starving()) {
        turns.note(Turn::wait_without_memory);
        _ending.thrown = Thrown::bad_alloc;
        return false;
    }
    if (timeout == 0) turns.note(Turn::waited_without_timeout);
    const std::int32_t ms = static_cast<std::int32_t>(static_cast<std::uint32_t>(timeout));
    const bool selecting = world.task().selecting;
    const bool watched = !selecting || fd < select_limit;
    const bool limited = selecting ? ms != -1 : ms >= 0;
    note_wait(ms, watched);
    int result;
    int interruptions = 0;
    do {
        result = world.wait(fd, ms, limited, watched);
        if (result < 0 && world.error() == EINTR && ++interruptions == 5)
            turns.note(Turn::interrupted_5_times);
    } while (result < 0 && world.error() == EINTR);
    if (interruptions > 0) turns.note(Turn::wait_interrupted);
    if (result == 0) {
        turns.note(Turn::wait_timed_out);
        give_up(fd);
        fail(Thrown::timeout, minor_of_timeout);
        return false;
    }
    judge_wait(fd, result, error);
    return true;
}

void Teller::note_wait(std::int32_t ms, bool watched) {
    if (ms == 0) turns.note(Turn::wait_at_once);
    if (ms < 0 && ms != -1 && world.task().selecting) turns.note(Turn::wait_negative_select);
    if (ms == -1 || (ms < 0 && !world.task().selecting)) turns.note(Turn::wait_without_limit);
    if (!watched) turns.note(Turn::wait_unwatched);
}

void Teller::judge_wait(int fd, int result, int& error) {
    if (result == -1) {
        turns.note(Turn::wait_failed);
        error = world.error();
    } else if (result == 1) {
        turns.note(Turn::wait_ready);
        if (world.so_error(fd, error) != 0) {
            turns.note(Turn::sockopt_failed);
            error = ECONNREFUSED;
        } else if (error != 0) {
            turns.note(Turn::connection_failed_later);
        }
    } else {
        turns.note(Turn::wait_odd_result);
    }
}

// What was given of the peer's address is all that may be compared; another family is not equal.
bool Teller::connected_to_itself(int fd, const Address& peer) {
    Address local{};
    if (world.local_name(fd, 28, local) != 0) {
        turns.note(Turn::self_by_failed_name);
        return true;
    }
    const unsigned needed = (peer.family() == v6_family ? 8 : 4) + peer.ip_size();
    if (peer.size < needed) turns.note(Turn::short_peer);
    if (peer.size < needed || local.family() != peer.family() || local.port() != peer.port()) return false;
    const bool same = std::memcmp(local.ip(), peer.ip(), peer.ip_size()) == 0;
    if (same) turns.note(Turn::self_connection);
    return same;
}

}  // namespace sim
}  // namespace kel
