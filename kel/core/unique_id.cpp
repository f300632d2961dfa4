// SPDX-License-Identifier: MIT
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

int compare(const KELUniqueId& a, const KELUniqueId& b) {
    return a.value() < b.value() ? -1 : a.value() > b.value();
}

unsigned long _kel_hash(const KELUniqueId& id) { return id.value(); }
