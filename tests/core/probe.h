// Looks into objects of the library the way binary clients do.
//
//   field_at      the bytes at an offset, as a value
//   native        the POSIX mutex inside a mutex
//   slot_of       the slot of a virtual operation
//   is_held       whether a mutex is held, asked from another thread
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_CORE_PROBE_H
#define KEL_TESTS_CORE_PROBE_H

#include <kel/core/mutex.h>
#include <kel/core/spin_mutex.h>
#include <pthread.h>

#include <cstddef>
#include <cstring>
#include <thread>

namespace kel {
namespace test {

const std::size_t word = sizeof(void*);

template <class T>
T field_at(const void* object, std::size_t offset) {
    T value;
    std::memcpy(&value, static_cast<const unsigned char*>(object) + offset, sizeof value);
    return value;
}

inline pthread_mutex_t* at(void* object, std::size_t offset) {
    return reinterpret_cast<pthread_mutex_t*>(static_cast<unsigned char*>(object) + offset);
}

// Behind the virtual table pointer, and in a recursive mutex behind its attribute object as well, which
// is shorter than a pointer.
inline pthread_mutex_t* native(KELMutex& m) { return at(&m, word); }
inline pthread_mutex_t* native(KELRMutex& m) { return at(&m, 2 * word); }

inline KELSpinMutexImpl* impl_of(KELSpinMutex& m) { return field_at<KELSpinMutexImpl*>(&m, word); }
inline KELRSpinMutexImpl* impl_of(KELRSpinMutex& m) { return field_at<KELRSpinMutexImpl*>(&m, word); }

// A pointer to a virtual member holds one more than the offset of its slot; of any other member an
// even address.
template <class Member>
long slot_of(Member member) {
    std::ptrdiff_t offset = 0;
    static_assert(sizeof member >= sizeof offset, "a pointer to a member function");
    std::memcpy(&offset, &member, sizeof offset);
    return offset % 2 == 0 ? -1 : (offset - 1) / static_cast<long>(word);
}

template <class Mutex>
bool is_held(Mutex& m) {
    bool held = false;
    std::thread asker([&] {
        held = pthread_mutex_trylock(native(m)) != 0;
        if (!held) pthread_mutex_unlock(native(m));
    });
    asker.join();
    return held;
}

}  // namespace test
}  // namespace kel

#endif
