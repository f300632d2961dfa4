// SPDX-License-Identifier: MIT
#include <bench/support/quiet.h>

#include <algorithm>
#include <chrono>
#include <cstdint>

namespace bench {

namespace {

typedef std::chrono::steady_clock Clock;

const double kQuiet = 1.1;  // of the least time of a probe
const std::chrono::milliseconds kFirstLook(30);
const std::chrono::milliseconds kPatience(30);

// Four chains of additions side by side: as many as a whole processor can do at a time, and half of one
// cannot. Aligned, so that the loop lies in its cache lines alike in all programs: where it lies badly it
// takes half as long again.
__attribute__((noinline, aligned(64))) double once() {
    std::uint32_t a = 1, b = 2, c = 3, d = 4;
    const Clock::time_point start = Clock::now();
    for (int i = 0; i < 20000; ++i) {
        a += 1;
        b += 2;
        c += 3;
        d += 4;
        __asm__ volatile("" : "+r"(a), "+r"(b), "+r"(c), "+r"(d));
    }
    return std::chrono::duration<double, std::nano>(Clock::now() - start).count();
}

// The least probe until one takes `enough` at most, or the time is over.
double probe_until(double enough, Clock::duration patience) {
    const Clock::time_point limit = Clock::now() + patience;
    double least = probe();
    while (least > enough && Clock::now() < limit) least = std::min(least, probe());
    return least;
}

}  // namespace

double probe() {
    const double first = once();
    return std::min({first, once(), once()});
}

double wait_for_quiet() {
    static double least = probe_until(0, kFirstLook);
    const double taken = probe_until(kQuiet * least, kPatience);
    least = std::min(least, taken);
    return taken;
}

}  // namespace bench
