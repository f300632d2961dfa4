// Runs code or a program in a child process and collects what it leaves behind.
//
//   Outcome       exit status or signal, standard output and standard error
//   in_child      forks, runs a function, exits 0 when it returns
//   run_program   starts a program with arguments, extra environment and input
//   assertion_of  the four pieces of the assertion that a function fails, and what it printed first
//
//     const Outcome o = in_child([] { std::cout << "hello"; });
//     EXPECT_EQ(o.out, "hello");
//
// The two that start no new program first wait for the end of the other threads, and fail the test when these
// do not end: what a thread holds meanwhile would be held for ever in the child.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_CHILD_H
#define KEL_TESTS_SUPPORT_CHILD_H

#include <functional>
#include <string>
#include <vector>

namespace kel {
namespace test {

struct Outcome {
    int exit_code = -1;  // -1 when a signal ended the child
    int signal = 0;      // 0 when it exited
    std::string out;
    std::string err;
};

// An exception that leaves `body` ends the child with 99 and its text on standard error.
Outcome in_child(const std::function<void()>& body);

// `program[0]` is the path. `environment` holds "NAME=value" added to this process's own; a bare
// "NAME" removes that variable. `input` is the program's standard input.
Outcome run_program(const std::vector<std::string>& program, const std::vector<std::string>& environment = {},
                    const std::string& input = "");

struct Assertion {
    bool failed = false;
    std::string expression;
    std::string file;
    unsigned line = 0;
    std::string function;
    Outcome child;  // what the process printed before, e.g. the line of perror
};

// Runs `body` in a child whose `__assert_fail` reports its arguments and ends the child with 77.
// `body` arms itself where it needs to; the assertion is seen armed or not.
Assertion assertion_of(const std::function<void()>& body);

}  // namespace test
}  // namespace kel

#endif
