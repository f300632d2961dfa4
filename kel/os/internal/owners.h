// Owners of a socket descriptor and of an address list, for code that an exception may leave.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_OS_INTERNAL_OWNERS_H
#define KEL_OS_INTERNAL_OWNERS_H

#include <kel/os/address.h>
#include <unistd.h>

#include <memory>

namespace kel {
namespace internal {

// Closes its descriptor at the end of the scope. -1 is no descriptor.
class Descriptor {
public:
    explicit Descriptor(int fd) : _fd(fd) {}
    Descriptor(Descriptor&& other) noexcept : _fd(other.release()) {}
    Descriptor& operator=(Descriptor&&) = delete;
    ~Descriptor() { reset(-1); }

    bool is_open() const { return _fd >= 0; }
    int get() const { return _fd; }

    // For functions that may close the descriptor themselves, and then set it to -1.
    int& ref() { return _fd; }

    void reset(int fd) {
        if (is_open()) close(_fd);
        _fd = fd;
    }

    // The caller becomes the owner.
    int release() {
        const int fd = _fd;
        _fd = -1;
        return fd;
    }

private:
    int _fd;
};

struct AddressListDeleter {
    void operator()(addrinfo* list) const { Freeaddrinfo(list); }
};

// Releases its list at the end of the scope.
using AddressList = std::unique_ptr<addrinfo, AddressListDeleter>;

}  // namespace internal
}  // namespace kel

#endif
