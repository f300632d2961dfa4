// Serves any number of clients at once in one thread.
//
//   PollServer   a listener, its sessions and the poller that watches them
//
// run() belongs to one thread; stop() may be called from any thread and from a signal handler.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_POLL_SERVER_H
#define NAMES_POLL_SERVER_H

#include <kel/os/pipe.h>
#include <kel/os/poll.h>

#include <map>
#include <memory>

#include "server.h"
#include "session.h"

namespace names {

class PollServer : public Server {
public:
    // Takes over the listening socket.
    PollServer(int listener, KELPoll::SupportedAPIs api, Servant& servant);
    ~PollServer() override;

    void run() override;
    void stop() override;

private:
    typedef std::map<int, std::unique_ptr<Session>> Sessions;

    bool serve_ready(int ms);
    void finish();
    void watch(const Session& session);
    void accept_client();
    void admit(int fd);
    void serve(Sessions::iterator entry);
    void end(Sessions::iterator entry);
    bool can_watch(int fd) const;

    const int _listener;
    const KELPoll::SupportedAPIs _api;
    const std::unique_ptr<KELPoll> _poll;
    KELPipe _stop;
    Servant& _servant;
    Sessions _sessions;
    bool _accepting;  // off while the process has no descriptor to spare
};

}  // namespace names

#endif
