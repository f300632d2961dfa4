// SPDX-License-Identifier: MIT
// Opens the library that is its argument and prints how many nanoseconds that took.
#include <dlfcn.h>

#include <chrono>
#include <iostream>

int main(int argc, char** argv) {
    if (argc != 2) return 2;
    const auto start = std::chrono::steady_clock::now();
    void* const opened = dlopen(argv[1], RTLD_NOW);
    const std::chrono::nanoseconds taken = std::chrono::steady_clock::now() - start;
    if (opened == nullptr) return 1;
    std::cout << taken.count() << std::endl;
}
