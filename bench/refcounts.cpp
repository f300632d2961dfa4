// SPDX-License-Identifier: MIT
// Objects that count their references.
#include <bench/support/bench.h>
#include <kel/core/resource.h>

#include <atomic>
#include <memory>

using bench::kKel;
using bench::kLimit;
using bench::line;

namespace {

struct Object : KELResource {
    int payload = 0;
};

// A reference more and one less, the object staying.
void raw_pair(benchmark::State& state) {
    std::atomic<int> count(1);
    for (auto _ : state) {
        count.fetch_add(1, std::memory_order_relaxed);
        count.fetch_sub(1, std::memory_order_acq_rel);
    }
}

void shared_pair(benchmark::State& state) {
    const std::shared_ptr<int> object = std::make_shared<int>(0);
    for (auto _ : state) {
        std::shared_ptr<int> other = object;
        benchmark::DoNotOptimize(other);
    }
}

void kel_pair(benchmark::State& state, bool sharing) {
    Object* const object = new Object;
    object->_set_sharing(sharing);
    for (auto _ : state) {
        object->_ref();
        object->_unref();
    }
    object->_unref();
}

void plain_pair(benchmark::State& state) {
    int count = 1;
    for (auto _ : state) {
        benchmark::DoNotOptimize(++count);
        benchmark::DoNotOptimize(--count);
    }
}

// From new to the end, with one further reference in between.
void raw_life(benchmark::State& state) {
    for (auto _ : state) {
        std::atomic<int>* const object = new std::atomic<int>(1);
        benchmark::DoNotOptimize(object);
        object->fetch_add(1, std::memory_order_relaxed);
        object->fetch_sub(1, std::memory_order_acq_rel);
        if (object->fetch_sub(1, std::memory_order_acq_rel) == 1) delete object;
    }
}

void shared_life(benchmark::State& state) {
    for (auto _ : state) {
        std::shared_ptr<int> object = std::make_shared<int>(0);
        std::shared_ptr<int> other = object;
        benchmark::DoNotOptimize(other);
    }
}

void kel_life(benchmark::State& state) {
    for (auto _ : state) {
        Object* const object = new Object;
        object->_ref();
        object->_unref();
        object->_unref();
    }
}

const bool registered = [] {
    line("reference + release, shared", kLimit, raw_pair);
    line("reference + release, shared", "std::shared_ptr", shared_pair);
    line("reference + release, shared", kKel, [](benchmark::State& state) { kel_pair(state, true); });

    line("reference + release, one thread", kLimit, plain_pair);
    line("reference + release, one thread", "std::shared_ptr", shared_pair);
    line("reference + release, one thread", kKel, [](benchmark::State& state) { kel_pair(state, false); });

    line("counted object, new to delete", kLimit, raw_life);
    line("counted object, new to delete", "std::shared_ptr", shared_life);
    line("counted object, new to delete", kKel, kel_life);
    return true;
}();

}  // namespace
