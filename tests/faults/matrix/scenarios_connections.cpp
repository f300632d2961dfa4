// Connecting: one socket to an address, and a host by its name.
//
// SPDX-License-Identifier: MIT
#include <kel/os/poll.h>
#include <kel/os/portable.h>

#include <cerrno>
#include <string>

#include "tests/faults/matrix/net_scenario.h"

namespace {

using namespace kel::test;

// --- one socket --------------------------------------------------------------------------------------

class SocketScenario : public NetScenario {
    void set_up() override {
        net.waits.assign(64, {1, 0});
        _fd = net.open_socket();
        pending();
    }
    virtual void pending() {}
    std::string state() override { return _fd >= 0 && net.is_open(_fd) ? "open" : "closed"; }

protected:
    void connect(unsigned long long timeout) {
        int error = 0;
        try {
            KELPortable::tcpConnect(_fd, error, &_address.any, static_cast<int>(_address.size()), timeout);
        } catch (...) {
            keep(_fd);
            throw;
        }
        keep(_fd);
        gives("error %d, %s", error, _fd >= 0 ? "open" : "closed");
    }

private:
    SocketAddress _address = socket_address("10.1.1.1:80");
    int _fd = -1;
};

class SocketConnects : public SocketScenario {
    void act() override { connect(0); }
};
KEL_NET_SCENARIO(SocketConnects).giving("error 0, open");

class SocketConnectsInTime : public SocketScenario {
    void pending() override { net.connects = {EINPROGRESS}; }
    void act() override { connect(2000); }
};
KEL_NET_SCENARIO(SocketConnectsInTime).giving("error 0, open");

class SocketConnectsTooLate : public SocketScenario {
    void pending() override {
        net.connects = {EINPROGRESS};
        net.waits.assign(64, {0, 0});
    }
    void act() override { connect(2000); }
};
KEL_NET_SCENARIO(SocketConnectsTooLate).giving("throws CORBA::TIMEOUT 0x4b450001 NO");

// --- a host ------------------------------------------------------------------------------------------

class HostScenario : public NetScenario {
    void set_up() override {
        net.waits.assign(64, {1, 0});
        network();
    }
    virtual void network() {}

protected:
    void connect(const char* host, unsigned long long timeout = 0, const char* bind_name = "") {
        keep(KELPortable::tcpConnect(host, 80, timeout, bind_name));
        gives("connected");
    }
};

class ConnectOne : public HostScenario {
    void act() override { connect("one"); }
};
KEL_NET_SCENARIO(ConnectOne).giving("connected");

class ConnectTwo : public HostScenario {
    void act() override { connect("two"); }
};
KEL_NET_SCENARIO(ConnectTwo).giving("connected");

class ConnectLoopback : public HostScenario {
    void act() override { connect("127.0.0.1"); }
};
KEL_NET_SCENARIO(ConnectLoopback).giving("connected");

class ConnectLinkLocal : public HostScenario {
    void act() override { connect("link"); }
};
KEL_NET_SCENARIO(ConnectLinkLocal).giving("connected");

class ConnectInTime : public HostScenario {
    void network() override { net.connects = {EINPROGRESS}; }
    void act() override { connect("one", 2500); }
};
KEL_NET_SCENARIO(ConnectInTime).giving("connected");

class ConnectInTimeBySelect : public HostScenario {
public:
    ~ConnectInTimeBySelect() override { KELPoll::defaultAPI(KELPoll::API_POLL); }

private:
    void network() override {
        net.connects = {EINPROGRESS};
        KELPoll::defaultAPI(KELPoll::API_SELECT);
    }
    void act() override { connect("one", 2500); }
};
KEL_NET_SCENARIO(ConnectInTimeBySelect).giving("connected");

class ConnectTooLate : public HostScenario {
    void network() override {
        net.connects = {EINPROGRESS};
        net.waits.assign(64, {0, 0});
    }
    void act() override { connect("one", 2500); }
};
KEL_NET_SCENARIO(ConnectTooLate).giving("throws CORBA::TIMEOUT 0x4b450001 NO");

// Refused twice, so that a second passes before the third attempt.
class ConnectAfterAPause : public HostScenario {
    void network() override { net.connects = {ECONNREFUSED, ECONNREFUSED, 0}; }
    void act() override { connect("one", 10000); }
};
KEL_NET_SCENARIO(ConnectAfterAPause).giving("connected");

class ConnectRefused : public HostScenario {
    void network() override { net.connects = {ECONNREFUSED}; }
    void act() override { connect("one", 1500); }
};
KEL_NET_SCENARIO(ConnectRefused).giving("throws CORBA::TRANSIENT 0x4f4d006f NO");

class ConnectBound : public HostScenario {
    void act() override { connect("one", 0, "10.9.9.9"); }
};
KEL_NET_SCENARIO(ConnectBound).giving("connected");

class ConnectBoundInIpv6 : public HostScenario {
    void act() override { connect("six", 0, "2001:db8::5"); }
};
KEL_NET_SCENARIO(ConnectBoundInIpv6).giving("connected");

class ConnectBoundByName : public HostScenario {
    void network() override { net.resolve("me", {"10.9.9.8"}); }
    void act() override { connect("one", 0, "me"); }
};
KEL_NET_SCENARIO(ConnectBoundByName).giving("connected");

class ConnectBoundByNameInIpv6 : public HostScenario {
    void network() override { net.resolve("me", {"2001:db8::8"}); }
    void act() override { connect("six", 0, "me"); }
};
KEL_NET_SCENARIO(ConnectBoundByNameInIpv6).giving("connected");

}  // namespace
