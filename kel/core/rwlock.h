// A lock that many readers or one writer may hold.
//
//   KELRWLock     the lock; as soon as a writer waits, new readers wait too
//   KELRLock_var  holds it for reading until the end of the scope
//   KELWLock_var  holds it for writing until the end of the scope
//
//     KELRLock_var hold(_lock);   // unlocked when hold goes out of scope
//
// Any thread. The lock is not recursive and remembers no owner: a second read_lock() of a thread
// while a writer waits deadlocks, and an unlock() by a thread that holds nothing corrupts the count.
// The lock must outlive every unlock(), which wakes the waiting threads as its last step.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_RWLOCK_H
#define KEL_CORE_RWLOCK_H

#include <kel/config.h>
#include <kel/core/condition.h>
#include <kel/core/mutex.h>

class KEL_API KEL_CAPABILITY("rwlock") KELRWLock {
public:
    KELRWLock();
    KELRWLock(const KELRWLock&) = delete;
    KELRWLock& operator=(const KELRWLock&) = delete;

    // Waits while a writer holds the lock or waits for it, then holds it with other readers.
    void read_lock() KEL_THREAD_ANNOTATION(acquire_shared_capability());
    // Waits until nobody holds the lock, then holds it alone.
    void write_lock() KEL_ACQUIRE();

    // Releases whichever of the two the caller holds.
    void unlock() KEL_THREAD_ANNOTATION(release_generic_capability());

    KELMutex _mutex;                             // protects _state and _waiting_writers
    std::int32_t _state KEL_GUARDED_BY(_mutex);  // readers that hold the lock; 0 free; -1 a writer holds it
    KELCondition _readers;                       // readers wait here
    std::uint32_t _waiting_writers KEL_GUARDED_BY(_mutex);  // writers blocked in write_lock()
    KELCondition _writers;                                  // writers wait here
};

class KEL_API KEL_SCOPED_CAPABILITY KELRLock_var {
public:
    // Waits for the lock and holds it for reading. `lock` is not owned.
    explicit KELRLock_var(KELRWLock& lock) KEL_THREAD_ANNOTATION(acquire_shared_capability(lock));
    KELRLock_var(const KELRLock_var&) = delete;
    KELRLock_var& operator=(const KELRLock_var&) = delete;
    ~KELRLock_var() KEL_THREAD_ANNOTATION(release_generic_capability());

private:
    KELRWLock* _lock;
    unsigned char _locked;  // non-zero: the destructor unlocks
};

class KEL_API KEL_SCOPED_CAPABILITY KELWLock_var {
public:
    // Waits for the lock and holds it for writing. `lock` is not owned.
    explicit KELWLock_var(KELRWLock& lock) KEL_ACQUIRE(lock);
    KELWLock_var(const KELWLock_var&) = delete;
    KELWLock_var& operator=(const KELWLock_var&) = delete;
    ~KELWLock_var() KEL_RELEASE();

private:
    KELRWLock* _lock;
    unsigned char _locked;  // non-zero: the destructor unlocks
};

#endif
