// SPDX-License-Identifier: MIT
#include "tests/faults/soak/faults.h"

#include <netinet/in.h>

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tests/support/fault.h"

namespace kel {
namespace soak {

namespace seams = test::seams;

namespace {

const unsigned one_in = 100;
const char own_name[] = "here.test";

std::atomic<unsigned long> made{0};
std::atomic<long> lists{0};
std::atomic<std::uint32_t> threads_seeded{0};

// Each thread draws from a row of its own.
std::uint32_t draw() {
    static thread_local std::uint32_t state = 0;
    if (state == 0) state = (threads_seeded.fetch_add(1) + 1) * 2654435769u | 1;
    state ^= state << 13;
    state ^= state >> 17;
    state ^= state << 5;
    return state;
}

// Whether this call fails.
bool unlucky() {
    if (!by_chance()) return false;
    made.fetch_add(1, std::memory_order_relaxed);
    return true;
}

template <std::size_t n>
int one_of(const int (&errors)[n]) {
    return errors[draw() % n];
}

// The seam fails with one of the errors, else the system answers.
template <std::size_t n, class... A>
void may_fail(test::Seam<int(A...)>& seam, const int (&errors)[n]) {
    seam.script([&seam, errors](A... a) {
        if (!unlucky()) return seam.real(a...);
        errno = one_of(errors);
        return -1;
    });
}

template <std::size_t n, class... A>
void may_return(test::Seam<int(A...)>& seam, const int (&codes)[n]) {
    seam.script([&seam, codes](A... a) { return unlucky() ? one_of(codes) : seam.real(a...); });
}

void set_up_sockets() {
    may_fail(seams::socket, {EMFILE, ENFILE, ENOMEM, EACCES});
    may_fail(seams::bind, {EADDRINUSE, EADDRNOTAVAIL});
    may_fail(seams::listen, {EADDRINUSE, ENOMEM});
    may_fail(seams::accept, {EINTR, EMFILE, ECONNABORTED});
    may_fail(seams::connect, {ECONNREFUSED, EADDRINUSE, EINTR, ENETUNREACH, ETIMEDOUT, ENOMEM});
    may_fail(seams::getsockopt, {ENOBUFS});
    may_fail(seams::setsockopt, {ENOPROTOOPT});
    may_fail(seams::getsockname, {ENOBUFS});
    may_fail(seams::fcntl64, {EPERM});
    // The descriptor is gone all the same.
    seams::close.script([](int fd) {
        const int result = seams::close.real(fd);
        if (!unlucky()) return result;
        errno = EIO;
        return -1;
    });
}

// An unlucky wait is interrupted, refused or over too soon.
int unlucky_wait() {
    errno = one_of({EINTR, EINTR, ENOMEM, 0});
    return errno == 0 ? 0 : -1;
}

bool is_a_sleep(int n, const fd_set* r, const fd_set* w) { return n == 1 && r == nullptr && w == nullptr; }

void set_up_waits() {
    seams::poll.script([](pollfd* entries, nfds_t n, int ms) {
        return unlucky() ? unlucky_wait() : seams::poll.real(entries, n, ms);
    });
    seams::select.script([](int n, fd_set* r, fd_set* w, fd_set* e, timeval* t) {
        if (is_a_sleep(n, r, w)) return 0;
        return unlucky() ? unlucky_wait() : seams::select.real(n, r, w, e, t);
    });
    seams::sleep.script([](unsigned) { return 0u; });
}

void set_up_names() {
    seams::gethostname.script([](char* name, size_t n) {
        if (n >= sizeof own_name) std::memcpy(name, own_name, sizeof own_name);
        return 0;
    });
    seams::gethostbyname_r.script([](const char*, hostent*, char*, size_t, hostent** found, int* error) {
        *found = nullptr;
        *error = unlucky() ? TRY_AGAIN : HOST_NOT_FOUND;
        return 0;
    });
    seams::getaddrinfo.script(
        [](const char* host, const char* service, const addrinfo* hints, addrinfo** list) -> int {
            const int codes[] = {EAI_AGAIN, EAI_MEMORY, EAI_NONAME};
            if (unlucky()) return one_of(codes);
            // This machine under its own name is the loopback, where the listeners are.
            const bool own = std::strcmp(host, own_name) == 0;
            if (own && hints->ai_family != AF_INET) return EAI_NONAME;
            const int rc = seams::getaddrinfo.real(own ? "127.0.0.1" : host, service, hints, list);
            if (rc == 0) ++lists;
            return rc;
        });
    seams::freeaddrinfo.script([](addrinfo* list) {
        --lists;
        seams::freeaddrinfo.real(list);
    });
}

void set_up_threads() {
    may_return(seams::pthread_create, {EAGAIN});
    may_return(seams::pthread_mutex_init, {ENOMEM, EAGAIN});
    may_return(seams::pthread_cond_init, {ENOMEM, EAGAIN});
    seams::perror.script([](const char*) {});
}

}  // namespace

void set_up_faults() {
    set_up_sockets();
    set_up_waits();
    set_up_names();
    set_up_threads();
}

bool by_chance() { return draw() % one_in == 0; }

unsigned long faults_made() { return made; }

long lists_held() { return lists; }

void plan_lost_memory() {
    made.fetch_add(1, std::memory_order_relaxed);
    test::AllocationPlan::fail(test::AllocationPlan::calls() + 1 + static_cast<long>(draw() % 8));
}

}  // namespace soak
}  // namespace kel
