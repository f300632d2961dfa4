// Listening on the first free port of a range, as it should go.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/oracle_listener.h"

#include <cerrno>

namespace kel {
namespace sim {

namespace {

const unsigned last_port = 65535;

class Listener {
public:
    explicit Listener(Teller& teller) : _teller(teller), _world(teller.world), _task(teller.world.task()) {}

    void tell() {
        const ListAnswer list = _teller.nodes(_task.host, _task.port);
        if (list.code != 0) return _teller.fail(Thrown::comm_failure, list.code);
        unsigned node = 0;
        while (node < list.count && !bound_to(list.nodes[node])) ++node;
        _teller.release_nodes(_task.host);
        if (node == list.count) return _teller.fail_with_error(_error, false);
        if (node > 0) note(Turn::second_node_bound);
        listen();
    }

private:
    void note(Turn turn) { _teller.turns.note(turn); }

    bool bound_to(Address node) {
        _fd = _world.socket(node.family(), 1, 0);
        if (_fd < 0) {
            _error = _world.error();
            return false;
        }
        _teller.set_link_local(node);
        _world.reuse(_fd, 1);
        if (bound_to_a_port(node)) return true;
        _world.close(_fd);
        return false;
    }

    // The end of the range is a sum of 32 bits. One that wraps leaves nothing to try, one above the
    // last port ends there, and port 0 stands for one port of the system's choice.
    bool bound_to_a_port(Address node) {
        std::uint32_t last = _task.port == 0 ? 0 : _task.port + _task.range;
        if (last < _task.port) note(Turn::range_wrapped);
        if (_task.port == 0) note(Turn::port_zero);
        if (last > last_port) {
            note(Turn::range_stops_at_last_port);
            last = last_port;
        }
        for (std::uint32_t port = _task.port; port <= last; ++port) {
            node.port(port);
            if (_world.bind(_fd, node) == 0) {
                note(port == _task.port ? Turn::port_bound : Turn::port_bound_later);
                return true;
            }
            _error = _world.error();
        }
        note(Turn::ports_all_taken);
        return false;
    }

    // The error is read after the socket was closed.
    void listen() {
        if (_world.listen(_fd, 1024) == 0) return _teller.returned(_fd);
        const int before = _world.error();
        _world.close(_fd);
        note(_world.error() == before ? Turn::listen_failed : Turn::minor_of_close);
        _teller.fail(Thrown::comm_failure, _world.error());
    }

    Teller& _teller;
    World& _world;
    const Task& _task;
    int _fd = -1;
    int _error = 0;
};

}  // namespace

void tell_listener(Teller& teller) { Listener(teller).tell(); }

}  // namespace sim
}  // namespace kel
