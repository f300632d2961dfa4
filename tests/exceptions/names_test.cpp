// Both spellings of the mapped names, one of which a system header takes away.
// SPDX-License-Identifier: MIT

// clang-format off
#include <sys/sysmacros.h>  // defines minor() and comes first for that
#include <kel/exceptions/standard.h>
// clang-format on

#include <gtest/gtest.h>

#include <type_traits>

namespace {

TEST(MappedNames, TypeCodeOfTheOrbHasBothNames) {
    EXPECT_TRUE((std::is_same<CORBA::TypeCode, CORBA_TypeCode>::value));
}

TEST(MappedNames, StatusesAreNamesOfTheNamespaceAndOfTheirType) {
    EXPECT_EQ(CORBA::COMPLETED_MAYBE, CORBA::CompletionStatus::COMPLETED_MAYBE);
}

TEST(MappedNames, MinorIsNoMacroAfterTheHeaders) {
    EXPECT_EQ(CORBA_BAD_PARAM(0x1000, CORBA::COMPLETED_NO).minor(), 0x1000u);
}

}  // namespace
