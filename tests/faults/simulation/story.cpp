// Comparing stories.
//
// SPDX-License-Identifier: MIT
#include "tests/faults/simulation/story.h"

#include <cstring>

namespace kel {
namespace sim {

bool Event::operator==(const Event& other) const {
    return call == other.call && a == other.a && b == other.b && result == other.result &&
           error == other.error && time == other.time && address == other.address;
}

bool Ending::operator==(const Ending& other) const {
    return thrown == other.thrown && minor == other.minor && completed == other.completed &&
           descriptor == other.descriptor && error == other.error && open == other.open &&
           nonblocking == other.nonblocking && lists == other.lists && own_lists == other.own_lists &&
           blocks == other.blocks && time == other.time && std::strcmp(reason, other.reason) == 0;
}

void Story::clear() {
    events.clear();
    std::memset(&ending, 0, offsetof(Ending, reason) + 1);
}

const char* name_of(Thrown thrown) {
    static const char* const names[kinds_thrown] = {
        "nothing",        "CORBA::NO_RESOURCES", "CORBA::TRANSIENT", "CORBA::COMM_FAILURE",
        "CORBA::TIMEOUT", "CORBA::BAD_PARAM",    "std::bad_alloc",   "something else",
    };
    return names[static_cast<unsigned>(thrown)];
}

}  // namespace sim
}  // namespace kel
