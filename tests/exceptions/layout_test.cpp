// Object layouts and virtual slots that code compiled against the library relies on.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <cstring>
#include <type_traits>

#include "tests/exceptions/sample_exceptions.h"

namespace {

typedef CORBA_Exception::Description Description;

// The index of a virtual operation in the virtual table: a pointer to it holds the offset plus one.
template <class Member>
std::size_t slot(Member member) {
    std::size_t words[sizeof(Member) / sizeof(std::size_t)];
    std::memcpy(words, &member, sizeof member);
    return (words[0] - 1) / sizeof(void*);
}

// The `index`th pointer-sized word of an object.
template <class T>
T word(const void* object, std::size_t index) {
    T value;
    std::memcpy(&value, static_cast<const char*>(object) + index * sizeof(void*), sizeof value);
    return value;
}

TEST(ExceptionLayout, OperationsFollowTheDestructorInTheirOrder) {
    EXPECT_EQ(slot(&CORBA_Exception::_desc), 2u);
    EXPECT_EQ(slot(&CORBA_Exception::_write), 3u);
    EXPECT_EQ(slot(&CORBA_Exception::_copy), 4u);
    EXPECT_EQ(slot(&CORBA_Exception::_pretty_print), 5u);
    EXPECT_EQ(slot(&CORBA_Exception::_raise), 6u);
    EXPECT_EQ(slot(&CORBA_Exception::_deep_copy), 7u);
    EXPECT_EQ(slot(&CORBA_Exception::_name), 8u);
    EXPECT_EQ(slot(&CORBA_Exception::_repository_id), 9u);
}

TEST(ExceptionLayout, RootUserExceptionsAndRemarshalHaveNoFields) {
    EXPECT_EQ(sizeof(CORBA_Exception), sizeof(void*));
    EXPECT_EQ(sizeof(CORBA_UserException), sizeof(void*));
    EXPECT_EQ(sizeof(KELRemarshal), sizeof(void*));
}

TEST(ExceptionLayout, DescriptionHoldsItsFieldsInOrder) {
    const char* const id = "IDL:test/Layout:1.0";
    const CORBA_TypeCode* const tc = reinterpret_cast<const CORBA_TypeCode*>(&id);
    const Description d("Layout", id, KELRemarshal::_factory, &CORBA_Exception::_description, tc);
    EXPECT_EQ(sizeof(Description), 6 * sizeof(void*));
    EXPECT_EQ(word<const char*>(&d, 1), d.name());
    EXPECT_EQ(word<const char*>(&d, 2), id);
    EXPECT_EQ(word<Description::Factory>(&d, 3), &KELRemarshal::_factory);
    EXPECT_EQ(word<const Description*>(&d, 4), &CORBA_Exception::_description);
    EXPECT_EQ(word<const CORBA_TypeCode*>(&d, 5), tc);
}

TEST(ExceptionLayout, SystemExceptionHoldsMinorCodeStatusAndExplanation) {
    const CORBA_BAD_PARAM e(0x1234, CORBA::COMPLETED_MAYBE, "because");
    EXPECT_EQ(word<unsigned long>(&e, 1), 0x1234u);
    EXPECT_EQ(word<std::uint32_t>(&e, 2), 2u);
    EXPECT_EQ(word<const char*>(&e, 3), e.reason());
    EXPECT_EQ(sizeof(CORBA_SystemException), 3 * sizeof(void*) + sizeof(CORBA_String_var));
}

TEST(ExceptionLayout, StdExceptionAddsDescriptionAndFactory) {
    const CORBA_BAD_PARAM e;
    const std::size_t first = sizeof(CORBA_SystemException) / sizeof(void*);
    EXPECT_EQ(word<Description*>(&e, first), &CORBA_BAD_PARAM::_description);
    EXPECT_EQ(word<Description::Factory>(&e, first + 1), &CORBA_BAD_PARAM::_factory);
    EXPECT_EQ(sizeof(KELStdException), sizeof(CORBA_SystemException) + 2 * sizeof(void*));
}

TEST(ExceptionLayout, StandardExceptionsAddNoField) {
#define KEL_STANDARD_EXCEPTION(X) EXPECT_EQ(sizeof(CORBA_##X), sizeof(KELStdException));
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
}

TEST(ExceptionLayout, ClassTree) {
    EXPECT_TRUE((std::is_base_of<CORBA_Exception, CORBA_SystemException>::value));
    EXPECT_TRUE((std::is_base_of<CORBA_Exception, CORBA_UserException>::value));
    EXPECT_TRUE((std::is_base_of<CORBA_UserException, KELRemarshal>::value));
    EXPECT_TRUE((std::is_base_of<CORBA_SystemException, KELStdException>::value));
    EXPECT_TRUE((std::is_base_of<KELStdException, CORBA_BAD_PARAM>::value));
}

}  // namespace
