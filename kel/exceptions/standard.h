// The 36 standard system exceptions.
//
//   CORBA_X, CORBA::X   one class for every X listed in standard.inc: CORBA_UNKNOWN,
//                       CORBA_BAD_PARAM, ... CORBA_CODESET_INCOMPATIBLE
//
// All of them look the same:
//
//     CORBA_X()                                                minor code 0, COMPLETED_NO
//     CORBA_X(unsigned long minor, CORBA::CompletionStatus)
//     CORBA_X(unsigned long minor, CORBA::CompletionStatus, const char* reason)
//     _raise()       throws a copy typed CORBA_X
//     _factory()     a default instance on the heap, for CORBA::release
//     _downcast(e)   `e` as CORBA_X, or null when it is of another class or null
//     _typeCode(tc)  stores the ORB's type code in the class's description and returns that
//     _description   "CORBA::X", "IDL:omg.org/CORBA/X:1.0"
//
//     throw CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "the name is empty");
//
// `_typeCode` changes what all threads see and belongs to start-up. The rest may be called by any
// thread; an exception object belongs to one thread at a time.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_STANDARD_H
#define KEL_EXCEPTIONS_STANDARD_H

#include <kel/config.h>
#include <kel/exceptions/system_exception.h>

#define KEL_STANDARD_EXCEPTION(X)                                                              \
    class KEL_API CORBA_##X : public KELStdException {                                         \
    public:                                                                                    \
        CORBA_##X();                                                                           \
        CORBA_##X(unsigned long minor, CORBA::CompletionStatus completed);                     \
        CORBA_##X(unsigned long minor, CORBA::CompletionStatus completed, const char* reason); \
        void _raise() const override;                                                          \
        static CORBA_Exception* _factory();                                                    \
        static CORBA_##X* _downcast(CORBA_Exception* e);                                       \
        static const CORBA_##X* _downcast(const CORBA_Exception* e);                           \
        static CORBA_##X* _downcast(std::nullptr_t) { return nullptr; }                        \
        static CORBA_Exception::Description* _typeCode(const CORBA_TypeCode* tc);              \
        static CORBA_Exception::Description _description;                                      \
    };                                                                                         \
    namespace CORBA {                                                                          \
    typedef ::CORBA_##X X;                                                                     \
    }
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION

#endif
