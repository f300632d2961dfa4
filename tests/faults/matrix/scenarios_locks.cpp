// Mutexes of every kind, their guards and their pools.
//
// SPDX-License-Identifier: MIT
#include <kel/core/mutex.h>
#include <kel/core/unique_id.h>

#include <new>

#include "tests/faults/matrix/pools.h"
#include "tests/faults/matrix/scenario.h"

namespace {

using namespace kel::test;

// --- mutexes -----------------------------------------------------------------------------------------

class PlainMutex : public Scenario {
    void act() override {
        KELMutex m;
        m.lock();
        m.unlock();
    }
};
KEL_SCENARIO(PlainMutex).and_retried();

class RecursiveMutex : public Scenario {
    void act() override {
        KELRMutex m;
        m.lock();
        m.lock();
        m.unlock();
        m.unlock();
    }
};
KEL_SCENARIO(RecursiveMutex).and_retried();

template <class Mutex>
class MutexByInterface : public Scenario {
    void act() override {
        KELIMutex& any = _mutex;
        any.v_lock();
        any.v_unlock();
    }
    Mutex _mutex;
};
using PlainMutexByInterface = MutexByInterface<KELMutex>;
using RecursiveMutexByInterface = MutexByInterface<KELRMutex>;
using PooledMutexByInterface = MutexByInterface<KELSpinMutex>;
using PooledRecursiveMutexByInterface = MutexByInterface<KELRSpinMutex>;
KEL_SCENARIO(PlainMutexByInterface);
KEL_SCENARIO(RecursiveMutexByInterface);
KEL_SCENARIO(PooledMutexByInterface);
KEL_SCENARIO(PooledRecursiveMutexByInterface);

// --- guards ------------------------------------------------------------------------------------------

class PlainGuard : public Scenario {
    void act() override {
        KELMutex_var hold(_mutex, 1);
        hold.unlock();
        hold.lock();
    }
    KELMutex _mutex;
};
KEL_SCENARIO(PlainGuard);

class RecursiveGuard : public Scenario {
    void act() override {
        KELRMutex_var hold(_mutex, 1);
        KELRMutex_var again(_mutex, 1);
        again.unlock();
        again.lock();
    }
    KELRMutex _mutex;
};
KEL_SCENARIO(RecursiveGuard);

class GuardThatHandsOver : public Scenario {
    void act() override {
        { KELMutex_var hold(_mutex, 0); }
        _mutex.unlock();
    }
    KELMutex _mutex;
};
KEL_SCENARIO(GuardThatHandsOver);

class DeferredGuard : public Scenario {
    void act() override {
        KELDMutex_var hold(nullptr, 1);
        hold.set(nullptr);
        hold.set(&_mutex);
    }
    KELMutex _mutex;
};
KEL_SCENARIO(DeferredGuard);

class DeferredGuardOnAMutex : public Scenario {
    void act() override {
        KELDMutex_var hold(&_mutex, 1);
        hold.unlock();
    }
    KELMutex _mutex;
};
KEL_SCENARIO(DeferredGuardOnAMutex);

class DeferredGuardSetTwice : public Scenario {
    void act() override {
        KELDMutex_var hold(&_mutex, 1);
        hold.set(&_mutex);
    }
    KELMutex _mutex;
};
KEL_SCENARIO(DeferredGuardSetTwice)
    .giving("ends _mtx == (KELMutex *)__null, vthread, void KELDMutex_var::set(KELMutex*)");

// --- pools -------------------------------------------------------------------------------------------

// A handle, made and used while `parked` mutexes wait in the pool.
template <class Handle, class Pool, int parked>
class PooledMutex : public Scenario {
    void prepare() override { _pool.park(parked); }
    void act() override {
        Handle m;
        m.lock();
        m.unlock();
    }
    std::string state() override { return std::to_string(_pool.parked()) + " parked"; }
    Pool _pool;
};
using PooledMutexFromAnEmptyPool = PooledMutex<KELSpinMutex, EmptyPlainPool, 0>;
using PooledMutexThatWasParked = PooledMutex<KELSpinMutex, EmptyPlainPool, 2>;
using PooledRecursiveMutexFromAnEmptyPool = PooledMutex<KELRSpinMutex, EmptyRecursivePool, 0>;
using PooledRecursiveMutexThatWasParked = PooledMutex<KELRSpinMutex, EmptyRecursivePool, 2>;
KEL_SCENARIO(PooledMutexFromAnEmptyPool).and_retried();
KEL_SCENARIO(PooledMutexThatWasParked);
KEL_SCENARIO(PooledRecursiveMutexFromAnEmptyPool).and_retried();
KEL_SCENARIO(PooledRecursiveMutexThatWasParked);

// The thirty-third mutex has no place in the pool.
template <class Pool, class Impl>
class FullPool : public Scenario {
    void prepare() override {
        _pool.park(32);
        _one_more = new Impl;
    }
    void act() override { _pool.pool->destroy(_one_more); }
    Pool _pool;
    Impl* _one_more = nullptr;
};
using FullPlainPool = FullPool<EmptyPlainPool, KELSpinMutexImpl>;
using FullRecursivePool = FullPool<EmptyRecursivePool, KELRSpinMutexImpl>;
KEL_SCENARIO(FullPlainPool);
KEL_SCENARIO(FullRecursivePool);

// --- the first use of what is made once --------------------------------------------------------------

template <class Handle>
class FirstPooledMutex : public Scenario {
    void act() override {
        Handle m;
        m.lock();
        m.unlock();
    }
};
using FirstPooledPlainMutex = FirstPooledMutex<KELSpinMutex>;
using FirstPooledRecursiveMutex = FirstPooledMutex<KELRSpinMutex>;
KEL_SCENARIO(FirstPooledPlainMutex).in_a_fresh_process().and_retried();
KEL_SCENARIO(FirstPooledRecursiveMutex).in_a_fresh_process().and_retried();

class UniqueId : public Scenario {
    void act() override {
        const unsigned long first = KELUniqueId().value();
        gives("%lu apart", KELUniqueId().value() - first);
    }
};
KEL_SCENARIO(UniqueId).giving("1 apart");

// A lock that cannot be made draws no id.
class FirstUniqueId : public Scenario {
    void prepare() override { _before = KELUniqueId::_globalId; }
    void act() override { gives("%lu apart", KELUniqueId().value() - _before); }
    unsigned long _before = 0;
};
KEL_SCENARIO(FirstUniqueId).giving("0 apart").in_a_fresh_process().and_retried();

}  // namespace
