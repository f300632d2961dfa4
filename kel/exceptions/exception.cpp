// SPDX-License-Identifier: MIT
#include <kel/containers/dictionary.h>
#include <kel/containers/strings.h>
#include <kel/exceptions/exception.h>
#include <kel/exceptions/internal/downcast.h>
#include <kel/exceptions/internal/repository_id.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/internal/console.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <cstdlib>
#include <iostream>

namespace {

typedef KELDictionary<KELStringWrapper, CORBA_Exception::Description*> Registry;

// Static data, and needed by initialisers that run before this unit's: no initialiser of its own.
// The registry is never destroyed, because descriptions of other libraries outlive this unit.
Registry* _excepDict = nullptr;
int env_checked = 0;
int debug_flag = 0;

// Tracing is decided once, by the first description of the process. Only the presence of the
// variable counts, not its value.
bool tracing() {
    if (env_checked == 0) {
        env_checked = 1;
        if (std::getenv("DEBUG_STATIC") != nullptr) debug_flag = 1;
    }
    return debug_flag != 0;
}

void trace_class(const char* name, const CORBA_Exception::Description* description) {
    std::cout << (name != nullptr ? name : "(null)") << ", " << static_cast<const void*>(description)
              << std::endl;
}

}  // namespace

// ---- objects built when the library is loaded, in this order ----

static std::ios_base::Init standard_streams;

CORBA_Exception::Description CORBA_Exception::_description("CORBA::Exception",
                                                           "IDL:omg.org/CORBA/Exception:1.0", nullptr,
                                                           nullptr, nullptr);

CORBA_Exception::Description CORBA_SystemException::_description("CORBA::SystemException",
                                                                 "IDL:omg.org/CORBA/SystemException:1.0",
                                                                 nullptr, &CORBA_Exception::_description,
                                                                 nullptr);

CORBA_Exception::Description CORBA_UserException::_description("CORBA::UserException",
                                                               "IDL:omg.org/CORBA/UserException:1.0", nullptr,
                                                               &CORBA_Exception::_description, nullptr);

CORBA_Exception::Description KELRemarshal::_description("KELRemarshal", KEL_REPOSITORY_ID("KELRemarshal"),
                                                        KELRemarshal::_factory,
                                                        &CORBA_UserException::_description, nullptr);

// ---- descriptions and their registry ----

// Deliberate: not constexpr, and defined out of every other unit's sight. The standard exceptions
// are described before their base, and what the trace reads from that base must still be zero.
// Pinned by Trace.StandardExceptionsAreDescribedBeforeTheirBaseHasAName.
CORBA_Exception::Description::Description(const char* name, const char* repository_id, Factory create,
                                          const Description* base, const CORBA_TypeCode* type_code)
    : _name(name), _repository_id(repository_id), _factory(create), _base(base), _type_code(type_code) {
    if (tracing()) trace();
    enter();
}

CORBA_Exception::Description::~Description() {
    _excepDict->removeKeyIfExists(KELStringWrapper(_repository_id));
}

// The name of a description that may not be constructed yet: it then reads as the zero of static
// storage. The call keeps the compiler from assuming anything about the object, and the sanitizers
// from reporting the order of initialisers, which is as it should be.
__attribute__((noinline, no_sanitize("address"), no_sanitize("vptr"))) const char*
CORBA_Exception::Description::printable_name(const Description& description) {
    return description._name;
}

void CORBA_Exception::Description::trace() const {
    std::cout << "Statically initializing class: ";
    trace_class(_name, this);
    std::cout << "The class has the following base:" << std::endl;
    if (_base != nullptr) {
        trace_class(printable_name(*_base), _base);
    } else {
        std::cout << "(null)" << std::endl;
    }
    std::cout << std::endl;
}

void CORBA_Exception::Description::enter() {
    if (_excepDict == nullptr) _excepDict = new Registry(16);
    _excepDict->addIfNotExist(KELStringWrapper(_repository_id), this);
}

const CORBA_Exception::Description* CORBA_Exception::Description::desc(const char* repository_id) {
    Description* found = nullptr;
    if (_excepDict != nullptr) _excepDict->atKey(KELStringWrapper(repository_id), found);
    return found;
}

bool CORBA_Exception::Description::can_cast(const Description& target) const {
    if (this == &target) return true;
    return _base != nullptr && _base->can_cast(target);
}

// ---- the root ----

CORBA_Exception::~CORBA_Exception() = default;

const CORBA_Exception::Description* CORBA_Exception::_desc() const { return &_description; }
const char* CORBA_Exception::_name() const { return _desc()->name(); }
const char* CORBA_Exception::_repository_id() const { return _desc()->repository_id(); }

void CORBA_Exception::_write(KELostream&) const {}
void CORBA_Exception::_copy(KEListream&) {}

void CORBA_Exception::_pretty_print(KELostream& out) const {
    out << "Exception: " << _name();
    endl(out);
}

// ---- ownership ----

CORBA_Exception_var::~CORBA_Exception_var() { delete _exception; }

CORBA_Exception_var& CORBA_Exception_var::operator=(CORBA_Exception* e) {
    if (e != _exception) delete _exception;
    _exception = e;
    return *this;
}

CORBA_Exception*& CORBA_Exception_var::out() {
    *this = nullptr;
    return _exception;
}

CORBA_Exception* CORBA_Exception_var::_retn() {
    CORBA_Exception* e = _exception;
    _exception = nullptr;
    return e;
}

void CORBA::release(CORBA_Exception* e) { delete e; }

// ---- user exceptions ----

const CORBA_Exception::Description* CORBA_UserException::_desc() const { return &_description; }

CORBA_UserException* CORBA_UserException::_downcast(CORBA_Exception* e) {
    return kel::internal::downcast<CORBA_UserException>(e);
}

const CORBA_UserException* CORBA_UserException::_downcast(const CORBA_Exception* e) {
    return kel::internal::downcast<const CORBA_UserException>(e);
}

const CORBA_Exception::Description* KELRemarshal::_desc() const { return &_description; }
void KELRemarshal::_raise() const { throw *this; }
CORBA_Exception* KELRemarshal::_deep_copy() { return new KELRemarshal(*this); }
CORBA_Exception* KELRemarshal::_factory() { return new KELRemarshal; }

KELRemarshal* KELRemarshal::_downcast(CORBA_Exception* e) { return kel::internal::downcast<KELRemarshal>(e); }

const KELRemarshal* KELRemarshal::_downcast(const CORBA_Exception* e) {
    return kel::internal::downcast<const KELRemarshal>(e);
}

// ---- on streams ----

KELostream& operator<<(KELostream& out, const CORBA_Exception& e) {
    out << e._repository_id();
    e._write(out);
    return out;
}

KEListream& operator>>(KEListream& in, CORBA_Exception*& e) {
    e = nullptr;
    if (_excepDict == nullptr) throw CORBA_BAD_INV_ORDER(4, CORBA::COMPLETED_MAYBE);

    CORBA_String_var id(static_cast<char*>(nullptr));  // in line, which the empty string is not
    in >> id;
    CORBA_Exception::Description* found = nullptr;
    _excepDict->atKey(KELStringWrapper(id.in()), found);

    // An abstract class has no factory, and a peer may name one: nobody here knows its body.
    if (found == nullptr || found->factory() == nullptr) {
        e = new CORBA_UNKNOWN;
        return in;
    }
    e = found->factory()();
    e->_copy(in);
    return in;
}

std::ostream& operator<<(std::ostream& os, const CORBA_Exception& e) {
    KELostream out(os);
    if (kel::internal::is_console(&os)) {
        e._pretty_print(out);
    } else {
        e._write(out);
    }
    return os;
}
