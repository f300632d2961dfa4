// SPDX-License-Identifier: MIT

// The operations that callers have in line are defined here.
#define KEL_INLINE_SPIN_MUTEX

#include <kel/core/internal/scoped_lock.h>
#include <kel/core/spin_mutex.h>

#include <new>

using kel::internal::ScopedLock;

namespace {

const std::int32_t max_parked = 32;

}  // namespace

// --- plain -------------------------------------------------------------------------------------------

KELSpinMutex::KELSpinMutex() : _impl(KELSpinMutexImplFactory::instance()->create()) {}

KELSpinMutex::~KELSpinMutex() { KELSpinMutexImplFactory::instance()->destroy(_impl); }

void KELSpinMutex::v_lock() { lock(); }
void KELSpinMutex::v_unlock() { unlock(); }

// The pools stand in static storage and are never destroyed: detached threads go on using them while
// the process exits.
KELSpinMutexImplFactory* KELSpinMutexImplFactory::instance() {
    alignas(KELSpinMutexImplFactory) static unsigned char storage[sizeof(KELSpinMutexImplFactory)];
    static KELSpinMutexImplFactory* const pool = new (storage) KELSpinMutexImplFactory;
    return pool;
}

KELSpinMutexImplFactory::KELSpinMutexImplFactory() : _free_count(0) {}

KELSpinMutexImpl* KELSpinMutexImplFactory::create() {
    KELMutex_var hold(_guard, 1);
    if (_free_count > 0) return _free[--_free_count];
    return new KELSpinMutexImpl;
}

void KELSpinMutexImplFactory::destroy(KELSpinMutexImpl* m) {
    if (m == nullptr) return;
    KELMutex_var hold(_guard, 1);
    if (_free_count < max_parked) {
        _free[_free_count++] = m;
    } else {
        delete m;
    }
}

// --- recursive ---------------------------------------------------------------------------------------

KELRSpinMutex::KELRSpinMutex() : _impl(KELRSpinMutexImplFactory::instance()->create()) {}

KELRSpinMutex::~KELRSpinMutex() { KELRSpinMutexImplFactory::instance()->destroy(_impl); }

void KELRSpinMutex::v_lock() { lock(); }
void KELRSpinMutex::v_unlock() { unlock(); }

KELRSpinMutexImplFactory* KELRSpinMutexImplFactory::instance() {
    alignas(KELRSpinMutexImplFactory) static unsigned char storage[sizeof(KELRSpinMutexImplFactory)];
    static KELRSpinMutexImplFactory* const pool = new (storage) KELRSpinMutexImplFactory;
    return pool;
}

KELRSpinMutexImplFactory::KELRSpinMutexImplFactory() : _free_count(0) {}

KELRSpinMutexImpl* KELRSpinMutexImplFactory::create() {
    ScopedLock<KELSpinMutex> hold(_guard);
    if (_free_count > 0) return _free[--_free_count];
    return new KELRSpinMutexImpl;
}

// Deliberate: null is parked like a mutex, counts as one and is handed out again, where the plain pool
// ignores it. Whoever wants a recursive mutex that excludes nobody parks a null first.
// Pinned by RecursivePool.HandsOutAParkedNull and RecursivePool.CountsAParkedNullTowardsTheThirtyTwo.
void KELRSpinMutexImplFactory::destroy(KELRSpinMutexImpl* m) {
    ScopedLock<KELSpinMutex> hold(_guard);
    if (_free_count < max_parked) {
        _free[_free_count++] = m;
    } else {
        delete m;
    }
}
