// The bindings of the service.
//
//   NameStore   contexts of names, each bound to a value
//
// Any thread: readers share the store, a writer has it to itself.
//
// SPDX-License-Identifier: MIT
#ifndef NAMES_STORE_H
#define NAMES_STORE_H

#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/core/rwlock.h>

#include <string>
#include <vector>

#include "journal.h"

namespace names {

class NameStore {
public:
    NameStore();
    NameStore(const NameStore&) = delete;
    NameStore& operator=(const NameStore&) = delete;

    // Makes every change that `journal` holds, and tells it the changes from now on. It must outlive the
    // store. What the journal throws leaves the bindings as they are.
    void keep(Journal& journal);

    // Binds a name that is free; AlreadyBound when it is not.
    void bind(const char* context, const char* name, const char* value);

    // Binds a name, whether it is free or not.
    void rebind(const char* context, const char* name, const char* value);

    // The value of a name; NotFound when it has none.
    std::string resolve(const char* context, const char* name);

    // Frees a name; NotFound when it is free.
    void unbind(const char* context, const char* name);

    // The bound names of a context in the order of strcmp.
    std::vector<std::string> list(const char* context);

private:
    typedef KELDictionary<CORBA_String_var, CORBA_String_var*> Context;  // owns the values
    typedef KELDictionary<CORBA_String_var, Context*> Contexts;          // owns the contexts

    // The context, or null when nothing was ever bound in it.
    Context* find(const char* context);
    Context& find_or_create(const char* context);

    // The value of a name, or null.
    CORBA_String_var* find(const char* context, const char* name);

    void record(const char* operation, const char* context, const char* name, const char* value = "");
    void restore(const Request& change);

    KELRWLock _lock;
    Journal* _journal;  // null while nothing is kept
    Contexts _contexts;
};

}  // namespace names

#endif
