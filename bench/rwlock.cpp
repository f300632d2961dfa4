// SPDX-License-Identifier: MIT
// The reader-writer lock, not contended.
#include <bench/support/bench.h>
#include <kel/core/rwlock.h>
#include <pthread.h>

#include <shared_mutex>

#ifdef KEL_BENCH_ABSL
#include <absl/synchronization/mutex.h>
#endif
#ifdef KEL_BENCH_ACE
#include <ace/RW_Thread_Mutex.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

struct Raw {
    Raw() { pthread_rwlock_init(&lock, nullptr); }
    ~Raw() { pthread_rwlock_destroy(&lock); }
    void read() { pthread_rwlock_rdlock(&lock); }
    void read_end() { pthread_rwlock_unlock(&lock); }
    void write() { pthread_rwlock_wrlock(&lock); }
    void write_end() { pthread_rwlock_unlock(&lock); }
    pthread_rwlock_t lock;
};

struct Shared {
    void read() { lock.lock_shared(); }
    void read_end() { lock.unlock_shared(); }
    void write() { lock.lock(); }
    void write_end() { lock.unlock(); }
    std::shared_mutex lock;
};

struct Kel {
    void read() { lock.read_lock(); }
    void read_end() { lock.unlock(); }
    void write() { lock.write_lock(); }
    void write_end() { lock.unlock(); }
    KELRWLock lock;
};

#ifdef KEL_BENCH_ABSL
struct Absl {
    void read() ABSL_NO_THREAD_SAFETY_ANALYSIS { lock.ReaderLock(); }
    void read_end() ABSL_NO_THREAD_SAFETY_ANALYSIS { lock.ReaderUnlock(); }
    void write() ABSL_NO_THREAD_SAFETY_ANALYSIS { lock.WriterLock(); }
    void write_end() ABSL_NO_THREAD_SAFETY_ANALYSIS { lock.WriterUnlock(); }
    absl::Mutex lock;
};
#endif

#ifdef KEL_BENCH_ACE
struct Ace {
    void read() { lock.acquire_read(); }
    void read_end() { lock.release(); }
    void write() { lock.acquire_write(); }
    void write_end() { lock.release(); }
    ACE_RW_Thread_Mutex lock;
};
#endif

template <class Lock>
void read(benchmark::State& state) {
    static Lock lock;
    for (auto _ : state) {
        lock.read();
        lock.read_end();
    }
}

template <class Lock>
void write(benchmark::State& state) {
    static Lock lock;
    for (auto _ : state) {
        lock.write();
        lock.write_end();
    }
}

template <class Lock>
void contender(const std::string& who) {
    line("read lock + unlock", who, read<Lock>);
    line("write lock + unlock", who, write<Lock>);
}

const bool registered = [] {
    contender<Raw>(kLimit);
    contender<Shared>("std::shared_mutex");
    contender<Kel>(kKel);
#ifdef KEL_BENCH_ABSL
    contender<Absl>("absl::Mutex");
#endif
#ifdef KEL_BENCH_ACE
    contender<Ace>("ACE_RW_Thread_Mutex");
#endif
    return true;
}();

}  // namespace
