// SPDX-License-Identifier: MIT
#include <kel/core/internal/scoped_lock.h>
#include <kel/core/resource.h>

#include <iostream>
#include <new>

using kel::internal::ScopedLock;

// Built at load.
static std::ios_base::Init standard_streams;

// A constant: it holds its value before anything is built.
unsigned char KELResourceImpl::_init_sharing = 1;

namespace {

const std::uint32_t max_parked = 1024;

}  // namespace

// --- the record --------------------------------------------------------------------------------------

KELResourceImpl::KELResourceImpl() : _count(1), _sharing(get_init_sharing()) {}

void KELResourceImpl::set_init_sharing(unsigned char on) {
    __atomic_store_n(&_init_sharing, on, __ATOMIC_RELAXED);
}

unsigned char KELResourceImpl::get_init_sharing() {
    return __atomic_load_n(&_init_sharing, __ATOMIC_RELAXED);
}

// The flag is read once: were it switched between lock and unlock, one of the two would be missing.
std::int32_t KELResourceImpl::add(std::int32_t change) {
    if (__atomic_load_n(&_sharing, __ATOMIC_RELAXED) == 0) return _count += change;
    ScopedLock<KELSpinMutex> hold(_mutex);
    return _count += change;
}

// --- the pool ----------------------------------------------------------------------------------------

// In static storage and never destroyed: detached threads go on counting while the process exits.
KELResourceImplFactory* KELResourceImplFactory::instance() {
    alignas(KELResourceImplFactory) static unsigned char storage[sizeof(KELResourceImplFactory)];
    static KELResourceImplFactory* const pool = new (storage) KELResourceImplFactory;
    return pool;
}

KELResourceImplFactory::KELResourceImplFactory() : _parked_count(0) {}

// Deliberate: a new record starts at 1, a recycled one is raised from 0 to 1 under its own mutex.
// Pinned by ResourcePool.RecycledRecordIsRaisedUnderItsMutex.
KELResourceImpl* KELResourceImplFactory::create() {
    ScopedLock<KELSpinMutex> hold(_guard);
    if (_parked_count == 0) return new KELResourceImpl;
    KELResourceImpl* const r = _parked[--_parked_count];
    __atomic_store_n(&r->_sharing, KELResourceImpl::get_init_sharing(), __ATOMIC_RELAXED);
    r->add(1);
    return r;
}

void KELResourceImplFactory::destroy(KELResourceImpl* r) {
    if (r == nullptr) return;
    ScopedLock<KELSpinMutex> hold(_guard);
    if (_parked_count < max_parked) {
        r->_count = 0;
        _parked[_parked_count++] = r;
    } else {
        delete r;
    }
}

void KELResourceImplFactory::garbage_collect() {
    ScopedLock<KELSpinMutex> hold(_guard);
    while (_parked_count > 0) delete _parked[--_parked_count];
}

// --- the counted object ------------------------------------------------------------------------------

KELResource::KELResource() : _impl(nullptr) {}

KELResource::KELResource(const KELResource&) : _impl(nullptr) {}

// Both objects keep their own references.
KELResource& KELResource::operator=(const KELResource&) { return *this; }

// Only a record leads to the pool, which exists then: making it may fail, and a destructor must not.
KELResource::~KELResource() {
    if (_impl != nullptr) KELResourceImplFactory::instance()->destroy(_impl);
}

// Two threads may make the first reference together: one record is published, the other goes back.
KELResourceImpl* KELResource::record() {
    KELResourceImpl* published = __atomic_load_n(&_impl, __ATOMIC_ACQUIRE);
    if (published != nullptr) return published;
    KELResourceImpl* const made = KELResourceImplFactory::instance()->create();
    if (__atomic_compare_exchange_n(&_impl, &published, made, false, __ATOMIC_ACQ_REL, __ATOMIC_ACQUIRE)) {
        return made;
    }
    KELResourceImplFactory::instance()->destroy(made);
    return published;
}

unsigned long KELResource::_ref() { return static_cast<unsigned long>(record()->add(1)); }

// Deliberate: only exactly 0 deletes; a count below it goes unnoticed.
// Pinned by Resource.UnrefBelowZeroGoesUnnoticed.
long KELResource::_unref() {
    KELResourceImpl* const r = __atomic_load_n(&_impl, __ATOMIC_ACQUIRE);
    const long left = r != nullptr ? r->add(-1) : 0;
    if (left == 0) delete this;
    return left;
}

unsigned long KELResource::_deref() {
    KELResourceImpl* const r = __atomic_load_n(&_impl, __ATOMIC_ACQUIRE);
    return r != nullptr ? static_cast<unsigned long>(r->add(-1)) : 0;
}

// Writes nothing: threads may ask together for a count that is not shared and that none of them changes.
unsigned long KELResource::_num_refs() {
    KELResourceImpl* const r = __atomic_load_n(&_impl, __ATOMIC_ACQUIRE);
    if (r == nullptr) return 1;
    if (__atomic_load_n(&r->_sharing, __ATOMIC_RELAXED) == 0) return static_cast<unsigned long>(r->_count);
    ScopedLock<KELSpinMutex> hold(r->_mutex);
    return static_cast<unsigned long>(r->_count);
}

// Deliberate: without the mutex; it serves objects that nobody shares yet.
// Pinned by Resource.ResetTakesNoMutex.
void KELResource::_reset_refs() { record()->_count = 0; }

void KELResource::_set_sharing(unsigned char on) {
    __atomic_store_n(&record()->_sharing, on, __ATOMIC_RELAXED);
}

void KELResource::set_init_sharing(unsigned char on) { KELResourceImpl::set_init_sharing(on); }

void KELResource::garbage_collect() { KELResourceImplFactory::instance()->garbage_collect(); }
