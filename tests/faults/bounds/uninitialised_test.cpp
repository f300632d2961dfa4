// What nobody has written must not be seen. Memory that was never written to is zero by chance only:
// here the allocator fills its blocks with other bytes and so does the compiler with local variables.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "tests/support/child.h"

namespace {

using kel::test::Outcome;
using kel::test::run_program;

class Uninitialised : public testing::Test {
protected:
    Uninitialised()
        : _folder(std::filesystem::temp_directory_path() / ("kel-bounds-" + std::to_string(::getpid()))) {
        std::filesystem::create_directory(_folder);
        _expected = run_program({KEL_EVERYTHING, _folder});
    }
    ~Uninitialised() override { std::filesystem::remove_all(_folder); }

    void expect_the_same(const char* program, const char* fill) {
        SCOPED_TRACE(fill);
        const Outcome o = run_program({program, _folder}, {std::string("MALLOC_PERTURB_=") + fill});
        EXPECT_EQ(o.out, _expected.out);
        EXPECT_EQ(o.err, _expected.err);
        EXPECT_EQ(o.signal, 0);
        EXPECT_EQ(o.exit_code, 0);
    }

    std::filesystem::path _folder;
    Outcome _expected;
};

TEST_F(Uninitialised, ProgramGoesThroughEverything) {
    EXPECT_NE(_expected.out.find("\nlog: logged 7\n"), std::string::npos);
    EXPECT_NE(_expected.err.find("no_such_library"), std::string::npos);
    EXPECT_EQ(_expected.exit_code, 0);
}

// The allocator fills a block with the complement of the number, and a released one with the number.
TEST_F(Uninitialised, MemoryOfTheAllocatorIsNotSeen) {
    for (const char* fill : {"85", "170", "255"}) expect_the_same(KEL_EVERYTHING, fill);
}

TEST_F(Uninitialised, LocalVariablesAreNotSeen) {
    for (const char* fill : {"85", "170"}) expect_the_same(KEL_EVERYTHING_PATTERNED, fill);
}

}  // namespace
