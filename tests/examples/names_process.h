// The programs of the name service, run as a user runs them.
//
//   NamesServer   a names_server on a free port; stopped when it goes out of scope
//   RawClient     a plain socket to it, to send what no client of ours would send
//   SilentPort    a port that takes connections and never answers
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_EXAMPLES_NAMES_PROCESS_H
#define KEL_TESTS_EXAMPLES_NAMES_PROCESS_H

#include <sys/types.h>

#include <string>
#include <vector>

#include "tests/support/child.h"

namespace kel {
namespace test {

class NamesServer {
public:
    // Returns when the server has said which port it listens on.
    explicit NamesServer(const std::vector<std::string>& options = {});
    NamesServer(const NamesServer&) = delete;
    NamesServer& operator=(const NamesServer&) = delete;
    ~NamesServer();

    int port() const { return _port; }
    pid_t process() const { return _process; }

    // Sends SIGTERM, waits, and returns the exit status (128 + signal when a signal ended it).
    int stop();

    // Ends the server without a word, in the middle of whatever it does.
    void crash();

    // Open descriptors of the server.
    int descriptors() const;

    // Whether the server comes to have so many descriptors open, and so many threads, before patience
    // ends: it may not have noticed yet that a client has left.
    bool settles_at(int descriptors_expected) const;
    bool settles_at(int descriptors_expected, int threads_expected) const;

    // Threads of the server.
    int threads() const;

    // What a names_client with these lines on standard input leaves behind.
    Outcome client(const std::string& lines, const std::vector<std::string>& options = {}) const;

    // The outcomes that the client printed, one for each line.
    std::vector<std::string> outcomes(const std::string& lines) const;

private:
    int end();  // waits for it
    int entries_of(const char* what) const;

    pid_t _process;
    int _output;
    int _port;
};

class RawClient {
public:
    explicit RawClient(int port);
    RawClient(const RawClient&) = delete;
    RawClient& operator=(const RawClient&) = delete;
    ~RawClient();

    void send(const std::string& bytes);

    // Everything that comes until the server hangs up, or until nothing has come for ten seconds.
    std::string receive_all();

    // The next `n` bytes, fewer when the server hangs up or falls silent.
    std::string receive(std::size_t n);

    // The text of the next message.
    std::string receive_message();

    // Hangs up with a reset instead of an orderly end.
    void reset();

private:
    int _fd;
    std::string _received;
};

class SilentPort {
public:
    SilentPort();
    SilentPort(const SilentPort&) = delete;
    SilentPort& operator=(const SilentPort&) = delete;
    ~SilentPort();
    int port() const { return _port; }

private:
    int _fd;
    int _port;
};

// A port of the loopback address on which nobody listens.
int unused_port();

// What a names_client for `port` leaves behind.
Outcome names_client(int port, const std::string& lines, const std::vector<std::string>& options = {});

// `text` with its length in front.
std::string frame(const std::string& text);

}  // namespace test
}  // namespace kel

#endif
