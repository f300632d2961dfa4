// Each thread's holder of the exception that its last call raised.
//
//   CORBA_Environment    holds at most one exception and owns it
//   CurrentEnvironment   the per-thread object that carries a thread's environment
//
//     CORBA_Environment* env = CORBA::current_environment();
//     if (env->exception() != 0) env->clear();
//
// An environment is used by its own thread only and needs no lock. The one of current_environment()
// lives until its thread ends: never release it, it would be freed twice.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_SERVICES_ENVIRONMENT_H
#define KEL_SERVICES_ENVIRONMENT_H

#include <kel/config.h>
#include <kel/core/mutex.h>
#include <kel/core/thread_local.h>
#include <kel/exceptions/exception.h>

class KEL_API CORBA_Environment {
public:
    CORBA_Environment();
    ~CORBA_Environment();

    CORBA_Environment(const CORBA_Environment&) = delete;
    CORBA_Environment& operator=(const CORBA_Environment&) = delete;

    // Holds `e` from now on and releases what was held before. `e` may be null.
    void exception(CORBA_Exception* e);

    // What is held, or null. It belongs to the environment.
    CORBA_Exception* exception() const;

    // Releases what is held.
    void clear();

    // The calling thread's environment, never null. Its first call in a thread may throw
    // CORBA_NO_RESOURCES or std::bad_alloc.
    static CORBA_Environment* current_environment();

private:
    CORBA_Exception_var _exception;
};

class KEL_API CurrentEnvironment : public KELThreadLocal {
public:
    // Registers the object for the calling thread, which must not have one yet.
    CurrentEnvironment();
    ~CurrentEnvironment() override;

    // The slot of this class among the per-thread objects, drawn by the first call. Any thread.
    static unsigned long key_id();

    // The calling thread's object, created when there is none. The thread's end deletes it.
    static CurrentEnvironment* instance();

    // Lives as long as this object.
    CORBA_Environment* environment();

    static unsigned long _key_id;  // 0 until it is drawn
    static KELMutex _mtx;          // guards the drawing; taken before KELThreadLocal::_mutex

private:
    CORBA_Environment _environment;
};

namespace CORBA {

typedef CORBA_Environment Environment;

// CORBA_Environment::current_environment().
KEL_API CORBA_Environment* current_environment();

// 1 when `e` is null, else 0.
KEL_API unsigned char is_nil(CORBA_Environment* e);

// Deletes an environment that the caller allocated, and its exception. Null is ignored.
KEL_API void release(CORBA_Environment* e);

}  // namespace CORBA

#endif
