// How `_raise` throws a copy of its object.
//
//     void CORBA_X::_raise() const { raise_copy(*this); }
//
// `throw *this` makes its copy where it throws. Since copying may fail, that frame then has a clean-up, and
// unwinding asks it twice about an exception that it has nothing to do with, which is a tenth of the way from
// _raise() to the handler. Here the copy is made by a function of its own, which is gone by then.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_INTERNAL_RAISE_COPY_H
#define KEL_EXCEPTIONS_INTERNAL_RAISE_COPY_H

#include <cxxabi.h>

#include <new>
#include <typeinfo>

namespace kel {
namespace internal {

// A copy of `e` in the memory of exceptions, which __cxa_throw takes over.
template <class X>
__attribute__((noinline)) void* thrown_copy(const X& e) {
    void* const room = abi::__cxa_allocate_exception(sizeof(X));
    try {
        return new (room) X(e);
    } catch (...) {
        abi::__cxa_free_exception(room);
        throw;
    }
}

template <class X>
void destroy_thrown(void* e) {
    static_cast<X*>(e)->~X();
}

template <class X>
[[noreturn]] void raise_copy(const X& e) {
    void* const copy = thrown_copy(e);
    abi::__cxa_throw(copy, const_cast<std::type_info*>(&typeid(X)), &destroy_thrown<X>);
}

}  // namespace internal
}  // namespace kel

#endif
