// SPDX-License-Identifier: MIT
#include "tests/faults/bounds/bounds.h"

#include <new>

namespace kel {
namespace test {

namespace {

// Made by the first parameter that is added, whichever file that is in.
std::vector<Bounded>& list() {
    static std::vector<Bounded> parameters;
    return parameters;
}

}  // namespace

Bounded::Bounded(const char* in_header, const char* its_name) : header(in_header), name(its_name) {
    list().push_back(*this);
}

const std::vector<Bounded>& bounded() { return list(); }

void at_bounds(void (*body)(std::uint32_t n)) {
    for (const std::uint32_t n : bounds) {
        SCOPED_TRACE("n = " + std::to_string(n));
        reset_faults();
        body(n);
    }
    reset_faults();
}

bool refused(const std::function<void()>& body) {
    const long before = GuardedArrays::live();
    try {
        body();
    } catch (const std::bad_alloc&) {
        return GuardedArrays::live() == before;
    }
    return false;
}

}  // namespace test
}  // namespace kel
