// SPDX-License-Identifier: MIT
#include <kel/core/internal/failure.h>
#include <kel/exceptions/raise.h>

#include <cerrno>
#include <cstdio>

// <assert.h> hides it from release builds, which report failed assertions here all the same.
extern "C" void __assert_fail(const char* expression, const char* file, unsigned line,
                              const char* function) noexcept __attribute__((__noreturn__));

namespace kel {
namespace internal {

// Deliberate: the minor code is errno, not the code that the call returned. The thread calls do not
// set errno, so it may be 0 or left over from an earlier call, but peers compare these minor codes.
// Pinned by Failure.MinorCodeIsErrnoAndNotTheReturnedCode.
void create_failed(const char* call) {
    const int error = errno;
    std::perror(call);
    raise_no_resources(static_cast<std::uint32_t>(error));
}

void use_failed(const char* call, const char* expression, unsigned line, const char* function) {
    std::perror(call);
    assertion_failed(expression, "vthread", line, function);
}

void assertion_failed(const char* expression, const char* file, unsigned line, const char* function) {
    __assert_fail(expression, file, line, function);
}

}  // namespace internal
}  // namespace kel
