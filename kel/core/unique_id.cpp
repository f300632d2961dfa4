// SPDX-License-Identifier: MIT

// The operations that callers have in line are defined here.
#define KEL_INLINE_UNIQUE_ID

#include <kel/core/mutex.h>
#include <kel/core/unique_id.h>

#include <iostream>
#include <new>

// Built at load.
static std::ios_base::Init standard_streams;

std::uint32_t KELUniqueId::_globalId = 0;

// The lock stands in static storage and is never destroyed: detached threads go on drawing ids while
// the process exits.
KELUniqueId::KELUniqueId() {
    alignas(KELMutex) static unsigned char storage[sizeof(KELMutex)];
    static KELMutex* const lock = new (storage) KELMutex;
    KELMutex_var hold(*lock, 1);
    _value = _globalId++;
}
