// The root of the tree, its user exceptions, and what owns an exception on the heap.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/exception.h>
#include <kel/exceptions/standard.h>

#include <sstream>
#include <string>
#include <type_traits>

#include "tests/exceptions/sample_exceptions.h"
#include "tests/support/fault.h"

namespace {

using kel::test::Derived;
using kel::test::Sample;

// What the root itself says, seen through a class that overrides only what is pure.
class Bare : public CORBA_Exception {
public:
    void _raise() const override { throw *this; }
    CORBA_Exception* _deep_copy() override { return new Bare(*this); }
};

std::string written(const CORBA_Exception& e) {
    std::ostringstream text;
    KELostream out(text);
    e._write(out);
    return text.str();
}

std::string printed(const CORBA_Exception& e) {
    std::ostringstream text;
    KELostream out(text);
    e._pretty_print(out);
    return text.str();
}

// ---- the root ----

TEST(Exception, RootDescribesItself) {
    EXPECT_EQ(Bare()._desc(), &CORBA_Exception::_description);
    EXPECT_STREQ(CORBA_Exception::_description.name(), "CORBA::Exception");
    EXPECT_STREQ(CORBA_Exception::_description.repository_id(), "IDL:omg.org/CORBA/Exception:1.0");
}

TEST(Exception, RootIsAbstractAndHasNoBase) {
    EXPECT_EQ(CORBA_Exception::_description.factory(), nullptr);
    EXPECT_EQ(CORBA_Exception::_description.base(), nullptr);
    EXPECT_TRUE(std::is_abstract<CORBA_Exception>::value);
}

TEST(Exception, RootWritesAnEmptyBody) { EXPECT_EQ(written(Bare()), ""); }

TEST(Exception, RootReadsAnEmptyBody) {
    std::istringstream text("untouched");
    KEListream in(text);
    Bare()._copy(in);
    EXPECT_EQ(in.cur_in_offset(), 0u);
    EXPECT_EQ(text.tellg(), 0);
}

TEST(Exception, NameIsTheOneOfTheDescription) {
    EXPECT_EQ(Sample()._name(), Sample::_description.name());
    EXPECT_STREQ(Bare()._name(), "CORBA::Exception");
}

TEST(Exception, RepositoryIdIsTheOneOfTheDescription) {
    EXPECT_EQ(Sample()._repository_id(), Sample::_description.repository_id());
    EXPECT_STREQ(Bare()._repository_id(), "IDL:omg.org/CORBA/Exception:1.0");
}

TEST(Exception, PrettyFormIsTheHeadingAndTheName) {
    // Encoded strings carry their length and quotes; the line ends with the stream's endl.
    EXPECT_EQ(printed(Bare()), "12\"Exception: \"\n17\"CORBA::Exception\"\n\n");
}

TEST(Exception, HandlerForTheRootCatchesWhatRaiseThrows) {
    EXPECT_THROW(Sample(7)._raise(), CORBA_Exception);
    EXPECT_THROW(CORBA_BAD_PARAM()._raise(), CORBA_Exception);
}

TEST(Exception, MappedNamesAreTheSameClasses) {
    EXPECT_TRUE((std::is_same<CORBA::Exception, CORBA_Exception>::value));
    EXPECT_TRUE((std::is_same<CORBA::Exception_var, CORBA_Exception_var>::value));
    EXPECT_TRUE((std::is_same<CORBA::UserException, CORBA_UserException>::value));
    EXPECT_TRUE((std::is_same<CORBA::SystemException, CORBA_SystemException>::value));
}

// ---- user exceptions ----

TEST(UserException, DescriptionDerivesFromTheRootAndIsAbstract) {
    const CORBA_Exception::Description& d = CORBA_UserException::_description;
    EXPECT_STREQ(d.name(), "CORBA::UserException");
    EXPECT_STREQ(d.repository_id(), "IDL:omg.org/CORBA/UserException:1.0");
    EXPECT_EQ(d.factory(), nullptr);
    EXPECT_EQ(d.base(), &CORBA_Exception::_description);
    EXPECT_EQ(d.type_code(), nullptr);
}

TEST(UserException, RaiseAndDeepCopyStayPure) { EXPECT_TRUE(std::is_abstract<CORBA_UserException>::value); }

TEST(UserException, OverridesOnlyTheDescription) {
    class Plain : public CORBA_UserException {
    public:
        void _raise() const override { throw *this; }
        CORBA_Exception* _deep_copy() override { return new Plain(*this); }
    };
    EXPECT_EQ(Plain()._desc(), &CORBA_UserException::_description);
    EXPECT_STREQ(Plain()._name(), "CORBA::UserException");
    EXPECT_EQ(written(Plain()), "");
}

TEST(SystemException, DescriptionDerivesFromTheRootAndIsAbstract) {
    const CORBA_Exception::Description& d = CORBA_SystemException::_description;
    EXPECT_STREQ(d.name(), "CORBA::SystemException");
    EXPECT_STREQ(d.repository_id(), "IDL:omg.org/CORBA/SystemException:1.0");
    EXPECT_EQ(d.factory(), nullptr);
    EXPECT_EQ(d.base(), &CORBA_Exception::_description);
    EXPECT_EQ(d.type_code(), nullptr);
}

// ---- KELRemarshal ----

TEST(Remarshal, DescriptionDerivesFromUserExceptions) {
    const CORBA_Exception::Description& d = KELRemarshal::_description;
    EXPECT_STREQ(d.name(), "KELRemarshal");
    EXPECT_STREQ(d.repository_id(), "IDL:kel.internal/KELRemarshal:1.0");
    EXPECT_EQ(d.factory(), &KELRemarshal::_factory);
    EXPECT_EQ(d.base(), &CORBA_UserException::_description);
    EXPECT_EQ(d.type_code(), nullptr);
}

TEST(Remarshal, IsRegistered) {
    EXPECT_EQ(CORBA_Exception::Description::desc("IDL:kel.internal/KELRemarshal:1.0"),
              &KELRemarshal::_description);
}

TEST(Remarshal, DescribesItself) { EXPECT_EQ(KELRemarshal()._desc(), &KELRemarshal::_description); }

TEST(Remarshal, CarriesNoData) { EXPECT_EQ(written(KELRemarshal()), ""); }

TEST(Remarshal, FactoryMakesOneOnTheHeap) {
    CORBA_Exception_var e(KELRemarshal::_factory());
    EXPECT_NE(dynamic_cast<KELRemarshal*>(e.in()), nullptr);
}

TEST(Remarshal, DeepCopyIsAnotherRemarshal) {
    KELRemarshal original;
    CORBA_Exception_var copy(original._deep_copy());
    EXPECT_NE(copy.in(), &original);
    EXPECT_NE(dynamic_cast<KELRemarshal*>(copy.in()), nullptr);
}

TEST(Remarshal, RaiseThrowsARemarshal) { EXPECT_THROW(KELRemarshal()._raise(), KELRemarshal); }

TEST(Remarshal, HandlerForUserExceptionsCatchesIt) {
    EXPECT_THROW(KELRemarshal()._raise(), CORBA_UserException);
}

// ---- downcast ----

TEST(Downcast, NullGivesNull) {
    CORBA_Exception* none = nullptr;
    EXPECT_EQ(CORBA_SystemException::_downcast(none), nullptr);
    EXPECT_EQ(CORBA_UserException::_downcast(none), nullptr);
    EXPECT_EQ(KELRemarshal::_downcast(none), nullptr);
    EXPECT_EQ(KELRemarshal::_downcast(nullptr), nullptr);
}

TEST(Downcast, GivesTheObjectForItsOwnClassAndItsBases) {
    KELRemarshal e;
    CORBA_Exception* root = &e;
    EXPECT_EQ(KELRemarshal::_downcast(root), &e);
    EXPECT_EQ(CORBA_UserException::_downcast(root), &e);
}

TEST(Downcast, GivesNullForAnotherBranchOfTheTree) {
    KELRemarshal user;
    CORBA_BAD_PARAM system;
    EXPECT_EQ(CORBA_SystemException::_downcast(&user), nullptr);
    EXPECT_EQ(CORBA_UserException::_downcast(&system), nullptr);
    EXPECT_EQ(CORBA_SystemException::_downcast(static_cast<CORBA_Exception*>(&system)), &system);
}

TEST(Downcast, GivesNullForAMoreDerivedClass) {
    Sample e;
    EXPECT_EQ(KELRemarshal::_downcast(&e), nullptr);
}

TEST(Downcast, ConstFormFollowsTheSameRule) {
    const KELRemarshal e;
    const CORBA_Exception* root = &e;
    EXPECT_EQ(KELRemarshal::_downcast(root), &e);
    EXPECT_EQ(CORBA_UserException::_downcast(root), &e);
    EXPECT_EQ(CORBA_SystemException::_downcast(root), nullptr);
    EXPECT_EQ(KELRemarshal::_downcast(static_cast<const CORBA_Exception*>(nullptr)), nullptr);
}

// ---- ownership ----

TEST(ExceptionVar, DestructorDeletesThroughTheVirtualDestructor) {
    const int before = Sample::alive;
    {
        CORBA_Exception_var hold(new Sample);
        EXPECT_EQ(Sample::alive, before + 1);
    }
    EXPECT_EQ(Sample::alive, before);
}

TEST(ExceptionVar, NullIsNothingToDelete) {
    CORBA_Exception_var hold(nullptr);
    EXPECT_EQ(hold.in(), nullptr);
}

TEST(ExceptionVar, ReachesTheHeldException) {
    CORBA_Exception_var hold(new Sample);
    EXPECT_STREQ(hold->_name(), "Sample");
}

TEST(ExceptionVar, AssignmentDeletesTheOldExceptionAndAdoptsTheNewOne) {
    const int before = Sample::alive;
    Sample* second = new Sample(2);
    CORBA_Exception_var hold(new Sample(1));
    hold = second;
    EXPECT_EQ(Sample::alive, before + 1);
    EXPECT_EQ(hold.in(), second);
}

TEST(ExceptionVar, AssigningTheHeldExceptionKeepsIt) {
    const int before = Sample::alive;
    CORBA_Exception_var hold(new Sample);
    hold = hold.in();
    EXPECT_EQ(Sample::alive, before + 1);
}

TEST(ExceptionVar, RetnHandsTheExceptionOver) {
    CORBA_Exception_var hold(new Sample);
    CORBA_Exception_var taken(hold._retn());
    EXPECT_EQ(hold.in(), nullptr);
    EXPECT_NE(taken.in(), nullptr);
}

TEST(ExceptionVar, OutDeletesTheHeldExceptionFirst) {
    const int before = Sample::alive;
    CORBA_Exception_var hold(new Sample);
    hold.out() = nullptr;
    EXPECT_EQ(Sample::alive, before);
}

TEST(ExceptionVar, InoutGivesThePointerItself) {
    CORBA_Exception_var hold;
    hold.inout() = new Sample(3);
    EXPECT_NE(hold.in(), nullptr);
}

TEST(ExceptionVar, IsOnePointerAndIsNotCopied) {
    EXPECT_EQ(sizeof(CORBA_Exception_var), sizeof(void*));
    EXPECT_FALSE(std::is_copy_constructible<CORBA_Exception_var>::value);
    EXPECT_FALSE(std::is_copy_assignable<CORBA_Exception_var>::value);
}

TEST(Release, DeletesThroughTheVirtualDestructor) {
    const int before = Sample::alive;
    CORBA_Exception* e = new Derived;
    EXPECT_EQ(Sample::alive, before + 1);
    CORBA::release(e);
    EXPECT_EQ(Sample::alive, before);
}

TEST(Release, IgnoresNull) {
    const long before = kel::test::AllocationPlan::live_blocks();
    CORBA::release(static_cast<CORBA_Exception*>(nullptr));
    CORBA::release(nullptr);
    CORBA::release(0);
    EXPECT_EQ(kel::test::AllocationPlan::live_blocks(), before);
}

}  // namespace
