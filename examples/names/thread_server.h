// Serves each client in a thread of its own.
//
//   ThreadServer   a listener and the threads of its clients
//
// run() belongs to one thread; stop() may be called from any thread and from a signal handler.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_THREAD_SERVER_H
#define NAMES_THREAD_SERVER_H

#include <kel/core/condition.h>
#include <kel/core/mutex.h>
#include <kel/os/pipe.h>
#include <kel/os/poll.h>

#include <memory>

#include "servant.h"
#include "server.h"

namespace names {

class ThreadServer : public Server {
public:
    // Takes over the listening socket.
    ThreadServer(int listener, KELPoll::SupportedAPIs api, Servant& servant);
    ~ThreadServer() override;

    void run() override;
    void stop() override;

private:
    class Client;

    void accept_client();
    void start(std::unique_ptr<Client> client);
    void wait_for_room();
    void client_has_left(unsigned long requests);
    void wait_for_clients();

    const int _listener;
    const KELPoll::SupportedAPIs _api;
    Servant& _servant;
    KELPipe _stop;  // never read: what stop() writes is seen by every thread
    KELMutex _mutex;
    KELCondition _left;
    unsigned long _present KEL_GUARDED_BY(_mutex);
};

}  // namespace names

#endif
