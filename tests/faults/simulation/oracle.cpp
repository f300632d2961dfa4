// Connecting to a host, listening, accepting and binding, as they should go.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/oracle.h"

#include <cerrno>
#include <cstdio>

#include "tests/faults/simulation/oracle_listener.h"

namespace kel {
namespace sim {

namespace {

const char* const turn_names[] = {
#define KEL_TURN(name) #name,
#include "tests/faults/simulation/turns.inc"
#undef KEL_TURN
};

const int most_in_use = 16;

// A call to connect to a host, from its first address to its last.
class HostConnect {
public:
    explicit HostConnect(Teller& teller) : _teller(teller), _world(teller.world), _task(teller.world.task()) {
        _remaining = _task.timeout;
    }

    void tell() {
        const ListAnswer list = _teller.nodes(_task.host, _task.port);
        if (list.code != 0) return _teller.fail(Thrown::transient, list.code);
        bool going_on = true;
        for (_node = 0; _node < list.count && going_on; ++_node) going_on = try_node(list.nodes[_node]);
        if (going_on) {
            _teller.turns.note(Turn::no_node_left);
            _teller.fail_with_error(_error, true);
        }
        // Whatever happened, only a descriptor that was returned stays open.
        if (_teller.thrown() && _fd >= 0) _world.close(_fd);
        _teller.release_nodes(_task.host);
    }

private:
    // False when the call is over.
    bool try_node(Address node) {
        _fd = _world.socket(node.family(), 1, 0);
        if (_fd < 0) {
            _teller.turns.note(Turn::node_without_socket);
            _error = _world.error();
            return true;
        }
        _error = 0;
        _in_use = 0;
        if (_teller.is_local(_task.host)) {
            _teller.turns.note(Turn::host_is_local);
            _teller.set_loopback(node);
        }
        while (true) {
            if (!attempt(node)) return false;
            if (_error == 0) return connected();
            if (!again(node)) return true;
        }
    }

    // False when the attempt threw.
    bool attempt(Address& node) {
        if (_fd < 0) _fd = _world.socket(node.family(), 1, 0);
        if (_fd < 0) {
            _teller.turns.note(Turn::retry_without_socket);
            _teller.fail_with_error(_world.error(), true);
            return false;
        }
        if (!_teller.bind_to_name(_fd, _task.bind_host, node.family())) return false;
        _teller.set_link_local(node);
        return _teller.connect(_fd, _error, node, _remaining);
    }

    bool connected() {
        _teller.turns.note(_node == 0 ? Turn::connected : Turn::connected_later_node);
        _teller.returned(_fd);
        return false;
    }

    // Whether the same address is tried again after `_error`.
    bool again(Address& node) {
        if (_error == EADDRINUSE) {
            const bool more = ++_in_use <= most_in_use;
            _teller.turns.note(more ? Turn::in_use_retried : Turn::in_use_17_times);
            return more;
        }
        if (_error != ECONNREFUSED) {
            _teller.turns.note(Turn::other_error_ends_node);
            if (_error == EINTR) _teller.turns.note(Turn::connect_interrupted);
            return false;
        }
        if (!_first_refusal) return back_off();
        _first_refusal = false;
        _teller.turns.note(Turn::first_refusal);
        if (_teller.is_loopback(node)) {
            _teller.turns.note(Turn::first_refusal_on_loopback);
            _teller.set_own_address(node);
        }
        return true;
    }

    bool back_off() {
        const std::uint64_t wait = _delay * 1000;
        if (_remaining > wait) {
            _remaining -= wait;
            // The system's call takes the seconds as 32 bits.
            _world.sleep(static_cast<std::uint64_t>(static_cast<std::uint32_t>(_delay)) * 1000);
            _teller.turns.note(_delay >= 8 ? Turn::backed_off_4_times : Turn::backed_off);
            if (_delay >> 32 != 0) _teller.turns.note(Turn::backed_off_beyond_32_bits);
            _delay *= 2;
            return true;
        }
        // The call that sleeps takes milliseconds in the word size.
        const unsigned long pause = static_cast<unsigned long>(_remaining);
        _teller.turns.note(_task.timeout == 0 ? Turn::refused_again_without_timeout : Turn::out_of_time);
        if (pause == 0) _teller.turns.note(Turn::pause_of_zero);
        _world.pause(pause);
        _remaining = 0;
        return false;
    }

    Teller& _teller;
    World& _world;
    const Task& _task;
    std::uint64_t _remaining = 0;
    std::uint64_t _delay = 1;
    bool _first_refusal = true;
    unsigned _node = 0;
    int _in_use = 0;
    int _fd = -1;
    int _error = 0;
};

void tell_connect_socket(Teller& teller) {
    const Task& task = teller.world.task();
    int fd = teller.world.given();
    int error = 4711;
    teller.connect(fd, error, task.peer, task.timeout);
    teller.left(fd, error);
}

void tell_accept(Teller& teller) {
    const int fd = teller.world.accept(teller.world.given(), 28);
    teller.turns.note(fd < 0 ? Turn::accept_failed : Turn::accepted);
    if (fd < 0) return teller.fail_with_error(teller.world.error(), false);
    teller.returned(fd);
}

void tell_bind_name(Teller& teller) {
    const int fd = teller.world.given();
    teller.bind_to_name(fd, teller.world.task().bind_host, teller.world.task().family);
    teller.left(fd, 0);
}

}  // namespace

const char* name_of(Turn turn) { return turn_names[static_cast<unsigned>(turn)]; }

void foretell(const Task& task, World& world, Turns& turns) {
    world.begin(task);
    Teller teller(world, turns);
    switch (task.job) {
        case Job::connect_host:
            HostConnect(teller).tell();
            break;
        case Job::connect_socket:
            tell_connect_socket(teller);
            break;
        case Job::listen_on:
            tell_listener(teller);
            break;
        case Job::accept_one:
            tell_accept(teller);
            break;
        case Job::bind_name:
            tell_bind_name(teller);
            break;
    }
    world.finish(world.story().ending.descriptor);
}

}  // namespace sim
}  // namespace kel
