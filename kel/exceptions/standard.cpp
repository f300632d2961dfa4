// SPDX-License-Identifier: MIT
#include <kel/exceptions/internal/downcast.h>
#include <kel/exceptions/internal/raise_copy.h>
#include <kel/exceptions/standard.h>

#include <iostream>

// ---- objects built when the library is loaded, in this order ----

static std::ios_base::Init standard_streams;

// The base is constructed later, by another unit; a description needs no more of it than its address.
#define KEL_STANDARD_EXCEPTION(X)                                                                      \
    CORBA_Exception::Description CORBA_##X::_description("CORBA::" #X, "IDL:omg.org/CORBA/" #X ":1.0", \
                                                         CORBA_##X::_factory,                          \
                                                         &CORBA_SystemException::_description, nullptr);
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION

// ---- the classes ----

// `_downcast` and `_deep_copy` hand out a KELStdException as the concrete class, which works as long
// as the concrete class adds no field.
#define KEL_STANDARD_EXCEPTION(X)                                                                         \
    static_assert(sizeof(CORBA_##X) == sizeof(KELStdException), "a standard exception adds no field");    \
    CORBA_##X::CORBA_##X() : KELStdException(_description, _factory) {}                                   \
    CORBA_##X::CORBA_##X(unsigned long minor, CORBA::CompletionStatus completed)                          \
        : KELStdException(minor, completed, _description, _factory) {}                                    \
    CORBA_##X::CORBA_##X(unsigned long minor, CORBA::CompletionStatus completed, const char* reason)      \
        : KELStdException(minor, completed, reason, _description, _factory) {}                            \
    void CORBA_##X::_raise() const { kel::internal::raise_copy(*this); }                                  \
    CORBA_Exception* CORBA_##X::_factory() { return new CORBA_##X; }                                      \
    CORBA_##X* CORBA_##X::_downcast(CORBA_Exception* e) { return kel::internal::downcast<CORBA_##X>(e); } \
    const CORBA_##X* CORBA_##X::_downcast(const CORBA_Exception* e) {                                     \
        return kel::internal::downcast<const CORBA_##X>(e);                                               \
    }                                                                                                     \
    CORBA_Exception::Description* CORBA_##X::_typeCode(const CORBA_TypeCode* tc) {                        \
        _description.type_code(tc);                                                                       \
        return &_description;                                                                             \
    }
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
