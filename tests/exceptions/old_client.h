// An ORB whose code is compiled with the oldest standard that the headers support, C++11.
//
//   Full        a user exception as an ORB defines it
//   OldClient   throws and catches through the mapped names
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_EXCEPTIONS_OLD_CLIENT_H
#define KEL_TESTS_EXCEPTIONS_OLD_CLIENT_H

#include <kel/exceptions/standard.h>

namespace kel {
namespace test {

class Full : public CORBA::UserException {
public:
    const CORBA::Exception::Description* _desc() const;
    void _raise() const;
    CORBA::Exception* _deep_copy();

    static CORBA::Exception* _factory();
    static Full* _downcast(CORBA::Exception* e);

    static CORBA::Exception::Description _description;
};

struct OldClient {
    // Throws Full or, given a reason, CORBA::NO_RESOURCES.
    static void work(const char* reason);

    // Calls `work` and returns the name of what a handler for the class's base caught.
    static const char* name_of_failure(const char* reason);
};

}  // namespace test
}  // namespace kel

#endif
