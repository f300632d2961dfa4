// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/os/base_util.h>
#include <kel/os/internal/copy_text.h>
#include <kel/os/portable.h>
#include <signal.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <memory>

static std::ios_base::Init standard_streams;
KELRMutex KELPortable::_mutex;

namespace {

const long one_second_us = 1000000;

// Sends the signal, or fails as for a process that does not exist when `pid` is no process id: cut to
// its width it could name another process, or, as 0, this one's group.
int kill_process(long pid) {
    const auto process = static_cast<pid_t>(pid);
    if (process == pid) return kill(process, SIGKILL);
    errno = ESRCH;
    return -1;
}

}  // namespace

int wrapped_select(int nfds, fd_set* r, fd_set* w, fd_set* e, timeval* timeout) {
    if (timeout == nullptr) return select(nfds, r, w, e, nullptr);
    const timeval asked = *timeout;
    const int rc = select(nfds, r, w, e, timeout);
    *timeout = asked;
    return rc;
}

int KELPortable::gettimeofday(timeval& tv) { return ::gettimeofday(&tv, nullptr); }

int KELPortable::vgettimeofday(timeval* tv) { return ::gettimeofday(tv, nullptr); }

timeval KELPortable::elapsed(const timeval& from, const timeval& to) {
    // Unsigned, so that seconds far apart wrap.
    auto seconds = static_cast<unsigned long>(to.tv_sec) - static_cast<unsigned long>(from.tv_sec);
    auto microseconds =
        static_cast<long>(static_cast<unsigned long>(to.tv_usec) - static_cast<unsigned long>(from.tv_usec));
    if (microseconds < 0) {
        seconds -= 1;
        microseconds += one_second_us;
    } else if (microseconds > one_second_us) {
        // Deliberate: a difference of exactly one second in microseconds is not carried. Pinned by
        // Time.ElapsedLeavesExactlyAMillionMicroseconds.
        seconds += 1;
        microseconds -= one_second_us;
    }
    timeval difference;
    difference.tv_sec = static_cast<time_t>(seconds);
    difference.tv_usec = static_cast<suseconds_t>(microseconds);
    return difference;
}

int KELPortable::sleep(unsigned long ms) {
    timeval wait;
    convert(ms, wait);
    // Deliberate: the wait watches the exceptions of descriptor 0 and its result is the caller's, so
    // that it ends early for a signal and at once without that descriptor. Pinned by
    // Sleep.WatchesTheExceptionsOfDescriptorZero.
    fd_set exceptions;
    FD_ZERO(&exceptions);
    FD_SET(0, &exceptions);
    return wrapped_select(1, nullptr, nullptr, &exceptions, &wait);
}

unsigned KELPortable::vsleep(unsigned long s) { return ::sleep(static_cast<unsigned>(s)); }

int KELPortable::compare_time(timeval& a, timeval& b) {
    if (a.tv_sec != b.tv_sec) {
        return static_cast<int>(static_cast<unsigned long>(a.tv_sec) - static_cast<unsigned long>(b.tv_sec));
    }
    return static_cast<int>(static_cast<unsigned long>(a.tv_usec) - static_cast<unsigned long>(b.tv_usec));
}

int KELPortable::compare_time(timeval& a, unsigned long long ms) { return static_cast<int>(convert(a) - ms); }

void KELPortable::convert(unsigned long long ms, timeval& tv) {
    tv.tv_sec = static_cast<time_t>(ms / 1000);
    tv.tv_usec = static_cast<suseconds_t>(ms % 1000 * 1000);
}

unsigned long long KELPortable::convert(const timeval& tv) {
    const auto whole_seconds = static_cast<unsigned long long>(tv.tv_sec) * 1000;
    return whole_seconds + static_cast<unsigned long long>(tv.tv_usec / 1000);
}

int KELPortable::process_id() { return BaseUtil::getpid(); }

int KELPortable::max_fds() { return static_cast<int>(sysconf(_SC_OPEN_MAX)); }

bool KELPortable::max_fd_reached(int fd) { return fd == max_fds() - 1; }

bool KELPortable::get_sysversion(KELSysVersion& v) {
    const std::unique_ptr<BaseUtil::SysVersion> version(BaseUtil::get_sysversion());
    if (version == nullptr) return false;
    v.major = static_cast<std::uint16_t>(version->major);
    v.minor = static_cast<std::uint16_t>(version->minor);
    return true;
}

void KELPortable::vkill(long pid) {
    // The blank and colon are part of the text; perror adds its own separator behind them.
    if (kill_process(pid) != 0) perror("vkill: ");
}

int KELPortable::vGetErrorNo() { return errno; }

char* KELPortable::_get_error_str() { return kel::internal::copy_text(std::strerror(errno)); }

char* KELPortable::get_property(const char* name) { return BaseUtil::GetProperty(name); }

int KELPortable::vstricmp(const char* a, const char* b) { return strcasecmp(a, b); }

bool KELPortable::vFileExists(const char* path) {
    struct stat attributes;
    return stat(path, &attributes) == 0;
}

bool KELPortable::vwhence(const char* name, char* out) {
    if (vFileExists(name)) {
        std::memmove(out, name, std::strlen(name) + 1);
        return true;
    }
    const CORBA_String_var wanted(kel::internal::copy_text(name));  // kept apart, since `out` may be `name`
    CORBA_String_var path(kel::internal::copy_text(get_property("PATH")));
    out[0] = '\0';
    if (wanted.in() == nullptr || path.in() == nullptr) return false;
    // Deliberate: a blank separates folders too. Pinned by Whence.ColonBlankAndSemicolonSeparateFolders.
    const char* const separators = ": ;";
    char* rest = nullptr;
    for (char* folder = BaseUtil::strtok_r(path, separators, &rest); folder != nullptr;
         folder = BaseUtil::strtok_r(nullptr, separators, &rest)) {
        std::sprintf(out, "%s/%s", folder, wanted.in());
        if (vFileExists(out)) return true;
    }
    out[0] = '\0';
    return false;
}

hostent* KELPortable::gethostbyname(const char* name) {
    static vhostname record;
    hostent* found = nullptr;
    // Deliberate: "try again" is asked again without a limit. Pinned by
    // CachedHostEntry.IsAskedForUntilTheResolverDecides.
    do {
        record._h_errno = 0;  // a code of an earlier look-up must not repeat this one
        found = BaseUtil::vgethostbyname_r(name, &record);
    } while (found == nullptr && record._h_errno == TRY_AGAIN);
    return found;
}
