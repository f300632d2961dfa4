// One client's connection, on the server's side.
//
//   Session   reads requests as they arrive and sends their replies as the client takes them
//
// The connection does not block: whoever owns the session waits until wanted_event() is reported and
// calls on_ready(). While replies are waiting to be sent no request is read, so that a client that
// does not listen costs one reply and no more.
//
// One thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_SESSION_H
#define NAMES_SESSION_H

#include <string>

#include "message.h"
#include "servant.h"

namespace names {

class Session {
public:
    // Takes over the connected socket `fd`.
    Session(int fd, Servant& servant);
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;
    ~Session();

    int descriptor() const { return _fd; }

    // KELPoll::evMaskRead or KELPoll::evMaskWrite.
    short wanted_event() const;

    // Does what can be done without waiting. False when the session has ended: the client hung up, or
    // sent what cannot be understood and has been told so.
    bool on_ready();

    unsigned long requests() const { return _requests; }

private:
    bool receive();
    bool send_pending();
    bool answer_requests();

    const int _fd;
    Servant& _servant;
    FrameReader _received;
    std::string _to_send;
    bool _last_reply;  // the connection ends when it is sent
    unsigned long _requests;
};

}  // namespace names

#endif
