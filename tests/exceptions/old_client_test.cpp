// The headers as an ORB uses them whose code is older than the library.
// SPDX-License-Identifier: MIT
#include "tests/exceptions/old_client.h"

#include <gtest/gtest.h>

namespace {

using kel::test::Full;
using kel::test::OldClient;

TEST(OldClient, ThrowsSystemExceptionsThatNewCodeCatches) {
    EXPECT_THROW(OldClient::work("none left"), CORBA_NO_RESOURCES);
}

TEST(OldClient, ThrowsItsOwnExceptionThatNewCodeCatches) {
    EXPECT_THROW(OldClient::work(nullptr), Full);
    EXPECT_THROW(OldClient::work(nullptr), CORBA_UserException);
}

TEST(OldClient, CatchesByTheMappedNames) {
    EXPECT_STREQ(OldClient::name_of_failure("none left"), "CORBA::NO_RESOURCES");
    EXPECT_STREQ(OldClient::name_of_failure(nullptr), "Full");
}

TEST(OldClient, ItsExceptionIsRegistered) {
    EXPECT_EQ(CORBA::Exception::Description::desc("IDL:example.org/Full:1.0"), &Full::_description);
}

TEST(OldClient, ItsOwnDowncastFollowsTheDescriptions) {
    Full full;
    CORBA::MARSHAL other;
    EXPECT_EQ(Full::_downcast(&full), &full);
    EXPECT_EQ(Full::_downcast(&other), nullptr);
}

}  // namespace
