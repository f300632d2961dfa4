// Ends while the library is still in use.
//
//   exit late       uses every shared part once more after the exit-time destructors of the library
//   exit threads    main returns while sixteen threads use the library
//
// SPDX-License-Identifier: MIT
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

#include <cstdlib>
#include <cstring>

namespace {

bool late = false;

// Standard streams may be gone by now: this goes to the system at once.
void say(const char* what) {
    if (::write(1, what, std::strlen(what)) < 0 || ::write(1, "\n", 1) < 0) ::_exit(1);
}

// The library's locks work on after their destructors, which is what this program is about.
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

void use_named_locks() {
    lock_and_unlock(KELThread::_mutex);
    lock_and_unlock(KELThreadLocal::_mutex);
    lock_and_unlock(KELPortable::_mutex);
    lock_and_unlock(CurrentEnvironment::_mtx);
}

void use_pooled_mutexes() {
    KELSpinMutex plain;
    lock_and_unlock(plain);
    KELRSpinMutex recursive;
    lock_and_unlock(recursive);
}

void use_counters() {
    KELResource* const counted = new KELResource;
    counted->_ref();
    counted->_unref();
    counted->_unref();
    KELUniqueId();
}

void use_services() {
    KELDebugLogger::instance()->start(0, 0x10000000, "exit.cpp", 1) << "not enabled" << endl;
    CORBA::current_environment()->clear();
    KELLoadLibrary::instance()->UnloadAll();
}

void use_threads() { Nothing(); }

void raise_and_catch() {
    try {
        CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "late")._raise();
    } catch (const CORBA_SystemException&) {
    }
}

void use_everything() {
    use_named_locks();
    use_pooled_mutexes();
    use_counters();
    use_services();
    use_threads();
    raise_and_catch();
}

void after_the_destructors(int, void*) {
    if (!late) return;
    if (CORBA_Exception::Description::desc("IDL:omg.org/CORBA/UNKNOWN:1.0") == nullptr)
        say("nothing registered");
    use_named_locks();
    say("named locks");
    use_pooled_mutexes();
    say("pooled mutexes");
    use_counters();
    say("counters");
    use_services();
    say("services");
    use_threads();
    say("threads");
    raise_and_catch();
    say("exceptions");
}

// Registered before any library is initialised and for none of them, this runs after everything
// that belongs to one.
void register_first(int, char**, char**) { ::on_exit(after_the_destructors, nullptr); }

__attribute__((section(".preinit_array"), used)) void (*const before_all)(int, char**,
                                                                          char**) = register_first;

KELMutex started_mutex;
KELCondition started_changed;
int started = 0;

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

void start_sixteen() {
    for (int i = 0; i < 16; ++i) (new Busy)->run();
    started_mutex.lock();
    while (started < 16) started_changed.wait(started_mutex);
    started_mutex.unlock();
}

}  // namespace

int main(int, char** argv) {
    if (std::strcmp(argv[1], "late") == 0) {
        late = true;
        use_everything();
    } else {
        start_sixteen();
    }
    return 0;
}
