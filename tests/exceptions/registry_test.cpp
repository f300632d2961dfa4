// Descriptions and the registry that finds them by repository id.
// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <memory>
#include <new>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include "tests/exceptions/sample_exceptions.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace {

typedef CORBA_Exception::Description Description;

using kel::test::AllocationPlan;
using kel::test::Armed;
using kel::test::Derived;
using kel::test::in_child;
using kel::test::Outcome;
using kel::test::Sample;

const char* const an_id = "IDL:test/Registry:1.0";

std::unique_ptr<Description> describe(const char* id, const Description* base = nullptr) {
    return std::unique_ptr<Description>(new Description("Registry", id, nullptr, base, nullptr));
}

// ---- what a description holds ----

TEST(Description, KeepsWhatItIsGiven) {
    const CORBA_TypeCode* const tc = reinterpret_cast<const CORBA_TypeCode*>(&an_id);
    const Description d("A::B", an_id, Sample::_factory, &Sample::_description, tc);
    EXPECT_STREQ(d.name(), "A::B");
    EXPECT_STREQ(d.repository_id(), an_id);
    EXPECT_EQ(d.factory(), &Sample::_factory);
    EXPECT_EQ(d.base(), &Sample::_description);
    EXPECT_EQ(d.type_code(), tc);
}

TEST(Description, DoesNotCopyItsTexts) {
    char name[] = "name";
    char id[] = "IDL:test/Borrowed:1.0";
    const Description d(name, id, nullptr, nullptr, nullptr);
    EXPECT_EQ(d.name(), name);
    EXPECT_EQ(d.repository_id(), id);
}

TEST(Description, TypeCodeCanBeSetLater) {
    Description d("Typed", an_id, nullptr, nullptr, nullptr);
    d.type_code(reinterpret_cast<const CORBA_TypeCode*>(&d));
    EXPECT_EQ(d.type_code(), reinterpret_cast<const CORBA_TypeCode*>(&d));
}

TEST(Description, IsNotCopied) {
    EXPECT_FALSE(std::is_copy_constructible<Description>::value);
    EXPECT_FALSE(std::is_copy_assignable<Description>::value);
}

TEST(Description, HasAVirtualDestructor) {
    class Watched : public Description {
    public:
        explicit Watched(bool& gone)
            : Description("Watched", an_id, nullptr, nullptr, nullptr), _gone(gone) {}
        ~Watched() override { _gone = true; }

    private:
        bool& _gone;
    };
    bool gone = false;
    Description* d = new Watched(gone);
    delete d;
    EXPECT_TRUE(gone);
}

// ---- the registry ----

TEST(Registry, FindsADescriptionFromItsConstructionOn) {
    EXPECT_EQ(Description::desc(an_id), nullptr);
    const std::unique_ptr<Description> d = describe(an_id);
    EXPECT_EQ(Description::desc(an_id), d.get());
}

TEST(Registry, UnknownIdGivesNull) { EXPECT_EQ(Description::desc("IDL:test/Unknown:1.0"), nullptr); }

TEST(Registry, ComparesTheTextOfIdsAndNotTheirAddress) {
    const std::unique_ptr<Description> d = describe(an_id);
    const std::string same_text(an_id);
    EXPECT_EQ(Description::desc(same_text.c_str()), d.get());
}

TEST(Registry, NullIdIsAnIdLikeAnyOther) {
    EXPECT_EQ(Description::desc(nullptr), nullptr);
    const std::unique_ptr<Description> d = describe(nullptr);
    EXPECT_EQ(Description::desc(nullptr), d.get());
    EXPECT_EQ(Description::desc(""), nullptr);
}

TEST(Registry, FirstDescriptionOfAnIdWins) {
    const std::unique_ptr<Description> first = describe(an_id);
    const std::unique_ptr<Description> second = describe(an_id);
    EXPECT_EQ(Description::desc(an_id), first.get());
}

TEST(Registry, NewcomerStaysUnregisteredAfterTheFirstIsGone) {
    std::unique_ptr<Description> first = describe(an_id);
    const std::unique_ptr<Description> second = describe(an_id);
    first.reset();
    EXPECT_EQ(Description::desc(an_id), nullptr);
}

TEST(Registry, DestroyingASecondDescriptionRemovesTheFirstOnesEntry) {
    const std::unique_ptr<Description> first = describe(an_id);
    describe(an_id).reset();
    EXPECT_EQ(Description::desc(an_id), nullptr);
}

TEST(Registry, DestroyingADescriptionWhoseEntryIsGoneChangesNothing) {
    std::unique_ptr<Description> first = describe(an_id);
    std::unique_ptr<Description> second = describe(an_id);
    second.reset();
    first.reset();
    EXPECT_EQ(Description::desc(an_id), nullptr);
    EXPECT_EQ(Description::desc("IDL:test/Sample:1.0"), &Sample::_description);
}

TEST(Registry, IdCanBeRegisteredAgain) {
    describe(an_id).reset();
    const std::unique_ptr<Description> d = describe(an_id);
    EXPECT_EQ(Description::desc(an_id), d.get());
}

TEST(Registry, AnswersOneIdAfterAnotherAndTheSameAgain) {
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(Description::desc("IDL:test/Sample:1.0"), &Sample::_description);
        EXPECT_EQ(Description::desc("IDL:test/Sample:1.0"), &Sample::_description);
        EXPECT_EQ(Description::desc("IDL:test/Derived:1.0"), &Derived::_description);
        EXPECT_EQ(Description::desc("IDL:test/None:1.0"), nullptr);
    }
}

TEST(Registry, GrowsBeyondItsFirstCapacity) {
    std::string ids[300];
    std::unique_ptr<Description> descriptions[300];
    for (int i = 0; i < 300; ++i) {
        ids[i] = "IDL:test/Many" + std::to_string(i) + ":1.0";
        descriptions[i] = describe(ids[i].c_str());
    }
    for (int i = 0; i < 300; ++i) EXPECT_EQ(Description::desc(ids[i].c_str()), descriptions[i].get());
    EXPECT_EQ(Description::desc("IDL:omg.org/CORBA/UNKNOWN:1.0"), &CORBA_UNKNOWN::_description);
}

TEST(Registry, TakesNoLock) {
    kel::test::reset_faults();
    {
        Armed armed;
        const std::unique_ptr<Description> d = describe(an_id);
        Description::desc(an_id);
    }
    EXPECT_EQ(kel::test::seams::pthread_mutex_lock.calls(), 0);
    kel::test::reset_faults();
}

TEST(Registry, ThreadsMayLookUpTogether) {
    const char* const ids[] = {"IDL:test/Sample:1.0", "IDL:test/Derived:1.0", "IDL:omg.org/CORBA/UNKNOWN:1.0",
                               "IDL:test/None:1.0"};
    const Description* const expected[] = {&Sample::_description, &Derived::_description,
                                           &CORBA_UNKNOWN::_description, nullptr};
    int wrong[4] = {};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            for (int i = t; i < 4000; ++i) wrong[t] += Description::desc(ids[i % 4]) != expected[i % 4];
        });
    }
    for (std::thread& t : threads) t.join();
    for (const int n : wrong) EXPECT_EQ(n, 0);
}

class RegistryWithoutMemory : public kel::test::FaultTest {};

TEST_F(RegistryWithoutMemory, DescriptionThatCannotBeRegisteredIsNotConstructed) {
    // More than the registry has in reserve, so that registering one needs memory.
    std::string ids[40];
    std::unique_ptr<Description> others[40];
    for (int i = 0; i < 40; ++i) {
        ids[i] = "IDL:test/Other" + std::to_string(i) + ":1.0";
        others[i] = describe(ids[i].c_str());
    }
    AllocationPlan::fail(1);
    {
        Armed armed;
        EXPECT_THROW(Description("Late", an_id, nullptr, nullptr, nullptr), std::bad_alloc);
    }
    EXPECT_EQ(Description::desc(an_id), nullptr);
    EXPECT_EQ(Description::desc(ids[39].c_str()), others[39].get());
}

TEST(Registry, HoldsTheThreeRoots) {
    EXPECT_EQ(Description::desc("IDL:omg.org/CORBA/Exception:1.0"), &CORBA_Exception::_description);
    EXPECT_EQ(Description::desc("IDL:omg.org/CORBA/SystemException:1.0"),
              &CORBA_SystemException::_description);
    EXPECT_EQ(Description::desc("IDL:omg.org/CORBA/UserException:1.0"), &CORBA_UserException::_description);
}

// ---- tracing was decided when the process started ----

TEST(Registry, ConstructionPrintsNothingWithoutTracing) {
    const Outcome o = in_child([] { describe(an_id); });
    EXPECT_EQ(o.out, "");
}

TEST(Registry, VariableThatIsSetLaterDoesNotStartTracing) {
    const Outcome o = in_child([] {
        ::setenv("DEBUG_STATIC", "1", 1);
        describe(an_id);
    });
    EXPECT_EQ(o.out, "");
}

// ---- membership ----

TEST(CanCast, ToItself) { EXPECT_TRUE(Sample::_description.can_cast(Sample::_description)); }

TEST(CanCast, ToEveryBase) {
    EXPECT_TRUE(Derived::_description.can_cast(Sample::_description));
    EXPECT_TRUE(Derived::_description.can_cast(CORBA_UserException::_description));
    EXPECT_TRUE(Derived::_description.can_cast(CORBA_Exception::_description));
}

TEST(CanCast, NotToADerivedClass) {
    EXPECT_FALSE(Sample::_description.can_cast(Derived::_description));
    EXPECT_FALSE(CORBA_Exception::_description.can_cast(Sample::_description));
}

TEST(CanCast, SystemExceptionToTheRootButNotToUserExceptions) {
    EXPECT_TRUE(CORBA_BAD_PARAM::_description.can_cast(CORBA_Exception::_description));
    EXPECT_FALSE(CORBA_BAD_PARAM::_description.can_cast(CORBA_UserException::_description));
}

TEST(CanCast, ComparesTheObjectsAndNotTheirIds) {
    const std::unique_ptr<Description> first = describe(an_id);
    const std::unique_ptr<Description> twin = describe(an_id);
    EXPECT_FALSE(first->can_cast(*twin));
}

TEST(CanCast, IsABool) {
    EXPECT_TRUE((std::is_same<bool, decltype(Sample::_description.can_cast(Sample::_description))>::value));
}

}  // namespace
