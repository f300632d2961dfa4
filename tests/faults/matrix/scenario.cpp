// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/scenario.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <deque>

#include "tests/support/fault.h"

namespace kel {
namespace test {

namespace {

// Made by the first scenario that is listed, whichever file it stands in.
std::deque<Definition>& all() {
    static std::deque<Definition> definitions;
    return definitions;
}

}  // namespace

void Scenario::gives(const char* format, ...) {
    const Disarmed pause;
    std::va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(_result, sizeof _result, format, arguments);
    va_end(arguments);
}

Definition& list(std::string name, std::unique_ptr<Scenario> (*make)()) {
    all().emplace_back();
    all().back().name = std::move(name);
    all().back().make = make;
    return all().back();
}

std::vector<const Definition*> scenarios() {
    std::vector<const Definition*> found;
    for (const Definition& definition : all()) found.push_back(&definition);
    std::sort(found.begin(), found.end(),
              [](const Definition* a, const Definition* b) { return a->name < b->name; });
    return found;
}

}  // namespace test
}  // namespace kel
