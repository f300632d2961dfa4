// What all system exceptions share: minor code, status, explanation, body and pretty form.
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <cstring>
#include <iostream>
#include <limits>
#include <new>
#include <sstream>
#include <string>
#include <type_traits>

#include "tests/exceptions/recording_streams.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace {

using kel::test::AllocationPlan;
using kel::test::Armed;
using kel::test::in_child;
using kel::test::RecordingOstream;
using kel::test::ScriptedIstream;
using testing::ElementsAre;

CORBA::CompletionStatus status(unsigned long n) { return static_cast<CORBA::CompletionStatus>(n); }

// The highest bit of a minor code, whose width is that of the platform's unsigned long.
const unsigned long top_bit = ~(~0ul >> 1);

// ---- constants ----

TEST(CompletionStatus, HasTheMarshalledNumbers) {
    EXPECT_EQ(static_cast<unsigned>(CORBA::COMPLETED_YES), 0u);
    EXPECT_EQ(static_cast<unsigned>(CORBA::COMPLETED_NO), 1u);
    EXPECT_EQ(static_cast<unsigned>(CORBA::COMPLETED_MAYBE), 2u);
}

TEST(CompletionStatus, IsThirtyTwoBitsWide) {
    EXPECT_TRUE((std::is_same<std::underlying_type<CORBA::CompletionStatus>::type, std::uint32_t>::value));
}

TEST(MinorCodeSet, OfTheOmgIsAConstantUnsignedLong) {
    EXPECT_EQ(CORBA::OMGVMCID, 0x4f4d0000ul);
    EXPECT_TRUE((std::is_same<decltype(CORBA::OMGVMCID), const unsigned long>::value));
}

// ---- the minor-code rule ----

struct MinorCode {
    unsigned long given;
    unsigned long stored;
};

class MinorCodeRule : public testing::TestWithParam<MinorCode> {};

TEST_P(MinorCodeRule, DecidesWhatAConstructorStores) {
    EXPECT_EQ(CORBA_BAD_PARAM(GetParam().given, CORBA::COMPLETED_NO).minor(), GetParam().stored);
    EXPECT_EQ(CORBA_BAD_PARAM(GetParam().given, CORBA::COMPLETED_NO, "why").minor(), GetParam().stored);
}

TEST_P(MinorCodeRule, DecidesWhatInitStores) {
    CORBA_BAD_PARAM e;
    e.init(GetParam().given, CORBA::COMPLETED_YES);
    EXPECT_EQ(e.minor(), GetParam().stored);
}

INSTANTIATE_TEST_SUITE_P(SystemException, MinorCodeRule,
                         testing::Values(MinorCode{0, 0x4f4d0000}, MinorCode{5, 0x4f4d0005},
                                         MinorCode{11, 0x4f4d000b}, MinorCode{0xfff, 0x4f4d0fff},
                                         MinorCode{0x1000, 0x1000}, MinorCode{0x1001, 0x1001},
                                         MinorCode{0x4f4d0005, 0x4f4d0005}, MinorCode{0x4b450001, 0x4b450001},
                                         MinorCode{0x80000000, 0x80000000}, MinorCode{0xfffffffe, 0xfffffffe},
                                         MinorCode{~0ul, ~0ul}, MinorCode{top_bit | 5, top_bit | 5}));

// ---- construction ----

TEST(SystemException, InitStoresTheStatus) {
    CORBA_BAD_PARAM e;
    e.init(1, CORBA::COMPLETED_MAYBE);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
}

TEST(SystemException, InitLeavesTheExplanation) {
    CORBA_BAD_PARAM e(1, CORBA::COMPLETED_NO, "why");
    e.init(2, CORBA::COMPLETED_YES);
    EXPECT_STREQ(e.reason(), "why");
}

TEST(SystemException, ExplanationIsEmptyWhenNoneIsGiven) {
    EXPECT_STREQ(CORBA_BAD_PARAM(1, CORBA::COMPLETED_NO).reason(), "");
}

TEST(SystemException, ExplanationIsCopied) {
    char text[] = "first";
    const CORBA_BAD_PARAM e(1, CORBA::COMPLETED_NO, text);
    std::strcpy(text, "other");
    EXPECT_STREQ(e.reason(), "first");
}

TEST(SystemException, NullExplanationStaysNull) {
    EXPECT_EQ(CORBA_BAD_PARAM(1, CORBA::COMPLETED_NO, nullptr).reason(), nullptr);
}

TEST(SystemException, SettersStoreWhatTheyAreGiven) {
    CORBA_BAD_PARAM e;
    e.minor(5);
    e.completed(CORBA::COMPLETED_MAYBE);
    e.reason("later");
    EXPECT_EQ(e.minor(), 5u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
    EXPECT_STREQ(e.reason(), "later");
}

TEST(SystemException, IsAbstract) { EXPECT_TRUE(std::is_abstract<CORBA_SystemException>::value); }

TEST(SystemException, DescribesItselfUnlessAClassSaysMore) {
    class Plain : public CORBA_SystemException {
    public:
        Plain() : CORBA_SystemException(3, CORBA::COMPLETED_YES) {}
        void _raise() const override { throw *this; }
        CORBA_Exception* _deep_copy() override { return new Plain(*this); }
    };
    EXPECT_EQ(Plain()._desc(), &CORBA_SystemException::_description);
    EXPECT_EQ(Plain().minor(), 0x4f4d0003u);
}

// ---- the body ----

TEST(SystemExceptionBody, IsMinorCodeAndStatusAsUnsignedLongs) {
    RecordingOstream out;
    CORBA_BAD_PARAM(0x1234, CORBA::COMPLETED_MAYBE, "stays here")._write(out);
    EXPECT_THAT(out.calls, ElementsAre("ulong 4660", "ulong 2"));
}

TEST(SystemExceptionBody, ReadsMinorCodeAndStatusAsUnsignedLongs) {
    ScriptedIstream in({0x12345678, 0, 99});
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_EQ(e.minor(), 0x12345678u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_YES);
    EXPECT_EQ(in.left(), 1u);
}

TEST(SystemExceptionBody, ReadingKeepsAMinorCodeOutsideEverySet) {
    ScriptedIstream in({5, 1});
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_EQ(e.minor(), 5u);
}

TEST(SystemExceptionBody, ReadingLeavesTheExplanation) {
    ScriptedIstream in({5, 1});
    CORBA_BAD_PARAM e(1, CORBA::COMPLETED_NO, "why");
    e._copy(in);
    EXPECT_STREQ(e.reason(), "why");
}

TEST(SystemExceptionBody, ReadingKeepsAStatusThatIsNoneOfTheThree) {
    ScriptedIstream in({5, 7});
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_EQ(static_cast<std::uint32_t>(e.completed()), 7u);
}

TEST(SystemExceptionBody, ReadingKeepsTheGreatestStatus) {
    ScriptedIstream in({5, 0xffffffff});
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_EQ(static_cast<std::uint32_t>(e.completed()), 0xffffffffu);
}

TEST(SystemExceptionBody, StatusWhoseLowBitsAreAValidOneIsStillNoneOfTheThree) {
    ScriptedIstream in({5, top_bit | 1});
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_GT(static_cast<std::uint32_t>(e.completed()), 2u);
}

TEST(SystemExceptionBody, FailedReadOfTheStatusLeavesTheMinorCodeThatWasRead) {
    ScriptedIstream in({5});
    CORBA_BAD_PARAM e(0x1000, CORBA::COMPLETED_YES);
    EXPECT_THROW(e._copy(in), int);
    EXPECT_EQ(e.minor(), 5u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_YES);
}

TEST(SystemExceptionBody, EndedStreamLeavesBoth) {
    std::istringstream text;
    text.setstate(std::ios::eofbit);
    KEListream in(text);
    CORBA_BAD_PARAM e(0x1000, CORBA::COMPLETED_MAYBE);
    e._copy(in);
    EXPECT_EQ(e.minor(), 0x1000u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
}

TEST(SystemExceptionBody, TravelsThroughText) {
    std::ostringstream text;
    KELostream out(text);
    CORBA_BAD_PARAM(0xfffffffe, CORBA::COMPLETED_MAYBE)._write(out);
    EXPECT_EQ(text.str(), "4294967294 2 ");
    std::istringstream back(text.str());
    KEListream in(back);
    CORBA_BAD_PARAM e;
    e._copy(in);
    EXPECT_EQ(e.minor(), 0xfffffffeu);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
}

// ---- the pretty form ----

std::string pretty(const CORBA_Exception& e) {
    return in_child([&] {
               KELostream out(std::cout);
               e._pretty_print(out);
           })
        .out;
}

TEST(SystemExceptionPrettyForm, HasFourLines) {
    EXPECT_EQ(pretty(CORBA_NO_RESOURCES(0x1000, CORBA::COMPLETED_YES, "none left")),
              "Exception: CORBA::NO_RESOURCES\n"
              "\tExplanation: none left\n"
              "\tMinor: 4096 \n"
              "\tCompletion Status: YES\n");
}

TEST(SystemExceptionPrettyForm, EmptyExplanationPrintsNoLine) {
    const char* const without =
        "Exception: CORBA::NO_RESOURCES\n"
        "\tMinor: 4096 \n"
        "\tCompletion Status: NO\n";
    EXPECT_EQ(pretty(CORBA_NO_RESOURCES(0x1000, CORBA::COMPLETED_NO)), without);
    EXPECT_EQ(pretty(CORBA_NO_RESOURCES(0x1000, CORBA::COMPLETED_NO, "")), without);
}

TEST(SystemExceptionPrettyForm, NullExplanationPrintsNoLine) {
    EXPECT_EQ(pretty(CORBA_NO_RESOURCES(0x1000, CORBA::COMPLETED_MAYBE, nullptr)),
              "Exception: CORBA::NO_RESOURCES\n"
              "\tMinor: 4096 \n"
              "\tCompletion Status: MAYBE\n");
}

TEST(SystemExceptionPrettyForm, GoesThroughTheOperationsOfTheStream) {
    RecordingOstream out;
    CORBA_TIMEOUT(5, CORBA::COMPLETED_NO, "late")._pretty_print(out);
    EXPECT_THAT(out.calls, ElementsAre("text Exception: ", "text CORBA::TIMEOUT", "text \n",  //
                                       "text \tExplanation: ", "text late", "text \n",        //
                                       "text \tMinor: ", "ulong 1330446341", "text \n",       //
                                       "text \tCompletion Status: ", "text NO", "text \n"));
}

class InvalidStatus : public testing::TestWithParam<unsigned long> {};

TEST_P(InvalidStatus, IsPrintedAsSuch) {
    RecordingOstream out;
    CORBA_TIMEOUT(5, status(GetParam()))._pretty_print(out);
    ASSERT_EQ(out.calls.size(), 9u);
    EXPECT_EQ(out.calls[7], "text Invalid status");
}

INSTANTIATE_TEST_SUITE_P(SystemExceptionPrettyForm, InvalidStatus,
                         testing::Values(3, 7, 256, 257, 0x10001, 0x80000000, 0xffffffff));

// ---- KELStdException ----

CORBA_Exception* make_timeout() { return new CORBA_TIMEOUT; }

KELStdException standard(unsigned long minor, CORBA::CompletionStatus completed) {
    return KELStdException(minor, completed, CORBA_TIMEOUT::_description, make_timeout);
}

TEST(StdException, TakesMinorCodeStatusDescriptionAndFactory) {
    const KELStdException e = standard(5, CORBA::COMPLETED_MAYBE);
    EXPECT_EQ(e.minor(), 0x4f4d0005u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
    EXPECT_STREQ(e.reason(), "");
    EXPECT_EQ(e._desc(), &CORBA_TIMEOUT::_description);
}

TEST(StdException, TakesAnExplanationAfterTheStatus) {
    const KELStdException e(5, CORBA::COMPLETED_YES, "late", CORBA_TIMEOUT::_description, make_timeout);
    EXPECT_STREQ(e.reason(), "late");
    EXPECT_EQ(e.minor(), 0x4f4d0005u);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_YES);
    EXPECT_EQ(e._desc(), &CORBA_TIMEOUT::_description);
}

TEST(StdException, DefaultsToMinorCodeZeroAndNotCompleted) {
    const KELStdException e(CORBA_TIMEOUT::_description, make_timeout);
    EXPECT_EQ(e.minor(), CORBA::OMGVMCID);
    EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
    EXPECT_EQ(e._desc(), &CORBA_TIMEOUT::_description);
}

TEST(StdException, RaiseThrowsTheImplementationClassThatDescribesTheConcreteOne) {
    try {
        standard(5, CORBA::COMPLETED_MAYBE)._raise();
        FAIL() << "nothing was thrown";
    } catch (const KELStdException& e) {
        EXPECT_EQ(typeid(e), typeid(KELStdException));
        EXPECT_EQ(e._desc(), &CORBA_TIMEOUT::_description);
        EXPECT_EQ(e.minor(), 0x4f4d0005u);
        EXPECT_EQ(e.completed(), CORBA::COMPLETED_MAYBE);
    }
}

TEST(StdException, ThrownAsSuchIsNotCaughtByAHandlerForTheConcreteClass) {
    EXPECT_THROW(
        {
            try {
                standard(5, CORBA::COMPLETED_NO)._raise();
            } catch (const CORBA_TIMEOUT&) {
            }
        },
        KELStdException);
}

TEST(StdException, DowncastGoesByTheDescription) {
    KELStdException e = standard(5, CORBA::COMPLETED_NO);
    CORBA_TIMEOUT* const cast = CORBA_TIMEOUT::_downcast(&e);
    EXPECT_EQ(static_cast<void*>(cast), static_cast<void*>(&e));
    EXPECT_EQ(CORBA_MARSHAL::_downcast(&e), nullptr);
}

TEST(StdException, DeepCopyCallsTheStoredFactory) {
    KELStdException e = standard(5, CORBA::COMPLETED_NO);
    CORBA_Exception_var copy(e._deep_copy());
    EXPECT_NE(dynamic_cast<CORBA_TIMEOUT*>(copy.in()), nullptr);
}

TEST(StdException, CopyOfARaisedOneStillCallsItsFactory) {
    try {
        standard(5, CORBA::COMPLETED_NO)._raise();
    } catch (KELStdException& e) {
        CORBA_Exception_var copy(e._deep_copy());
        EXPECT_NE(dynamic_cast<CORBA_TIMEOUT*>(copy.in()), nullptr);
    }
}

TEST(StdException, DeepCopyDoesNotApplyTheMinorCodeRuleAgain) {
    CORBA_MARSHAL e;
    e.minor(5);
    CORBA_Exception_var copy(e._deep_copy());
    EXPECT_EQ(CORBA_SystemException::_downcast(copy.in())->minor(), 5u);
}

TEST(StdException, RaiseDoesNotApplyTheMinorCodeRuleAgain) {
    CORBA_MARSHAL e;
    e.minor(5);
    try {
        e._raise();
    } catch (const CORBA_MARSHAL& raised) {
        EXPECT_EQ(raised.minor(), 5u);
    }
}

TEST(StdException, DeepCopyKeepsANullExplanationNull) {
    CORBA_MARSHAL e(5, CORBA::COMPLETED_NO, nullptr);
    CORBA_Exception_var copy(e._deep_copy());
    EXPECT_EQ(CORBA_SystemException::_downcast(copy.in())->reason(), nullptr);
}

TEST(StdException, RaiseKeepsANullExplanationNull) {
    try {
        CORBA_MARSHAL(5, CORBA::COMPLETED_NO, nullptr)._raise();
    } catch (const CORBA_MARSHAL& raised) {
        EXPECT_EQ(raised.reason(), nullptr);
    }
}

TEST(StdException, DeepCopyOwnsItsExplanation) {
    CORBA_MARSHAL e(5, CORBA::COMPLETED_NO, "why");
    CORBA_Exception_var copy(e._deep_copy());
    EXPECT_NE(CORBA_SystemException::_downcast(copy.in())->reason(), e.reason());
    EXPECT_STREQ(CORBA_SystemException::_downcast(copy.in())->reason(), "why");
}

// ---- without memory ----

class WithoutMemory : public kel::test::FaultTest {
protected:
    CORBA_MARSHAL _e{5, CORBA::COMPLETED_NO, "a text that has to be allocated"};
};

TEST_F(WithoutMemory, DeepCopyThatGetsNoObjectThrows) {
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(_e._deep_copy(), std::bad_alloc);
}

TEST_F(WithoutMemory, DeepCopyThatGetsNoExplanationLeavesNoObjectBehind) {
    const long before = AllocationPlan::live_blocks();
    AllocationPlan::fail(2);
    {
        Armed armed;
        EXPECT_THROW(_e._deep_copy(), std::bad_alloc);
        EXPECT_EQ(AllocationPlan::calls(), 2);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(WithoutMemory, RaiseSurfacesAsBadAlloc) {
    AllocationPlan::fail(1);
    Armed armed;
    EXPECT_THROW(_e._raise(), std::bad_alloc);
}

}  // namespace
