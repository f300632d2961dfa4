// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <kel/exceptions/internal/downcast.h>
#include <kel/exceptions/internal/repository_id.h>
#include <kel/services/load_library.h>

#include <algorithm>
#include <cstring>
#include <iostream>
#include <vector>

// What the library builds when it is loaded: the standard streams, then the description.
static std::ios_base::Init standard_streams;

// Deliberate: the scope separator stays in the repository id, which peers compare as text.
// Pinned by LoadError.TheRepositoryIdKeepsTheScopeSeparator.
CORBA_Exception::Description KELLoadLibrary::LoadError::_description(
    "KELLoadLibrary::LoadError", KEL_REPOSITORY_ID("KELLoadLibrary::LoadError"),
    KELLoadLibrary::LoadError::_factory, &CORBA_UserException::_description, nullptr);

KELLoadLibrary* KELLoadLibrary::_instance = nullptr;
unsigned char KELLoadLibrary::_inited = 0;

namespace {

const std::size_t usual_name_size = 1024;

// What the system says about the last failure; never null.
const char* loading_problem() {
    const char* const text = dlerror();
    return text != nullptr ? text : "";
}

bool write_suffix(char* out) {
    std::strcpy(out, "_");
    std::strcat(out, "r");
    std::strcat(out, ".so");
    return true;
}

}  // namespace

KELLoadLibrary* KELLoadLibrary::instance() {
    KELLoadLibrary* current = __atomic_load_n(&_instance, __ATOMIC_ACQUIRE);
    if (current != nullptr) return current;
    KELLoadLibrary* const made = new KELLoadLibrary;
    if (!__atomic_compare_exchange_n(&_instance, &current, made, false, __ATOMIC_ACQ_REL, __ATOMIC_ACQUIRE)) {
        delete made;  // another thread was first
        return current;
    }
    __atomic_store_n(&_inited, 1, __ATOMIC_RELEASE);
    return made;
}

KELLoadLibrary::KELLoadLibrary() : _libraries(16) {}

// Deliberate: only the name that opened is remembered, so a name that needed the second attempt tries the
// first one again next time. Pinned by LoadLibrary.AFallbackNameTriesTheWrappedNameAgain.
void KELLoadLibrary::Load(const char* name) {
    KELMutex_var hold(_lock, 1);
    const std::size_t needed = std::strlen(_prefix()) + std::strlen(name) + std::strlen(_suffix()) + 1;
    std::vector<char> wrapped(std::max(usual_name_size, needed));
    _wrap_libname(wrapped.data(), name);
    try {
        if (_loadLibrary(wrapped.data(), 0) != nullptr) return;
        _loadLibrary(name, 1);
    } catch (const LoadError& error) {
        // Deliberate: the exception ends its own line, so that an empty one follows.
        // Pinned by LoadLibrary.AFailurePrintsThePrettyFormAndAnEmptyLine.
        std::cerr << "LoadLibrary failed for [" << name << "]: " << error << std::endl;
    }
}

// Deliberate: the name is taken as it is, so what Load opened as libx_r.so is closed by that name.
// Pinned by LoadLibrary.UnloadWantsTheNameThatWasOpened.
void KELLoadLibrary::Unload(const char* name) {
    KELMutex_var hold(_lock, 1);
    _unload(name);
}

// Each removal moves other entries, also across the place that an iterator has reached. Starting over
// after every one reaches them all.
void KELLoadLibrary::UnloadAll() {
    KELMutex_var hold(_lock, 1);
    while (_libraries.count() != 0) {
        KELDictionary<CORBA_String_var, void*>::Iterator first(_libraries);
        _unload((++first)->_key.in());
    }
    _libraries.removeAll();
}

void* KELLoadLibrary::_loadLibrary(const char* file, unsigned char throw_on_failure) {
    const CORBA_String_var key(file);
    void* handle = nullptr;
    if (_libraries.atKey(key, handle)) return handle;
    handle = dlopen(file, RTLD_LAZY);
    if (handle == nullptr) {
        const CORBA_String_var problem(loading_problem());
        if (throw_on_failure == 0) return nullptr;
        throw LoadError(problem.in(), 0);
    }
    try {
        _libraries.add(key, handle);
    } catch (...) {
        dlclose(handle);
        throw;
    }
    return handle;
}

// `file` may be the key of the very entry that goes, hence the copy.
void KELLoadLibrary::_unload(const char* file) {
    const CORBA_String_var key(file);
    void* handle = nullptr;
    if (!_libraries.atKey(key, handle)) return;
    _libraries.removeKey(key);
    _closeLibrary(handle);
}

void KELLoadLibrary::_closeLibrary(void* handle) {
    if (dlclose(handle) == 0) return;
    std::cerr << "dlclose failed: " << loading_problem() << std::endl;
}

const char* KELLoadLibrary::_prefix() { return "lib"; }

const char* KELLoadLibrary::_suffix() {
    static char suffix[256];
    static const bool inited = write_suffix(suffix);
    static_cast<void>(inited);
    return suffix;
}

void KELLoadLibrary::_wrap_libname(char* out, const char* name) {
    *out = '\0';
    if (_prefix() != nullptr) std::strcpy(out, _prefix());
    std::strcat(out, name);
    if (_suffix() != nullptr) std::strcat(out, _suffix());
}

KELLoadLibrary::LoadError::LoadError() : _code(0) {}

KELLoadLibrary::LoadError::LoadError(const char* message, unsigned long code)
    : _message(message), _code(static_cast<std::uint32_t>(code)) {}

KELLoadLibrary::LoadError::~LoadError() = default;

const char* KELLoadLibrary::LoadError::message() const { return _message.in(); }

unsigned long KELLoadLibrary::LoadError::code() const { return _code; }

const CORBA_Exception::Description* KELLoadLibrary::LoadError::_desc() const { return &_description; }

void KELLoadLibrary::LoadError::_raise() const { throw LoadError(*this); }

CORBA_Exception* KELLoadLibrary::LoadError::_deep_copy() { return new LoadError(*this); }

KELLoadLibrary::LoadError* KELLoadLibrary::LoadError::_downcast(CORBA_Exception* e) {
    return kel::internal::downcast<LoadError>(e);
}

const KELLoadLibrary::LoadError* KELLoadLibrary::LoadError::_downcast(const CORBA_Exception* e) {
    return kel::internal::downcast<const LoadError>(e);
}

CORBA_Exception* KELLoadLibrary::LoadError::_factory() { return new LoadError; }
