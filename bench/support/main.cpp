// SPDX-License-Identifier: MIT
// The main function of every program of the bench.
#include <benchmark/benchmark.h>
#include <pthread.h>

#include <cstdlib>

namespace {

pthread_mutex_t parking = PTHREAD_MUTEX_INITIALIZER;

void* park(void*) {
    pthread_mutex_lock(&parking);
    return nullptr;
}

// In a process of one thread the C library leaves out what only several need, in its allocator and its
// streams. Clients of the library have several, so a second one waits here until the end.
void park_a_second_thread() {
    pthread_mutex_lock(&parking);
    pthread_t parked;
    if (pthread_create(&parked, nullptr, &park, nullptr) != 0) std::abort();
}

}  // namespace

int main(int argc, char** argv) {
    park_a_second_thread();
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
}
