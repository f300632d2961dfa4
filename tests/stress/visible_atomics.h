// Shows valgrind's drd which accesses are atomic. It sees machine code only, where on x86 an atomic load
// or store is a plain move, like one that nobody protects.
//
//     g++ -include tests/stress/visible_atomics.h ...    # library and tests, in scripts/gates/race.sh
//
// With this in front of a source, each atomic access becomes a locked instruction, which drd takes for
// atomic, and what is published by a release and found by an acquire is announced as such. What is not
// atomic stays what it is. First uses of function-local objects are ordered by the compiler in a way that
// cannot be shown: first_use.cpp does them while there is one thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_STRESS_VISIBLE_ATOMICS_H
#define KEL_TESTS_STRESS_VISIBLE_ATOMICS_H

#include <valgrind/drd.h>

#include <cstdint>

namespace kel {
namespace visible {

// What stands for `object` in announcements: no address at which a mutex or condition may lie later, as
// drd does not forget objects on a stack.
inline void* announced(const volatile void* object) {
    return reinterpret_cast<void*>(reinterpret_cast<std::uintptr_t>(object) | 1);
}

inline void before(const volatile void* object, int order) {
    if (order != __ATOMIC_RELAXED && order != __ATOMIC_ACQUIRE) ANNOTATE_HAPPENS_BEFORE(announced(object));
}

inline void after(const volatile void* object, int order) {
    if (order != __ATOMIC_RELAXED && order != __ATOMIC_RELEASE) ANNOTATE_HAPPENS_AFTER(announced(object));
}

// Exchanges a value for itself: whether that succeeds or not, `*found` is the value there.
template <class T>
void load(const volatile T* object, T* found, int order) {
    T* const writable = const_cast<T*>(object);
    T same = T();
    *found = same;
    while (!__atomic_compare_exchange(writable, found, &same, false, __ATOMIC_SEQ_CST, __ATOMIC_SEQ_CST)) {
        same = *found;
    }
    after(object, order);
}

template <class T>
T load_n(const volatile T* object, int order) {
    T found;
    load(object, &found, order);
    return found;
}

template <class T, class Value>
void store(volatile T* object, Value* value, int order) {
    before(object, order);
    T written = *value, replaced;
    __atomic_exchange(const_cast<T*>(object), &written, &replaced, __ATOMIC_SEQ_CST);
}

template <class T, class Value>
void store_n(volatile T* object, Value value, int order) {
    T written = static_cast<T>(value);
    store(object, &written, order);
}

template <class T, class Value>
bool compare_exchange_n(volatile T* object, T* expected, Value value, bool, int order, int failure_order) {
    T written = static_cast<T>(value);
    before(object, order);
    const bool done = __atomic_compare_exchange(const_cast<T*>(object), expected, &written, false,
                                                __ATOMIC_SEQ_CST, __ATOMIC_SEQ_CST);
    after(object, done ? order : failure_order);
    return done;
}

}  // namespace visible
}  // namespace kel

#define __atomic_load(object, found, order) ::kel::visible::load(object, found, order)
#define __atomic_load_n(object, order) ::kel::visible::load_n(object, order)
#define __atomic_store(object, value, order) ::kel::visible::store(object, value, order)
#define __atomic_store_n(object, value, order) ::kel::visible::store_n(object, value, order)
#define __atomic_compare_exchange_n(object, expected, value, weak, order, failure_order) \
    ::kel::visible::compare_exchange_n(object, expected, value, weak, order, failure_order)

#endif
