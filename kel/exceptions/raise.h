// Throws system exceptions from code that must not see their classes.
//
// Templates and the low layers throw through these functions; only their one source knows the
// exception classes. That breaks the circle in which every layer throws and exceptions use
// every layer. A minor code is given as its 32-bit value and passes the minor-code rule.
//
//     if (rc != 0) kel::internal::raise_no_resources(errno);   // does not return
//
// Any thread. None of them returns.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_RAISE_H
#define KEL_EXCEPTIONS_RAISE_H

#include <kel/config.h>

namespace kel {
namespace internal {

[[noreturn]] KEL_API void raise_bad_param();                               // BAD_PARAM()
[[noreturn]] KEL_API void raise_object_not_exist();                        // OBJECT_NOT_EXIST()
[[noreturn]] KEL_API void raise_marshal();                                 // MARSHAL()
[[noreturn]] KEL_API void raise_timeout();                                 // TIMEOUT()
[[noreturn]] KEL_API void raise_no_resources(std::uint32_t minor);         // COMPLETED_NO
[[noreturn]] KEL_API void raise_bad_inv_order_maybe(std::uint32_t minor);  // COMPLETED_MAYBE

}  // namespace internal
}  // namespace kel

#endif
