// Carries requests out.
//
//   Servant   turns the text of a request into the text of its reply
//
// Any thread.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_SERVANT_H
#define NAMES_SERVANT_H

#include <string>

#include "message.h"
#include "store.h"

namespace names {

class Servant {
public:
    explicit Servant(NameStore& store) : _store(store) {}

    // Every request has an answer: whatever a request is or does, an exception that it raises becomes
    // the reply, and stays this thread's last exception until its next request. Throws nothing but
    // std::bad_alloc.
    std::string answer(const std::string& request);

private:
    void carry_out(const Request& request, KELostream& reply);

    NameStore& _store;
};

// The reply that tells `failure`.
std::string exception_reply(const CORBA_Exception& failure);

}  // namespace names

#endif
