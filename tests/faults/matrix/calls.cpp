// SPDX-License-Identifier: MIT
#include "tests/faults/matrix/calls.h"

#include <netdb.h>

#include <cerrno>

namespace kel {
namespace test {

namespace {

const auto after_the_work = Manner::after_the_work;

// No thread call sets errno, so what a wrapper reads there is left over from something else.
const std::vector<int> preset = {7, 0, 4095};
const std::vector<int> one_preset = {EIO};

std::vector<FailingCall> thread_calls() {
    return {
        {&seams::pthread_mutex_init, {EAGAIN, ENOMEM, EPERM}, Manner::plain, preset},
        {&seams::pthread_mutex_destroy, {EBUSY, EINVAL}, after_the_work, one_preset},
        {&seams::pthread_mutex_lock, {EINVAL, EDEADLK, EAGAIN}, Manner::plain, one_preset},
        {&seams::pthread_mutex_unlock, {EPERM, EINVAL}, Manner::plain, one_preset},
        {&seams::pthread_mutexattr_init, {ENOMEM}, after_the_work, one_preset},
        {&seams::pthread_mutexattr_settype, {EINVAL}, after_the_work, one_preset},
        {&seams::pthread_mutexattr_destroy, {EINVAL}, after_the_work, one_preset},
        {&seams::pthread_cond_init, {EAGAIN, ENOMEM}, Manner::plain, preset},
        {&seams::pthread_cond_destroy, {EBUSY, EINVAL}, after_the_work, one_preset},
        {&seams::pthread_cond_wait, {EPERM, EINVAL, EINTR}, Manner::plain, one_preset},
        {&seams::pthread_cond_timedwait, {ETIMEDOUT, EINTR, EINVAL, EPERM}, Manner::plain, one_preset},
        {&seams::pthread_cond_signal, {EINVAL}, Manner::plain, one_preset},
        {&seams::pthread_cond_broadcast, {EINVAL}, Manner::plain, one_preset},
        {&seams::pthread_attr_init, {ENOMEM}, Manner::plain, one_preset},
        {&seams::pthread_attr_destroy, {EINVAL}, after_the_work, one_preset},
        {&seams::pthread_attr_setstacksize, {EINVAL}, Manner::plain, one_preset},
        {&seams::pthread_attr_setdetachstate, {EINVAL}, Manner::plain, one_preset},
        {&seams::pthread_attr_setinheritsched, {EINVAL, ENOTSUP}, Manner::plain, one_preset},
        {&seams::pthread_create, {EAGAIN, EINVAL, EPERM}, Manner::plain, preset},
        {&seams::pthread_key_create, {EAGAIN, ENOMEM}, Manner::plain, preset},
        {&seams::pthread_setspecific, {ENOMEM, EINVAL}, Manner::plain, one_preset},
    };
}

std::vector<FailingCall> process_calls() {
    return {
        {&seams::getenv, {0}},
        {&seams::gettimeofday, {EFAULT, EINVAL}},
        {&seams::time, {EOVERFLOW, EFAULT}},
        {&seams::sleep, {1, 3}, Manner::plain, one_preset},  // the seconds that a signal left over
        {&seams::uname, {EFAULT}},
        {&seams::getlogin_r, {ENXIO, ENOENT, ENOTTY, EMFILE, ENFILE, ERANGE}, Manner::plain, one_preset},
        {&seams::sysconf, {EINVAL}},
        {&seams::kill, {ESRCH, EPERM, EINVAL}},
        {&seams::select, {EINTR, EBADF, EINVAL, ENOMEM}},
        {&seams::poll, {EINTR, EINVAL, EFAULT, ENOMEM}},
        {&seams::pipe, {EMFILE, ENFILE, EFAULT}},
        {&seams::read, {EINTR, EAGAIN, EIO, EBADF}},
        {&seams::write, {EINTR, EAGAIN, EPIPE, ENOSPC}},
        {&seams::close, {EINTR, EIO}, after_the_work},
        {&seams::fcntl64, {EBADF, EINVAL}},
        {&seams::fopen64, {EMFILE, ENOMEM, EACCES, ENOENT}},
        {&seams::fclose, {EIO, ENOSPC}, after_the_work},
        {&seams::fflush, {ENOSPC, EIO, EBADF}},
        {&seams::stat64, {ENOENT, EACCES, ENOTDIR, ELOOP}},
        {&seams::fstat64, {EIO, EOVERFLOW}},
        {&seams::fchmod, {EPERM, EROFS}},
        {&seams::rename, {EACCES, EXDEV, ENOSPC}},
        {&seams::unlink, {EACCES, ENOENT}},
        {&seams::dlopen, {0}},
        {&seams::dlclose, {1}, after_the_work},
        {&seams::dlerror, {0}},
    };
}

std::vector<FailingCall> network_calls() {
    return {
        {&seams::gethostname, {EFAULT, ENAMETOOLONG}},
        {&seams::gethostbyname_r,
         {HOST_NOT_FOUND, TRY_AGAIN, NO_RECOVERY, NO_DATA, NETDB_INTERNAL},
         Manner::plain,
         one_preset},
        {&seams::gethostbyaddr_r,
         {HOST_NOT_FOUND, TRY_AGAIN, NO_RECOVERY, NETDB_INTERNAL},
         Manner::plain,
         one_preset},
        {&seams::getaddrinfo,
         {EAI_NONAME, EAI_AGAIN, EAI_FAIL, EAI_MEMORY, EAI_SYSTEM, EAI_FAMILY},
         Manner::plain,
         one_preset},
        {&seams::if_nametoindex, {ENODEV, EMFILE}},
        {&seams::socket, {EMFILE, ENOMEM, ENFILE, ENOBUFS, EACCES, EAFNOSUPPORT}},
        {&seams::bind, {EADDRINUSE, EADDRNOTAVAIL, EACCES, EINVAL}},
        {&seams::listen, {EADDRINUSE, EOPNOTSUPP, EMFILE}},
        {&seams::accept, {EMFILE, ENOMEM, ENFILE, ENOBUFS, EAGAIN, EINTR, ECONNABORTED, EPROTO}},
        {&seams::connect,
         {ECONNREFUSED, EADDRINUSE, EINPROGRESS, EAGAIN, ETIMEDOUT, EHOSTUNREACH, ENETUNREACH, EINTR, EACCES,
          ENOMEM}},
        {&seams::getsockname, {ENOTSOCK, ENOBUFS}},
        {&seams::getpeername, {ENOTCONN, EBADF, ENOBUFS}},
        {&seams::getsockopt, {EBADF, ENOTSOCK}},
        {&seams::setsockopt, {ENOPROTOOPT, ENOMEM}},
    };
}

// What the two re-entrant look-ups return along with a code.
int result_of(int code) {
    if (code == TRY_AGAIN) return EAGAIN;
    return code == NETDB_INTERNAL ? ERANGE : ENOENT;
}

}  // namespace

const std::vector<FailingCall>& failing_calls() {
    static const std::vector<FailingCall> calls = [] {
        std::vector<FailingCall> all = thread_calls();
        for (const auto& more : {process_calls(), network_calls()}) {
            all.insert(all.end(), more.begin(), more.end());
        }
        return all;
    }();
    return calls;
}

const FailingCall* failing_call(const SeamBase& seam) {
    for (const FailingCall& call : failing_calls()) {
        if (call.seam == &seam) return &call;
    }
    return nullptr;
}

const FailingCall* failing_call(const std::string& name) {
    for (const FailingCall& call : failing_calls()) {
        if (call.seam->name() == name) return &call;
    }
    return nullptr;
}

std::string Fault::text() const {
    std::string text = std::string(seam->name()) + " " + std::to_string(nth) + " fails with " +
                       std::to_string(error) + (from_then_on ? " for ever" : " once");
    if (left_in_errno >= 0) text += ", errno " + std::to_string(left_in_errno);
    return text;
}

void apply(const std::vector<Fault>& faults) {
    std::vector<SeamBase*> planned;
    for (const Fault& fault : faults) {
        const bool second = !planned.empty() && planned.back() == fault.seam;
        if (second) {
            fault.seam->fail_too(fault.nth, fault.error);
        } else {
            fault.seam->fail(fault.nth, fault.error, fault.from_then_on);
        }
        if (fault.left_in_errno >= 0) fault.seam->leave_errno(fault.left_in_errno);
        if (failing_call(*fault.seam)->manner == after_the_work) fault.seam->fail_after_the_work();
        planned.push_back(fault.seam);
    }
}

void withdraw(const std::vector<Fault>& faults) {
    for (const Fault& fault : faults) {
        fault.seam->fail(0, 0);
        fault.seam->fail_too(0, 0);
    }
}

void tell_resolver_failures() {
    seams::gethostbyname_r.tell_failure(
        [](int code, const char*, hostent*, char*, size_t, hostent** found, int* error) {
            *found = nullptr;
            *error = code;
            return result_of(code);
        });
    seams::gethostbyaddr_r.tell_failure(
        [](int code, const void*, socklen_t, int, hostent*, char*, size_t, hostent** found, int* error) {
            *found = nullptr;
            *error = code;
            return result_of(code);
        });
}

}  // namespace test
}  // namespace kel
