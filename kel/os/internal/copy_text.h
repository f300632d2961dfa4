// A copy of a text, for functions that must not throw.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_INTERNAL_COPY_TEXT_H
#define KEL_OS_INTERNAL_COPY_TEXT_H

#include <kel/containers/strings.h>

#include <new>

namespace kel {
namespace internal {

// A copy of `text`, to be freed with CORBA::string_free; null for null, or when there is no memory.
inline char* copy_text(const char* text) noexcept {
    try {
        return CORBA::string_dup(text);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

}  // namespace internal
}  // namespace kel

#endif
