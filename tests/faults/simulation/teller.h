// The steps that the oracle's tales share: naming, binding and connecting one socket.
//
//   Teller    acts in a world of its own and writes down what the caller gets
//
// A step that should throw writes the exception into the ending and returns false.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_TELLER_H
#define KEL_TESTS_FAULTS_SIMULATION_TELLER_H

#include "tests/faults/simulation/oracle.h"

namespace kel {
namespace sim {

class Teller {
public:
    Teller(World& its_world, Turns& its_turns)
        : world(its_world), turns(its_turns), _ending(its_world.story().ending) {
        _ending.descriptor = -1;
    }

    World& world;
    Turns& turns;

    // --- How the call ends -----------------------------------------------------------------

    bool thrown() const { return _ending.thrown != Thrown::nothing; }
    void returned(int fd) { _ending.descriptor = fd; }
    void left(int fd, int error);
    // `minor` as the library passes it on.
    void fail(Thrown thrown, long minor);
    // The exception that stands for a system error.
    void fail_with_error(int error, bool transient);

    // --- Names -----------------------------------------------------------------------------

    // The addresses of a host; both any-addresses, IPv6 first, when there is no host.
    ListAnswer nodes(unsigned host, unsigned port);
    void release_nodes(unsigned host);
    bool is_local(unsigned host);

    // --- Addresses -------------------------------------------------------------------------

    bool is_loopback(const Address& address) const;
    void set_loopback(Address& address) const;
    void set_own_address(Address& address);
    void set_link_local(Address& address);

    // --- Sockets ---------------------------------------------------------------------------

    bool bind_to_name(int fd, unsigned name, int family);
    bool connect(int& fd, int& error, const Address& peer, std::uint64_t timeout);

private:
    const Name& name(unsigned index) const { return name_of(*world.task().machine, index); }
    bool look_up(unsigned index, int family, Address& address);
    bool ask_for_v4(unsigned index, Ip& ip);
    bool text_v4(unsigned index, Ip& ip);
    bool bytes_v4(unsigned index, Ip& ip);
    bool bytes_v6(unsigned index, Ip& ip);
    bool bad_name(unsigned index, const char* format, const char* cause);
    bool bind_v6(unsigned index, Address& local);
    bool bind_v4(unsigned index, Address& local);
    bool wait_for(int& fd, int& error, std::uint64_t timeout);
    void note_wait(std::int32_t ms, bool watched);
    void judge_wait(int fd, int result, int& error);
    bool connected_to_itself(int fd, const Address& peer);
    void give_up(int& fd);

    Ending& _ending;
};

}  // namespace sim
}  // namespace kel

#endif
