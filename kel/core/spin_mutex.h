// Mutexes for short-lived objects: handles onto mutexes that are recycled through a pool.
//
//   KELSpinMutex                a handle onto a pooled plain mutex
//   KELRSpinMutex               a handle onto a pooled recursive mutex
//   KELSpinMutexImpl            a pooled plain mutex
//   KELRSpinMutexImpl           a pooled recursive mutex
//   KELSpinMutexImplFactory     parks up to 32 plain mutexes
//   KELRSpinMutexImplFactory    parks up to 32 recursive mutexes
//
//     class Record { KELSpinMutex _guard; ... };   // a new Record reuses the mutex of an old one
//
// They do not spin. An object that lives briefly and owns one does not create and destroy an
// operating-system mutex every time. Any thread may use all of it; failures are those of mutex.h.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_SPIN_MUTEX_H
#define KEL_CORE_SPIN_MUTEX_H

#include <kel/core/mutex.h>

#ifndef KEL_INLINE_SPIN_MUTEX
// What the definitions in line begin with; empty in the unit that owns them.
#define KEL_INLINE_SPIN_MUTEX KEL_INLINE
#endif

class KEL_API KELSpinMutexImpl : public KELMutex {};
class KEL_API KELRSpinMutexImpl : public KELRMutex {};

class KEL_API KEL_CAPABILITY("mutex") KELSpinMutex : public KELIMutex {
public:
    // Takes a mutex from the pool. Throws CORBA::NO_RESOURCES when a new one cannot be made.
    KELSpinMutex();
    void v_lock() override KEL_ACQUIRE();
    void v_unlock() override KEL_RELEASE();

    // Gives the mutex back. It must not be locked.
    ~KELSpinMutex() override;

    // As lock() of the mutex that the handle stands for.
    void lock() KEL_ACQUIRE();
    // As unlock() of the mutex that the handle stands for.
    void unlock() KEL_RELEASE();

private:
    KELSpinMutexImpl* _impl;
};

class KEL_API KEL_CAPABILITY("mutex") KELRSpinMutex : public KELIMutex {
public:
    // As for KELSpinMutex. A null that was parked in the pool gives a mutex that excludes nobody.
    KELRSpinMutex();
    void v_lock() override KEL_ACQUIRE();
    void v_unlock() override KEL_RELEASE();
    ~KELRSpinMutex() override;

    // As lock() of the mutex that the handle stands for.
    void lock() KEL_ACQUIRE();
    // As unlock() of the mutex that the handle stands for.
    void unlock() KEL_RELEASE();

private:
    KELRSpinMutexImpl* _impl;
};

class KEL_API KELSpinMutexImplFactory {
public:
    KELSpinMutexImplFactory(const KELSpinMutexImplFactory&) = delete;
    KELSpinMutexImplFactory& operator=(const KELSpinMutexImplFactory&) = delete;

    // The one pool of the process, made on first use and never null.
    static KELSpinMutexImplFactory* instance();

    // The mutex that was parked last, or a new one when none is parked. The caller gives it back
    // with destroy(). Throws CORBA::NO_RESOURCES or std::bad_alloc, which leave the pool as it was.
    KELSpinMutexImpl* create();

    // Parks `m`, or deletes it when 32 mutexes are parked. Null is ignored.
    void destroy(KELSpinMutexImpl* m);

private:
    KELSpinMutexImplFactory();

    std::int32_t _free_count KEL_GUARDED_BY(_guard);
    KELMutex _guard;
    KELSpinMutexImpl* _free[32] KEL_GUARDED_BY(_guard);
};

class KEL_API KELRSpinMutexImplFactory {
public:
    KELRSpinMutexImplFactory(const KELRSpinMutexImplFactory&) = delete;
    KELRSpinMutexImplFactory& operator=(const KELRSpinMutexImplFactory&) = delete;

    // The one pool of the process, made on first use and never null. It is guarded by a pooled
    // plain mutex, so that its first use makes the plain pool too.
    static KELRSpinMutexImplFactory* instance();

    // As for the plain pool, but null when a null was parked last.
    KELRSpinMutexImpl* create();

    // Parks `m`, a null as well, or deletes it when 32 are parked.
    void destroy(KELRSpinMutexImpl* m);

private:
    KELRSpinMutexImplFactory();

    std::int32_t _free_count KEL_GUARDED_BY(_guard);
    KELSpinMutex _guard;
    KELRSpinMutexImpl* _free[32] KEL_GUARDED_BY(_guard);
};

KEL_INLINE_BEGIN

KEL_INLINE_SPIN_MUTEX void KELSpinMutex::lock() {
    if (_impl != 0) _impl->lock();
}

KEL_INLINE_SPIN_MUTEX void KELSpinMutex::unlock() {
    if (_impl != 0) _impl->unlock();
}

KEL_INLINE_SPIN_MUTEX void KELRSpinMutex::lock() {
    if (_impl != 0) _impl->lock();
}

KEL_INLINE_SPIN_MUTEX void KELRSpinMutex::unlock() {
    if (_impl != 0) _impl->unlock();
}

KEL_INLINE_END

#endif
