// The functions through which templates and low layers throw.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/raise.h>
#include <kel/exceptions/standard.h>

#include <functional>

namespace {

using namespace kel::internal;

// What `raise` throws, which must be an `X`, as minor code and status.
template <class X>
void expect_raised(const std::function<void()>& raise, unsigned long minor,
                   CORBA::CompletionStatus completed) {
    try {
        raise();
        FAIL() << "nothing was thrown";
    } catch (const X& e) {
        EXPECT_EQ(e.minor(), minor);
        EXPECT_EQ(e.completed(), completed);
    }
}

TEST(Raise, BadParamIsTheDefaultOne) {
    expect_raised<CORBA_BAD_PARAM>(raise_bad_param, CORBA::OMGVMCID, CORBA::COMPLETED_NO);
}

TEST(Raise, ObjectNotExistIsTheDefaultOne) {
    expect_raised<CORBA_OBJECT_NOT_EXIST>(raise_object_not_exist, CORBA::OMGVMCID, CORBA::COMPLETED_NO);
}

TEST(Raise, MarshalIsTheDefaultOne) {
    expect_raised<CORBA_MARSHAL>(raise_marshal, CORBA::OMGVMCID, CORBA::COMPLETED_NO);
}

TEST(Raise, TimeoutIsTheDefaultOne) {
    expect_raised<CORBA_TIMEOUT>(raise_timeout, CORBA::OMGVMCID, CORBA::COMPLETED_NO);
}

TEST(Raise, NoResourcesPlacesItsMinorCodeInTheSetOfTheOmg) {
    expect_raised<CORBA_NO_RESOURCES>([] { raise_no_resources(11); }, 0x4f4d000b, CORBA::COMPLETED_NO);
}

TEST(Raise, NegativeMinorCodeKeepsItsThirtyTwoBits) {
    expect_raised<CORBA_NO_RESOURCES>([] { raise_no_resources(static_cast<std::uint32_t>(-2)); }, 0xfffffffe,
                                      CORBA::COMPLETED_NO);
}

TEST(Raise, BadInvOrderMayHaveCompleted) {
    expect_raised<CORBA_BAD_INV_ORDER>([] { raise_bad_inv_order_maybe(4); }, 0x4f4d0004,
                                       CORBA::COMPLETED_MAYBE);
}

}  // namespace
