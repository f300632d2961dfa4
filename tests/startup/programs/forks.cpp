// Forks while the library is in use.
//
//   forks alone             a process without other threads: both sides use everything, "child" and "parent"
//   forks busy N            N times, while sixteen threads use the library: starts this program again, as
//                           `forks fresh`, from a child; "fresh N" counts those that ended well
//   forks descriptors LOG   opens one of each kind of descriptor and starts `forks seen` from a child
//
//   forks fresh             uses everything
//   forks seen NAME FD...   "NAME open" or "NAME closed" for each
//
// Between fork and exec the child of a threaded process calls nothing but the system.
//
// SPDX-License-Identifier: MIT
#include <fcntl.h>
#include <kel/os/pipe.h>
#include <sys/wait.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "tests/startup/programs/use.h"

using namespace kel::test;

namespace {

typedef std::vector<std::string> Words;

// The exit code of child `pid`, or -1 when a signal ended it.
int exit_code_of(pid_t pid) {
    int status = 0;
    while (::waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// Starts `program` with `arguments` from a child and waits for it.
int run(const char* program, const Words& arguments) {
    std::vector<char*> words = {const_cast<char*>(program)};
    for (const std::string& argument : arguments) words.push_back(const_cast<char*>(argument.c_str()));
    words.push_back(nullptr);
    const pid_t pid = ::fork();
    if (pid != 0) return exit_code_of(pid);
    ::execv(program, words.data());
    ::_exit(127);
}

int alone() {
    use_everything();
    const pid_t pid = ::fork();
    if (pid != 0 && exit_code_of(pid) != 0) return 1;
    start_sixteen();
    use_everything();
    std::puts(pid == 0 ? "child" : "parent");
    return 0;
}

int busy(const char* program, int rounds) {
    start_sixteen();
    int fresh = 0;
    for (int i = 0; i < rounds; ++i) fresh += run(program, {"fresh"}) == 0;
    std::printf("fresh %d\n", fresh);
    return 0;
}

int descriptors(const char* program, const char* log_file) {
    KELPipe pipe;
    const int listener = KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0);
    const auto port = static_cast<unsigned short>(KELPortable::saGetPort(listener));
    const int connected = KELPortable::tcpConnect("127.0.0.1", port, 5000, "");
    const int accepted = KELPortable::socketAccept(listener);
    KELDebugLogger log(log_file);
    log.openFile();
    return run(program, {"seen", "read", std::to_string(pipe._read_fd), "write",
                         std::to_string(pipe._write_fd), "return-read", std::to_string(pipe._return_read_fd),
                         "return-write", std::to_string(pipe._return_write_fd), "listener",
                         std::to_string(listener), "connected", std::to_string(connected), "accepted",
                         std::to_string(accepted), "log", std::to_string(log._fd)});
}

int seen(char** argv) {
    for (; argv[0] != nullptr && argv[1] != nullptr; argv += 2) {
        const bool open = ::fcntl(std::atoi(argv[1]), F_GETFD) != -1;
        std::printf("%s %s\n", argv[0], open ? "open" : "closed");
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string what(argc > 1 ? argv[1] : "");
    if (what == "alone") return alone();
    if (what == "busy") return busy(argv[0], std::atoi(argv[2]));
    if (what == "descriptors") return descriptors(argv[0], argv[2]);
    if (what == "seen") return seen(argv + 2);
    use_everything();
    return 0;
}
