// What every header of the library starts from: the export macro, lock annotations and the
// assumptions about the platform, stated in one place.
//
//   KEL_API                marks a class or function as part of the library's interface
//   KEL_LOCAL              keeps a name out of the interface
//   KEL_INLINE             a short operation that callers have in line and the library has as well
//   KEL_GUARDED_BY, ...    thread-safety annotations; they mean something to clang only
//
// SPDX-License-Identifier: MIT
#ifndef KEL_CONFIG_H
#define KEL_CONFIG_H

#include <sys/time.h>

#include <cstddef>
#include <cstdint>

#if !defined(__linux__) || !(defined(__i386__) || defined(__x86_64__))
#error "KEL supports Linux on x86 and x86-64"
#endif

#define KEL_API __attribute__((visibility("default")))
#define KEL_LOCAL __attribute__((visibility("hidden")))

// An operation whose call costs as much as its work. The header's definition is there to be inlined and
// is never emitted; where it is not inlined, and for programs linked before it was, the library has the
// function under its old symbol. The unit that owns it defines the macro KEL_INLINE_<HEADER> as empty
// before the header, which makes the same lines its own definitions.
#define KEL_INLINE inline __attribute__((gnu_inline))

// Stand around such definitions: clang would remark that they are not "extern", as no member can be.
#if defined(__clang__)
#define KEL_INLINE_BEGIN \
    _Pragma("clang diagnostic push") _Pragma("clang diagnostic ignored \"-Wgnu-inline-cpp-without-extern\"")
#define KEL_INLINE_END _Pragma("clang diagnostic pop")
#else
#define KEL_INLINE_BEGIN
#define KEL_INLINE_END
#endif

#if defined(__clang__)
// An attribute of clang's analysis of locks; nothing to other compilers.
#define KEL_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define KEL_THREAD_ANNOTATION(x)
#endif

// A class that is a lock.
#define KEL_CAPABILITY(x) KEL_THREAD_ANNOTATION(capability(x))
// A class that holds a lock for a scope.
#define KEL_SCOPED_CAPABILITY KEL_THREAD_ANNOTATION(scoped_lockable)
// A field, and what a pointer points to, that only the holder of the lock may touch.
#define KEL_GUARDED_BY(x) KEL_THREAD_ANNOTATION(guarded_by(x))
#define KEL_PT_GUARDED_BY(x) KEL_THREAD_ANNOTATION(pt_guarded_by(x))
// A function whose caller holds the lock, takes it, gives it back, does not hold it.
#define KEL_REQUIRES(...) KEL_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))
#define KEL_ACQUIRE(...) KEL_THREAD_ANNOTATION(acquire_capability(__VA_ARGS__))
#define KEL_RELEASE(...) KEL_THREAD_ANNOTATION(release_capability(__VA_ARGS__))
#define KEL_EXCLUDES(...) KEL_THREAD_ANNOTATION(locks_excluded(__VA_ARGS__))
// A function whose use of locks the analysis cannot follow.
#define KEL_NO_THREAD_SAFETY_ANALYSIS KEL_THREAD_ANNOTATION(no_thread_safety_analysis)

// Object layouts, slot order and the numbers on the wire rest on these.
static_assert(sizeof(short) == 2 && sizeof(int) == 4 && sizeof(long long) == 8, "integer widths");
static_assert(sizeof(float) == 4 && sizeof(double) == 8, "floating-point widths");
static_assert(sizeof(wchar_t) == 4, "wide characters are four bytes");
static_assert(sizeof(long) == sizeof(void*), "long is as wide as a pointer");
#if defined(__i386__)
static_assert(sizeof(timeval) == 8, "timeval has 32-bit fields on x86: do not define _TIME_BITS=64");
#endif

#endif
