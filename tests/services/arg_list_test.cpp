// Taking options out of an argument vector and asking for them.
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/arg_list.h>

#include <atomic>
#include <new>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/fault.h"

namespace {

using namespace kel::test;

typedef std::vector<std::string> Texts;

// An argument vector as main gets it, with the null behind it.
class Arguments {
public:
    explicit Arguments(Texts texts) : argc(static_cast<int>(texts.size())), _texts(std::move(texts)) {
        for (std::string& text : _texts) _pointers.push_back(&text[0]);
        _pointers.push_back(nullptr);
    }

    char** argv() { return _pointers.data(); }
    Texts left() const { return Texts(_pointers.begin(), _pointers.begin() + argc); }
    const std::vector<char*>& pointers() const { return _pointers; }

    int argc;

private:
    Texts _texts;
    std::vector<char*> _pointers;
};

class ArgList : public FaultTest {
protected:
    // What is left of `texts` once the options that begin with `prefix` are taken out.
    Texts left_of(Texts texts, const char* prefix = "-Px") {
        Arguments arguments(std::move(texts));
        list.argInit(arguments.argc, arguments.argv(), prefix);
        return arguments.left();
    }

    // The value of an option as text; "null" when there is none.
    std::string value(const char* name) {
        CORBA_String_var text(list.getArgValue(name));
        return text.in() != nullptr ? text.in() : "null";
    }

    void expect_bad_prefix(const char* prefix) {
        Arguments arguments({"prog", "-Pxa", "1"});
        try {
            list.argInit(arguments.argc, arguments.argv(), prefix);
            FAIL() << "accepted";
        } catch (const CORBA_BAD_PARAM& e) {
            EXPECT_EQ(e.minor(), CORBA::OMGVMCID);
            EXPECT_EQ(e.completed(), CORBA::COMPLETED_NO);
        }
        EXPECT_EQ(arguments.argc, 3);
        EXPECT_EQ(arguments.left(), (Texts{"prog", "-Pxa", "1"}));
        EXPECT_EQ(list.getArgCount(), 0u);
    }

    KELArgList list;
};

// --- the prefix --------------------------------------------------------------------------------------

TEST_F(ArgList, ANullPrefixIsRefused) { expect_bad_prefix(nullptr); }
TEST_F(ArgList, AnEmptyPrefixIsRefused) { expect_bad_prefix(""); }
TEST_F(ArgList, APrefixWithoutADashIsRefused) { expect_bad_prefix("ORB"); }
TEST_F(ArgList, ALoneDashIsRefused) { expect_bad_prefix("-"); }
TEST_F(ArgList, TwoDashesAreRefused) { expect_bad_prefix("--x"); }
TEST_F(ArgList, ABlankAfterTheDashIsRefused) { expect_bad_prefix("- x"); }
TEST_F(ArgList, AByteBeyondAsciiAfterTheDashIsRefused) { expect_bad_prefix("-\xe4"); }

TEST_F(ArgList, ADigitMayFollowTheDash) { EXPECT_EQ(left_of({"-4x", "-a"}, "-4"), (Texts{"-a"})); }
TEST_F(ArgList, OneLetterIsEnough) { EXPECT_EQ(left_of({"-x", "-y"}, "-x"), (Texts{"-y"})); }

TEST_F(ArgList, OnlyTheFirstCharacterAfterTheDashIsLookedAt) {
    EXPECT_EQ(left_of({"-P-x", "v", "-Px"}, "-P-"), (Texts{"-Px"}));
    EXPECT_EQ(value("P-x"), "v");
}

TEST_F(ArgList, ABadPrefixIsRefusedWithoutArgumentsToo) {
    int none = 0;
    EXPECT_THROW(list.argInit(none, nullptr, "ORB"), CORBA_BAD_PARAM);
}

// --- the arguments -----------------------------------------------------------------------------------

TEST_F(ArgList, AnOptionWithAValueTakesBoth) {
    EXPECT_EQ(left_of({"prog", "-PxName", "value", "rest"}), (Texts{"prog", "rest"}));
    EXPECT_EQ(value("PxName"), "value");
}

TEST_F(ArgList, AnOptionBeforeAnotherOptionHasNoValue) {
    EXPECT_EQ(left_of({"prog", "-PxName", "-Other", "x"}), (Texts{"prog", "-Other", "x"}));
    EXPECT_EQ(list.getArg("PxName"), 1);
    EXPECT_EQ(value("PxName"), "null");
}

TEST_F(ArgList, TheArgumentAfterAnOptionWithoutAValueIsLookedAtItself) {
    EXPECT_EQ(left_of({"prog", "-PxA", "-PxB", "v"}), (Texts{"prog"}));
    EXPECT_EQ(value("PxA"), "null");
    EXPECT_EQ(value("PxB"), "v");
}

TEST_F(ArgList, TheLastArgumentHasNoValue) {
    EXPECT_EQ(left_of({"prog", "-PxName"}), (Texts{"prog"}));
    EXPECT_EQ(list.getArg("PxName"), 1);
    EXPECT_EQ(value("PxName"), "null");
}

TEST_F(ArgList, ThePrefixAloneIsAnOption) {
    EXPECT_EQ(left_of({"prog", "-Px", "value"}), (Texts{"prog"}));
    EXPECT_EQ(value("Px"), "value");
}

TEST_F(ArgList, ThePrefixAloneMayHaveNoValue) {
    EXPECT_EQ(left_of({"-Px", "-y"}), (Texts{"-y"}));
    EXPECT_EQ(list.getArg("Px"), 1);
    EXPECT_EQ(value("Px"), "null");
}

TEST_F(ArgList, ArgumentsWithAnotherBeginningStay) {
    EXPECT_EQ(left_of({"prog", "-P", "-px", "Px", "--Px", "-PyName"}),
              (Texts{"prog", "-P", "-px", "Px", "--Px", "-PyName"}));
    EXPECT_EQ(list.getArgCount(), 0u);
}

TEST_F(ArgList, AValueCannotBeginWithADash) {
    EXPECT_EQ(left_of({"-PxOffset", "-5"}), (Texts{"-5"}));
    EXPECT_EQ(value("PxOffset"), "null");
}

TEST_F(ArgList, ALoneDashIsNoValueEither) {
    EXPECT_EQ(left_of({"-PxFile", "-"}), (Texts{"-"}));
    EXPECT_EQ(value("PxFile"), "null");
}

TEST_F(ArgList, AnEmptyArgumentIsAValue) {
    EXPECT_EQ(left_of({"-PxFile", "", "x"}), (Texts{"x"}));
    CORBA_String_var text(list.getArgValue("PxFile"));
    EXPECT_STREQ(text.in(), "");
}

TEST_F(ArgList, AValueThatLooksLikeAnotherArgumentIsSkipped) {
    EXPECT_EQ(left_of({"-PxA", "Px", "rest"}), (Texts{"rest"}));
    EXPECT_EQ(list.getArgCount(), 1u);
}

TEST_F(ArgList, TheLastValueOfANameWins) {
    EXPECT_EQ(left_of({"prog", "-PxName", "first", "x", "-PxName", "second"}), (Texts{"prog", "x"}));
    EXPECT_EQ(value("PxName"), "second");
    EXPECT_EQ(list.getArgCount(), 1u);
}

TEST_F(ArgList, AMissingValueReplacesAnEarlierOne) {
    left_of({"-PxName", "first", "-PxName"});
    EXPECT_EQ(value("PxName"), "null");
    EXPECT_EQ(list.getArg("PxName"), 1);
}

TEST_F(ArgList, OptionsAndOtherArgumentsMayBeMixed) {
    EXPECT_EQ(left_of({"prog", "-Pxa", "1", "x", "-Pxb", "-Pxc"}), (Texts{"prog", "x"}));
    EXPECT_EQ(value("Pxa"), "1");
    EXPECT_EQ(value("Pxb"), "null");
    EXPECT_EQ(value("Pxc"), "null");
    EXPECT_EQ(list.getArg("Pxb"), 1);
    EXPECT_EQ(list.getArg("Pxd"), 0);
    EXPECT_EQ(list.getArgCount(), 3u);
}

TEST_F(ArgList, TheFirstArgumentIsLookedAtToo) {
    EXPECT_EQ(left_of({"-Pxprog", "v"}), Texts());
    EXPECT_EQ(value("Pxprog"), "v");
}

TEST_F(ArgList, TheNameKeepsThePrefixWithoutItsDash) {
    left_of({"-PxName", "v"});
    EXPECT_EQ(list.getArg("PxName"), 1);
    EXPECT_EQ(list.getArg("-PxName"), 0);
    EXPECT_EQ(list.getArg("Name"), 0);
}

TEST_F(ArgList, OptionsOfSeveralPrefixesAddUp) {
    Arguments arguments({"prog", "-Aa", "1", "-Bb", "2"});
    list.argInit(arguments.argc, arguments.argv(), "-A");
    list.argInit(arguments.argc, arguments.argv(), "-B");
    EXPECT_EQ(arguments.left(), (Texts{"prog"}));
    EXPECT_EQ(list.getArgCount(), 2u);
}

TEST_F(ArgList, ManyOptionsAreKept) {
    Texts texts;
    for (int i = 0; i < 200; ++i) {
        texts.push_back("-Px" + std::to_string(i));
        texts.push_back("v" + std::to_string(i));
    }
    EXPECT_EQ(left_of(texts), Texts());
    EXPECT_EQ(list.getArgCount(), 200u);
    for (int i = 0; i < 200; ++i)
        EXPECT_EQ(value(("Px" + std::to_string(i)).c_str()), "v" + std::to_string(i));
}

TEST_F(ArgList, TheKeptPointersAreTheCallersOwn) {
    Arguments arguments({"prog", "-Pxa", "1", "x"});
    char* const kept = arguments.pointers()[3];
    list.argInit(arguments.argc, arguments.argv(), "-Px");
    EXPECT_EQ(arguments.pointers()[1], kept);
}

TEST_F(ArgList, TheSlotBehindTheKeptArgumentsIsNotWritten) {
    Arguments arguments({"prog", "-Pxa", "1", "x"});
    const std::vector<char*> before = arguments.pointers();
    list.argInit(arguments.argc, arguments.argv(), "-Px");
    EXPECT_EQ(arguments.argc, 2);
    EXPECT_EQ(arguments.pointers()[2], before[2]);
    EXPECT_EQ(arguments.pointers()[3], before[3]);
    EXPECT_EQ(arguments.pointers()[4], nullptr);
}

TEST_F(ArgList, NoArgumentsAreLeftAlone) {
    for (int count : {0, -1}) {
        int argc = count;
        list.argInit(argc, nullptr, "-Px");
        EXPECT_EQ(argc, count);
    }
    EXPECT_EQ(list.getArgCount(), 0u);
}

TEST_F(ArgList, ArgumentsStayWhenMemoryRunsOut) {
    const Texts texts = {"prog", "-Pxa", "1", "x", "-Pxb", "2"};
    long n = 1;
    for (bool failed = true; failed; ++n) {
        KELArgList fresh;
        Arguments arguments(texts);
        failed = false;
        AllocationPlan::fail(n);
        try {
            Armed armed;
            fresh.argInit(arguments.argc, arguments.argv(), "-Px");
        } catch (const std::bad_alloc&) {
            failed = true;
        }
        reset_faults();
        if (!failed) break;
        EXPECT_EQ(arguments.left(), texts) << n;
        EXPECT_EQ(arguments.argc, 6) << n;
        fresh.argInit(arguments.argc, arguments.argv(), "-Px");
        EXPECT_EQ(arguments.left(), (Texts{"prog", "x"})) << n;
        EXPECT_EQ(fresh.getArgCount(), 2u) << n;
    }
    EXPECT_GT(n, 4);
}

// --- the store ---------------------------------------------------------------------------------------

TEST_F(ArgList, StartsEmpty) {
    EXPECT_EQ(list.getArgCount(), 0u);
    EXPECT_EQ(list.getArg("x"), 0);
    EXPECT_EQ(list.getArgValue("x"), nullptr);
}

TEST_F(ArgList, NameAndValueAreCopied) {
    std::string name = "name", text = "value";
    list.putArgValue(name.c_str(), text.c_str());
    name = "xxxx";
    text = "xxxxx";
    EXPECT_EQ(value("name"), "value");
}

TEST_F(ArgList, AValueMayBeNull) {
    list.putArgValue("name", nullptr);
    EXPECT_EQ(list.getArg("name"), 1);
    EXPECT_EQ(list.getArgValue("name"), nullptr);
    EXPECT_EQ(list.getArgCount(), 1u);
}

TEST_F(ArgList, StoringAgainReplacesTheValue) {
    list.putArgValue("other", "o");
    list.putArgValue("name", "first");
    list.putArgValue("name", "second");
    EXPECT_EQ(value("name"), "second");
    EXPECT_EQ(value("other"), "o");
    EXPECT_EQ(list.getArgCount(), 2u);
}

TEST_F(ArgList, EachValueHandedOutIsTheCallersOwn) {
    list.putArgValue("name", "value");
    char* const first = list.getArgValue("name");
    char* const second = list.getArgValue("name");
    EXPECT_NE(first, second);
    first[0] = 'x';
    EXPECT_STREQ(second, "value");
    EXPECT_EQ(value("name"), "value");
    CORBA::string_free(first);
    CORBA::string_free(second);
}

TEST_F(ArgList, AValueOutlivesItsList) {
    KELArgList* const shortlived = new KELArgList;
    shortlived->putArgValue("name", "value");
    CORBA_String_var text(shortlived->getArgValue("name"));
    delete shortlived;
    EXPECT_STREQ(text.in(), "value");
}

TEST_F(ArgList, NothingIsLeaked) {
    const long before = AllocationPlan::live_blocks();
    {
        KELArgList fresh;
        for (int i = 0; i < 100; ++i) fresh.putArgValue(std::to_string(i % 60).c_str(), "value");
        fresh.getArg("1");
        CORBA::string_free(fresh.getArgValue("2"));
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(ArgList, TakingOptionsOutLeaksNothing) {
    const std::string long_value(1000, 'v');
    for (long n = 0; n < 12; ++n) {
        Arguments arguments({"prog", "-Pxa", long_value, "-Pxb", "-Pxa", "short", "x"});
        const long before = AllocationPlan::live_blocks();
        {
            KELArgList fresh;
            AllocationPlan::fail(n);
            try {
                Armed armed;
                fresh.argInit(arguments.argc, arguments.argv(), "-Px");
            } catch (const std::bad_alloc&) {
            }
            reset_faults();
        }
        EXPECT_EQ(AllocationPlan::live_blocks(), before) << n;
    }
}

TEST_F(ArgList, AFailedStoreKeepsTheOldValueAndReleasesTheLock) {
    list.putArgValue("name", "first");
    const std::string second(100, 's');
    long n = 1;
    for (;; ++n) {
        AllocationPlan::fail(n);
        bool failed = false;
        try {
            Armed armed;
            list.putArgValue("name", second.c_str());
        } catch (const std::bad_alloc&) {
            failed = true;
        }
        reset_faults();
        if (!failed) break;
        EXPECT_EQ(value("name"), "first") << n;
        list.putArgValue("other", "o");  // the lock is free
    }
    EXPECT_GT(n, 2);
    EXPECT_EQ(value("name"), second);
}

TEST_F(ArgList, AFailedQuestionReleasesTheLock) {
    list.putArgValue("name", "value");
    for (long n = 1; n <= 2; ++n) {
        reset_faults();
        AllocationPlan::fail(n);
        {
            Armed armed;
            EXPECT_THROW(list.getArgValue("name"), std::bad_alloc) << n;
        }
        list.putArgValue("name", "value");
    }
}

TEST_F(ArgList, ThreadsMayAskWhileAnotherStores) {
    list.putArgValue("name", "a");
    std::atomic<bool> done{false};
    std::atomic<int> wrong{0};
    std::vector<std::thread> readers;
    for (int i = 0; i < 3; ++i) {
        readers.emplace_back([&] {
            while (!done) {
                const std::string text = value("name");
                if (text != "a" && text != "bb") ++wrong;
                if (!list.getArg("name") || list.getArgCount() == 0) ++wrong;
            }
        });
    }
    for (int i = 0; i < 300; ++i) {
        list.putArgValue("name", i % 2 != 0 ? "a" : "bb");
        list.putArgValue(std::to_string(i).c_str(), nullptr);
    }
    done = true;
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(wrong, 0);
    EXPECT_EQ(list.getArgCount(), 301u);
}

}  // namespace
