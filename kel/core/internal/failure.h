// How a wrapper reports a thread call that failed.
//
// Creating reports by an exception, using ends the process:
//
//     const int rc = pthread_cond_init(&_condition, nullptr);
//     if (rc != 0) create_failed("pthread_cond_init");
//
//     const int rc = pthread_cond_signal(&_condition);
//     if (rc != 0) use_failed("pthread_cond_signal", "(rc == 0)", __LINE__, "void KELCondition::signal()");
//
// Call them straight after the failed call, while errno is still its own. None of them returns.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CORE_INTERNAL_FAILURE_H
#define KEL_CORE_INTERNAL_FAILURE_H

#include <kel/config.h>

namespace kel {
namespace internal {

// Prints `call` with perror and throws CORBA::NO_RESOURCES with errno as minor code, COMPLETED_NO.
[[noreturn]] KEL_LOCAL void create_failed(const char* call);

// Prints `call` with perror and fails the assertion `expression` of `function` in file "vthread".
[[noreturn]] KEL_LOCAL void use_failed(const char* call, const char* expression, unsigned line,
                                       const char* function);

// Fails an assertion the way assert() does, but in release builds too.
[[noreturn]] KEL_LOCAL void assertion_failed(const char* expression, const char* file, unsigned line,
                                             const char* function);

}  // namespace internal
}  // namespace kel

#endif
