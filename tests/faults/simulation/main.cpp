// Plays many seeds through the library and holds each against the oracle.
//
//     kel_simulation --seeds 1000000 [--from 0] [--processes 2] [--hours 100] [--within 60]
//     kel_simulation --seed 4711           one of them, with all that happened
//
// The last line is the figures. Exit status 1 when a seed differs or a goal is missed: the virtual
// hours, the seconds, and, when hours are asked for, every decision of the oracle.
//
// SPDX-License-Identifier: MIT
#include <sys/resource.h>
#include <time.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>

#include "tests/faults/simulation/run.h"

namespace {

struct Options {
    bool one = false;
    std::uint64_t seed = 0;
    kel::sim::Run run = {0, 100000, 2};
    double hours = 0;
    double within = 0;
};

bool read(int argc, char** argv, Options& options) {
    for (int i = 1; i + 1 < argc; i += 2) {
        const std::uint64_t value = std::strtoull(argv[i + 1], nullptr, 10);
        const char* const name = argv[i];
        if (std::strcmp(name, "--seed") == 0) {
            options.one = true;
            options.seed = value;
        } else if (std::strcmp(name, "--seeds") == 0) {
            options.run.count = value;
        } else if (std::strcmp(name, "--from") == 0) {
            options.run.first = value;
        } else if (std::strcmp(name, "--processes") == 0) {
            options.run.processes = value > 0 ? static_cast<unsigned>(value) : 1;
        } else if (std::strcmp(name, "--hours") == 0) {
            options.hours = static_cast<double>(value);
        } else if (std::strcmp(name, "--within") == 0) {
            options.within = static_cast<double>(value);
        } else {
            return false;
        }
    }
    return argc % 2 == 1;
}

double seconds() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

void print_endings(const kel::sim::Figures& figures) {
    for (unsigned i = 0; i < kel::sim::kinds_thrown; ++i) {
        std::printf("%12llu %s\n", static_cast<unsigned long long>(figures.endings[i]),
                    name_of(static_cast<kel::sim::Thrown>(i)));
    }
}

void print_turns(const kel::sim::Figures& figures) {
    for (unsigned i = 0; i < static_cast<unsigned>(kel::sim::Turn::count); ++i) {
        std::printf("%12llu %s\n", static_cast<unsigned long long>(figures.turns.taken[i]),
                    name_of(static_cast<kel::sim::Turn>(i)));
    }
}

int run(const Options& options) {
    const double begin = seconds();
    kel::sim::Figures figures;
    const bool equal = kel::sim::run(options.run, figures);
    const double took = seconds() - begin;
    print_endings(figures);
    print_turns(figures);
    std::fflush(stdout);
    const bool all = options.hours == 0 || figures.turns_missed(&std::cout) == 0;
    std::cout.flush();
    const bool long_enough = figures.hours >= options.hours;
    const bool fast_enough = options.within == 0 || took < options.within;
    const unsigned turns = static_cast<unsigned>(kel::sim::Turn::count);
    std::printf(
        "sim: %llu seeds, %llu different, %llu connects, %llu waits, %llu descriptors, %u of %u decisions "
        "reached, %.0f virtual hours, %.1f s\n",
        static_cast<unsigned long long>(figures.seeds), static_cast<unsigned long long>(figures.different),
        static_cast<unsigned long long>(figures.connects), static_cast<unsigned long long>(figures.waits),
        static_cast<unsigned long long>(figures.descriptors), turns - figures.turns_missed(nullptr), turns,
        figures.hours, took);
    return equal && all && long_enough && fast_enough ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!read(argc, argv, options)) {
        std::cerr << "kel_simulation: see the top of main.cpp for the options\n";
        return 2;
    }
    if (options.one) return kel::sim::replay(options.seed) ? 0 : 1;
    return run(options);
}
