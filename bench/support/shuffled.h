// The keys of the dictionary's bench, in an order that no cache foresees and that is always the same.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_BENCH_SUPPORT_SHUFFLED_H
#define KEL_BENCH_SUPPORT_SHUFFLED_H

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <numeric>
#include <random>
#include <string>
#include <vector>

namespace bench {

// 0 to n - 1, as KELUniqueId numbers things.
inline std::vector<std::uint32_t> shuffled_numbers(std::size_t n) {
    std::vector<std::uint32_t> numbers(n);
    std::iota(numbers.begin(), numbers.end(), 0u);
    std::shuffle(numbers.begin(), numbers.end(), std::mt19937(4711));
    return numbers;
}

// Names such as operations and services have: twelve letters.
inline std::vector<std::string> random_names(std::size_t n) {
    std::mt19937 draw(4711);
    std::vector<std::string> names(n);
    for (std::string& name : names) {
        for (int i = 0; i < 12; ++i) name += static_cast<char>('a' + draw() % 26);
    }
    return names;
}

// Names that differ in a number at their end.
inline std::vector<std::string> numbered_names(std::size_t n) {
    std::vector<std::string> names;
    for (std::uint32_t i : shuffled_numbers(n)) names.push_back("object_" + std::to_string(i));
    return names;
}

inline std::vector<const char*> pointers(const std::vector<std::string>& names) {
    std::vector<const char*> result;
    for (const std::string& name : names) result.push_back(name.c_str());
    return result;
}

}  // namespace bench

#endif
