// SPDX-License-Identifier: MIT
#include "tests/faults/soak/balance.h"

#include <dirent.h>
#include <poll.h>

#include <cstdio>
#include <memory>
#include <thread>

#include "tests/faults/soak/faults.h"
#include "tests/support/fault.h"

namespace kel {
namespace soak {

namespace {

int entries(const char* folder) {
    const std::unique_ptr<DIR, int (*)(DIR*)> open(opendir(folder), closedir);
    int count = 0;
    while (open != nullptr && readdir(open.get()) != nullptr) ++count;
    return count - 2;  // "." and ".."
}

// Adds up the pages one by one; the counter in statm is off by some pages for each processor.
long resident() {
    const std::unique_ptr<FILE, int (*)(FILE*)> file(fopen("/proc/self/smaps_rollup", "r"), fclose);
    char line[200];
    long amount = 0;
    while (file != nullptr && fgets(line, sizeof line, file.get()) != nullptr) {
        if (sscanf(line, "Rss: %ld kB", &amount) == 1) return amount;
    }
    return 0;
}

int running_threads() { return entries("/proc/self/task"); }

}  // namespace

// Counted by another thread, as the first one may bring the sanitizer's with it.
int idle_threads() {
    int count = 0;
    std::thread([&count] { count = running_threads() - 1; }).join();
    return count;
}

// A thread leaves the folder after the last of its clean-up, which nothing else tells of a detached one.
bool settle(int threads) {
    for (int i = 0; i < 500; ++i) {
        if (running_threads() == threads) return true;
        poll(nullptr, 0, 20);
    }
    return false;
}

Balance balance() {
    Balance held;
    held.descriptors = entries("/proc/self/fd") - 1;  // but for the folder itself
    held.blocks = test::AllocationPlan::live_blocks();
    held.lists = lists_held();
    held.resident = resident();
    return held;
}

}  // namespace soak
}  // namespace kel
