// KELLoadLibrary::LoadError as a member of the exception tree.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/load_library.h>
#include <kel/streams/istream.h>
#include <kel/streams/ostream.h>

#include <iostream>
#include <sstream>
#include <string>
#include <type_traits>

#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace {

using kel::test::AllocationPlan;
typedef KELLoadLibrary::LoadError Error;

TEST(LoadError, IsEmptyWhenDefaultConstructed) {
    const Error error;
    EXPECT_STREQ(error.message(), "");
    EXPECT_EQ(error.code(), 0u);
}

TEST(LoadError, CopiesItsMessage) {
    std::string text = "no such file";
    const Error error(text.c_str(), 0);
    text[0] = 'x';
    EXPECT_STREQ(error.message(), "no such file");
}

TEST(LoadError, ANullMessageStaysNull) {
    EXPECT_EQ(Error(static_cast<const char*>(nullptr), 1).message(), nullptr);
}

TEST(LoadError, TheCodeIsAThirtyTwoBitWord) {
    EXPECT_EQ(Error("", 0xffffffffu).code(), 0xffffffffu);
    EXPECT_EQ(Error("", static_cast<unsigned long>(0x100000001ull)).code(), 1u);
}

TEST(LoadError, TheCodeLiesBehindTheMessage) {
    const Error error("text", 5);
    const char* const start = reinterpret_cast<const char*>(&error);
    const char* const message = start + sizeof(CORBA_UserException);
    EXPECT_EQ(reinterpret_cast<const CORBA_String_var*>(message)->in(), error.message());
    EXPECT_EQ(*reinterpret_cast<const std::uint32_t*>(message + sizeof(CORBA_String_var)), 5u);
}

TEST(LoadError, IsAUserException) {
    Error error;
    CORBA_UserException* const base = &error;
    EXPECT_EQ(base->_desc(), &Error::_description);
}

TEST(LoadError, ItsDescriptionNamesTheClass) {
    EXPECT_STREQ(Error::_description.name(), "KELLoadLibrary::LoadError");
    EXPECT_STREQ(Error()._name(), "KELLoadLibrary::LoadError");
}

TEST(LoadError, TheRepositoryIdKeepsTheScopeSeparator) {
    EXPECT_STREQ(Error()._repository_id(), "IDL:kel.internal/KELLoadLibrary::LoadError:1.0");
}

TEST(LoadError, ItsDescriptionHasFactoryBaseAndNoTypeCode) {
    EXPECT_EQ(Error::_description.factory(), &Error::_factory);
    EXPECT_EQ(Error::_description.base(), &CORBA_UserException::_description);
    EXPECT_EQ(Error::_description.type_code(), nullptr);
}

TEST(LoadError, IsRegisteredUnderItsId) {
    EXPECT_EQ(CORBA_Exception::Description::desc("IDL:kel.internal/KELLoadLibrary::LoadError:1.0"),
              &Error::_description);
}

TEST(LoadError, TheFactoryMakesAnEmptyOne) {
    CORBA_Exception_var made(Error::_factory());
    const Error* const error = Error::_downcast(made.in());
    ASSERT_NE(error, nullptr);
    EXPECT_STREQ(error->message(), "");
    EXPECT_EQ(error->code(), 0u);
}

TEST(LoadError, RaisingThrowsACopyOfTheSameClass) {
    const Error error("text", 5);
    try {
        error._raise();
        FAIL() << "returned";
    } catch (const Error& thrown) {
        EXPECT_NE(&thrown, &error);
        EXPECT_STREQ(thrown.message(), "text");
        EXPECT_NE(thrown.message(), error.message());
        EXPECT_EQ(thrown.code(), 5u);
    }
}

TEST(LoadError, IsCaughtAsItsBases) {
    EXPECT_THROW(Error("", 0)._raise(), CORBA_UserException);
    EXPECT_THROW(Error("", 0)._raise(), CORBA_Exception);
}

TEST(LoadError, ADeepCopyHasItsOwnMessageAndTheCode) {
    Error error("text", 5);
    CORBA_Exception_var copy(error._deep_copy());
    const Error* const same = Error::_downcast(copy.in());
    ASSERT_NE(same, nullptr);
    EXPECT_NE(same, &error);
    EXPECT_STREQ(same->message(), "text");
    EXPECT_NE(same->message(), error.message());
    EXPECT_EQ(same->code(), 5u);
}

TEST(LoadError, ADeepCopyWithoutMemoryLeaksNothing) {
    Error error("text", 5);
    const long before = AllocationPlan::live_blocks();
    for (long n = 1; n <= 2; ++n) {
        kel::test::reset_faults();
        AllocationPlan::fail(n);
        kel::test::Armed armed;
        EXPECT_THROW(error._deep_copy(), std::bad_alloc);
    }
    kel::test::reset_faults();
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST(LoadError, DowncastFindsOnlyLoadErrors) {
    Error error;
    CORBA_BAD_PARAM other;
    KELRemarshal sibling;
    EXPECT_EQ(Error::_downcast(static_cast<CORBA_Exception*>(&error)), &error);
    EXPECT_EQ(Error::_downcast(static_cast<const CORBA_Exception*>(&error)), &error);
    EXPECT_EQ(Error::_downcast(&other), nullptr);
    EXPECT_EQ(Error::_downcast(&sibling), nullptr);
    EXPECT_EQ(Error::_downcast(nullptr), nullptr);
    EXPECT_EQ(Error::_downcast(static_cast<CORBA_Exception*>(nullptr)), nullptr);
}

TEST(LoadError, ItsBasesDowncastToo) {
    Error error;
    EXPECT_EQ(CORBA_UserException::_downcast(&error), &error);
    EXPECT_EQ(CORBA_SystemException::_downcast(&error), nullptr);
}

TEST(LoadError, NothingOfItIsMarshalled) {
    std::ostringstream out;
    out << Error("text", 5);
    EXPECT_EQ(out.str(), "");
}

TEST(LoadError, TravelsAsItsIdAlone) {
    std::ostringstream written;
    {
        KELostream out(written);
        out << Error("text", 5);
    }
    std::istringstream text(written.str());
    KEListream in(text);
    CORBA_Exception* read = nullptr;
    in >> read;
    CORBA_Exception_var made(read);
    const Error* const error = Error::_downcast(made.in());
    ASSERT_NE(error, nullptr);
    EXPECT_STREQ(error->message(), "");
    EXPECT_EQ(error->code(), 0u);
}

TEST(LoadError, WritesReadsAndPrintsAsEveryException) {
    EXPECT_TRUE((std::is_same<decltype(&Error::_write), decltype(&CORBA_Exception::_write)>::value));
    EXPECT_TRUE((std::is_same<decltype(&Error::_copy), decltype(&CORBA_Exception::_copy)>::value));
    EXPECT_TRUE(
        (std::is_same<decltype(&Error::_pretty_print), decltype(&CORBA_Exception::_pretty_print)>::value));
    EXPECT_TRUE((std::is_same<decltype(&Error::_name), decltype(&CORBA_Exception::_name)>::value));
    EXPECT_TRUE(
        (std::is_same<decltype(&Error::_repository_id), decltype(&CORBA_Exception::_repository_id)>::value));
}

TEST(LoadError, ThePrettyFormIsTheNameAlone) {
    const kel::test::Outcome o = kel::test::in_child([] { std::cout << Error("text", 5); });
    EXPECT_EQ(o.out, "Exception: KELLoadLibrary::LoadError\n");
}

}  // namespace
