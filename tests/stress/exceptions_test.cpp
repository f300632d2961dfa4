// The registry of exceptions, which all threads ask without a lock.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>
#include <kel/streams/istream.h>

#include <sstream>
#include <string>

#include "tests/stress/together.h"

namespace kel {
namespace test {
namespace {

typedef CORBA_Exception::Description Description;

const Description* const standard[] = {
#define KEL_STANDARD_EXCEPTION(X) &CORBA_##X::_description,
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
};
const int standard_count = sizeof standard / sizeof *standard;

TEST(ExceptionRegistry, LookUpsAtOnceFindTheirOwnDescription) {
    together(crowd, [](int thread) {
        for (int n = 0; n < 3000; ++n) {
            const Description* const wanted = standard[(n * 5 + thread * 11) % standard_count];
            ASSERT_EQ(Description::desc(wanted->repository_id()), wanted);
            ASSERT_TRUE(wanted->can_cast(CORBA_Exception::_description));
        }
        EXPECT_EQ(Description::desc("IDL:test/NoSuchException:1.0"), nullptr);
    });
}

// What a reply carries: the repository id, then the minor code and the status.
CORBA_Exception* received(const Description& d) {
    const std::string id(d.repository_id());
    std::istringstream wire(std::to_string(id.size() + 1) + "\"" + id + "\"\n7\n1\n");
    KEListream in(wire);
    CORBA_Exception* e = nullptr;
    in >> e;
    return e;
}

TEST(ExceptionRegistry, EveryThreadCatchesWhatItsOwnStreamCarries) {
    together(crowd, [](int thread) {
        for (int n = 0; n < 200; ++n) {
            const Description* const wanted = standard[(n + thread) % standard_count];
            const CORBA_Exception_var e(received(*wanted));
            const CORBA_Exception_var copy(e.in()->_deep_copy());
            try {
                copy->_raise();
            } catch (const CORBA_SystemException& caught) {
                ASSERT_STREQ(caught._name(), wanted->name());
                ASSERT_EQ(caught.minor(), 7u);
            }
        }
    });
}

}  // namespace
}  // namespace test
}  // namespace kel
