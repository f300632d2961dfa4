// SPDX-License-Identifier: MIT
#include "channel.h"

#include <kel/exceptions/standard.h>
#include <kel/os/poll.h>
#include <kel/os/portable.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <memory>

#include "nonblocking.h"

namespace names {

Channel::Channel(const char* host, unsigned short port, unsigned timeout, const char* bind_name)
    : _fd(KELPortable::tcpConnect(host, port, timeout, bind_name)), _timeout(timeout) {}

Channel::~Channel() { close(_fd); }

std::string Channel::call(const std::string& message) {
    send_all(framed(message));
    std::string reply;
    while (!_received.next(reply)) {
        wait_for(KELPoll::evMaskRead);
        char buffer[16 * 1024];
        const ssize_t n = recv(_fd, buffer, sizeof buffer, MSG_DONTWAIT);
        if (n == 0) throw CORBA_COMM_FAILURE(0, CORBA::COMPLETED_MAYBE, "the service hung up");
        if (n > 0) {
            _received.append(buffer, static_cast<std::size_t>(n));
        } else if (!would_block(errno)) {
            KELPortable::socketError(errno, 0);
        }
    }
    return reply;
}

void Channel::send_all(const std::string& bytes) {
    std::size_t sent = 0;
    while (sent < bytes.size()) {
        const ssize_t n = send(_fd, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (n > 0) {
            sent += static_cast<std::size_t>(n);
        } else if (would_block(errno)) {
            wait_for(KELPoll::evMaskWrite);
        } else {
            KELPortable::socketError(errno, 0);
        }
    }
}

void Channel::wait_for(short event) {
    const std::unique_ptr<KELPoll> poll(KELPoll::create(1, KELPoll::_defaultAPI));
    poll->add(_fd, event, nullptr);
    const int ready = poll->waitForEvents(_timeout != 0 ? static_cast<int>(_timeout) : -1);
    if (ready == 0) throw CORBA_TIMEOUT(0, CORBA::COMPLETED_MAYBE, "the service does not answer");
    if (ready < 0 && errno != EINTR) KELPortable::socketError(errno, 0);
}

}  // namespace names
