// SPDX-License-Identifier: MIT
#include <errno.h>
#include <fcntl.h>
#include <kel/exceptions/standard.h>
#include <kel/os/pipe.h>
#include <unistd.h>

#include <ios>

// Built at load.
static std::ios_base::Init standard_streams;

namespace {

// Makes a pipe whose two ends are closed on exec. False, with errno, when the system gives none.
bool open_pipe(std::int32_t& read_end, std::int32_t& write_end) {
    int ends[2];
    if (pipe(ends) != 0) return false;
    read_end = ends[0];
    write_end = ends[1];
    fcntl(read_end, F_SETFD, FD_CLOEXEC);
    fcntl(write_end, F_SETFD, FD_CLOEXEC);
    return true;
}

}  // namespace

// Deliberate: the forward pipe stays open when there is no return pipe, for there is no object
// whose destructor could close it. Pinned by Pipe.AFailedReturnPipeLeavesTheForwardPipeOpen.
KELPipe::KELPipe() {
    if (open_pipe(_read_fd, _write_fd) && open_pipe(_return_read_fd, _return_write_fd)) return;
    const int error = errno;
    throw CORBA_NO_RESOURCES(static_cast<std::uint32_t>(error), CORBA::COMPLETED_NO);
}

KELPipe::~KELPipe() {
    for (const int fd : {_read_fd, _write_fd, _return_read_fd, _return_write_fd}) close(fd);
}

int KELPipe::write(const char* buf, unsigned long len) {
    return static_cast<int>(::write(_write_fd, buf, len));
}

int KELPipe::read(char* buf, unsigned long len) { return static_cast<int>(::read(_read_fd, buf, len)); }

int KELPipe::write_to_writer(const char* buf, unsigned long len) {
    return static_cast<int>(::write(_return_write_fd, buf, len));
}

int KELPipe::read_from_writer(char* buf, unsigned long len) {
    return static_cast<int>(::read(_return_read_fd, buf, len));
}
