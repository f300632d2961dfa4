// Exceptions on marshalling streams and on standard streams.
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/exceptions/standard.h>

#include <iostream>
#include <new>
#include <sstream>
#include <string>

#include "tests/exceptions/recording_streams.h"
#include "tests/exceptions/sample_exceptions.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

namespace {

using kel::test::AllocationPlan;
using kel::test::Armed;
using kel::test::in_child;
using kel::test::Outcome;
using kel::test::RecordingOstream;
using kel::test::Sample;
using kel::test::ScriptedIstream;
using testing::ElementsAre;

// The text of a repository id as it travels, so that tests state only the id.
std::string encoded(const std::string& s) { return std::to_string(s.size() + 1) + "\"" + s + "\"\n"; }

std::string marshalled(const CORBA_Exception& e) {
    std::ostringstream text;
    KELostream out(text);
    out << e;
    return text.str();
}

CORBA_Exception* unmarshalled(const std::string& wire) {
    std::istringstream text(wire);
    KEListream in(text);
    CORBA_Exception* e = nullptr;
    in >> e;
    return e;
}

const CORBA_SystemException& system_part(const CORBA_Exception_var& e) {
    return *CORBA_SystemException::_downcast(e.in());
}

// ---- writing ----

TEST(ExceptionStreams, WritesTheRepositoryIdAndThenTheBody) {
    RecordingOstream out;
    out << CORBA_BAD_PARAM(0x1234, CORBA::COMPLETED_MAYBE);
    EXPECT_THAT(out.calls, ElementsAre("text IDL:omg.org/CORBA/BAD_PARAM:1.0", "ulong 4660", "ulong 2"));
}

TEST(ExceptionStreams, TextFormOfAnException) {
    EXPECT_EQ(marshalled(CORBA_BAD_PARAM(0x1234, CORBA::COMPLETED_YES)),
              encoded("IDL:omg.org/CORBA/BAD_PARAM:1.0") + "4660 0 ");
}

TEST(ExceptionStreams, WritingUsesTheIdThatTheExceptionNames) {
    EXPECT_EQ(marshalled(Sample(7)), encoded("IDL:test/Sample:1.0") + "7 ");
}

TEST(ExceptionStreams, WritingReturnsTheStream) {
    RecordingOstream out;
    KELostream& base = out;
    EXPECT_EQ(&(base << CORBA_UNKNOWN()), &base);
}

// ---- reading ----

TEST(ExceptionStreams, ReadingCreatesTheClassThatTheIdNames) {
    CORBA_Exception_var e(unmarshalled(encoded("IDL:omg.org/CORBA/MARSHAL:1.0") + "77 2 "));
    ASSERT_NE(dynamic_cast<CORBA_MARSHAL*>(e.in()), nullptr);
    EXPECT_EQ(system_part(e).minor(), 77u);
    EXPECT_EQ(system_part(e).completed(), CORBA::COMPLETED_MAYBE);
}

TEST(ExceptionStreams, ReadingGivesBackWhatWasWritten) {
    CORBA_Exception_var e(unmarshalled(marshalled(Sample(42))));
    ASSERT_NE(dynamic_cast<Sample*>(e.in()), nullptr);
    EXPECT_EQ(dynamic_cast<Sample*>(e.in())->number, 42);
}

TEST(ExceptionStreams, ReadsAMarkerWithoutABody) {
    CORBA_Exception_var e(unmarshalled(encoded("IDL:kel.internal/KELRemarshal:1.0")));
    EXPECT_NE(KELRemarshal::_downcast(e.in()), nullptr);
}

TEST(ExceptionStreams, ReadingOverwritesThePointerWithoutDeleting) {
    Sample mine;
    CORBA_Exception* e = &mine;
    std::istringstream text(encoded("IDL:test/Sample:1.0") + "7 ");
    KEListream in(text);
    in >> e;
    EXPECT_NE(e, &mine);
    CORBA::release(e);
}

TEST(ExceptionStreams, ReadingReturnsTheStream) {
    std::istringstream text(encoded("IDL:test/Sample:1.0") + "7 ");
    KEListream in(text);
    CORBA_Exception* e = nullptr;
    EXPECT_EQ(&(in >> e), &in);
    CORBA::release(e);
}

TEST(ExceptionStreams, ReadsTheIdFromABinaryStream) {
    const std::string id = "IDL:omg.org/CORBA/TIMEOUT:1.0";
    ScriptedIstream in({id.size() + 1, 9, 0}, id + '\0');
    CORBA_Exception* read = nullptr;
    static_cast<KEListream&>(in) >> read;
    CORBA_Exception_var e(read);
    ASSERT_NE(dynamic_cast<CORBA_TIMEOUT*>(e.in()), nullptr);
    EXPECT_EQ(system_part(e).minor(), 9u);
}

TEST(ExceptionStreams, UnknownIdGivesADefaultUnknown) {
    CORBA_Exception_var e(unmarshalled(encoded("IDL:test/Nobody:1.0") + "77 2 "));
    ASSERT_NE(dynamic_cast<CORBA_UNKNOWN*>(e.in()), nullptr);
    EXPECT_EQ(system_part(e).minor(), CORBA::OMGVMCID);
    EXPECT_EQ(system_part(e).completed(), CORBA::COMPLETED_NO);
}

TEST(ExceptionStreams, UnknownIdLeavesTheBodyUnread) {
    std::istringstream text(encoded("IDL:test/Nobody:1.0") + "77 2 ");
    KEListream in(text);
    CORBA_Exception* e = nullptr;
    in >> e;
    CORBA::release(e);
    unsigned long next = 0;
    in >> next;
    EXPECT_EQ(next, 77u);
}

TEST(ExceptionStreams, NullIdGivesUnknown) {
    CORBA_Exception_var e(unmarshalled("0 "));
    EXPECT_NE(dynamic_cast<CORBA_UNKNOWN*>(e.in()), nullptr);
}

class AbstractId : public testing::TestWithParam<const char*> {};

TEST_P(AbstractId, GivesUnknownAndLeavesTheBodyUnread) {
    std::istringstream text(encoded(GetParam()) + "77 2 ");
    KEListream in(text);
    CORBA_Exception* read = nullptr;
    in >> read;
    CORBA_Exception_var e(read);
    EXPECT_NE(dynamic_cast<CORBA_UNKNOWN*>(e.in()), nullptr);
    unsigned long next = 0;
    in >> next;
    EXPECT_EQ(next, 77u);
}

INSTANTIATE_TEST_SUITE_P(ExceptionStreams, AbstractId,
                         testing::Values("IDL:omg.org/CORBA/Exception:1.0",
                                         "IDL:omg.org/CORBA/SystemException:1.0",
                                         "IDL:omg.org/CORBA/UserException:1.0"));

TEST(ExceptionStreams, PointerIsNullWhenTheIdCannotBeRead) {
    ScriptedIstream in({});
    Sample mine;
    CORBA_Exception* e = &mine;
    EXPECT_THROW(static_cast<KEListream&>(in) >> e, int);
    EXPECT_EQ(e, nullptr);
}

TEST(ExceptionStreams, CallerOwnsTheExceptionWhenTheBodyCannotBeRead) {
    std::istringstream text(encoded("IDL:test/Sample:1.0"));
    KEListream in(text);
    CORBA_Exception* e = nullptr;
    Sample::refuse_to_read = true;
    EXPECT_THROW(in >> e, int);
    Sample::refuse_to_read = false;
    CORBA_Exception_var hold(e);
    EXPECT_NE(dynamic_cast<Sample*>(hold.in()), nullptr);
}

// Reading an exception whose `nth` allocation fails, or none of them when there are fewer.
class ReadingWithoutMemory : public kel::test::FaultTest, public testing::WithParamInterface<const char*> {
protected:
    // Whether the read got through.
    bool read_failing_at(long nth) {
        std::istringstream text(encoded(GetParam()) + "77 2 ");
        KEListream in(text);
        CORBA_Exception* e = nullptr;
        const long before = AllocationPlan::live_blocks();
        AllocationPlan::fail(nth);
        bool got_through = true;
        try {
            Armed armed;
            in >> e;
        } catch (const std::bad_alloc&) {
            got_through = false;
        }
        kel::test::reset_faults();
        EXPECT_EQ(e != nullptr, got_through);
        CORBA::release(e);
        EXPECT_EQ(AllocationPlan::live_blocks(), before);
        return got_through;
    }
};

TEST_P(ReadingWithoutMemory, LeavesNothingBehind) {
    long nth = 1;
    while (!read_failing_at(nth)) ++nth;
    EXPECT_EQ(nth, 3);  // the text of the id and the exception
}

INSTANTIATE_TEST_SUITE_P(ExceptionStreams, ReadingWithoutMemory,
                         testing::Values("IDL:omg.org/CORBA/MARSHAL:1.0", "IDL:test/Nobody:1.0"));

// ---- standard streams ----

TEST(ExceptionStreams, OtherStreamsGetTheBodyWithoutTheRepositoryId) {
    std::ostringstream text;
    text << CORBA_BAD_PARAM(0x1234, CORBA::COMPLETED_MAYBE, "not shown");
    EXPECT_EQ(text.str(), "4660 2 ");
}

TEST(ExceptionStreams, StreamThatSharesTheConsolesBufferIsNoConsole) {
    const Outcome o = in_child([] {
        std::ostream twin(std::cout.rdbuf());
        twin << CORBA_BAD_PARAM(0x1234, CORBA::COMPLETED_NO);
    });
    EXPECT_EQ(o.out, "4660 1 ");
}

TEST(ExceptionStreams, StandardOutputGetsThePrettyForm) {
    const Outcome o = in_child([] { std::cout << CORBA_BAD_PARAM(5, CORBA::COMPLETED_NO, "too long"); });
    EXPECT_EQ(o.out,
              "Exception: CORBA::BAD_PARAM\n"
              "\tExplanation: too long\n"
              "\tMinor: 1330446341 \n"
              "\tCompletion Status: NO\n");
}

TEST(ExceptionStreams, StandardErrorGetsThePrettyForm) {
    const Outcome o = in_child([] { std::cerr << Sample(7); });
    EXPECT_EQ(o.err, "Exception: Sample\n");
}

TEST(ExceptionStreams, LogStreamGetsThePrettyFormInTheEncodingOfOtherStreams) {
    const Outcome o = in_child([] { std::clog << Sample(7); });
    EXPECT_EQ(o.err, "12\"Exception: \"\n7\"Sample\"\n\n");
}

TEST(ExceptionStreams, InsertionReturnsTheStandardStream) {
    std::ostringstream text;
    EXPECT_EQ(&(text << Sample(7)), &text);
}

}  // namespace
