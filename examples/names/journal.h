// A memory of the bindings that outlives the server.
//
//   Journal          what the store tells its changes to
//   offer_journal    how a plug-in makes itself known
//   load_journal     loads the plug-in and opens its journal
//
// The plug-in is a shared library, loaded by its short name; its initialiser offers a function that
// opens a journal, so that the server needs to know nothing of it but this header.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_JOURNAL_H
#define NAMES_JOURNAL_H

#include <functional>
#include <memory>

#include "message.h"

namespace names {

class Journal {
public:
    virtual ~Journal();

    // Hands over every recorded change in its order. What a crash has cut off at the end is dropped.
    virtual void restore(const std::function<void(const Request&)>& apply) = 0;

    // Records a change. When it returns, the change survives the end of the process. Throws
    // CORBA::PERSIST_STORE, with nothing recorded, when it cannot.
    virtual void record(const Request& change) = 0;
};

typedef std::unique_ptr<Journal> (*OpenJournal)(const char* file);

// Called by a plug-in while it is being loaded.
void offer_journal(OpenJournal open);

// The journal in `file`, opened by the plug-in `library`. Throws CORBA::INITIALIZE when there is no such
// plug-in and CORBA::PERSIST_STORE when it cannot use the file. The main thread only.
std::unique_ptr<Journal> load_journal(const char* library, const char* file);

}  // namespace names

#endif
