// The words for the codes of an exception.
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <kel/exceptions/explain.h>
#include <kel/exceptions/standard.h>
#include <netdb.h>
#include <string.h>

#include <map>
#include <set>
#include <string>
#include <utility>

#include "tests/support/fault.h"

namespace {

using kel::test::AllocationPlan;
using kel::test::Armed;
using kel::test::FaultTest;
using testing::EndsWith;
using testing::HasSubstr;
using testing::Not;

std::string explained(const CORBA_Exception& e) {
    const CORBA_String_var line(kel_explain(e));
    return line.in();
}

// ---- the whole line ----

TEST(Explain, AnErrnoIsNamedAndPutIntoWords) {
    EXPECT_EQ(explained(CORBA_TRANSIENT(111, CORBA::COMPLETED_NO)),
              "IDL:omg.org/CORBA/TRANSIENT:1.0: minor 0x4f4d006f (vendor set 0x4f4d0000 OMG, code 0x06f): "
              "errno 111 ECONNREFUSED, Connection refused; completion status NO");
}

TEST(Explain, ACodeOfTheResolverIsNamedAndPutIntoWords) {
    EXPECT_EQ(explained(CORBA_COMM_FAILURE(static_cast<std::uint32_t>(EAI_NONAME), CORBA::COMPLETED_NO)),
              "IDL:omg.org/CORBA/COMM_FAILURE:1.0: minor 0xfffffffe (vendor set 0xfffff000, code 0xffe): "
              "resolver -2 EAI_NONAME, Name or service not known; completion status NO");
}

TEST(Explain, ACodeOfTheOmgIsPutIntoWords) {
    EXPECT_EQ(explained(CORBA_OBJ_ADAPTER(3, CORBA::COMPLETED_YES)),
              "IDL:omg.org/CORBA/OBJ_ADAPTER:1.0: minor 0x4f4d0003 (vendor set 0x4f4d0000 OMG, code 0x003): "
              "OMG, no default servant available; completion status YES");
}

TEST(Explain, ACodeOfTheLibraryIsPutIntoWords) {
    EXPECT_EQ(explained(CORBA_TIMEOUT(0x4b450001, CORBA::COMPLETED_MAYBE)),
              "IDL:omg.org/CORBA/TIMEOUT:1.0: minor 0x4b450001 (vendor set 0x4b450000 kel, code 0x001): "
              "kel, the connection was not made in time; completion status MAYBE");
}

TEST(Explain, TheExplanationOfTheExceptionEndsTheLine) {
    const CORBA_BAD_PARAM e(8, CORBA::COMPLETED_NO, "client bind on [lo] failed");
    EXPECT_THAT(explained(e), EndsWith("; completion status NO; client bind on [lo] failed"));
}

TEST(Explain, AnEmptyExplanationAddsNothing) {
    EXPECT_THAT(explained(CORBA_BAD_PARAM(8, CORBA::COMPLETED_NO, "")), EndsWith("status NO"));
}

TEST(Explain, ANullExplanationAddsNothing) {
    EXPECT_THAT(explained(CORBA_BAD_PARAM(8, CORBA::COMPLETED_NO, nullptr)), EndsWith("status NO"));
}

TEST(Explain, ControlCharactersOfTheExplanationBecomeBlanks) {
    EXPECT_THAT(explained(CORBA_BAD_PARAM(8, CORBA::COMPLETED_NO, "a\nb\tc\x1b[1m\x7f\xc3\xa9")),
                EndsWith("; a b c [1m \xc3\xa9"));
}

TEST(Explain, AStatusThatIsNoneOfTheThreeIsInvalid) {
    const CORBA_MARSHAL e(1, static_cast<CORBA::CompletionStatus>(7));
    EXPECT_THAT(explained(e), EndsWith("; completion status Invalid status"));
}

TEST(Explain, AUserExceptionIsItsRepositoryId) {
    EXPECT_EQ(explained(KELRemarshal()), "IDL:kel.internal/KELRemarshal:1.0");
}

class Nameless : public KELRemarshal {
    const char* _repository_id() const override { return nullptr; }
};

TEST(Explain, AnExceptionWithoutARepositoryIdIsSaidToHaveNone) { EXPECT_EQ(explained(Nameless()), "(null)"); }

// ---- codes ----

TEST(ExplainCode, ANumberWithSeveralMeaningsGetsThemAll) {
    EXPECT_THAT(
        explained(CORBA_TRANSIENT(2, CORBA::COMPLETED_NO)),
        HasSubstr(": OMG, no usable profile in the object reference; or errno 2 ENOENT, No such file or "
                  "directory; "));
    EXPECT_THAT(
        explained(CORBA_BAD_INV_ORDER(4, CORBA::COMPLETED_MAYBE)),
        HasSubstr(": OMG, the ORB has shut down; or kel, the stream has indirection tables already, "));
}

TEST(ExplainCode, AnUnknownCodeOfTheOmgSaysSo) {
    EXPECT_THAT(explained(CORBA_MARSHAL(4095, CORBA::COMPLETED_NO)), HasSubstr("no words for this code"));
}

TEST(ExplainCode, AnUnknownErrnoSaysSo) {
    EXPECT_THAT(explained(CORBA_NO_RESOURCES(134, CORBA::COMPLETED_NO)), HasSubstr("no words for this code"));
}

TEST(ExplainCode, AnotherVendorsCodeSaysSo) {
    EXPECT_EQ(explained(CORBA_TRANSIENT(0x54410002, CORBA::COMPLETED_NO)),
              "IDL:omg.org/CORBA/TRANSIENT:1.0: minor 0x54410002 (vendor set 0x54410000, code 0x002): "
              "no words for this code; completion status NO");
}

TEST(ExplainCode, ACodeOutsideEverySetSaysSo) {
    CORBA_TRANSIENT e;
    e.minor(111);
    EXPECT_THAT(explained(e), HasSubstr("(vendor set 0x00000000, code 0x06f): no words for this code"));
}

TEST(ExplainCode, OnlyExceptionsThatCarryAnErrnoAreExplainedWithOne) {
    for (const auto& carries : {explained(CORBA_NO_RESOURCES(24, CORBA::COMPLETED_NO)),
                                explained(CORBA_COMM_FAILURE(24, CORBA::COMPLETED_NO)),
                                explained(CORBA_TRANSIENT(24, CORBA::COMPLETED_NO))}) {
        EXPECT_THAT(carries, HasSubstr("errno 24 EMFILE, Too many open files"));
    }
    EXPECT_THAT(explained(CORBA_MARSHAL(24, CORBA::COMPLETED_NO)), Not(HasSubstr("errno")));
}

TEST(ExplainCode, OnlyExceptionsOfTheNetworkAreExplainedWithTheResolversCodes) {
    EXPECT_THAT(explained(CORBA_NO_RESOURCES(0xfffffffe, CORBA::COMPLETED_NO)), Not(HasSubstr("resolver")));
}

class Overloaded : public CORBA_TRANSIENT {
public:
    Overloaded() : CORBA_TRANSIENT(11, CORBA::COMPLETED_NO) {}
    const CORBA_Exception::Description* _desc() const override {
        static const CORBA_Exception::Description description(
            "Overloaded", "IDL:test/Overloaded:1.0", nullptr, &CORBA_TRANSIENT::_description, nullptr);
        return &description;
    }
};

TEST(ExplainCode, ADerivedExceptionHasTheWordsOfItsBase) {
    EXPECT_THAT(explained(Overloaded()), HasSubstr("errno 11 EAGAIN"));
}

#if __SIZEOF_LONG__ == 8
TEST(ExplainCode, AMinorCodeWiderThanThirtyTwoBitsIsPrintedInFull) {
    CORBA_TRANSIENT e;
    e.minor(0xfffffffffffffffe);
    EXPECT_THAT(explained(e),
                HasSubstr("minor 0xfffffffffffffffe (vendor set 0xfffffffffffff000, code 0xffe): "
                          "no words for this code"));
}
#endif

// ---- the tables ----

TEST(ExplainTables, EveryErrnoOfTheSystemHasItsNameAndWords) {
    for (int number = 1; number < 4096; ++number) {
        const char* const name = strerrorname_np(number);
        const std::string line = explained(CORBA_NO_RESOURCES(number, CORBA::COMPLETED_NO));
        if (name == nullptr) {
            EXPECT_THAT(line, Not(HasSubstr("errno"))) << number;
        } else {
            EXPECT_THAT(line, HasSubstr("errno " + std::to_string(number) + ' ' + name + ", " +
                                        strerrordesc_np(number) + "; completion"));
        }
    }
}

TEST(ExplainTables, EveryCodeOfTheResolverHasItsWords) {
    const std::string unknown = gai_strerror(-4000);
    for (int number = -1; number > -200; --number) {
        if (gai_strerror(number) == unknown) continue;
        const CORBA_TRANSIENT e(static_cast<std::uint32_t>(number), CORBA::COMPLETED_NO);
        EXPECT_THAT(explained(e), HasSubstr("resolver " + std::to_string(number) + " EAI_"));
        EXPECT_THAT(explained(e), HasSubstr(gai_strerror(number)));
    }
}

template <class X>
std::string explained_row(unsigned long minor) {
    return explained(X(minor, CORBA::COMPLETED_NO));
}

struct Row {
    const char* exception;
    unsigned long minor;
    std::string (*explained)(unsigned long minor);
    const char* source;
    const char* words;
};

const Row rows[] = {
#define KEL_OMG_MINOR(X, code, words) {#X, code, explained_row<CORBA_##X>, "OMG, ", words},
#define KEL_OWN_MINOR(X, minor, words) {#X, minor, explained_row<CORBA_##X>, "kel, ", words},
#include <kel/exceptions/internal/minors.inc>
#undef KEL_OMG_MINOR
#undef KEL_OWN_MINOR
};

TEST(ExplainTables, EveryRowIsFoundByItsExceptionAndMinor) {
    std::map<std::string, std::set<std::pair<std::string, unsigned long>>> found;
    for (const Row& row : rows) {
        EXPECT_THAT(row.explained(row.minor), HasSubstr(std::string(row.source) + row.words));
        EXPECT_TRUE(found[row.source].emplace(row.exception, row.minor).second)
            << row.exception << ' ' << row.minor << " stands there twice";
    }
    EXPECT_GT(found["OMG, "].size(), 70u);
    EXPECT_EQ(found["kel, "].size(), 10u);
}

// ---- memory ----

class ExplainWithoutMemory : public FaultTest {};

TEST_F(ExplainWithoutMemory, EveryAllocationThatFailsIsABadAllocAndLeavesNothingBehind) {
    const CORBA_TRANSIENT e(2, CORBA::COMPLETED_NO, "a reason that does not fit into a short string");
    const std::string expected = explained(e);
    long failed = 0;
    for (long nth = 1; failed == nth - 1; ++nth) {
        AllocationPlan::fail(nth);
        const long blocks = AllocationPlan::live_blocks();
        try {
            const Armed armed;
            CORBA::string_free(kel_explain(e));
        } catch (const std::bad_alloc&) {
            ++failed;
        }
        kel::test::reset_faults();
        EXPECT_EQ(AllocationPlan::live_blocks(), blocks) << nth;
    }
    EXPECT_GT(failed, 5);
    EXPECT_EQ(explained(e), expected);
}

}  // namespace
