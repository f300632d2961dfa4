// Listening and accepting, in the made-up network and with the sockets of the system.
//
// SPDX-License-Identifier: MIT
#include <kel/os/portable.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "tests/faults/matrix/net_scenario.h"
#include "tests/os/fake_resolver.h"
#include "tests/os/loopback.h"

namespace {

using namespace kel::test;

// --- made up -----------------------------------------------------------------------------------------

class Listening : public NetScenario {
protected:
    void listen_on(const char* host, unsigned short port, unsigned long range) {
        keep(KELPortable::createTcpListenerSocket(host, port, range));
        gives("listening");
    }
};

class ListenOnOneAddress : public Listening {
    void act() override { listen_on("one", 80, 0); }
};
KEL_NET_SCENARIO(ListenOnOneAddress).giving("listening");

class ListenOnALinkLocalAddress : public Listening {
    void act() override { listen_on("link", 80, 0); }
};
KEL_NET_SCENARIO(ListenOnALinkLocalAddress).giving("listening");

// The first port of three is in use.
class ListenOnARangeOfPorts : public Listening {
    void set_up() override { net.binds = {EADDRINUSE, 0}; }
    void act() override { listen_on("one", 5000, 2); }
};
KEL_NET_SCENARIO(ListenOnARangeOfPorts).giving("listening");

class ListenEverywhere : public Listening {
    void act() override { listen_on(nullptr, 80, 0); }
};
KEL_NET_SCENARIO(ListenEverywhere).giving("listening");

class Accept : public NetScenario {
    void act() override {
        keep(KELPortable::socketAccept(_listener));
        gives("accepted");
    }
    void set_up() override { _listener = open_socket(); }
    int _listener = -1;
};
KEL_NET_SCENARIO(Accept).giving("accepted");

// --- real --------------------------------------------------------------------------------------------

// Sockets on the loopback. Only this machine's own name is made up: it leads to the loopback too.
class RealSockets : public Scenario {
public:
    ~RealSockets() override {
        if (_kept >= 0) ::close(_kept);
    }

private:
    void prepare() override {
        name_machine("kelhost");
        seams::getaddrinfo.script(
            [](const char* host, const char* service, const addrinfo* hints, addrinfo** list) {
                const bool own = std::strcmp(host, "kelhost") == 0;
                return seams::getaddrinfo.real(own ? "127.0.0.1" : host, service, hints, list);
            });
    }

protected:
    void keep(int fd) { _kept = fd; }

private:
    int _kept = -1;
};

class ListenForReal : public RealSockets {
    void act() override {
        keep(KELPortable::createTcpListenerSocket("127.0.0.1", 0, 0));
        gives("listening");
    }
};
KEL_NET_SCENARIO(ListenForReal).giving("listening");

class ConnectForReal : public RealSockets {
    void act() override {
        keep(KELPortable::tcpConnect("127.0.0.1", _port, 0, ""));
        gives("connected");
    }
    const Listener _server{"127.0.0.1"};
    const unsigned short _port = _server.port();
};
KEL_NET_SCENARIO(ConnectForReal).giving("connected");

class AcceptForReal : public RealSockets {
    void act() override {
        keep(KELPortable::socketAccept(_server.fd()));
        gives("accepted");
    }
    const Listener _server{"127.0.0.1"};
    const Descriptor _client{KELPortable::tcpConnect("127.0.0.1", _server.port(), 0, "")};
};
KEL_NET_SCENARIO(AcceptForReal).giving("accepted");

}  // namespace
