// SPDX-License-Identifier: MIT
// The first dlopen of the library in a fresh process, which has the C++ library already and does nothing
// else.
#include <bench/support/bench.h>

#include <cstdio>

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

// What one open took in a new process; negative when the library cannot be opened.
double nanoseconds_to_open(const char* library) {
    const std::string command = std::string(KEL_BENCH_OPENER) + " " + library;
    FILE* const child = popen(command.c_str(), "r");
    double taken = -1;
    if (child == nullptr || std::fscanf(child, "%lf", &taken) != 1) taken = -1;
    if (child != nullptr) pclose(child);
    return taken;
}

void open(benchmark::State& state, const char* library) {
    for (auto _ : state) {
        const double taken = nanoseconds_to_open(library);
        if (taken < 0) state.SkipWithError("cannot be opened");
        state.SetIterationTime(taken / 1e9);
    }
}

void load_line(const char* who, const char* library) {
    line("first dlopen in a fresh process", who, [=](benchmark::State& state) { open(state, library); })
        ->UseManualTime()
        ->Iterations(3);
}

const bool registered = [] {
    load_line(kLimit, KEL_BENCH_EMPTY);
    load_line(kKel, KEL_BENCH_KEL);
#ifdef KEL_BENCH_ACE
    load_line("libACE", KEL_BENCH_ACE_FILE);
#endif
    return true;
}();

}  // namespace
