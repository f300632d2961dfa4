// Catches the system exception that a call must throw.
//
//     const auto e = thrown<CORBA_TRANSIENT>([] { KELPortable::socketError(EAGAIN, 1); });
//     EXPECT_EQ(e.minor(), 0x4f4d000bu);
//
// SPDX-License-Identifier: MIT
#ifndef KEL_TESTS_OS_THROWN_H
#define KEL_TESTS_OS_THROWN_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <typeinfo>

#include "tests/support/fault.h"

namespace kel {
namespace test {

// The exception of class E, and of no class derived from it, that `body` throws while armed.
template <class E, class Body>
E thrown(Body body) {
    try {
        Armed armed;
        body();
    } catch (const E& e) {
        EXPECT_TRUE(typeid(e) == typeid(E)) << typeid(e).name();
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
        return e;
    } catch (const CORBA_Exception& e) {
        ADD_FAILURE() << "threw " << e._name();
        return E();
    }
    ADD_FAILURE() << "threw nothing";
    return E();
}

}  // namespace test
}  // namespace kel

#endif
