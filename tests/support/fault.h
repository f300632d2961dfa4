// Makes the system fail, or answers in its place.
//
//   Seam<R(A...)>       one interposed C-library or thread call: counts, fails, or asks a script
//   seams::socket, ...  the seams themselves, one per line of seams.inc
//   Armed               while one lives, this thread's calls are counted and judged
//   ArmedEverywhere     the same for every thread of the process
//   Disarmed            a pause inside an armed scope
//   CallTrace           while one lives, armed calls are listed in their order
//   all_seams           every seam there is
//   AllocationPlan      the same for operator new
//
//     seams::listen.fail(1, EACCES);                       // the first armed call fails
//     seams::connect.script([&](int fd, const sockaddr*, socklen_t) { ...; return 0; });
//     { Armed armed; EXPECT_THROW(open_listener(), CORBA_COMM_FAILURE); }
//     EXPECT_EQ(seams::listen.calls(), 1);
//     reset_faults();                                      // or derive the fixture from FaultTest
//
// The symbols are defined in the test executable, so the library is tested as it ships. Plans and
// scripts are set while nothing is armed; counting is safe from any thread.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_FAULT_H
#define KEL_TESTS_SUPPORT_FAULT_H

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <functional>
#include <type_traits>
#include <utility>
#include <vector>

namespace kel {
namespace test {

// Interposed symbols are called before the thread sanitizer has set itself up, so their code is not
// instrumented and uses the atomic builtins: std::atomic's members would be instrumented.
#define KEL_TEST_BEFORE_SANITIZER __attribute__((no_sanitize("thread")))

// How a call of the family tells its caller that it failed.
enum class Failing {
    minus_one_and_errno,  // returns -1 (null for a pointer) and sets errno
    returned_code,        // returns the error; errno stays as the test preset it
    zero_and_errno,       // returns 0 and sets errno
};

KEL_TEST_BEFORE_SANITIZER bool armed();

class Armed {
public:
    Armed();
    ~Armed();
    Armed(const Armed&) = delete;
    Armed& operator=(const Armed&) = delete;
};

class ArmedEverywhere {
public:
    ArmedEverywhere();
    ~ArmedEverywhere();
    ArmedEverywhere(const ArmedEverywhere&) = delete;
    ArmedEverywhere& operator=(const ArmedEverywhere&) = delete;
};

class Disarmed {
public:
    Disarmed();
    ~Disarmed();
    Disarmed(const Disarmed&) = delete;
    Disarmed& operator=(const Disarmed&) = delete;
};

// Forgets every plan, script and count, the allocation plan included.
void reset_faults();

class SeamBase {
public:
    constexpr SeamBase(const char* name, Failing how) : _name(name), _how(how) {}

    const char* name() const { return _name; }

    // Armed calls since the last reset.
    long calls() const { return __atomic_load_n(&_calls, __ATOMIC_RELAXED); }

    // The `nth` armed call (the first is 1) fails with `error`; with `from_then_on` all later ones too.
    void fail(long nth, int error, bool from_then_on = false) {
        _nth = nth;
        _error = error;
        _persistent = from_then_on;
    }

    // The `nth` armed call fails as well, with an error of its own.
    void fail_too(long nth, int error) {
        _second_nth = nth;
        _second_error = error;
    }

    void forget_calls() { _calls = 0; }

    // What a failing call that returns its error leaves in errno; without this errno stays as it is.
    void leave_errno(int value) { _left_errno = value; }

    // A failing call does its work all the same, as close() does.
    void fail_after_the_work() { _works = true; }

protected:
    KEL_TEST_BEFORE_SANITIZER bool fails_at(long n) const {
        return n == _second_nth || (_nth != 0 && (n == _nth || (_persistent && n > _nth)));
    }
    int error_of(long n) const { return n == _second_nth ? _second_error : _error; }
    void forget() {
        _calls = 0;
        _nth = 0;
        _persistent = false;
        _second_nth = 0;
        _left_errno = -1;
        _works = false;
    }

    const char* _name;
    Failing _how;
    long _calls = 0;
    long _nth = 0;
    int _error = 0;
    bool _persistent = false;
    long _second_nth = 0;
    int _second_error = 0;
    int _left_errno = -1;
    bool _works = false;
};

// In the order of seams.inc.
const std::vector<SeamBase*>& all_seams();

// Looks the system's calls up now, for callers that must not do it later: looking up allocates.
void find_real_calls();

// The armed calls of all threads while one lives, in their order. One lives at a time.
class CallTrace {
public:
    struct Call {
        SeamBase* seam;
        long nth;
    };

    CallTrace();
    ~CallTrace();
    CallTrace(const CallTrace&) = delete;
    CallTrace& operator=(const CallTrace&) = delete;

    // Forgets the calls so far, and the counts of all seams and of the allocation plan: what follows is
    // counted from 1.
    void restart();

    // No more calls are listed.
    void stop();

    std::vector<Call> calls() const;
};

KEL_TEST_BEFORE_SANITIZER void trace_call(SeamBase& seam, long nth);

template <class Signature>
class Seam;

template <class R, class... A>
class Seam<R(A...)> : public SeamBase {
public:
    constexpr Seam(const char* name, Failing how) : SeamBase(name, how) {}

    // Armed calls are answered by `answer`; it may call real(). Calls made inside it are not judged.
    void script(std::function<R(A...)> answer) {
        delete _script;
        _script = new std::function<R(A...)>(std::move(answer));
    }

    // A failing call is answered by `tell`, which gets the error first: for calls that tell a failure
    // by more than their result and errno.
    void tell_failure(std::function<R(int, A...)> tell) {
        delete _tell;
        _tell = new std::function<R(int, A...)>(std::move(tell));
    }

    // The system's own call.
    KEL_TEST_BEFORE_SANITIZER R real(A... a) { return reinterpret_cast<R (*)(A...)>(find_real())(a...); }

    KEL_TEST_BEFORE_SANITIZER void* find_real() {
        void* found = __atomic_load_n(&_real, __ATOMIC_RELAXED);
        if (found == nullptr) {
            found = dlsym(RTLD_NEXT, _name);
            __atomic_store_n(&_real, found, __ATOMIC_RELAXED);
        }
        return found;
    }

    // What the interposed symbol does.
    KEL_TEST_BEFORE_SANITIZER R call(A... a) {
        if (!armed()) return real(a...);
        const long n = __atomic_add_fetch(&_calls, 1, __ATOMIC_RELAXED);
        trace_call(*this, n);
        return fails_at(n) ? failure(error_of(n), a...) : answer(a...);
    }

    void reset() {
        forget();
        delete _script;
        _script = nullptr;
        delete _tell;
        _tell = nullptr;
    }

private:
    KEL_TEST_BEFORE_SANITIZER R answer(A... a) {
        if (_script == nullptr) return real(a...);
        Disarmed pause;
        return (*_script)(a...);
    }

    KEL_TEST_BEFORE_SANITIZER R failure(int error, A... a) {
        if (_works) answer(a...);
        if (_how == Failing::returned_code && _left_errno >= 0) errno = _left_errno;
        if (_tell != nullptr) {
            Disarmed pause;
            return (*_tell)(error, a...);
        }
        if constexpr (std::is_void_v<R>) {
            return;
        } else {
            if (_how != Failing::returned_code) errno = error;
            return failing_result(error);
        }
    }

    KEL_TEST_BEFORE_SANITIZER R failing_result([[maybe_unused]] int error) {
        if constexpr (std::is_pointer_v<R>) {
            return nullptr;
        } else {
            if (_how == Failing::returned_code) return static_cast<R>(error);
            return static_cast<R>(_how == Failing::zero_and_errno ? 0 : -1);
        }
    }

    std::function<R(A...)>* _script = nullptr;
    std::function<R(int, A...)>* _tell = nullptr;
    void* _real = nullptr;
};

// operator new, in all its forms, fails by this plan while the thread is armed.
struct AllocationPlan {
    static void fail(long nth, bool from_then_on = false);
    static long calls();        // armed calls since the last reset
    static long live_blocks();  // blocks of operator new that are in use in the whole process

    // What a new block holds, as far as its first 4 KiB: nothing that one could mistake for cleared memory.
    static constexpr unsigned char fresh_byte = 0xa5;
};

// A fixture that starts and ends with no plan.
class FaultTest : public ::testing::Test {
protected:
    void SetUp() override { reset_faults(); }
    void TearDown() override { reset_faults(); }
};

}  // namespace test
}  // namespace kel

#include "tests/support/seams.h"

#endif
