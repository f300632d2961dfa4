// What both ways of serving have in common.
//
//   Server   serves clients until it is stopped
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_SERVER_H
#define NAMES_SERVER_H

namespace names {

class Server {
public:
    virtual ~Server() = default;

    // Serves until stop() is called, then answers the requests that have arrived and returns.
    virtual void run() = 0;

    // Any thread, and signal handlers.
    virtual void stop() = 0;

    unsigned long clients() const { return _clients; }
    unsigned long requests() const { return _requests; }

protected:
    unsigned long _clients = 0;
    unsigned long _requests = 0;  // of the clients that have left
};

}  // namespace names

#endif
