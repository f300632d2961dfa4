// SPDX-License-Identifier: MIT
#include "thread_server.h"

#include <kel/core/thread.h>
#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>
#include <unistd.h>

#include <memory>

#include "session.h"
#include "trace.h"

namespace names {

namespace {

// A thousand threads with the system's default would fill the addresses of a 32-bit process.
const long kStackSize = 256 * 1024;
const int kNoLimit = -1;
const int kLastRounds = 1000;
const unsigned long long kRetryAfter = 100;  // milliseconds

}  // namespace

// Serves one client and deletes itself.
class ThreadServer::Client : public KELThread {
public:
    Client(int fd, ThreadServer& server)
        : KELThread(kStackSize), _server(server), _session(std::make_unique<Session>(fd, server._servant)) {}

    void begin() override {
        NAMES_TRACE(kTransport) << "a client came, descriptor " << descriptor() << endl;
        serve();
        NAMES_TRACE(kTransport) << "a client left, descriptor " << descriptor() << endl;
        const unsigned long requests = _session->requests();
        ThreadServer& server = _server;
        delete this;
        server.client_has_left(requests);
    }

private:
    long descriptor() const { return _session->descriptor(); }

    // Until the client leaves or the server stops; what has arrived by then is answered.
    void serve() {
        bool stopping = false;
        while (!stopping) {
            if (wait(kNoLimit, stopping) && !_session->on_ready()) return;
        }
        for (int round = 0; round < kLastRounds; ++round) {
            if (!wait(0, stopping) || !_session->on_ready()) return;
        }
    }

    // True when the session has something to do; `stopping` when stop() was called.
    bool wait(int ms, bool& stopping) {
        const std::unique_ptr<KELPoll> poll(KELPoll::create(2, _server._api));
        poll->add(_session->descriptor(), _session->wanted_event(), nullptr);
        poll->add(_server._stop._read_fd, KELPoll::evMaskRead, nullptr);
        if (poll->waitForEvents(ms) <= 0) return false;
        stopping = poll->reportedEvent(1) != 0;
        return poll->reportedEvent(0) != 0;
    }

    ThreadServer& _server;
    std::unique_ptr<Session> _session;
};

ThreadServer::ThreadServer(int listener, KELPoll::SupportedAPIs api, Servant& servant)
    : _listener(listener), _api(api), _servant(servant), _present(0) {}

ThreadServer::~ThreadServer() { close(_listener); }

void ThreadServer::stop() { _stop.write("", 1); }

void ThreadServer::run() {
    const std::unique_ptr<KELPoll> poll(KELPoll::create(2, _api));
    poll->add(_stop._read_fd, KELPoll::evMaskRead, nullptr);
    poll->add(_listener, KELPoll::evMaskRead, nullptr);
    for (;;) {
        if (poll->waitForEvents(kNoLimit) <= 0) continue;  // a signal
        if (poll->reportedEvent(0) != 0) break;
        accept_client();
    }
    // Clients whose requests have arrived but who are still to be accepted are served, too.
    poll->remove(_stop._read_fd);
    for (int round = 0; round < kLastRounds && poll->waitForEvents(0) > 0; ++round) accept_client();
    wait_for_clients();
}

// A client that is gone before it is accepted is no fault of the server; one that finds no descriptor or
// no thread left waits until another client leaves.
void ThreadServer::accept_client() {
    try {
        start(std::make_unique<Client>(KELPortable::socketAccept(_listener), *this));
    } catch (const CORBA_NO_RESOURCES&) {
        NAMES_TRACE(kTransport) << "no descriptor is left, clients have to wait" << endl;
        wait_for_room();
    } catch (const CORBA_COMM_FAILURE&) {
    }
}

// The thread may have deleted its object before run() returns here.
void ThreadServer::start(std::unique_ptr<Client> client) {
    {
        KELMutex_var hold(_mutex, 1);
        ++_present;
    }
    try {
        client->run();
    } catch (const CORBA_NO_RESOURCES&) {
        client_has_left(0);
        throw;
    }
    client.release();
    ++_clients;
}

void ThreadServer::wait_for_room() {
    KELMutex_var hold(_mutex, 1);
    _left.timedwait(_mutex, kRetryAfter);
}

void ThreadServer::client_has_left(unsigned long requests) {
    KELMutex_var hold(_mutex, 1);
    --_present;
    _requests += requests;
    _left.signal();
}

void ThreadServer::wait_for_clients() {
    KELMutex_var hold(_mutex, 1);
    while (_present != 0) _left.wait(_mutex);
}

}  // namespace names
