// SPDX-License-Identifier: MIT
// Mutexes and their guards, not contended: what every other class pays all the time.
#include <bench/support/bench.h>
#include <kel/core/mutex.h>
#include <kel/core/spin_mutex.h>
#include <pthread.h>

#include <mutex>

#ifdef KEL_BENCH_ABSL
#include <absl/synchronization/mutex.h>
#endif
#ifdef KEL_BENCH_ACE
#include <ace/Guard_T.h>
#include <ace/Recursive_Thread_Mutex.h>
#include <ace/Thread_Mutex.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// Aligned: where the linker happens to put a mutex, it may lie across two cache lines.
template <class Mutex>
void lock_unlock(benchmark::State& state) {
    alignas(64) static Mutex mutex;
    for (auto _ : state) {
        mutex.lock();
        mutex.unlock();
    }
}

template <class Mutex, class Guard>
void guard(benchmark::State& state) {
    alignas(64) static Mutex mutex;
    for (auto _ : state) {
        const Guard hold(mutex);
    }
}

template <class Mutex>
void create_destroy(benchmark::State& state) {
    for (auto _ : state) {
        Mutex mutex;
        benchmark::DoNotOptimize(&mutex);
    }
}

// The calls of the C library themselves, their results ignored.
struct RawMutex {
    RawMutex() { pthread_mutex_init(&mutex, nullptr); }
    ~RawMutex() { pthread_mutex_destroy(&mutex); }
    void lock() { pthread_mutex_lock(&mutex); }
    void unlock() { pthread_mutex_unlock(&mutex); }

    pthread_mutex_t mutex;
};

struct RawRecursiveMutex {
    RawRecursiveMutex() {
        pthread_mutexattr_t attributes;
        pthread_mutexattr_init(&attributes);
        pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
        pthread_mutex_init(&mutex, &attributes);
        pthread_mutexattr_destroy(&attributes);
    }
    ~RawRecursiveMutex() { pthread_mutex_destroy(&mutex); }
    void lock() { pthread_mutex_lock(&mutex); }
    void unlock() { pthread_mutex_unlock(&mutex); }

    pthread_mutex_t mutex;
};

struct KelGuard {
    explicit KelGuard(KELMutex& mutex) : hold(mutex, 1) {}
    KELMutex_var hold;
};

#ifdef KEL_BENCH_ABSL
struct AbslMutex {
    void lock() ABSL_NO_THREAD_SAFETY_ANALYSIS { mutex.Lock(); }
    void unlock() ABSL_NO_THREAD_SAFETY_ANALYSIS { mutex.Unlock(); }
    absl::Mutex mutex;
};
#endif

#ifdef KEL_BENCH_ACE
template <class Mutex>
struct AceMutex {
    void lock() { mutex.acquire(); }
    void unlock() { mutex.release(); }
    Mutex mutex;
};
#endif

const bool registered = [] {
    line("lock + unlock", kLimit, lock_unlock<RawMutex>);
    line("lock + unlock", "std::mutex", lock_unlock<std::mutex>);
    line("lock + unlock", kKel, lock_unlock<KELMutex>);

    line("recursive lock + unlock", kLimit, lock_unlock<RawRecursiveMutex>);
    line("recursive lock + unlock", "std::recursive_mutex", lock_unlock<std::recursive_mutex>);
    line("recursive lock + unlock", kKel, lock_unlock<KELRMutex>);

    line("guard", kLimit, lock_unlock<RawMutex>);
    line("guard", "std::lock_guard", guard<std::mutex, std::lock_guard<std::mutex>>);
    line("guard", kKel, guard<KELMutex, KelGuard>);

    line("create + destroy a mutex", kLimit, create_destroy<RawMutex>);
    line("create + destroy a mutex", kKel, create_destroy<KELMutex>);

    line("create + destroy a recursive mutex", kLimit, create_destroy<RawRecursiveMutex>);
    line("create + destroy a recursive mutex", kKel, create_destroy<KELRMutex>);

    line("pooled mutex, create + destroy", kLimit, create_destroy<RawMutex>);
    line("pooled mutex, create + destroy", kKel, create_destroy<KELSpinMutex>);
    line("pooled mutex, lock + unlock", kLimit, lock_unlock<RawMutex>);
    line("pooled mutex, lock + unlock", "std::mutex", lock_unlock<std::mutex>);
    line("pooled mutex, lock + unlock", kKel, lock_unlock<KELSpinMutex>);
#ifdef KEL_BENCH_ABSL
    line("lock + unlock", "absl::Mutex", lock_unlock<AbslMutex>);
#endif
#ifdef KEL_BENCH_ACE
    line("lock + unlock", "ACE_Thread_Mutex", lock_unlock<AceMutex<ACE_Thread_Mutex>>);
    line("recursive lock + unlock", "ACE_Recursive_Thread_Mutex",
         lock_unlock<AceMutex<ACE_Recursive_Thread_Mutex>>);
    line("guard", "ACE_Guard", guard<ACE_Thread_Mutex, ACE_Guard<ACE_Thread_Mutex>>);
    line("create + destroy a mutex", "ACE_Thread_Mutex", create_destroy<ACE_Thread_Mutex>);
#endif
    return true;
}();

}  // namespace
