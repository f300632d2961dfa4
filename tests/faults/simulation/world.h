// The system as a task meets it: virtual time, a table of descriptors, connections on their way and a
// resolver, all answering from the seed. It writes the story of the calls that are made.
//
//   World    one of them for the library, which reaches it through the interposed calls, and one for
//            the oracle, which calls it by hand
//
//     world.begin(task);
//     const int fd = world.socket(v4_family, 1, 0);          // -1: the error is in world.error()
//     world.finish(fd);                                      // fills in what is left of the ending
//
// A descriptor that is used after it was closed, or closed again, ends the process.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SIMULATION_WORLD_H
#define KEL_TESTS_FAULTS_SIMULATION_WORLD_H

#include "tests/faults/simulation/story.h"

namespace kel {
namespace sim {

// What errno reads when a task begins: of no meaning to it.
const int stale_error = 8;

class World {
public:
    World();
    World(const World&) = delete;
    World& operator=(const World&) = delete;

    void begin(const Task& task);
    // `held` is the descriptor that the caller holds now, -1 for none.
    void finish(int held);

    const Task& task() const { return *_task; }
    Story& story() { return _story; }
    std::uint64_t now() const { return _now; }

    // What errno reads. A call that succeeds leaves it, except for some that close.
    int error() const { return _error; }

    // Whether memory has run out.
    bool starving() const { return _starving; }

    // An open descriptor that no call of the task made.
    int given();

    ListAnswer list(unsigned name, unsigned port);
    void release_list() { --_lists; }
    void release_own_list() { ++_own_lists; }
    LookUp look_up(unsigned name, int family);
    // False when the name has no IPv4 address; `again` when it is worth another try.
    bool host_entry(unsigned name, bool& again, HostEntry& answer);
    unsigned interface_index();

    int socket(int family, int type, int protocol);
    int reuse(int fd, int value);
    int flags(int fd);
    int nonblock(int fd, int flags);
    int bind(int fd, const Address& address);
    int listen(int fd, int backlog);
    int accept(int fd, unsigned room);
    int connect(int fd, const Address& address);
    int wait(int fd, std::int64_t ms, bool limited, bool watched);
    int so_error(int fd, int& value);
    int local_name(int fd, unsigned room, Address& address);
    int close(int fd);
    std::uint64_t sleep(std::uint64_t ms);  // what is left of it
    int pause(std::uint64_t ms);

    [[noreturn]] void fatal(const char* what, int number) const;

private:
    struct Descriptor {
        bool open;
        bool pending;
        int flags;
        bool flags_known;
        std::uint64_t ends_at;
        int end;
        Address peer;
    };

    Descriptor& at(int fd, const char* use);
    int opened();
    int told(Event event, int error);
    Event event(Call call, std::int64_t a = 0, std::int64_t b = 0) const;
    int start(Descriptor& descriptor, const ConnectAnswer& answer);
    std::uint64_t left(const Descriptor& descriptor, bool watched) const;

    Story _story;
    const Task* _task = nullptr;
    std::uint64_t _now = 0;
    int _error = stale_error;
    bool _starving = false;
    int _lists = 0;
    int _own_lists = 0;
    int _started = 0;
    std::vector<Descriptor> _table;
    unsigned _asked[all_names] = {};
    unsigned _calls[32] = {};
};

}  // namespace sim
}  // namespace kel

#endif
