// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>

#include <cctype>
#include <cstring>
#include <ios>
#include <memory>

namespace {

// What the library builds when it is loaded.
std::ios_base::Init standard_streams;

bool is_option_prefix(const char* prefix) {
    return prefix != nullptr && prefix[0] == '-' && std::isalnum(static_cast<unsigned char>(prefix[1])) != 0;
}

bool begins_with_dash(const char* argument) { return argument[0] == '-'; }

}  // namespace

KELArgList::KELArgList() : _options(16) {}

KELArgList::~KELArgList() = default;

unsigned char KELArgList::getArg(const char* name) {
    const CORBA_String_var key(name);
    CORBA_String_var value;
    KELRLock_var hold(_options.rwlock());
    return _options.atKey(key, value);
}

char* KELArgList::getArgValue(const char* name) {
    const CORBA_String_var key(name);
    CORBA_String_var value;
    KELRLock_var hold(_options.rwlock());
    return _options.atKey(key, value) ? value._retn() : nullptr;
}

unsigned long KELArgList::getArgCount() {
    KELRLock_var hold(_options.rwlock());
    return _options.count();
}

// Everything is taken out of the arguments at once, at the end: until then storing may throw.
// Deliberate: argv[argc] keeps what it had; the arguments end where argc says.
// Pinned by ArgList.TheSlotBehindTheKeptArgumentsIsNotWritten.
void KELArgList::argInit(int& argc, char* const* argv, const char* prefix) {
    if (!is_option_prefix(prefix)) throw CORBA_BAD_PARAM();
    if (argc <= 0) return;
    const std::unique_ptr<char*[]> kept(new char*[static_cast<std::size_t>(argc) + 1]);
    const std::size_t prefix_length = std::strlen(prefix);
    int kept_count = 0;
    for (int i = 0; i < argc; ++i) {
        if (std::strncmp(argv[i], prefix, prefix_length) != 0) {
            kept[kept_count++] = argv[i];
            continue;
        }
        const char* const name = argv[i] + 1;
        const bool has_value = i + 1 < argc && !begins_with_dash(argv[i + 1]);
        putArgValue(name, has_value ? argv[++i] : nullptr);
    }
    std::memcpy(const_cast<char**>(argv), kept.get(), static_cast<std::size_t>(kept_count) * sizeof(char*));
    argc = kept_count;
}

// Deliberate: the last value wins. It is assigned into the entry that is there, which keeps the old one
// when there is no memory. Pinned by ArgList.TheLastValueOfANameWins.
void KELArgList::putArgValue(const char* name, const char* value) {
    const CORBA_String_var key(name);
    const CORBA_String_var text(value);
    KELWLock_var hold(_options.rwlock());
    if (_options.addIfNotExist(key, text)) return;
    Store::Iterator entry(_options);
    while (compare((++entry)->_key, key) != 0) {
    }
    entry.entry()->_value = text;
}
