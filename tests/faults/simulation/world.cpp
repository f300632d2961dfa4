// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/world.h"

#include <cerrno>
#include <cstdlib>
#include <iostream>

namespace kel {
namespace sim {

namespace {

const int nonblocking = 04000;
const std::size_t longest_story = 4000;  // several times what the most patient caller needs

// The number of calls of one kind so far, by the kind's place among the calls.
unsigned& count(unsigned* calls, Call call) { return calls[static_cast<unsigned>(call)]; }

const std::uint64_t never = ~static_cast<std::uint64_t>(0);

}  // namespace

// Room from the start, so that what the library leaves allocated can be told from what is kept here.
World::World() {
    _story.events.reserve(longest_story);
    _table.reserve(1024);
}

void World::begin(const Task& task) {
    _story.clear();
    _task = &task;
    _now = 0;
    _error = stale_error;
    _starving = false;
    _lists = _own_lists = _started = 0;
    _table.clear();
    for (unsigned& n : _asked) n = 0;
    for (unsigned& n : _calls) n = 0;
}

void World::finish(int held) {
    Ending& ending = _story.ending;
    ending.time = _now;
    ending.lists = _lists;
    ending.own_lists = _own_lists;
    for (const Descriptor& descriptor : _table) ending.open += descriptor.open ? 1 : 0;
    if (held >= 0) ending.nonblocking = (at(held, "result").flags & nonblocking) != 0;
}

void World::fatal(const char* what, int number) const {
    std::cout << "seed " << _task->seed << ": " << what << ' ' << number << '\n';
    print(std::cout, *_task);
    print_side_by_side(std::cout, *_task, _story, _story);
    std::cout.flush();
    std::abort();
}

World::Descriptor& World::at(int fd, const char* use) {
    const int index = fd - _task->first_descriptor;
    if (index < 0 || index >= static_cast<int>(_table.size()) || !_table[static_cast<unsigned>(index)].open) {
        std::cout << use << ": ";
        fatal("a descriptor that is not open is used:", fd);
    }
    return _table[static_cast<unsigned>(index)];
}

int World::opened() {
    Descriptor made{};
    made.open = true;
    made.flags = 02;
    _table.push_back(made);
    return _task->first_descriptor + static_cast<int>(_table.size()) - 1;
}

Event World::event(Call call, std::int64_t a, std::int64_t b) const {
    Event made{};
    made.call = call;
    made.a = a;
    made.b = b;
    return made;
}

// Writes the event down. An error is what errno reads from now on, and makes the result -1 unless the
// event has another.
int World::told(Event event, int error) {
    if (error != 0) {
        if (event.result == 0) event.result = -1;
        event.error = _error = error;
    }
    event.time = _now;
    if (_story.events.size() == longest_story)
        fatal("the calls do not end after", static_cast<int>(longest_story));
    _story.events.push_back(event);
    return static_cast<int>(event.result);
}

int World::given() { return opened(); }

ListAnswer World::list(unsigned name, unsigned port) {
    const ListAnswer answer = list_of(*_task);
    _now += answer.delay;
    Event made = event(Call::list, name, port);
    made.result = answer.code;
    told(made, 0);
    if (answer.code == 0) ++_lists;
    return answer;
}

LookUp World::look_up(unsigned name, int family) {
    const LookUp answer = look_up_of(*_task, family, name);
    _now += answer.delay;
    Event made = event(Call::look_up, name, family);
    made.result = answer.code;
    told(made, 0);
    if (answer.code == 0) ++_lists;
    return answer;
}

bool World::host_entry(unsigned name, bool& again, HostEntry& answer) {
    answer = host_entry_of(*_task, name);
    const unsigned nth = _asked[name]++;
    again = answer.again >= 5 || nth % (answer.again + 1) < answer.again;
    _now += host_entry_delay(*_task, name);
    const bool found = !again && answer.entry == Entry::found;
    Event made = event(Call::host_entry, name, again ? 1 : 0);
    made.result = found ? 0 : 1;
    told(made, 0);
    return found;
}

unsigned World::interface_index() {
    const unsigned index = interface_index_of(*_task);
    Event made = event(Call::interface_index);
    made.result = index;
    told(made, 0);
    return index;
}

int World::socket(int family, int type, int protocol) {
    Event made = event(Call::socket, family, type * 1000 + protocol);
    const int error = socket_of(*_task, count(_calls, Call::socket)++, family);
    if (error == 0) made.result = opened();
    return told(made, error);
}

int World::reuse(int fd, int value) {
    at(fd, "setsockopt");
    return told(event(Call::reuse, fd, value), reuse_of(*_task, count(_calls, Call::reuse)++));
}

// Reading the flags is no event: what happens when it fails is left open.
int World::flags(int fd) {
    Descriptor& descriptor = at(fd, "fcntl");
    const int flags = flags_of(*_task, count(_calls, Call::nonblock)++).flags;
    descriptor.flags_known = flags >= 0;
    if (flags < 0) _error = EBADF;
    return flags;
}

int World::nonblock(int fd, int flags) {
    Descriptor& descriptor = at(fd, "fcntl");
    if (!descriptor.flags_known) {
        _error = EPERM;
        return -1;
    }
    const int error = flags_of(*_task, count(_calls, Call::nonblock) - 1).error;
    if (error == 0) descriptor.flags = flags;
    return told(event(Call::nonblock, fd, flags), error);
}

int World::bind(int fd, const Address& address) {
    at(fd, "bind");
    Event made = event(Call::bind, fd);
    made.address = address;
    return told(made, bind_of(*_task, count(_calls, Call::bind)++));
}

int World::listen(int fd, int backlog) {
    at(fd, "listen");
    return told(event(Call::listen, fd, backlog), listen_of(*_task, count(_calls, Call::listen)++));
}

int World::accept(int fd, unsigned room) {
    at(fd, "accept");
    Event made = event(Call::accept, fd, room);
    const int error = accept_of(*_task, count(_calls, Call::accept)++);
    if (error == 0) made.result = opened();
    return told(made, error);
}

int World::connect(int fd, const Address& address) {
    Descriptor& descriptor = at(fd, "connect");
    descriptor.peer = address;
    descriptor.pending = false;
    Event made = event(Call::connect, fd);
    made.address = address;
    const ConnectAnswer answer = connect_of(*_task, count(_calls, Call::connect)++);
    return told(made, answer.started ? start(descriptor, answer) : answer.error);
}

// A blocking socket waits for its connection inside connect.
int World::start(Descriptor& descriptor, const ConnectAnswer& answer) {
    if ((descriptor.flags & nonblocking) == 0 && !answer.whatever_flags) {
        _now += answer.delay;
        return answer.end;
    }
    descriptor.pending = true;
    descriptor.ends_at = _now + answer.delay;
    descriptor.end = answer.end;
    if (_started++ == _task->starved_wait) _starving = true;
    return answer.error;
}

// How long the connection still needs; a descriptor that nobody watches is never ready.
std::uint64_t World::left(const Descriptor& descriptor, bool watched) const {
    if (!watched) return never;
    return descriptor.pending && descriptor.ends_at > _now ? descriptor.ends_at - _now : 0;
}

int World::wait(int fd, std::int64_t ms, bool limited, bool watched) {
    const Descriptor& descriptor = at(fd, "wait");
    Event made = event(Call::wait, fd, ms);
    const WaitAnswer answer = wait_of(*_task, count(_calls, Call::wait)++);
    if (limited && ms < 0) return told(made, EINVAL);
    const std::uint64_t needed = left(descriptor, watched);
    const std::uint64_t limit = limited ? static_cast<std::uint64_t>(ms) : never;
    const std::uint64_t end = needed < limit ? needed : limit;
    if (!answer.natural && (answer.delay == 0 || answer.delay < end)) {
        _now += answer.delay;
        made.result = answer.result;
        return told(made, answer.error);
    }
    // Nothing would ever end this wait, so the system refuses it.
    if (end == never) return told(made, ENOMEM);
    _now += end;
    made.result = needed <= limit ? 1 : 0;
    return told(made, 0);
}

int World::so_error(int fd, int& value) {
    Descriptor& descriptor = at(fd, "getsockopt");
    value = descriptor.end;
    const int error = so_error_of(*_task, count(_calls, Call::so_error)++);
    return told(event(Call::so_error, fd, error == 0 ? value : 0), error);
}

int World::local_name(int fd, unsigned room, Address& address) {
    const Descriptor& descriptor = at(fd, "getsockname");
    const LocalName answer = local_name_of(*_task, count(_calls, Call::local_name)++, descriptor.peer);
    address = answer.address;
    return told(event(Call::local_name, fd, room), answer.error);
}

int World::close(int fd) {
    at(fd, "close").open = false;
    const CloseAnswer answer = close_of(*_task, count(_calls, Call::close)++);
    Event made = event(Call::close, fd);
    made.result = answer.result;
    made.error = answer.error;
    if (answer.error != 0) _error = answer.error;
    told(made, 0);
    return answer.result;
}

std::uint64_t World::sleep(std::uint64_t ms) {
    const SleepAnswer answer = sleep_of(*_task, count(_calls, Call::sleep)++);
    const std::uint64_t passed = slept(answer, ms);
    _now += passed;
    told(event(Call::sleep, static_cast<std::int64_t>(ms)), 0);
    return ms - passed;
}

int World::pause(std::uint64_t ms) {
    const SleepAnswer answer = pause_of(*_task, count(_calls, Call::pause)++);
    _now += slept(answer, ms);
    return told(event(Call::pause, static_cast<std::int64_t>(ms)), answer.error);
}

}  // namespace sim
}  // namespace kel
