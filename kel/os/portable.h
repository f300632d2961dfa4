// One surface over the operating system: time, process, files, addresses and TCP connections.
//
//   KELPortable       static functions only; there are no instances
//   KELSysVersion     the version of the operating system
//   wrapped_select    select that leaves the caller's time-out as it was
//
//     const int fd = KELPortable::tcpConnect("server", 2809, 5000, 0);   // within five seconds
//
// Durations are milliseconds. Ports are in host order. Families are AF_INET and AF_INET6; with any
// other family a function fails or does nothing. Texts that are returned as `char*` belong to the
// caller, who frees them with CORBA::string_free, except where it is said otherwise.
// Any thread may call any function but gethostbyname, whose result all callers share.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_PORTABLE_H
#define KEL_OS_PORTABLE_H

#include <kel/config.h>
#include <kel/core/mutex.h>
#include <netdb.h>
#include <netinet/in.h>
#include <sys/select.h>
#include <sys/socket.h>

// The version of the operating system.
struct KEL_API KELSysVersion {
    // Anything when it could not be read, as both for a release that begins with a digit, like those
    // of Linux.
    std::uint16_t major;
    std::uint16_t minor;
};

// Waits like select and returns its result, with its errno. `*timeout` is the same after the call as
// before it, where the system would leave the time that remained.
KEL_API int wrapped_select(int nfds, fd_set* r, fd_set* w, fd_set* e, timeval* timeout);

class KEL_API KELPortable {
public:
    // --- Time ------------------------------------------------------------------------------

    // The time of day. 0, or -1 with errno.
    static int gettimeofday(timeval& tv);
    static int vgettimeofday(timeval* tv);

    // The time from `from` to `to`. A difference of exactly 1,000,000 microseconds is not carried.
    static timeval elapsed(const timeval& from, const timeval& to);

    // Waits `ms` milliseconds and returns 0. A signal ends the wait early with -1 and EINTR; without
    // an open descriptor 0 it fails at once with -1 and EBADF.
    static int sleep(unsigned long ms);

    // Waits `s` seconds. The seconds that were left when a signal ended the wait, else 0.
    static unsigned vsleep(unsigned long s);

    // Negative, zero or positive as `a` is earlier than, equal to or later than the other time.
    static int compare_time(timeval& a, timeval& b);
    static int compare_time(timeval& a, unsigned long long ms);

    // Milliseconds to a timeval and back; microseconds below a millisecond are dropped.
    static void convert(unsigned long long ms, timeval& tv);
    static unsigned long long convert(const timeval& tv);

    // --- Process and system ----------------------------------------------------------------

    // The number of this process.
    static int process_id();

    // How many descriptors the process may have.
    static int max_fds();

    // True when `fd` is the last descriptor that the process may have.
    static bool max_fd_reached(int fd);

    // The version of the operating system. False, and `v` as it was, when the system does not tell it
    // or when there is no memory.
    static bool get_sysversion(KELSysVersion& v);

    // Kills process `pid`. A failure is printed on standard error and not reported otherwise.
    static void vkill(long pid);

    // The calling thread's errno, and its text; no text when there is no memory for it.
    static int vGetErrorNo();
    static char* _get_error_str();

    // The value of an environment variable; see BaseUtil::GetProperty.
    static char* get_property(const char* name);

    // --- Texts and files -------------------------------------------------------------------

    // Compares without regard to case: negative, zero or positive.
    static int vstricmp(const char* a, const char* b);

    // Whether there is a file, a folder or anything else under `path`.
    static bool vFileExists(const char* path);

    // Finds the program `name`: as it is, else in the folders of PATH, which ':', ';' or a blank
    // separate. True with its path in `out`, or false with "" there, also when there is no memory to
    // search with. The caller makes `out` large enough for the longest folder, '/' and the name; `out`
    // may be `name` itself.
    static bool vwhence(const char* name, char* out);

    // --- Hosts and addresses ---------------------------------------------------------------
    //
    // A null or empty `host` is this machine under its own name. The functions that give a text look
    // it up under _mutex, which keeps other threads out of them until the resolver has answered.

    // Guards the host name and the addresses that are kept, and the resolver's shared buffers.
    static KELRMutex _mutex;

    // The host entry of `name`, or null. It is asked for again for as long as the resolver says "try
    // again". All callers share one entry, which the next call overwrites: one thread at a time.
    static hostent* gethostbyname(const char* name);

    // The name of this machine, found once. The caller must not free it.
    static const char* host_name();

    // The IPv4 address of `host` as text, or null. A text that is an address is returned as it is.
    static char* ip_addr(const char* host);

    // The address of `host` as text in family `af`. An unknown host gives null for IPv6 and this
    // machine's own address for IPv4.
    static char* ipAddr(int af, const char* host);

    // The address of `host` in network order: 4 bytes for AF_INET, 16 for AF_INET6, where an IPv4
    // address comes as a mapped one. False, and `addr` as it was, when there is none.
    static bool ipAddr(int af, void* addr, const char* host);

    // The address of `host` in the family that fits, IPv6 first. `addr` has room for 16 bytes; `len`
    // becomes 16 or 4. False when there is none.
    static bool ipAddr(void* addr, int& len, const char* host);

    // The address of `host` as text, and its family: AF_INET6 for the text of an IPv6 address, else
    // AF_INET.
    static char* host2ip(int& af, const char* host);

    // The IPv4 socket address of `host` and `port`; a null or empty host is any address. Set the
    // family afterwards: it is left 0. COMM_FAILURE when the host is unknown.
    static void convert(const char* host, unsigned short port, sockaddr_in& sa);

    // The address of `sa` as text, and its port.
    static char* convert(const sockaddr_in& sa, unsigned short& port);

    // The address of the peer of the connected socket `fd` as text, null when there is none. `port`
    // is not written. BAD_INV_ORDER when `fd` is negative.
    static char* peer_addr(int fd, unsigned short& port);

    // Whether `host` is this machine. is_local compares IPv4 addresses; isLocal compares IPv6
    // addresses as well.
    static bool isLocal(const char* host);
    static bool is_local(const char* host);

    // Whether `text` is an address of family `af`.
    static bool isValidIP(int af, const char* text);

    // --- Socket addresses ------------------------------------------------------------------

    // Stores `port`, in host order; nothing in a foreign family.
    static void saSetPort(sockaddr* sa, int port);

    // The port, or -1 in a foreign family; of a descriptor, that of its local address.
    static int saGetPort(sockaddr* sa);
    static int saGetPort(int fd);

    // Whether the address is 127.0.0.1 or ::1. Other addresses of 127.0.0.0/8 are not.
    static bool saIsLoopback(sockaddr* sa);

    // Set the loopback address, any address, this machine's own address. The last leaves the address
    // as it was when the own name cannot be resolved.
    static void saSetLoopback(sockaddr* sa);
    static void saSetWild(sockaddr* sa);
    static void saSetLocal(sockaddr* sa);

    // --- TCP -------------------------------------------------------------------------------

    // A listening socket on the first free port of `port` to `port + range`; port 0 is one port of the
    // system's choice, which saGetPort tells. A null or empty host listens on every address. The
    // caller closes it. Throws what socketError throws, COMM_FAILURE when it cannot listen or when
    // `host` is unknown.
    static int createTcpListenerSocket(const char* host, unsigned short port, unsigned long range);

    // Waits for a connection on `fd` and returns its socket, which the caller closes. Throws what
    // socketError throws; a signal is a failure.
    static int socketAccept(int fd);

    // Connects the socket `fd`, within `timeout` milliseconds or, with 0, without a limit. `err` is 0,
    // or the error, with `fd` closed and set to -1. TIMEOUT, with `fd` closed and -1, when the time
    // is over. A socket connected with a time-out stays non-blocking.
    static void tcpConnect(int& fd, int& err, sockaddr* addr, int addrlen, unsigned long long timeout);

    // A socket connected to `host`, which the caller closes. Every address of the host is tried, a
    // refusing one again for as long as `timeout` milliseconds last; 0 is no limit. A null or empty
    // `bindName` leaves the local address to the system. TRANSIENT or NO_RESOURCES when no address
    // answers or the host is unknown, TIMEOUT when one does not answer in time, BAD_PARAM for a bad
    // `bindName`.
    static int tcpConnect(const char* host, unsigned short port, unsigned long long timeout,
                          const char* bindName);

    // Throws the exception for the error number `err`: NO_RESOURCES when memory or descriptors ran
    // out, else TRANSIENT when `transient` is set, else COMM_FAILURE.
    [[noreturn]] static void socketError(int err, unsigned char transient);
};

#endif
