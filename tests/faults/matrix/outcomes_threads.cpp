// What is stated for the thread calls. Creating throws, using ends the process, destroying and what
// prepares a creation are not looked at.
//
// SPDX-License-Identifier: MIT
#include <cerrno>

#include "tests/faults/matrix/stated.h"

namespace kel {
namespace test {

namespace {

Stated not_created(const char* call) {
    return throws("NO_RESOURCES", "{minor}").prints(std::string(call) + ": {text}\n");
}

std::vector<Row> creation_rows() {
    return {
        {"*", "pthread_mutex_init", {}, any, not_created("pthread_mutex_init")},
        {"*", "pthread_cond_init", {}, any, not_created("pthread_cond_init")},
        {"*", "pthread_create", {}, any, not_created("pthread_create")},
        {"*", "pthread_key_create", {}, any, not_created("pthread_key_create")},
    };
}

// The two ends of a wait's time: the deadline and a signal.
std::vector<Row> timed_wait_rows() {
    const char* const expression = "(rc == 0 || rc == 110 || rc == 4 )";
    const char* const seconds = "unsigned char KELCondition::timedwait(KELMutex&, long unsigned int)";
    const char* const milliseconds =
        "unsigned char KELCondition::timedwait(KELMutex&, long long unsigned int)";
    const std::vector<int> over = {ETIMEDOUT, EINTR};
    return {
        {"TimedWait*", "pthread_cond_timedwait", over, any, gives("1")},
        {"ThrowingWait*", "pthread_cond_timedwait", over, any, throws("TIMEOUT", "0x4f4d0000")},
        {"TimedWaitForSeconds ThrowingWaitForSeconds",
         "pthread_cond_timedwait",
         {},
         any,
         ends("pthread_cond_timedwait", expression, seconds)},
        {"TimedWaitForMilliseconds ThrowingWaitForMilliseconds",
         "pthread_cond_timedwait",
         {},
         any,
         ends("pthread_cond_timedwait", expression, milliseconds)},
    };
}

std::vector<Row> use_rows() {
    const char* const create =
        "static void KELThread::_create_thread(long unsigned int, void*(*)(void*), void*)";
    return {
        {"*", "pthread_mutex_lock", {}, any, ends("pthread_mutex_lock", "(rc == 0)", "void {class}::lock()")},
        {"*", "pthread_mutex_unlock", {}, any, ends("{unlock}", "(rc == 0)", "void {class}::unlock()")},
        {"*",
         "pthread_cond_wait",
         {},
         any,
         ends("pthread_cond_wait", "(rc == 0)", "void KELCondition::wait(KELMutex&)")},
        {"*",
         "pthread_cond_signal",
         {},
         any,
         ends("pthread_cond_signal", "(rc == 0)", "void KELCondition::signal()")},
        {"*",
         "pthread_cond_broadcast",
         {},
         any,
         ends("pthread_cond_broadcast", "(rc == 0)", "void KELCondition::broadcast()")},
        {"*", "pthread_attr_init", {}, any, ends("pthread_attr_init", "(rc == 0)", create)},
        {"*", "pthread_attr_setstacksize", {}, any, ends("pthread_attr_setstacksize", "(rc == 0)", create)},
        {"*",
         "pthread_attr_setdetachstate",
         {},
         any,
         ends("pthread_attr_setdetachstate", "(rc == 0)", create)},
        {"*",
         "pthread_attr_setinheritsched",
         {},
         any,
         ends("pthread_attr_setinheritsched", "(rc ==0)", create)},
    };
}

// Standard output takes nothing more after a flush that failed, as for any program.
std::vector<Row> lost_output_rows() {
    const std::string heading =
        "KELThread::_start: unhandled exception in thread\nException: CORBA::BAD_PARAM\n";
    const std::string minor = heading + "\tMinor: 1330446336 \n";
    const std::string status = minor + "\tCompletion Status: NO\n";
    return {
        {"ThreadThatThrows", "fflush", {}, nth(1), ignored().shows(heading)},
        {"ThreadThatThrows", "fflush", {}, nth(2), ignored().shows(minor)},
        {"ThreadThatThrows", "fflush", {}, nth(3), ignored().shows(status)},
        {"ThreadThatThrows", "fflush", {}, nth(4), ignored()},
    };
}

std::vector<Row> ignored_rows() {
    return {
        {"*",
         "pthread_mutex_destroy pthread_mutexattr_init pthread_mutexattr_settype pthread_mutexattr_destroy "
         "pthread_cond_destroy pthread_attr_destroy pthread_setspecific",
         {},
         any,
         ignored()},
    };
}

}  // namespace

std::vector<Row> thread_rows() {
    std::vector<Row> all;
    for (const auto& part :
         {creation_rows(), timed_wait_rows(), use_rows(), lost_output_rows(), ignored_rows()}) {
        all.insert(all.end(), part.begin(), part.end());
    }
    return all;
}

}  // namespace test
}  // namespace kel
