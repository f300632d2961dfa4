// The lowest layer over the system: host look-ups, system version, user, process and environment.
//
//   BaseUtil     static functions only; there are no instances
//   vhostname    the record that one host look-up fills
//
//     vhostname record;
//     if (hostent* found = BaseUtil::vgethostbyname_r("localhost", &record)) use(found->h_addr_list[0]);
//
// No function throws. Any thread may call any of them, with what is said at strtok_r and GetProperty.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_BASE_UTIL_H
#define KEL_OS_BASE_UTIL_H

#include <kel/config.h>
#include <netdb.h>

// What a host look-up needs and fills. It belongs to the caller and serves one look-up at a time:
// the names and addresses of the found entry lie in its buffer.
struct KEL_API vhostname {
    hostent _hostent;    // the entry that was found
    int _h_errno;        // the resolver's code of the last call
    hostent* _result;    // &_hostent, or null when nothing was found
    char _buffer[1024];  // the texts and addresses that _hostent points to
};

class KEL_API BaseUtil {
public:
    // The version of the running system, as far as it could be read. Both parts are 0 for a release with
    // fewer than two dots.
    struct SysVersion {
        // Deliberate: a part that could not be read is not written and holds anything, as both do for a
        // release that begins with a digit, like those of Linux. Pinned by
        // SystemVersion.AReleaseThatBeginsWithADigitFillsNothing.
        int major;
        int minor;
    };

    // Looks `name` up once, without a retry. The entry, which is the one in `rec`, or null with the
    // reason in rec->_h_errno.
    static hostent* vgethostbyname_r(const char* name, vhostname* rec);

    // Looks up the host of the binary address `addr` of `len` bytes and family `type`. The entry in
    // `rec`, or null with the reason in rec->_h_errno.
    static hostent* vgethostbyaddr_r(const char* addr, int len, int type, vhostname* rec);

    // The version of the running system, which the caller deletes. Null, and a line on the standard
    // error stream, when the system does not tell it; null alone when there is no memory.
    static SysVersion* get_sysversion();

    // The login name, or "Unix User" when there is none or no memory for it. It is found once and stays the
    // same until the process ends; the caller must not free it.
    static const char* user_name();

    // The number of this process.
    static int getpid();

    // The next piece of a text: begins with `s`, goes on when `s` is null, ends with null. The place
    // is kept in `*save`, or, when `save` is null, in one place for the whole process, which then
    // allows one thread and one text at a time.
    static char* strtok_r(char* s, const char* delim, char** save);

    // The size of this process and the part of it that is in memory, in kilobytes of pages of 4;
    // both 0 when they cannot be read.
    static void GetProcessMemory(int& size, int& resident);

    // The value of the environment variable `name`, null when it is not set. It lies in the
    // environment: the caller does not free it, and no thread may change the environment meanwhile.
    static char* GetProperty(const char* name);
};

#endif
