// How the programs of the bench name what they measure.
//
//   line     one work of one contender: a line of the table has one for each
//   growth   one work of one contender at one size: a point of a curve
//
//     line("lock + unlock", "std::mutex", [](benchmark::State& state) { ... });
//     line("lock + unlock", kKel, [](benchmark::State& state) { ... });
//     growth("dictionary", kKel, 4096, [](benchmark::State& state) { ... });
//
// Contenders are kLimit, the least the machine can do it with, kKel, and peers under their own names.
// bench/goals.txt says which peer a goal is against. A line's time is processor time of the measuring
// thread; call UseRealTime() on what is returned where others do the work. A counter "items" divides the
// time: it is then that of one item. A counter "probe" tells how quiet the machine was around the time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_BENCH_SUPPORT_BENCH_H
#define KEL_BENCH_SUPPORT_BENCH_H

#include <bench/support/quiet.h>
#include <benchmark/benchmark.h>

#include <algorithm>
#include <string>

namespace bench {

const char* const kLimit = "limit";
const char* const kKel = "kel";

template <class Body>
benchmark::internal::Benchmark* line(const std::string& work, const std::string& contender, Body body) {
    return benchmark::RegisterBenchmark((work + "/" + contender).c_str(), [body](benchmark::State& state) {
        const double before = wait_for_quiet();
        body(state);
        state.counters["probe"] = std::max(before, probe());
    });
}

template <class Body>
benchmark::internal::Benchmark* growth(const std::string& work, const std::string& contender, long size,
                                       Body body) {
    return line("growth: " + work, contender + "@" + std::to_string(size), body);
}

// Runs `work` for as long as the state asks.
template <class Work>
void repeat(benchmark::State& state, Work work) {
    for (auto _ : state) work();
}

}  // namespace bench

#endif
