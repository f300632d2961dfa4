// Two pipes held as one object: a byte channel in each direction between two parties of a process.
//
//   KELPipe   forward: write -> read    return: write_to_writer -> read_from_writer
//
//     KELPipe pipe;
//     pipe.write("x", 1);                            // wakes a thread that polls pipe._read_fd
//     char c; pipe.read(&c, 1);
//
// The object takes no lock. One party uses write and read_from_writer, the other read and
// write_to_writer; writes of up to PIPE_BUF bytes are atomic. Destroy it only when no thread is
// inside one of its calls: the numbers of closed descriptors are given out again.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_PIPE_H
#define KEL_OS_PIPE_H

#include <kel/config.h>

class KEL_API KELPipe {
public:
    // The descriptors are blocking and are closed on exec. NO_RESOURCES with errno as minor code
    // when the system gives no pipe. A fork by another thread between the creation of a pipe and
    // its marking can hand the descriptors to that child.
    KELPipe();
    KELPipe(const KELPipe&) = delete;
    KELPipe& operator=(const KELPipe&) = delete;
    ~KELPipe();

    // Each is one call of the system, with its result: the number of bytes, which may be less than
    // `len`, 0 at the end of a read channel, -1 with errno on failure.
    int write(const char* buf, unsigned long len);
    int read(char* buf, unsigned long len);
    int write_to_writer(const char* buf, unsigned long len);
    int read_from_writer(char* buf, unsigned long len);

    // Owned by the object; for a poller to watch.
    std::int32_t _read_fd;
    std::int32_t _write_fd;
    std::int32_t _return_read_fd;
    std::int32_t _return_write_fd;
};

#endif
