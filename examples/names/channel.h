// The client's connection to the service.
//
//   Channel   sends a message and waits for the reply
//
// One thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_CHANNEL_H
#define NAMES_CHANNEL_H

#include <string>

#include "message.h"

namespace names {

class Channel {
public:
    // Connects within `timeout` milliseconds, 0 for no limit, from the local address `bind_name` unless
    // that is empty.
    // Throws what KELPortable::tcpConnect throws.
    Channel(const char* host, unsigned short port, unsigned timeout, const char* bind_name);
    Channel(const Channel&) = delete;
    Channel& operator=(const Channel&) = delete;
    ~Channel();

    // The reply to `message`. CORBA::TIMEOUT when the service does not take or answer the message within
    // the time-out, CORBA::COMM_FAILURE when the connection breaks.
    std::string call(const std::string& message);

private:
    void send_all(const std::string& bytes);
    void wait_for(short event);

    const int _fd;
    const unsigned _timeout;  // milliseconds; 0 is no limit
    FrameReader _received;
};

}  // namespace names

#endif
