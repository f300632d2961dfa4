// SPDX-License-Identifier: MIT
#include <kel/services/environment.h>

#include <ios>

// What the library builds when it is loaded. _key_id is plain data and needs no initialiser; _mtx
// outlives exit, because threads that still run may ask for their environment.
static std::ios_base::Init standard_streams;
KELMutex CurrentEnvironment::_mtx;
unsigned long CurrentEnvironment::_key_id = 0;

CORBA_Environment::CORBA_Environment() = default;

CORBA_Environment::~CORBA_Environment() = default;

void CORBA_Environment::exception(CORBA_Exception* e) { _exception = e; }

CORBA_Exception* CORBA_Environment::exception() const { return _exception.in(); }

void CORBA_Environment::clear() { exception(nullptr); }

CORBA_Environment* CORBA_Environment::current_environment() {
    return CurrentEnvironment::instance()->environment();
}

CurrentEnvironment::CurrentEnvironment() : KELThreadLocal(key_id()) {}

CurrentEnvironment::~CurrentEnvironment() = default;

unsigned long CurrentEnvironment::key_id() {
    const unsigned long drawn = __atomic_load_n(&_key_id, __ATOMIC_ACQUIRE);
    if (drawn != 0) return drawn;
    KELMutex_var hold(_mtx, 1);
    if (_key_id == 0) {
        KELRMutex_var hold_counter(KELThreadLocal::_mutex, 1);
        __atomic_store_n(&_key_id, static_cast<unsigned long>(KELThreadLocal::_cnt++), __ATOMIC_RELEASE);
    }
    return _key_id;
}

CurrentEnvironment* CurrentEnvironment::instance() {
    KELThreadLocal* const existing = KELThreadLocal::instance(key_id());
    if (existing != nullptr) return static_cast<CurrentEnvironment*>(existing);
    return new CurrentEnvironment;
}

CORBA_Environment* CurrentEnvironment::environment() { return &_environment; }

CORBA_Environment* CORBA::current_environment() { return CORBA_Environment::current_environment(); }

unsigned char CORBA::is_nil(CORBA_Environment* e) { return e == nullptr; }

void CORBA::release(CORBA_Environment* e) { delete e; }
