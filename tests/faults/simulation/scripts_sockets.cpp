// Sockets, waits and the clock.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>

#include <cerrno>
#include <cstring>

#include "tests/faults/simulation/scripts.h"
#include "tests/support/fault.h"

namespace kel {
namespace sim {

namespace seams = test::seams;

namespace {

// The descriptor whose connection was started last: the one that is waited for.
int connecting = -1;

// The result as the system hands it over: errno is written only where the world wrote it.
int answered(int result) {
    errno = playing.world->error();
    return result;
}

Address read(const sockaddr* from, socklen_t size) {
    Address address{};
    if (size > sizeof address.bytes) playing.world->fatal("an address is too long:", static_cast<int>(size));
    std::memcpy(address.bytes, from, size);
    address.size = static_cast<std::uint8_t>(size);
    return address;
}

void write(const Address& address, sockaddr* to, socklen_t* size) {
    std::memcpy(to, address.bytes, address.size < *size ? address.size : *size);
    *size = address.size;
}

int answer_bind(int fd, const sockaddr* address, socklen_t size) {
    return answered(playing.world->bind(fd, read(address, size)));
}

int answer_accept(int fd, sockaddr* address, socklen_t* size) {
    const int made = playing.world->accept(fd, *size);
    if (made >= 0) write(Address::of(v6_family, ip6(0xfd00, 9), 40002), address, size);
    return answered(made);
}

int answer_connect(int fd, const sockaddr* address, socklen_t size) {
    connecting = fd;
    const int result = playing.world->connect(fd, read(address, size));
    if (playing.world->starving()) test::AllocationPlan::fail(test::AllocationPlan::calls() + 1, true);
    return answered(result);
}

int answer_getsockname(int fd, sockaddr* address, socklen_t* size) {
    Address local{};
    const int result = playing.world->local_name(fd, *size, local);
    if (result == 0) write(local, address, size);
    return answered(result);
}

int answer_getsockopt(int fd, int level, int name, void* value, socklen_t* size) {
    if (level != SOL_SOCKET || name != SO_ERROR || *size != 4)
        playing.world->fatal("another option is read:", name);
    int error = 0;
    const int result = playing.world->so_error(fd, error);
    if (result == 0) std::memcpy(value, &error, 4);
    return answered(result);
}

int answer_setsockopt(int fd, int level, int name, const void* value, socklen_t size) {
    if (level != SOL_SOCKET || name != SO_REUSEADDR || size != 4)
        playing.world->fatal("another option is set:", name);
    int number;
    std::memcpy(&number, value, 4);
    return answered(playing.world->reuse(fd, number));
}

int answer_fcntl(int fd, int command, void* argument) {
    if (command == F_GETFL) return answered(playing.world->flags(fd));
    if (command != F_SETFL) playing.world->fatal("another command of fcntl:", command);
    return answered(playing.world->nonblock(fd, static_cast<int>(reinterpret_cast<std::intptr_t>(argument))));
}

int answer_poll(pollfd* entries, nfds_t n, int ms) {
    World& world = *playing.world;
    if (n != 1 || entries->fd != connecting) world.fatal("poll watches something else:", static_cast<int>(n));
    if (entries->events != POLLWRNORM) world.fatal("poll asks for other events:", entries->events);
    const int result = world.wait(entries->fd, ms, ms >= 0, true);
    entries->revents = result == 1 ? POLLWRNORM : 0;
    return answered(result);
}

bool is_a_pause(int n, const fd_set* r, const fd_set* w, const fd_set* e) {
    return n == 1 && r == nullptr && w == nullptr && e != nullptr && FD_ISSET(0, e);
}

std::int64_t milliseconds(const timeval* t) {
    if (t == nullptr) return -1;
    const std::uint64_t seconds = static_cast<std::uint64_t>(t->tv_sec);
    return static_cast<std::int64_t>(seconds * 1000 + static_cast<std::uint64_t>(t->tv_usec / 1000));
}

// The system leaves what remained of the time in `t`.
int answer_select(int n, fd_set* r, fd_set* w, fd_set* e, timeval* t) {
    World& world = *playing.world;
    const std::int64_t ms = milliseconds(t);
    const bool limited = t != nullptr;
    if (limited) *t = timeval();
    if (is_a_pause(n, r, w, e)) return answered(world.pause(static_cast<std::uint64_t>(ms)));
    if (r != nullptr || e != nullptr) world.fatal("select watches for something else", n);
    if (n > FD_SETSIZE) world.fatal("select is told to look behind its sets:", n);
    const bool watched = w != nullptr && connecting < n && FD_ISSET(connecting, w);
    return answered(world.wait(connecting, ms, limited, watched));
}

unsigned answer_sleep(unsigned seconds) {
    const std::uint64_t ms = static_cast<std::uint64_t>(seconds) * 1000;
    return static_cast<unsigned>(playing.world->sleep(ms) / 1000);
}

int answer_gettimeofday(timeval* tv, void*) {
    tv->tv_sec = static_cast<time_t>(playing.world->now() / 1000);
    tv->tv_usec = static_cast<suseconds_t>(playing.world->now() % 1000 * 1000);
    return 0;
}

template <class R, class... A>
void forbid(test::Seam<R(A...)>& seam) {
    seam.script([&seam](A...) -> R { playing.world->fatal(seam.name(), 0); });
}

}  // namespace

void script_sockets() {
    seams::socket.script([](int f, int t, int p) { return answered(playing.world->socket(f, t, p)); });
    seams::bind.script(answer_bind);
    seams::listen.script([](int fd, int backlog) { return answered(playing.world->listen(fd, backlog)); });
    seams::accept.script(answer_accept);
    seams::connect.script(answer_connect);
    seams::getsockname.script(answer_getsockname);
    seams::getsockopt.script(answer_getsockopt);
    seams::setsockopt.script(answer_setsockopt);
    seams::fcntl64.script(answer_fcntl);
    seams::poll.script(answer_poll);
    seams::select.script(answer_select);
    seams::close.script([](int fd) { return answered(playing.world->close(fd)); });
    seams::sleep.script(answer_sleep);
    seams::gettimeofday.script(answer_gettimeofday);
    // Not `pipe`, which the undefined-behaviour sanitizer calls to find out what memory can be read.
    forbid(seams::getpeername);
    forbid(seams::gethostbyaddr_r);
    forbid(seams::time);
}

}  // namespace sim
}  // namespace kel
