// Connections over the loopback, made, accepted and closed one after the other.
//
//   Connections    two listeners, one for each family that the machine has, and what came of them
//
//     Connections connections;
//     connections.make_until(end);
//
// One thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_FAULTS_SOAK_CONNECTIONS_H
#define KEL_TESTS_FAULTS_SOAK_CONNECTIONS_H

#include <chrono>

namespace kel {
namespace soak {

class Connections {
public:
    Connections();
    ~Connections();
    Connections(const Connections&) = delete;
    Connections& operator=(const Connections&) = delete;

    void make_until(std::chrono::steady_clock::time_point end);

    struct Figures {
        unsigned long made;      // connected, accepted and closed
        unsigned long failed;    // the connect threw
        unsigned long accepted;  // those included whose connect failed after all
        unsigned long listened;  // listeners opened and closed besides
        unsigned long wrong;     // not connected to what was asked for
    };
    const Figures& figures() const { return _figures; }

private:
    struct Listener {
        const char* host;
        int fd;
        unsigned short port;
    };

    void make_one(unsigned long n);
    int connect(const Listener& listener, unsigned long n);
    int connect_socket(const Listener& listener, unsigned long long timeout);
    void accept_all(const Listener& listener);
    void check(const Listener& listener, int fd);
    void listen_once();

    Listener _listeners[2];
    Figures _figures = {};
};

}  // namespace soak
}  // namespace kel

#endif
