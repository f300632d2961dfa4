// The words for a completion status.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_EXCEPTIONS_INTERNAL_STATUS_H
#define KEL_EXCEPTIONS_INTERNAL_STATUS_H

#include <kel/exceptions/system_exception.h>

namespace kel {
namespace internal {

// "YES", "NO" or "MAYBE"; "Invalid status" for any other number.
KEL_LOCAL const char* status_text(CORBA::CompletionStatus status);

}  // namespace internal
}  // namespace kel

#endif
