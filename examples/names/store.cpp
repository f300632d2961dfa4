// SPDX-License-Identifier: MIT
#include "store.h"

#include <algorithm>
#include <cstring>
#include <memory>

#include "exceptions.h"

namespace names {

namespace {

// What an entry owned goes with it. The dictionary hands out copies.
template <class Owned>
void delete_value(CORBA_String_var, Owned* value) {  // NOLINT(performance-unnecessary-value-param)
    delete value;
}

// Adds an entry that owns `value`.
template <class Owned>
Owned& add_owned(KELDictionary<CORBA_String_var, Owned*>& table, const char* key,
                 std::unique_ptr<Owned> value) {
    table.add(key, value.get());
    return *value.release();
}

}  // namespace

NameStore::NameStore() : _journal(nullptr), _contexts(16, delete_value<Context>) {}

void NameStore::keep(Journal& journal) {
    journal.restore([this](const Request& change) { restore(change); });
    _journal = &journal;
}

void NameStore::bind(const char* context, const char* name, const char* value) {
    KELWLock_var hold(_lock);
    if (find(context, name) != nullptr) throw AlreadyBound(name);
    record("bind", context, name, value);
    add_owned(find_or_create(context), name, std::make_unique<CORBA_String_var>(value));
}

void NameStore::rebind(const char* context, const char* name, const char* value) {
    KELWLock_var hold(_lock);
    CORBA_String_var* const bound = find(context, name);
    record("rebind", context, name, value);
    if (bound != nullptr) {
        *bound = value;
    } else {
        add_owned(find_or_create(context), name, std::make_unique<CORBA_String_var>(value));
    }
}

std::string NameStore::resolve(const char* context, const char* name) {
    KELRLock_var hold(_lock);
    const CORBA_String_var* const bound = find(context, name);
    if (bound == nullptr) throw NotFound(name);
    return bound->in();
}

void NameStore::unbind(const char* context, const char* name) {
    KELWLock_var hold(_lock);
    if (find(context, name) == nullptr) throw NotFound(name);
    record("unbind", context, name);
    find(context)->removeKey(name);
}

std::vector<std::string> NameStore::list(const char* context) {
    KELRLock_var hold(_lock);
    std::vector<std::string> found;
    Context* const names = find(context);
    if (names == nullptr) return found;
    Context::Iterator entries(*names);
    while (const Context::Assoc* entry = ++entries) found.push_back(entry->_key.in());
    std::sort(found.begin(), found.end());
    return found;
}

// Before the change is made, so that whoever is told of it can rely on it.
void NameStore::record(const char* operation, const char* context, const char* name, const char* value) {
    if (_journal == nullptr) return;
    Request change;
    change.operation = operation;
    change.context = context;
    change.name = name;
    change.value = value;
    _journal->record(change);
}

void NameStore::restore(const Request& change) {
    if (std::strcmp(change.operation, "unbind") == 0) {
        unbind(change.context, change.name);
    } else {
        rebind(change.context, change.name, change.value);
    }
}

NameStore::Context* NameStore::find(const char* context) {
    Context* found = nullptr;
    _contexts.atKey(context, found);
    return found;
}

NameStore::Context& NameStore::find_or_create(const char* context) {
    Context* const found = find(context);
    if (found != nullptr) return *found;
    return add_owned(_contexts, context, std::make_unique<Context>(16, delete_value<CORBA_String_var>));
}

CORBA_String_var* NameStore::find(const char* context, const char* name) {
    CORBA_String_var* bound = nullptr;
    Context* const names = find(context);
    if (names != nullptr) names->atKey(name, bound);
    return bound;
}

}  // namespace names
