// Arrays that end where the memory ends.
//
//   GuardedArrays   what the operator new of this program knows about its blocks
//   aliased_room    as much room as an address space has, over one small piece of memory
//
//     const std::unique_ptr<char[]> buffer(new char[4]);   // buffer[4] ends the process
//     EXPECT_THROW(CORBA::string_alloc(0x7fffffff), std::bad_alloc);
//
// A program that is linked with guard_alloc.cpp gets each block of operator new[] right in front of a
// page that cannot be touched, the library's blocks included. Both operators refuse more than the
// limit, so that no test of a huge length takes the memory that it asks for.
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_SUPPORT_GUARD_ALLOC_H
#define KEL_TESTS_SUPPORT_GUARD_ALLOC_H

#include <cstddef>
#include <memory>

namespace kel {
namespace test {

struct GuardedArrays {
    static const std::size_t limit = 64 * 1024 * 1024;  // bytes of one block

    // Arrays and objects that are in use in the whole process.
    static long live();
};

// `n` bytes that can be written, in front of a page that cannot be touched; null when the address
// space has no room for them. A byte is the same as the one a megabyte further on.
struct UnmapRoom {
    std::size_t bytes;
    void operator()(char* room) const;
};
typedef std::unique_ptr<char[], UnmapRoom> AliasedRoom;
AliasedRoom aliased_room(std::size_t n);

}  // namespace test
}  // namespace kel

#endif
