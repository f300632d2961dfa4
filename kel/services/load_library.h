// Opens shared libraries by a short name and remembers them until they are unloaded.
//
//   KELLoadLibrary              the process-wide loader
//   KELLoadLibrary::LoadError   why the system refused a library
//
//     KELLoadLibrary::instance()->Load("codec");              // libcodec_r.so, else codec itself
//     KELLoadLibrary::instance()->Unload("libcodec_r.so");    // by the name that was opened
//
// Load, Unload and UnloadAll may be called by any thread, but not from the initialiser of a
// library that is being loaded: the loader's lock is held while the system opens it. The first
// call of instance() may come from any thread too. The application's own run path does not apply,
// since it is this library that asks the system; a path or LD_LIBRARY_PATH always works.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_SERVICES_LOAD_LIBRARY_H
#define KEL_SERVICES_LOAD_LIBRARY_H

#include <kel/config.h>
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/core/mutex.h>
#include <kel/exceptions/exception.h>

#include <cstddef>

class KEL_API KELLoadLibrary {
public:
    class LoadError;

    // The loader of this process, made by the first call and never destroyed.
    static KELLoadLibrary* instance();

    // A loader with an empty table. Most callers share the one of instance().
    KELLoadLibrary();

    KELLoadLibrary(const KELLoadLibrary&) = delete;
    KELLoadLibrary& operator=(const KELLoadLibrary&) = delete;

    // Opens "lib" + name + "_r.so" or, failing that, `name` itself, unless it is open already. A name
    // that neither attempt can open is reported on std::cerr and nowhere else. `name` is not null.
    void Load(const char* name) KEL_EXCLUDES(_lock);

    // Closes the library that was opened under exactly this name ("libcodec_r.so", not "codec"),
    // however often it was loaded. An unknown name does nothing. A library that the system refuses
    // to close is reported on std::cerr and forgotten all the same.
    void Unload(const char* name) KEL_EXCLUDES(_lock);

    // Closes every library of the table and leaves it empty.
    void UnloadAll() KEL_EXCLUDES(_lock);

    // The handle of `file`, from the table or freshly opened and then kept in the table. When the
    // system refuses it the result is null, or a LoadError if `throw_on_failure` is not 0.
    void* _loadLibrary(const char* file, unsigned char throw_on_failure) KEL_REQUIRES(_lock);

    // What Unload does once it holds the lock.
    void _unload(const char* file) KEL_REQUIRES(_lock);

    // Gives `handle` back to the system; a refusal is reported on std::cerr.
    void _closeLibrary(void* handle) KEL_REQUIRES(_lock);

    // The two parts that turn a short name into a file name: "lib" and "_r.so". Static storage.
    static const char* _prefix();
    static const char* _suffix();

    // Writes prefix, `name` and suffix to `out`, which must have room for them: nothing is checked.
    static void _wrap_libname(char* out, const char* name);

    // What instance() gives, null until it was called first.
    static KELLoadLibrary* _instance;
    // Non-zero once there is an instance.
    static unsigned char _inited;

private:
    KELDictionary<CORBA_String_var, void*> _libraries KEL_GUARDED_BY(_lock);
    KELMutex _lock;
};

// Carries the system's own words about a library that could not be opened. They stay in the
// process: neither the message nor the code is marshalled or printed.
class KEL_API KELLoadLibrary::LoadError : public CORBA_UserException {
public:
    // An empty message and code 0.
    LoadError();

    // Copies `message`, which may be null.
    LoadError(const char* message, unsigned long code);

    LoadError(const LoadError&) = default;
    LoadError& operator=(const LoadError&) = default;
    ~LoadError() override;

    // Belongs to this exception.
    const char* message() const;

    // 0 in every error that the loader throws.
    unsigned long code() const;

    // The description of this class.
    const Description* _desc() const override;
    void _raise() const override;

    // A copy on the heap, released with CORBA::release.
    CORBA_Exception* _deep_copy() override;

    // `e` as a LoadError, or null when it is null or something else.
    static LoadError* _downcast(CORBA_Exception* e);
    static const LoadError* _downcast(const CORBA_Exception* e);
    static LoadError* _downcast(std::nullptr_t) { return 0; }

    // A LoadError() on the heap, released with CORBA::release.
    static CORBA_Exception* _factory();

    // The description of this class.
    static Description _description;

private:
    CORBA_String_var _message;
    std::uint32_t _code;
};

#endif
