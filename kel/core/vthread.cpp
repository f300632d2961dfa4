// SPDX-License-Identifier: MIT
// Mutexes, guards, conditions and threads. Every wrapper that ends the process when a thread call
// fails stands in this unit: the report names "vthread" and one of its lines.

// The operations that callers have in line are defined here.
#define KEL_INLINE_MUTEX
#define KEL_INLINE_THREAD
#define KEL_MUTEX_OWNER

#include <kel/core/condition.h>
#include <kel/core/internal/failure.h>
#include <kel/core/mutex.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <kel/exceptions/exception.h>
#include <kel/exceptions/raise.h>
#include <kel/os/portable.h>
#include <kel/services/environment.h>

#include <cerrno>
#include <iostream>

using kel::internal::assertion_failed;
using kel::internal::create_failed;
using kel::internal::use_failed;

// Built at load, in this order. No unit that is initialised earlier may lock the two mutexes.
static std::ios_base::Init standard_streams;
KELMutex KELThread::_mutex;
KELRMutex KELThreadLocal::_mutex;

// Constants: they hold their values before anything is built.
KELThread* KELThread::_first = nullptr;
std::int32_t KELThread::_inheritsched = -1;
KELThread::Factory KELThread::_factory = &KELThread::_create_thread;

namespace {

// Detached threads run, and lock, while exit destroys the library's static objects. Destroying a
// mutex that is held or waited for would end the process, so these keep theirs.
bool outlives_exit(const KELIMutex* mutex) {
    static const KELIMutex* const locks[] = {&KELThread::_mutex, &KELThreadLocal::_mutex,
                                             &KELPortable::_mutex, &CurrentEnvironment::_mtx};
    for (const KELIMutex* lock : locks) {
        if (lock == mutex) return true;
    }
    return false;
}

}  // namespace

// --- mutexes -----------------------------------------------------------------------------------------

namespace kel {
namespace internal {

void mutex_init_failed() { create_failed("pthread_mutex_init"); }

// Deliberate: a failed unlock of a plain mutex is headed by the name of the lock call; log filters look for
// that line. Pinned by Mutex.FailedUnlockNamesTheLockCall.
void mutex_use_failed(MutexUse use) {
    static const struct {
        const char* call;
        unsigned line;
        const char* function;
    } reports[] = {
        {"pthread_mutex_lock", __LINE__, "void KELMutex::lock()"},
        {"pthread_mutex_lock", __LINE__, "void KELMutex::unlock()"},
        {"pthread_mutex_lock", __LINE__, "void KELRMutex::lock()"},
        {"pthread_mutex_unlock", __LINE__, "void KELRMutex::unlock()"},
    };
    use_failed(reports[use].call, "(rc == 0)", reports[use].line, reports[use].function);
}

}  // namespace internal
}  // namespace kel

KELMutex::~KELMutex() {
    if (!outlives_exit(this)) pthread_mutex_destroy(&_mutex);
}

void KELMutex::v_lock() { lock(); }
void KELMutex::v_unlock() { unlock(); }

KELRMutex::~KELRMutex() {
    if (!outlives_exit(this)) pthread_mutex_destroy(&_mutex);
}

void KELRMutex::v_lock() { lock(); }
void KELRMutex::v_unlock() { unlock(); }

// --- guards ------------------------------------------------------------------------------------------

KELDMutex_var::KELDMutex_var(KELMutex* m, unsigned char flag) : _mtx(m), _locked(flag) {
    if (m != nullptr) m->lock();
}

KELDMutex_var::~KELDMutex_var() {
    if (_mtx != nullptr && _locked) _mtx->unlock();
}

// Deliberate: _locked stays as the constructor set it, so that a guard made with 0 never unlocks what
// is attached later. Pinned by DeferredGuard.SetLeavesTheFlagAsTheConstructorSetIt.
void KELDMutex_var::set(KELMutex* m) {
    if (_mtx != nullptr) {
        assertion_failed("_mtx == (KELMutex *)__null", "vthread", __LINE__,
                         "void KELDMutex_var::set(KELMutex*)");
    }
    if (m == nullptr) return;
    _mtx = m;
    m->lock();
}

// Deliberate: the mutex stays attached, so that one guard never serves two mutexes.
// Pinned by DeferredGuard.SetAfterUnlockAborts.
void KELDMutex_var::unlock() {
    if (_mtx == nullptr) return;
    _mtx->unlock();
    _locked = 0;
}

// --- conditions --------------------------------------------------------------------------------------

namespace {

// The sum wraps in the width of the field: a deadline beyond it lies in the past.
time_t later(time_t now, unsigned long seconds) {
    return static_cast<time_t>(static_cast<unsigned long>(now) + seconds);
}

// 0: woken. 1: the deadline passed.
//
// Deliberate: an interruption counts as a passed deadline and is not retried, so that a signal ends a
// timed wait. Current systems do not interrupt it any more.
// Pinned by Condition.InterruptedTimedWaitGivesOne.
//
// Deliberate: the blank before the last parenthesis; log filters know the text that way.
// Pinned by Condition.FailedWaitForSecondsEndsTheProcess.
unsigned char wait_until(pthread_cond_t* condition, pthread_mutex_t* mutex, const timespec& deadline,
                         const char* function) {
    const int rc = pthread_cond_timedwait(condition, mutex, &deadline);
    if (rc == 0) return 0;
    if (rc == ETIMEDOUT || rc == EINTR) return 1;
    use_failed("pthread_cond_timedwait", "(rc == 0 || rc == 110 || rc == 4 )", __LINE__, function);
}

}  // namespace

KELCondition::KELCondition() {
    const int rc = pthread_cond_init(&_condition, nullptr);
    if (rc != 0) create_failed("pthread_cond_init");
}

KELCondition::~KELCondition() { pthread_cond_destroy(&_condition); }

void KELCondition::wait(KELMutex& m) {
    const int rc = pthread_cond_wait(&_condition, &m._mutex);
    if (rc != 0) {
        use_failed("pthread_cond_wait", "(rc == 0)", __LINE__, "void KELCondition::wait(KELMutex&)");
    }
}

// Deliberate: the width of the limit chooses its unit, seconds here and milliseconds below. Callers
// choose by the type of their argument. Pinned by Condition.UnsignedLongCountsSeconds.
unsigned char KELCondition::timedwait(KELMutex& m, unsigned long seconds) {
    timeval now = {};
    KELPortable::gettimeofday(now);
    timespec deadline = {};
    deadline.tv_sec = later(now.tv_sec, seconds);
    deadline.tv_nsec = now.tv_usec * 1000;
    return wait_until(&_condition, &m._mutex, deadline,
                      "unsigned char KELCondition::timedwait(KELMutex&, long unsigned int)");
}

unsigned char KELCondition::timedwait(KELMutex& m, unsigned long long milliseconds) {
    timeval limit = {};
    KELPortable::convert(milliseconds, limit);
    timeval now = {};
    KELPortable::gettimeofday(now);
    const long microseconds = limit.tv_usec + now.tv_usec;
    timespec deadline = {};
    deadline.tv_sec = later(later(limit.tv_sec, now.tv_sec), microseconds / 1000000);
    deadline.tv_nsec = microseconds % 1000000 * 1000;
    return wait_until(&_condition, &m._mutex, deadline,
                      "unsigned char KELCondition::timedwait(KELMutex&, long long unsigned int)");
}

void KELCondition::wait(KELMutex& m, unsigned long seconds) {
    if (timedwait(m, seconds)) kel::internal::raise_timeout();
}

void KELCondition::wait(KELMutex& m, unsigned long long milliseconds) {
    if (timedwait(m, milliseconds)) kel::internal::raise_timeout();
}

void KELCondition::signal() {
    const int rc = pthread_cond_signal(&_condition);
    if (rc != 0) use_failed("pthread_cond_signal", "(rc == 0)", __LINE__, "void KELCondition::signal()");
}

void KELCondition::broadcast() {
    const int rc = pthread_cond_broadcast(&_condition);
    if (rc != 0) {
        use_failed("pthread_cond_broadcast", "(rc == 0)", __LINE__, "void KELCondition::broadcast()");
    }
}

// --- threads -----------------------------------------------------------------------------------------

KELThread::KELThread(long stacksize)
    : _tid(pthread_self()), _next(nullptr), _prev(nullptr), _stacksize(stacksize) {
    KELMutex_var hold(_mutex, 1);
    if (_first != nullptr) _first->_prev = this;
    _next = _first;
    _first = this;
}

KELThread::~KELThread() {
    KELMutex_var hold(_mutex, 1);
    if (_first == this) _first = _next;
    if (_prev != nullptr) _prev->_next = _next;
    if (_next != nullptr) _next->_prev = _prev;
}

void KELThread::run() { (*_factory)(static_cast<unsigned long>(_stacksize), &KELThread::_start, this); }

// Deliberate: no lock here and in terminateAll(). A caller that wants the registry to stand still holds
// _mutex itself, which is plain and must not be locked twice.
// Pinned by Thread.InstanceTakesNoLock and Thread.TerminateAllTakesNoLock.
KELThread* KELThread::instance(const KELThreadId& id) {
    for (KELThread* thread = _first; thread != nullptr; thread = thread->_next) {
        if (thread->_tid == id) return thread;
    }
    return nullptr;
}

void KELThread::terminateAll() {
    for (KELThread* thread = _first; thread != nullptr; thread = thread->_next) thread->terminate();
}

void KELThread::terminate() {}

void KELThread::yield() {}

// Deliberate: stack sizes go to the system as they are, too small and negative ones as well; there is no
// default or minimum of the library's own.
// Pinned by ThreadCreation.NegativeStackSizeGoesToTheSystemAsItIs.
//
// Deliberate: "(rc ==0)" has one blank less than the others; log filters know it that way.
// Pinned by Thread.FailedInheritschedEndsTheProcess.
//
// Deliberate: when pthread_create fails the attributes stay undestroyed; they own nothing here.
// Pinned by Thread.FailedCreationLeavesTheAttributesUndestroyed.
void KELThread::_create_thread(unsigned long stacksize, void* (*start)(void*), void* arg) {
    const char* const function =
        "static void KELThread::_create_thread(long unsigned int, void*(*)(void*), void*)";
    pthread_attr_t attributes;
    int rc = pthread_attr_init(&attributes);
    if (rc != 0) use_failed("pthread_attr_init", "(rc == 0)", __LINE__, function);
    if (stacksize != 0) {
        rc = pthread_attr_setstacksize(&attributes, stacksize);
        if (rc != 0) use_failed("pthread_attr_setstacksize", "(rc == 0)", __LINE__, function);
    }
    rc = pthread_attr_setdetachstate(&attributes, PTHREAD_CREATE_DETACHED);
    if (rc != 0) use_failed("pthread_attr_setdetachstate", "(rc == 0)", __LINE__, function);
    if (_inheritsched != -1) {
        rc = pthread_attr_setinheritsched(&attributes, _inheritsched);
        if (rc != 0) use_failed("pthread_attr_setinheritsched", "(rc ==0)", __LINE__, function);
    }
    pthread_t ignored;  // the new thread says itself who it is
    rc = pthread_create(&ignored, &attributes, start, arg);
    if (rc != 0) create_failed("pthread_create");
    pthread_attr_destroy(&attributes);
}

// Reads nothing from the object after begin(), which may have deleted it.
//
// Deliberate: after an exception the thread's slots are left to the destructor of the thread-specific
// key, which runs when the thread has unwound completely.
// Pinned by Thread.EscapedExceptionLeavesTheSlotsToTheKey.
void* KELThread::_start(void* arg) {
    KELThread* const thread = static_cast<KELThread*>(arg);
    thread->_tid = KELThreadId(pthread_self());
    try {
        thread->begin();
    } catch (const CORBA_Exception& unhandled) {
        std::cout << "KELThread::_start: unhandled exception in thread\n" << unhandled << std::endl;
        return nullptr;
    }
    KELThreadLocal::_exit_thread(arg);
    return nullptr;
}
