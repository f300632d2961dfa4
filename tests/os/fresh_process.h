// Runs code in a process that knows nothing about its machine yet.
//
//   said      what the code prints there
//   said_on   the same on a machine of a given name
//   taken     a text of the library, freed, as a std::string
//
//     EXPECT_EQ(said_on("192.0.2.7", [] { std::cout << taken(KELPortable::ip_addr("")); }), "192.0.2.7");
//
// The library keeps the machine's name and addresses, and the user's name, until the process ends, so
// whoever tests how they are found needs a new process. The code runs armed.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_FRESH_PROCESS_H
#define KEL_TESTS_OS_FRESH_PROCESS_H

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <kel/containers/strings.h>

#include <functional>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace kel {
namespace test {

inline std::string said(const std::function<void()>& body) {
    const Outcome outcome = in_child([&] {
        Armed armed;
        body();
    });
    EXPECT_EQ(outcome.exit_code, 0) << outcome.err;
    return outcome.out;
}

inline std::string said_on(const std::string& machine, const std::function<void()>& body) {
    return said([&] {
        name_machine(machine);
        body();
    });
}

// "(null)" when there is no text.
inline std::string taken(char* text) {
    const std::string copy = text != nullptr ? text : "(null)";
    CORBA::string_free(text);
    return copy;
}

// An address of either family.
inline std::string bytes_text(int family, const void* bytes) {
    char text[INET6_ADDRSTRLEN];
    return inet_ntop(family, bytes, text, sizeof text);
}

}  // namespace test
}  // namespace kel

#endif
