// The one implementation of the classes' `_downcast`.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_INTERNAL_DOWNCAST_H
#define KEL_EXCEPTIONS_INTERNAL_DOWNCAST_H

#include <kel/exceptions/exception.h>

namespace kel {
namespace internal {

// `e` as `X` when its description says so, null otherwise; `X` may be const. The description
// decides, not the run-time type: a KELStdException that was raised as such describes itself as
// the concrete class. Concrete classes add no field, so that the result is usable, but a check of
// the virtual table would object.
template <class X, class E>
__attribute__((no_sanitize("vptr"))) X* downcast(E* e) {
    if (e == nullptr || !e->_desc()->can_cast(X::_description)) return nullptr;
    return static_cast<X*>(e);
}

}  // namespace internal
}  // namespace kel

#endif
