// SPDX-License-Identifier: MIT
#include "poll_server.h"

#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>
#include <sys/select.h>
#include <unistd.h>

#include <iostream>
#include <vector>

#include "trace.h"

namespace names {

namespace {

const int kNoLimit = -1;
const int kLastRounds = 1000;

}  // namespace

PollServer::PollServer(int listener, KELPoll::SupportedAPIs api, Servant& servant)
    : _listener(listener), _api(api), _poll(KELPoll::create(16, api)), _servant(servant), _accepting(true) {
    _poll->add(_listener, KELPoll::evMaskRead, nullptr);
    _poll->add(_stop._read_fd, KELPoll::evMaskRead, nullptr);
}

PollServer::~PollServer() { close(_listener); }

void PollServer::stop() { _stop.write("", 1); }

void PollServer::run() {
    while (serve_ready(kNoLimit)) {
    }
    finish();
}

// Waits for events and serves what is ready. False when stop() was called.
bool PollServer::serve_ready(int ms) {
    if (_poll->waitForEvents(ms) <= 0) return true;  // nothing, or a signal
    // Serving changes the poller, so what is ready is noted first.
    std::vector<int> ready;
    for (int i = 0; i < _poll->count(); ++i) {
        if (_poll->reportedEvent(i) != 0) ready.push_back(_poll->descriptor(i));
    }
    bool go_on = true;
    for (const int fd : ready) {
        const Sessions::iterator entry = _sessions.find(fd);
        if (entry != _sessions.end()) {
            serve(entry);
        } else if (fd == _listener) {
            accept_client();
        } else {
            go_on = false;
        }
    }
    return go_on;
}

// Answers what has arrived, from clients that are still to be accepted as well.
void PollServer::finish() {
    _poll->remove(_stop._read_fd);
    for (int round = 0; round < kLastRounds && _poll->_waitForEvents(0) > 0; ++round) serve_ready(0);
    while (!_sessions.empty()) end(_sessions.begin());
}

void PollServer::watch(const Session& session) {
    _poll->add(session.descriptor(), session.wanted_event(), nullptr);
}

// A client that is gone before it is accepted is no fault of the server; one that finds no descriptor
// left waits until another client leaves.
void PollServer::accept_client() {
    try {
        admit(KELPortable::socketAccept(_listener));
    } catch (const CORBA_NO_RESOURCES&) {
        NAMES_TRACE(kTransport) << "no descriptor is left, clients have to wait" << endl;
        _poll->remove(_listener);
        _accepting = false;
    } catch (const CORBA_COMM_FAILURE&) {
    }
}

void PollServer::admit(int fd) {
    std::unique_ptr<Session> session = std::make_unique<Session>(fd, _servant);
    if (!can_watch(fd)) return;
    watch(*session);
    _sessions[fd] = std::move(session);
    NAMES_TRACE(kTransport) << "a client came, descriptor " << static_cast<long>(fd) << endl;
    ++_clients;
}

void PollServer::serve(Sessions::iterator entry) {
    Session& session = *entry->second;
    const short watched = session.wanted_event();
    if (!session.on_ready()) {
        end(entry);
    } else if (session.wanted_event() != watched) {
        _poll->remove(session.descriptor());
        watch(session);
    }
}

void PollServer::end(Sessions::iterator entry) {
    NAMES_TRACE(kTransport) << "a client left, descriptor " << static_cast<long>(entry->first) << endl;
    _requests += entry->second->requests();
    _poll->remove(entry->first);
    _sessions.erase(entry);
    if (_accepting) return;
    _poll->add(_listener, KELPoll::evMaskRead, nullptr);
    _accepting = true;
}

bool PollServer::can_watch(int fd) const { return _api != KELPoll::API_SELECT || fd < FD_SETSIZE; }

}  // namespace names
