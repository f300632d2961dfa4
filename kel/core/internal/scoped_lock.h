// Holds any mutex with lock() and unlock() until the end of the scope: the guard for pooled mutexes,
// for which there is no public one.
//
//     ScopedLock<KELSpinMutex> hold(_guard);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_INTERNAL_SCOPED_LOCK_H
#define KEL_CORE_INTERNAL_SCOPED_LOCK_H

#include <kel/config.h>

namespace kel {
namespace internal {

template <class Mutex>
class KEL_SCOPED_CAPABILITY ScopedLock {
public:
    explicit ScopedLock(Mutex& mutex) KEL_ACQUIRE(mutex) : _mutex(mutex) { mutex.lock(); }
    ScopedLock(const ScopedLock&) = delete;
    ScopedLock& operator=(const ScopedLock&) = delete;
    ~ScopedLock() KEL_RELEASE() { _mutex.unlock(); }

private:
    Mutex& _mutex;
};

}  // namespace internal
}  // namespace kel

#endif
