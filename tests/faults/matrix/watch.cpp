// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/watch.h"

#include <fcntl.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/os/portable.h>
#include <kel/services/environment.h>
#include <poll.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <thread>

#include "tests/core/probe.h"
#include "tests/support/fault.h"

// Defined in the program that counts the blocks of malloc.
long live_malloc_blocks() __attribute__((weak));

namespace kel {
namespace test {

// --- Ledger ----------------------------------------------------------------------------------------

Ledger::Ledger()
    : _blocks(AllocationPlan::live_blocks()),
      _system_blocks(live_malloc_blocks != nullptr ? live_malloc_blocks() : 0) {
    pollfd entries[descriptors];
    for (int fd = 0; fd < descriptors; ++fd) entries[fd] = {fd, 0, 0};
    ::poll(entries, descriptors, 0);
    for (int fd = 0; fd < descriptors; ++fd) _open[fd] = (entries[fd].revents & POLLNVAL) == 0;
}

void Ledger::compare(const Ledger& later, bool blocks_too, Text& problems) const {
    for (int fd = 0; fd < descriptors; ++fd) {
        if (_open[fd] == later._open[fd]) continue;
        problems.add("descriptor %d was %s and is %s\n", fd, _open[fd] ? "open" : "closed",
                     later._open[fd] ? "open" : "closed");
    }
    if (blocks_too && _blocks != later._blocks)
        problems.add("%ld blocks are left\n", later._blocks - _blocks);
}

// --- Capture ---------------------------------------------------------------------------------------

namespace {

// One file in memory for each stream, used by all runs of this process and of its children.
int capture_file(int stream) {
    static const int files[2] = {::memfd_create("shown", 0), ::memfd_create("printed", 0)};
    return files[stream];
}

void flush_streams() {
    std::cout.flush();
    std::fflush(stdout);
    std::fflush(stderr);
}

}  // namespace

Capture::Capture() {
    flush_streams();
    for (int stream = 0; stream < 2; ++stream) {
        const int file = capture_file(stream);
        if (::ftruncate(file, 0) != 0 || ::lseek(file, 0, SEEK_SET) != 0) std::abort();
        _saved[stream] = ::dup(stream + 1);
        ::dup2(file, stream + 1);
    }
}

void Capture::stop() {
    if (!_capturing) return;
    _capturing = false;
    flush_streams();
    for (int stream = 0; stream < 2; ++stream) {
        ::dup2(_saved[stream], stream + 1);
        ::close(_saved[stream]);
    }
    // A write that failed on purpose must not make later ones fail.
    std::cout.clear();
    std::cerr.clear();
    std::clearerr(stdout);
    std::clearerr(stderr);
}

void Capture::read(Text& shown, Text& printed) {
    Text* const texts[2] = {&shown, &printed};
    for (int stream = 0; stream < 2; ++stream) {
        char bytes[4096];
        const ssize_t n = ::pread(capture_file(stream), bytes, sizeof bytes, 0);
        if (n > 0) texts[stream]->append(bytes, static_cast<std::size_t>(n));
    }
}

// --- LockWatch -------------------------------------------------------------------------------------

namespace {

bool is_recursive(const pthread_mutex_t* m) { return (m->__data.__kind & 3) == PTHREAD_MUTEX_RECURSIVE; }

bool is_free(pthread_mutex_t* m) {
    if (pthread_mutex_trylock(m) != 0) return false;
    pthread_mutex_unlock(m);
    return true;
}

struct OwnLock {
    const char* name;
    pthread_mutex_t* mutex;
};

}  // namespace

LockWatch::LockWatch() {
    seams::pthread_mutex_lock.script([this](pthread_mutex_t* m) {
        _locked.insert(m);
        return seams::pthread_mutex_lock.real(m);
    });
    seams::pthread_mutex_destroy.script([this](pthread_mutex_t* m) {
        _locked.erase(m);
        return seams::pthread_mutex_destroy.real(m);
    });
    seams::pthread_mutex_lock.tell_failure([this](int rc, pthread_mutex_t* m) {
        _recursive = is_recursive(m);
        return rc;
    });
    seams::pthread_mutex_unlock.tell_failure([this](int rc, pthread_mutex_t* m) {
        _recursive = is_recursive(m);
        return rc;
    });
}

void LockWatch::check_free(Text& problems) const {
    const OwnLock own[] = {{"KELThread::_mutex", native(KELThread::_mutex)},
                           {"KELThreadLocal::_mutex", native(KELThreadLocal::_mutex)},
                           {"KELPortable::_mutex", native(KELPortable::_mutex)},
                           {"CurrentEnvironment::_mtx", native(CurrentEnvironment::_mtx)}};
    std::thread([&] {
        for (const OwnLock& lock : own) {
            if (!is_free(lock.mutex)) problems.add("%s is still locked\n", lock.name);
        }
        for (pthread_mutex_t* m : _locked) {
            if (!is_free(m)) problems.add("a mutex is still locked\n");
        }
    }).join();
}

}  // namespace test
}  // namespace kel
