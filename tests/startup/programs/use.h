// Uses the shared parts of the library.
//
//   use_everything    every shared part once; whatever does not work ends the process
//   start_sixteen     sixteen threads that use everything without end
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STARTUP_PROGRAMS_USE_H
#define KEL_TESTS_STARTUP_PROGRAMS_USE_H

#include <kel/core/condition.h>
#include <kel/core/mutex.h>
#include <kel/core/resource.h>
#include <kel/core/spin_mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/core/unique_id.h>
#include <kel/exceptions/standard.h>
#include <kel/os/portable.h>
#include <kel/services/debug_logger.h>
#include <kel/services/environment.h>
#include <kel/services/load_library.h>
#include <unistd.h>

namespace kel {
namespace test {

// The library's locks work on after their destructors, which a sanitizer could not know.
template <class Mutex>
__attribute__((no_sanitize("vptr"))) void lock_and_unlock(Mutex& mutex) {
    mutex.lock();
    mutex.unlock();
}

class Nothing : public KELThread {
public:
    Nothing() : KELThread(0) {}
    void begin() override {}
};

inline void use_named_locks() {
    lock_and_unlock(KELThread::_mutex);
    lock_and_unlock(KELThreadLocal::_mutex);
    lock_and_unlock(KELPortable::_mutex);
    lock_and_unlock(CurrentEnvironment::_mtx);
}

inline void use_pooled_mutexes() {
    KELSpinMutex plain;
    lock_and_unlock(plain);
    KELRSpinMutex recursive;
    lock_and_unlock(recursive);
}

inline void use_counters() {
    KELResource* const counted = new KELResource;
    counted->_ref();
    counted->_unref();
    counted->_unref();
    KELUniqueId();
}

inline void use_services() {
    KELDebugLogger::instance()->start(0, 0x10000000, "use.h", 1) << "not enabled" << endl;
    CORBA::current_environment()->clear();
    KELLoadLibrary::instance()->UnloadAll();
}

inline void use_threads() { Nothing(); }

inline void raise_and_catch() {
    try {
        CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "used")._raise();
    } catch (const CORBA_SystemException&) {
    }
}

inline void use_everything() {
    use_named_locks();
    use_pooled_mutexes();
    use_counters();
    use_services();
    use_threads();
    raise_and_catch();
}

inline KELMutex started_mutex;
inline KELCondition started_changed;
inline int started = 0;

class Busy : public KELThread {
public:
    Busy() : KELThread(0) {}
    void begin() override {
        use_everything();
        started_mutex.lock();
        ++started;
        started_changed.signal();
        started_mutex.unlock();
        // Of this thread alone: the others leave main enough of the processor to come to its end.
        if (::nice(19) < 0) ::_exit(1);
        for (;;) use_everything();
    }
};

// Returns when all of them have used everything once.
inline void start_sixteen() {
    for (int i = 0; i < 16; ++i) (new Busy)->run();
    started_mutex.lock();
    while (started < 16) started_changed.wait(started_mutex);
    started_mutex.unlock();
}

}  // namespace test
}  // namespace kel

#endif
