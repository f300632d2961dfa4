// Mutexes and the guards that hold them for a scope.
//
//   KELIMutex       what code locks when it does not care which mutex it is
//   KELMutex        plain: the thread that holds it must not lock it again
//   KELRMutex       recursive: as many unlocks as locks
//   KELMutex_var    holds a KELMutex until the end of the scope
//   KELRMutex_var   holds a KELRMutex until the end of the scope
//   KELDMutex_var   the same over a KELMutex that may be absent or come later
//
//     KELMutex_var hold(_mutex, 1);   // unlocked when hold goes out of scope
//
// A mutex may be used by any thread. A guard belongs to the scope that made it.
//
// Creating a mutex that the system refuses throws CORBA::NO_RESOURCES with the value of errno as
// minor code and COMPLETED_NO. A lock or unlock that the system refuses prints the name of the
// failed call on standard error and ends the process, in release builds too.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_MUTEX_H
#define KEL_CORE_MUTEX_H

#include <kel/config.h>
#include <pthread.h>

#ifndef KEL_INLINE_MUTEX
// What the definitions in line begin with; empty in the unit that owns them.
#define KEL_INLINE_MUTEX KEL_INLINE
#endif

// The library's own mutexes are zero before they are built and stay as they are when they are destroyed.
// Both times they can be locked, while a sanitizer would find no object there.
#define KEL_OBJECT_OR_NOT __attribute__((no_sanitize("vptr")))

class KEL_API KEL_CAPABILITY("mutex") KELIMutex {
public:
    KELIMutex() = default;
    KELIMutex(const KELIMutex&) = delete;
    KELIMutex& operator=(const KELIMutex&) = delete;

    // Call lock() and unlock() of the concrete class.
    virtual void v_lock() KEL_ACQUIRE() = 0;
    virtual void v_unlock() KEL_RELEASE() = 0;
    virtual ~KELIMutex();
};

class KEL_API KEL_CAPABILITY("mutex") KELMutex : public KELIMutex {
public:
    KELMutex();
    void v_lock() override KEL_ACQUIRE();
    void v_unlock() override KEL_RELEASE();
    ~KELMutex() override;

    // Waits until no thread holds the mutex and takes it.
    void lock() KEL_ACQUIRE();
    // Gives the mutex, which the calling thread holds, to the next one.
    void unlock() KEL_RELEASE();

private:
    friend class KELCondition;  // waits on _mutex itself

    pthread_mutex_t _mutex;
};

class KEL_API KEL_CAPABILITY("mutex") KELRMutex : public KELIMutex {
public:
    KELRMutex();
    void v_lock() override KEL_ACQUIRE();
    void v_unlock() override KEL_RELEASE();
    ~KELRMutex() override;

    // Waits until no other thread holds the mutex and takes it once more.
    void lock() KEL_ACQUIRE();
    // Takes one lock() of this thread back; the last one frees the mutex.
    void unlock() KEL_RELEASE();

private:
    pthread_mutexattr_t _attributes;
    pthread_mutex_t _mutex;
};

class KEL_API KEL_SCOPED_CAPABILITY KELMutex_var {
public:
    // Locks `m` whatever `flag` says. The flag decides whether the destructor unlocks: with 0 the
    // mutex stays locked when the guard is gone and somebody else has to unlock it.
    KELMutex_var(KELMutex& m, unsigned char flag) KEL_ACQUIRE(m);
    KELMutex_var(const KELMutex_var&) = delete;
    KELMutex_var& operator=(const KELMutex_var&) = delete;
    ~KELMutex_var() KEL_RELEASE();

    // Locks the mutex again after an unlock(). A second lock() in a row deadlocks.
    void lock() KEL_ACQUIRE();
    // Unlocks the mutex before the end of the scope.
    void unlock() KEL_RELEASE();
    // The mutex, whether or not the guard holds it.
    KELMutex* operator->() const { return &_mtx; }

    // The mutex, which is not owned.
    KELMutex& _mtx;
    unsigned char _locked;  // non-zero: the destructor unlocks
};

class KEL_API KEL_SCOPED_CAPABILITY KELRMutex_var {
public:
    // As for KELMutex_var: the flag decides only whether the destructor unlocks.
    KELRMutex_var(KELRMutex& m, unsigned char flag) KEL_ACQUIRE(m);
    KELRMutex_var(const KELRMutex_var&) = delete;
    KELRMutex_var& operator=(const KELRMutex_var&) = delete;
    ~KELRMutex_var() KEL_RELEASE();

    // As for KELMutex_var.
    void lock() KEL_ACQUIRE();
    void unlock() KEL_RELEASE();
    // The mutex, whether or not the guard holds it.
    KELRMutex* operator->() const { return &_mtx; }

    // The mutex, which is not owned.
    KELRMutex& _mtx;
    unsigned char _locked;  // non-zero: the destructor unlocks
};

class KEL_API KELDMutex_var {
public:
    // Locks `m` unless it is null; the flag decides only whether the destructor unlocks.
    KELDMutex_var(KELMutex* m, unsigned char flag) KEL_NO_THREAD_SAFETY_ANALYSIS;
    KELDMutex_var(const KELDMutex_var&) = delete;
    KELDMutex_var& operator=(const KELDMutex_var&) = delete;
    ~KELDMutex_var() KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Attaches and locks `m`; null attaches nothing. Ends the process when a mutex is attached
    // already, also one that unlock() released.
    void set(KELMutex* m) KEL_NO_THREAD_SAFETY_ANALYSIS;

    // Unlocks the mutex, if there is one, but keeps it attached.
    void unlock() KEL_NO_THREAD_SAFETY_ANALYSIS;
    // The attached mutex, or null.
    KELMutex* operator->() const { return _mtx; }

    // The mutex that is attached, or null. Not owned.
    KELMutex* _mtx;
    unsigned char _locked;  // non-zero: the destructor unlocks
};

namespace kel {
namespace internal {

// Which operation the system refused. The reports are written where the library is, not here.
enum MutexUse { kMutexLock, kMutexUnlock, kRMutexLock, kRMutexUnlock };

// Prints the name of the call and ends the process, or throws NO_RESOURCES.
[[noreturn]] KEL_API __attribute__((cold)) void mutex_use_failed(MutexUse use);
[[noreturn]] KEL_API __attribute__((cold)) void mutex_init_failed();

}  // namespace internal
}  // namespace kel

KEL_INLINE_BEGIN
#if !defined(__clang__) || defined(KEL_MUTEX_OWNER)  // clang makes the class's tables where it sees this
KEL_INLINE_MUTEX KELIMutex::~KELIMutex() {}
#endif
KEL_INLINE_MUTEX KELMutex::KELMutex() {
    const int rc = pthread_mutex_init(&_mutex, 0);
    if (rc != 0) kel::internal::mutex_init_failed();
}

// The attribute object is a member and the results of its two calls are not looked at: should they
// fail, pthread_mutex_init says so.
//
// Deliberate: a failed pthread_mutex_init leaves the attribute object undestroyed; it owns nothing.
// Pinned by RecursiveMutex.FailedCreationLeavesTheAttributesUndestroyed.
KEL_INLINE_MUTEX KELRMutex::KELRMutex() {
    pthread_mutexattr_init(&_attributes);
    pthread_mutexattr_settype(&_attributes, PTHREAD_MUTEX_RECURSIVE);
    const int rc = pthread_mutex_init(&_mutex, &_attributes);
    if (rc != 0) kel::internal::mutex_init_failed();
    pthread_mutexattr_destroy(&_attributes);
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELMutex::lock() {
    const int rc = pthread_mutex_lock(&_mutex);
    if (rc != 0) kel::internal::mutex_use_failed(kel::internal::kMutexLock);
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELMutex::unlock() {
    const int rc = pthread_mutex_unlock(&_mutex);
    if (rc != 0) kel::internal::mutex_use_failed(kel::internal::kMutexUnlock);
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELRMutex::lock() {
    const int rc = pthread_mutex_lock(&_mutex);
    if (rc != 0) kel::internal::mutex_use_failed(kel::internal::kRMutexLock);
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELRMutex::unlock() {
    const int rc = pthread_mutex_unlock(&_mutex);
    if (rc != 0) kel::internal::mutex_use_failed(kel::internal::kRMutexUnlock);
}

// Deliberate: the flag does not decide whether the guard locks. With 0 the mutex stays locked when the
// guard is gone: that is how a scope hands a locked mutex over to its caller.
// Pinned by MutexGuard.FlagZeroLeavesTheMutexLocked.
KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX KELMutex_var::KELMutex_var(KELMutex& m, unsigned char flag)
    : _mtx(m), _locked(flag) {
    m.lock();
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX KELMutex_var::~KELMutex_var() {
    if (_locked) _mtx.unlock();
}

// Deliberate: the flag is not looked at first. A guard with flag 0 may have handed its mutex over, so the
// flag does not tell whether the mutex is held. Pinned by MutexGuard.LockDoesNotTestTheFlag.
KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELMutex_var::lock() {
    _mtx.lock();
    _locked = 1;
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELMutex_var::unlock() {
    _mtx.unlock();
    _locked = 0;
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX KELRMutex_var::KELRMutex_var(KELRMutex& m, unsigned char flag)
    : _mtx(m), _locked(flag) {
    m.lock();
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX KELRMutex_var::~KELRMutex_var() {
    if (_locked) _mtx.unlock();
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELRMutex_var::lock() {
    _mtx.lock();
    _locked = 1;
}

KEL_OBJECT_OR_NOT KEL_INLINE_MUTEX void KELRMutex_var::unlock() {
    _mtx.unlock();
    _locked = 0;
}

// A mutex that ends in line belongs to whoever ends it. The library's own locks end at exit through the
// library's copy of the destructor, which leaves them usable.
#ifndef KEL_MUTEX_OWNER
KEL_INLINE_MUTEX KELMutex::~KELMutex() { pthread_mutex_destroy(&_mutex); }
KEL_INLINE_MUTEX KELRMutex::~KELRMutex() { pthread_mutex_destroy(&_mutex); }
#endif

KEL_INLINE_END

#endif
