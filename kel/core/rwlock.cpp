// SPDX-License-Identifier: MIT
#include <kel/core/rwlock.h>

KELRWLock::KELRWLock() : _state(0), _waiting_writers(0) {}

void KELRWLock::read_lock() {
    KELMutex_var hold(_mutex, 1);
    while (_state < 0 || _waiting_writers != 0) _readers.wait(_mutex);
    _state += 1;
}

void KELRWLock::write_lock() {
    KELMutex_var hold(_mutex, 1);
    while (_state != 0) {
        _waiting_writers += 1;
        _writers.wait(_mutex);
        _waiting_writers -= 1;
    }
    _state = -1;
}

// Wakes after the mutex is free, so that a woken thread does not run straight into it.
//
// Deliberate: nobody checks that the caller holds the lock; a free one goes to -1 and reads as held by
// a writer. Pinned by RWLock.UnlockOfAFreeLockReadsAsWriterHeld.
//
// Deliberate: with no writer waiting the readers are woken even while other readers remain.
// Pinned by RWLock.UnlockBroadcastsEvenWhileReadersRemain.
void KELRWLock::unlock() {
    bool wake_writer = false;
    bool wake_readers = false;
    {
        KELMutex_var hold(_mutex, 1);
        _state = _state >= 0 ? _state - 1 : 0;
        wake_writer = _waiting_writers != 0 && _state == 0;
        wake_readers = _waiting_writers == 0;
    }
    if (wake_writer) _writers.signal();
    if (wake_readers) _readers.broadcast();
}

KELRLock_var::KELRLock_var(KELRWLock& lock) : _lock(&lock), _locked(1) { lock.read_lock(); }

KELRLock_var::~KELRLock_var() {
    if (_locked) _lock->unlock();
}

KELWLock_var::KELWLock_var(KELRWLock& lock) : _lock(&lock), _locked(1) { lock.write_lock(); }

KELWLock_var::~KELWLock_var() {
    if (_locked) _lock->unlock();
}
