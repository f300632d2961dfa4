// SPDX-License-Identifier: MIT
#include "tests/support/child.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <iostream>

#include "tests/support/fault.h"
#include "tests/support/tasks.h"

extern char** environ;

namespace kel {
namespace test {

namespace {

struct Pipe {
    Pipe() {
        if (::pipe(ends) != 0) std::abort();
    }
    ~Pipe() {
        close_end(0);
        close_end(1);
    }
    void close_end(int i) {
        if (ends[i] >= 0) ::close(ends[i]);
        ends[i] = -1;
    }
    int ends[2] = {-1, -1};
};

// Appends what is there to `text`; false at the end of the stream.
bool drain(int fd, std::string& text) {
    char buffer[4096];
    const ssize_t n = ::read(fd, buffer, sizeof buffer);
    if (n <= 0) return n < 0 && errno == EINTR;
    text.append(buffer, static_cast<std::size_t>(n));
    return true;
}

// Reads both streams until each has ended, so that neither can fill up and block the child.
void collect(Pipe& out, Pipe& err, Outcome& outcome) {
    pollfd entries[2] = {{out.ends[0], POLLIN, 0}, {err.ends[0], POLLIN, 0}};
    std::string* texts[2] = {&outcome.out, &outcome.err};
    while (entries[0].fd >= 0 || entries[1].fd >= 0) {
        if (::poll(entries, 2, -1) < 0) continue;
        for (int i = 0; i < 2; ++i) {
            if (entries[i].revents != 0 && !drain(entries[i].fd, *texts[i])) entries[i].fd = -1;
        }
    }
}

void wait_for(pid_t child, Outcome& outcome) {
    int status = 0;
    while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    if (WIFEXITED(status)) outcome.exit_code = WEXITSTATUS(status);
    if (WIFSIGNALED(status)) outcome.signal = WTERMSIG(status);
}

Outcome start_and_wait(const std::string& input, const std::function<void()>& in_the_child) {
    Pipe in, out, err;
    std::cout.flush();
    std::fflush(nullptr);
    const pid_t child = ::fork();
    if (child == 0) {
        ::dup2(in.ends[0], 0);
        ::dup2(out.ends[1], 1);
        ::dup2(err.ends[1], 2);
        for (Pipe* pipe : {&in, &out, &err}) {
            pipe->close_end(0);
            pipe->close_end(1);
        }
        in_the_child();
        ::_exit(98);
    }
    out.close_end(1);
    err.close_end(1);
    // Inputs of tests are shorter than a pipe holds, so this cannot block. The child may have ended already;
    // as long as the reading end is open here too, that is no broken pipe.
    if (!input.empty() && ::write(in.ends[1], input.data(), input.size()) < 0) std::perror("write");
    in.close_end(0);
    in.close_end(1);
    Outcome outcome;
    collect(out, err, outcome);
    wait_for(child, outcome);
    return outcome;
}

// A detached thread of the test before may still be at its end, with a mutex in its hands.
void become_the_only_thread() { EXPECT_TRUE(others_end()) << "other threads run while a child is made"; }

[[noreturn]] void run_and_exit(const std::function<void()>& body) {
    int code = 0;
    try {
        body();
    } catch (const std::exception& e) {
        std::fprintf(stderr, "exception: %s\n", e.what());
        code = 99;
    }
    std::cout.flush();
    std::fflush(nullptr);
    ::_exit(code);
}

void apply_environment(const std::vector<std::string>& environment) {
    for (const std::string& entry : environment) {
        const std::size_t equals = entry.find('=');
        if (equals == std::string::npos) {
            ::unsetenv(entry.c_str());
        } else {
            ::setenv(entry.substr(0, equals).c_str(), entry.c_str() + equals + 1, 1);
        }
    }
}

std::string take_line(std::string& text) {
    const std::size_t end = text.find('\0');
    std::string line = text.substr(0, end);
    text.erase(0, end == std::string::npos ? end : end + 1);
    return line;
}

}  // namespace

Outcome in_child(const std::function<void()>& body) {
    become_the_only_thread();
    return start_and_wait("", [&] { run_and_exit(body); });
}

Outcome run_program(const std::vector<std::string>& program, const std::vector<std::string>& environment,
                    const std::string& input) {
    return start_and_wait(input, [&] {
        apply_environment(environment);
        std::vector<char*> arguments;
        for (const std::string& argument : program) arguments.push_back(const_cast<char*>(argument.c_str()));
        arguments.push_back(nullptr);
        ::execv(arguments[0], arguments.data());
        std::perror(arguments[0]);
        ::_exit(127);
    });
}

Assertion assertion_of(const std::function<void()>& body) {
    become_the_only_thread();
    Pipe report;
    Assertion seen;
    seen.child = start_and_wait("", [&] {
        // Arming every thread lets the script see the assertion wherever it is raised.
        ArmedEverywhere armed_for_the_assertion;
        seams::__assert_fail.script(
            [&](const char* expression, const char* file, unsigned line, const char* function) {
                const std::string number = std::to_string(line);
                for (const char* piece : {expression, file, number.c_str(), function}) {
                    if (::write(report.ends[1], piece, std::strlen(piece) + 1) < 0) ::_exit(78);
                }
                std::fflush(nullptr);
                ::_exit(77);
            });
        run_and_exit(body);
    });
    report.close_end(1);
    std::string pieces;
    while (drain(report.ends[0], pieces)) {
    }
    seen.failed = seen.child.exit_code == 77;
    seen.expression = take_line(pieces);
    seen.file = take_line(pieces);
    seen.line = static_cast<unsigned>(std::strtoul(take_line(pieces).c_str(), nullptr, 10));
    seen.function = take_line(pieces);
    return seen;
}

}  // namespace test
}  // namespace kel
