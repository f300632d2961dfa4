// SPDX-License-Identifier: MIT
// Detached threads, from their start until they say that their body is done. All on one processor: on
// which of several the system puts a new thread, and how deeply that one sleeps, would be the larger part
// of the time.
#include <bench/support/bench.h>
#include <kel/core/thread.h>
#include <pthread.h>
#include <sched.h>
#include <semaphore.h>

#include <memory>
#include <thread>
#include <vector>

#ifdef KEL_BENCH_ACE
#include <ace/Thread_Manager.h>
#endif

using bench::growth;
using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// What a body does as its last act. Waiting for it is the same for all.
struct Done {
    Done() { sem_init(&semaphore, 0, 0); }
    ~Done() { sem_destroy(&semaphore); }
    void post() { sem_post(&semaphore); }
    void wait() {
        while (sem_wait(&semaphore) != 0) {
        }
    }
    sem_t semaphore;
};

Done done;

// Keeps this thread and those it starts on the first of its processors while it lives.
class OneProcessor {
public:
    OneProcessor() {
        sched_getaffinity(0, sizeof(_before), &_before);
        cpu_set_t one;
        CPU_ZERO(&one);
        int first = 0;
        while (!CPU_ISSET(first, &_before)) ++first;
        CPU_SET(first, &one);
        sched_setaffinity(0, sizeof(one), &one);
    }
    ~OneProcessor() { sched_setaffinity(0, sizeof(_before), &_before); }
    OneProcessor(const OneProcessor&) = delete;
    OneProcessor& operator=(const OneProcessor&) = delete;

private:
    cpu_set_t _before;
};

void* raw_body(void*) {
    done.post();
    return nullptr;
}

void raw(benchmark::State& state) {
    const OneProcessor here;
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
    for (auto _ : state) {
        pthread_t thread;
        pthread_create(&thread, &attributes, &raw_body, nullptr);
        done.wait();
    }
    pthread_attr_destroy(&attributes);
}

void standard(benchmark::State& state) {
    const OneProcessor here;
    for (auto _ : state) {
        std::thread([] { done.post(); }).detach();
        done.wait();
    }
}

struct Worker : KELThread {
    Worker() : KELThread(0) {}
    void begin() override { done.post(); }
};

void kel(benchmark::State& state) {
    const OneProcessor here;
    Worker worker;
    for (auto _ : state) {
        worker.run();
        done.wait();
    }
}

#ifdef KEL_BENCH_ACE
ACE_THR_FUNC_RETURN ace_body(void*) {
    done.post();
    return nullptr;
}

void ace(benchmark::State& state) {
    const OneProcessor here;
    for (auto _ : state) {
        ACE_Thread::spawn(&ace_body, nullptr, THR_NEW_LWP | THR_DETACHED);
        done.wait();
    }
}
#endif

// --- many at once: the time of one among n that run side by side -------------------------------------

pthread_mutex_t gate = PTHREAD_MUTEX_INITIALIZER;

// Each of them waits until all have been started. The stacks are small, so that many fit.
const long stack = 64 * 1024;

void pass_the_gate() {
    pthread_mutex_lock(&gate);
    pthread_mutex_unlock(&gate);
    done.post();
}

void* raw_gate_body(void*) {
    pass_the_gate();
    return nullptr;
}

struct GateWorker : KELThread {
    GateWorker() : KELThread(stack) {}
    void begin() override { pass_the_gate(); }
};

template <class Start>
void many(benchmark::State& state, long n, Start start) {
    const OneProcessor here;
    for (auto _ : state) {
        pthread_mutex_lock(&gate);
        for (long i = 0; i < n; ++i) start(i);
        pthread_mutex_unlock(&gate);
        for (long i = 0; i < n; ++i) done.wait();
    }
    state.counters["items"] = static_cast<double>(n);
}

void many_raw(benchmark::State& state, long n) {
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
    pthread_attr_setstacksize(&attributes, stack);
    many(state, n, [&](long) {
        pthread_t thread;
        if (pthread_create(&thread, &attributes, &raw_gate_body, nullptr) != 0) std::abort();
    });
    pthread_attr_destroy(&attributes);
}

void many_kel(benchmark::State& state, long n) {
    const std::unique_ptr<GateWorker[]> workers(new GateWorker[n]);
    many(state, n, [&](long i) { workers[i].run(); });
}

const bool registered = [] {
    line("detached thread, start to end", kLimit, raw)->UseRealTime();
    line("detached thread, start to end", "std::thread", standard)->UseRealTime();
    line("detached thread, start to end", kKel, kel)->UseRealTime();
#ifdef KEL_BENCH_ACE
    line("detached thread, start to end", "ACE_Thread", ace)->UseRealTime();
#endif
    for (long n = 16; n <= 4096; n *= 4) {
        growth("threads at once, one of them", kLimit, n, [=](benchmark::State& state) {
            many_raw(state, n);
        })->UseRealTime();
        growth("threads at once, one of them", kKel, n, [=](benchmark::State& state) {
            many_kel(state, n);
        })->UseRealTime();
    }
    return true;
}();

}  // namespace
