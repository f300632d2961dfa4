// SPDX-License-Identifier: MIT
// Objects that exist once per thread.
#include <bench/support/bench.h>
#include <kel/core/thread_local.h>
#include <kel/services/environment.h>
#include <pthread.h>

#include <map>
#include <mutex>
#include <thread>

#ifdef KEL_BENCH_ACE
#include <ace/TSS_T.h>
#endif

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

struct Trace : KELThreadLocal {
    explicit Trace(unsigned long slot) : KELThreadLocal(slot) {}
};

unsigned long new_slot() {
    KELRMutex_var hold(KELThreadLocal::_mutex, 1);
    return KELThreadLocal::_cnt++;
}

// The calling thread's object, which exists.
void find_kel(benchmark::State& state) {
    const unsigned long slot = new_slot();
    Trace mine(slot);
    for (auto _ : state) benchmark::DoNotOptimize(KELThreadLocal::instance(slot));
}

void find_native(benchmark::State& state) {
    static thread_local int mine = 0;
    for (auto _ : state) benchmark::DoNotOptimize(&mine);
}

void find_by_key(benchmark::State& state) {
    pthread_key_t key;
    pthread_key_create(&key, nullptr);
    pthread_setspecific(key, &key);
    for (auto _ : state) benchmark::DoNotOptimize(pthread_getspecific(key));
    pthread_key_delete(key);
}

// The same reach with the standard library: any thread's object can be found, under a lock.
void find_in_map(benchmark::State& state) {
    std::recursive_mutex mutex;
    std::map<std::pair<std::thread::id, unsigned long>, void*> objects;
    objects[{std::this_thread::get_id(), 7}] = &mutex;
    for (auto _ : state) {
        std::lock_guard<std::recursive_mutex> hold(mutex);
        benchmark::DoNotOptimize(objects.find({std::this_thread::get_id(), 7})->second);
    }
}

#ifdef KEL_BENCH_ACE
void find_ace(benchmark::State& state) {
    ACE_TSS<int> mine;
    for (auto _ : state) benchmark::DoNotOptimize(mine.ts_object());
}
#endif

void environment_kel(benchmark::State& state) {
    for (auto _ : state) benchmark::DoNotOptimize(CORBA::current_environment());
}

// A thread's object made and destroyed.
void life_kel(benchmark::State& state) {
    const unsigned long slot = new_slot();
    for (auto _ : state) {
        Trace mine(slot);
        benchmark::DoNotOptimize(&mine);
    }
}

void life_by_key(benchmark::State& state) {
    pthread_key_t key;
    pthread_key_create(&key, nullptr);
    for (auto _ : state) {
        int* const mine = new int(0);
        pthread_setspecific(key, mine);
        benchmark::DoNotOptimize(mine);
        pthread_setspecific(key, nullptr);
        delete mine;
    }
    pthread_key_delete(key);
}

const bool registered = [] {
    line("thread-local object, found", kLimit, find_native);
    line("thread-local object, found", "pthread_getspecific", find_by_key);
    line("thread-local object, found", "mutex + std::map", find_in_map);
    line("thread-local object, found", kKel, find_kel);

    line("thread's environment, found", kLimit, find_native);
    line("thread's environment, found", kKel, environment_kel);

    line("thread-local object, made + destroyed", kLimit, life_by_key);
    line("thread-local object, made + destroyed", kKel, life_kel);
#ifdef KEL_BENCH_ACE
    line("thread-local object, found", "ACE_TSS", find_ace);
#endif
    return true;
}();

}  // namespace
