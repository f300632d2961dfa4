// SPDX-License-Identifier: MIT
#include "session.h"

#include <fcntl.h>
#include <kel/exceptions/standard.h>
#include <kel/os/poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>

#include "nonblocking.h"
#include "trace.h"

namespace names {

Session::Session(int fd, Servant& servant) : _fd(fd), _servant(servant), _last_reply(false), _requests(0) {
    fcntl(_fd, F_SETFL, fcntl(_fd, F_GETFL) | O_NONBLOCK);
}

Session::~Session() { close(_fd); }

short Session::wanted_event() const { return _to_send.empty() ? KELPoll::evMaskRead : KELPoll::evMaskWrite; }

bool Session::on_ready() {
    if (_to_send.empty() && !receive()) return false;
    // Requests that came together are answered together, each when the reply before it is on its way.
    while (send_pending()) {
        if (!_to_send.empty()) return true;
        if (_last_reply) return false;
        if (!answer_requests()) return true;
    }
    return false;
}

// False when the client is gone.
bool Session::receive() {
    char buffer[16 * 1024];
    const ssize_t n = recv(_fd, buffer, sizeof buffer, 0);
    if (n < 0) return would_block(errno);
    if (n > 0) _received.append(buffer, static_cast<std::size_t>(n));
    return n > 0;
}

// False when the client is gone.
bool Session::send_pending() {
    while (!_to_send.empty()) {
        const ssize_t n = send(_fd, _to_send.data(), _to_send.size(), MSG_NOSIGNAL);
        if (n < 0) return would_block(errno);
        _to_send.erase(0, static_cast<std::size_t>(n));
    }
    return true;
}

// Prepares the reply to the next request; false when none has arrived completely.
bool Session::answer_requests() {
    std::string request;
    try {
        if (!_received.next(request)) return false;
        ++_requests;
        NAMES_TRACE(kMarshalling) << "request of " << static_cast<long>(request.size()) << " bytes" << endl;
        _to_send = framed(_servant.answer(request));
        NAMES_TRACE(kMarshalling) << "reply of " << static_cast<long>(_to_send.size()) << " bytes" << endl;
    } catch (const CORBA_MARSHAL& garbage) {
        NAMES_TRACE(kTransport) << "descriptor " << static_cast<long>(_fd) << " sends garbage" << endl;
        _to_send = framed(exception_reply(garbage));
        _last_reply = true;
    }
    return true;
}

}  // namespace names
