// A program that contains the library comes to life as one that loads it.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <regex>
#include <string>
#include <vector>

#include "tests/startup/start.h"
#include "tests/startup/symbols.h"

namespace {

using kel::test::start;

std::string trace(const char* program) {
    static const std::regex address("0x[0-9a-f]+");
    return std::regex_replace(start({program}, {"DEBUG_STATIC=1"}).out, address, "ADDRESS");
}

TEST(StaticProgram, TraceIsThatOfTheSharedLibrary) {
    const std::string shared = trace("describe");
    EXPECT_NE(shared.find("CORBA::UNKNOWN, ADDRESS"), std::string::npos);
    EXPECT_EQ(trace("describe_static"), shared);
}

TEST(StaticProgram, InitialisersFollowTheListOfUnits) {
    const kel::test::Symbols symbols(std::string(KEL_STARTUP_PROGRAMS) + "/startup_describe_static");
    std::vector<std::string> units;
    for (const ElfW(Addr) address : symbols.initialisers()) {
        const kel::test::Function f = symbols.function_at(address);
        if (!kel::test::is_the_compilers(f)) units.push_back(f.unit);
    }
    EXPECT_EQ(units, kel::test::initialised_units());
}

}  // namespace
