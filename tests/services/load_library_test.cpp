// The loader of shared libraries, against scripted system calls.
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>

#include <cstring>
#include <new>
#include <thread>

#include "tests/services/scripted_loader.h"
#include "tests/support/child.h"

namespace {

using namespace kel::test;

class LoadLibrary : public LoadLibraryTest {};

// --- the singleton -----------------------------------------------------------------------------------

TEST_F(LoadLibrary, TheSharedLoaderIsOneObject) {
    KELLoadLibrary* const shared = KELLoadLibrary::instance();
    EXPECT_NE(shared, nullptr);
    EXPECT_EQ(KELLoadLibrary::instance(), shared);
    EXPECT_EQ(KELLoadLibrary::_instance, shared);
    EXPECT_EQ(KELLoadLibrary::_inited, 1);
}

TEST_F(LoadLibrary, TheFirstCallCreatesTheSharedLoader) {
    const Outcome o = in_child([] {
        KELLoadLibrary::_instance = nullptr;
        KELLoadLibrary::_inited = 0;
        const long before = AllocationPlan::live_blocks();
        KELLoadLibrary* const made = KELLoadLibrary::instance();
        std::cout << (AllocationPlan::live_blocks() - before) << (made == KELLoadLibrary::_instance)
                  << int(KELLoadLibrary::_inited);
    });
    EXPECT_EQ(o.out, "111");
}

TEST_F(LoadLibrary, ASharedLoaderWithoutMemoryCanBeMadeLater) {
    const Outcome o = in_child([] {
        KELLoadLibrary::_instance = nullptr;
        KELLoadLibrary::_inited = 0;
        AllocationPlan::fail(1);
        try {
            Armed armed;
            KELLoadLibrary::instance();
        } catch (const std::bad_alloc&) {
            std::cout << (KELLoadLibrary::_instance == nullptr) << int(KELLoadLibrary::_inited);
        }
        std::cout << (KELLoadLibrary::instance() != nullptr);
    });
    EXPECT_EQ(o.out, "101");
}

TEST_F(LoadLibrary, ThreadsThatRaceForTheSharedLoaderGetTheSameOne) {
    const Outcome o = in_child([] {
        KELLoadLibrary::_instance = nullptr;
        const long before = AllocationPlan::live_blocks();
        std::vector<KELLoadLibrary*> seen(8);
        {
            std::vector<std::thread> threads;
            for (KELLoadLibrary*& each : seen)
                threads.emplace_back([&each] { each = KELLoadLibrary::instance(); });
            for (std::thread& thread : threads) thread.join();
        }
        for (KELLoadLibrary* each : seen) std::cout << (each == KELLoadLibrary::_instance);
        seen = std::vector<KELLoadLibrary*>();
        std::cout << " " << (AllocationPlan::live_blocks() - before);
    });
    EXPECT_EQ(o.out, "11111111 1");
}

// --- names -------------------------------------------------------------------------------------------

TEST_F(LoadLibrary, ThePrefixIsLib) { EXPECT_STREQ(KELLoadLibrary::_prefix(), "lib"); }

TEST_F(LoadLibrary, TheSuffixIsBuiltOnceInOneBuffer) {
    EXPECT_STREQ(KELLoadLibrary::_suffix(), "_r.so");
    const char* const buffer = KELLoadLibrary::_suffix();
    EXPECT_EQ(KELLoadLibrary::_suffix(), buffer);
    EXPECT_EQ(buffer[255], '\0');  // its last byte
}

TEST_F(LoadLibrary, WrappingPutsTheNameBetweenPrefixAndSuffix) {
    char out[32] = "old text that goes";
    KELLoadLibrary::_wrap_libname(out, "codec");
    EXPECT_STREQ(out, "libcodec_r.so");
    KELLoadLibrary::_wrap_libname(out, "");
    EXPECT_STREQ(out, "lib_r.so");
}

TEST_F(LoadLibrary, WrappingLooksAtNoLength) {
    const std::string name(5000, 'n');
    std::vector<char> out(5100);
    KELLoadLibrary::_wrap_libname(out.data(), name.c_str());
    EXPECT_EQ(out.data(), "lib" + name + "_r.so");
}

// --- Load --------------------------------------------------------------------------------------------

TEST_F(LoadLibrary, TheWrappedNameIsTriedFirst) {
    available = {"libx_r.so", "x"};
    load("x");
    EXPECT_EQ(tried, (Names{"libx_r.so"}));
}

TEST_F(LoadLibrary, TheNameItselfIsTriedSecond) {
    available = {"x"};
    load("x");
    EXPECT_EQ(tried, (Names{"libx_r.so", "x"}));
}

TEST_F(LoadLibrary, LibrariesAreBoundLazily) {
    available = {"x"};
    load("x");
    EXPECT_EQ(modes, (std::set<int>{RTLD_LAZY}));
}

TEST_F(LoadLibrary, ASuccessIsSilent) {
    available = {"x"};
    const ErrorText errors;
    load("x");
    EXPECT_EQ(errors.str(), "");
}

TEST_F(LoadLibrary, LoadingTwiceOpensOnce) {
    available = {"libx_r.so"};
    load("x");
    load("x");
    EXPECT_EQ(tried, (Names{"libx_r.so"}));
}

TEST_F(LoadLibrary, OneUnloadClosesWhatWasLoadedTwice) {
    available = {"libx_r.so"};
    load("x");
    load("x");
    unload("libx_r.so");
    EXPECT_EQ(closed, (Names{"libx_r.so"}));
    unload("libx_r.so");
    EXPECT_EQ(closed.size(), 1u);
}

TEST_F(LoadLibrary, AnUnloadedLibraryIsOpenedAgain) {
    available = {"libx_r.so"};
    load("x");
    unload("libx_r.so");
    load("x");
    EXPECT_EQ(tried.size(), 2u);
    EXPECT_EQ(opened.size(), 1u);
}

TEST_F(LoadLibrary, AFallbackNameTriesTheWrappedNameAgain) {
    available = {"x"};
    load("x");
    load("x");
    EXPECT_EQ(tried, (Names{"libx_r.so", "x", "libx_r.so"}));
    EXPECT_EQ(opened.size(), 1u);
}

TEST_F(LoadLibrary, AFailurePrintsThePrettyFormAndAnEmptyLine) {
    const ErrorText errors;
    load("x");
    EXPECT_EQ(tried, (Names{"libx_r.so", "x"}));
    EXPECT_EQ(errors.str(), "LoadLibrary failed for [x]: Exception: KELLoadLibrary::LoadError\n\n");
}

TEST_F(LoadLibrary, TheReportNamesTheLibraryAsTheCallerDid) {
    const ErrorText errors;
    load("../no such/library.so");
    EXPECT_EQ(errors.str().find("LoadLibrary failed for [../no such/library.so]: "), 0u);
}

TEST_F(LoadLibrary, TheSystemIsAskedForItsWordsOnceForEachFailure) {
    const ErrorText errors;
    load("x");
    EXPECT_EQ(seams::dlerror.calls(), 2);
    available = {"y"};
    load("y");
    EXPECT_EQ(seams::dlerror.calls(), 3);
    unload("y");
    EXPECT_EQ(seams::dlerror.calls(), 3);
}

TEST_F(LoadLibrary, AFailureLeavesTheTableUnchanged) {
    const ErrorText errors;
    load("x");
    unload("x");
    unload("libx_r.so");
    EXPECT_EQ(closed.size(), 0u);
    load("x");
    EXPECT_EQ(tried.size(), 4u);
}

TEST_F(LoadLibrary, AFirstAttemptThatFailsIsSilent) {
    available = {"x"};
    const ErrorText errors;
    load("x");
    EXPECT_EQ(errors.str(), "");
}

TEST_F(LoadLibrary, LongNamesReachTheSystemWhole) {
    const ErrorText errors;
    for (std::size_t length : {1014u, 1015u, 1016u, 5000u}) {
        tried.clear();
        const std::string name(length, 'n');
        load(name);
        EXPECT_EQ(tried, (Names{"lib" + name + "_r.so", name}));
    }
}

TEST_F(LoadLibrary, OtherExceptionsLeaveLoadAndTheLockIsFree) {
    all_available = true;
    for (long n = 1; n <= 2; ++n) {
        AllocationPlan::fail(AllocationPlan::calls() + n);
        EXPECT_THROW(load("x"), std::bad_alloc);
    }
    load("x");
    EXPECT_EQ(opened.size(), 1u);
}

TEST_F(LoadLibrary, AHandleThatCannotBeKeptIsClosed) {
    all_available = true;
    int failures = 0;
    for (long n = 1; n < 20; ++n) {
        AllocationPlan::fail(AllocationPlan::calls() + n);
        try {
            load("x");
            break;
        } catch (const std::bad_alloc&) {
            ++failures;
            EXPECT_EQ(opened.size(), 0u) << n;
        }
    }
    EXPECT_GT(failures, 3);
    EXPECT_GT(closed.size(), 0u);
    EXPECT_EQ(opened.size(), 1u);
    AllocationPlan::fail(0);
    unload_all();
}

// --- _loadLibrary ------------------------------------------------------------------------------------

TEST_F(LoadLibrary, TheStoredHandleIsReturned) {
    available = {"x"};
    void* const handle = load_library("x", 0);
    EXPECT_NE(handle, nullptr);
    EXPECT_EQ(load_library("x", 1), handle);
    EXPECT_EQ(tried.size(), 1u);
}

TEST_F(LoadLibrary, AFailureGivesNullWhenNothingIsToBeThrown) {
    EXPECT_EQ(load_library("x", 0), nullptr);
    EXPECT_EQ(tried, (Names{"x"}));
}

TEST_F(LoadLibrary, AFailureThrowsTheSystemsWordsWithCodeZero) {
    try {
        load_library("x", 1);
        FAIL() << "returned";
    } catch (const KELLoadLibrary::LoadError& error) {
        std::strcpy(text, "overwritten");
        EXPECT_STREQ(error.message(), "cannot open shared object file");
        EXPECT_EQ(error.code(), 0u);
    }
}

TEST_F(LoadLibrary, AFailureWithoutWordsThrowsAnEmptyMessage) {
    problem = nullptr;
    try {
        load_library("x", 1);
        FAIL() << "returned";
    } catch (const KELLoadLibrary::LoadError& error) {
        EXPECT_STREQ(error.message(), "");
    }
}

// --- unloading ---------------------------------------------------------------------------------------

TEST_F(LoadLibrary, UnloadWantsTheNameThatWasOpened) {
    available = {"libx_r.so"};
    load("x");
    unload("x");
    EXPECT_EQ(closed.size(), 0u);
    unload("libx_r.so");
    EXPECT_EQ(closed, (Names{"libx_r.so"}));
}

TEST_F(LoadLibrary, AFallbackNameIsUnloadedByItself) {
    available = {"x"};
    load("x");
    unload("x");
    EXPECT_EQ(closed, (Names{"x"}));
}

TEST_F(LoadLibrary, UnloadingAnUnknownNameDoesNothing) {
    const ErrorText errors;
    unload("x");
    unload_unlocked("x");
    EXPECT_EQ(closed.size(), 0u);
    EXPECT_EQ(errors.str(), "");
}

TEST_F(LoadLibrary, TheEntryGoesBeforeTheLibraryIsClosed) {
    available = {"x", "y"};
    load("x");
    load("y");
    unsigned long left = 99;
    seams::dlclose.script([&](void* handle) {
        left = table().count();
        return close(handle);
    });
    unload("x");
    EXPECT_EQ(left, 1u);
    unload_all();
    EXPECT_EQ(left, 0u);
}

TEST_F(LoadLibrary, AFailedCloseIsReported) {
    available = {"x"};
    load("x");
    close_result = -1;
    std::strcpy(text, "shared object not open");
    const ErrorText errors;
    unload("x");
    EXPECT_EQ(errors.str(), "dlclose failed: shared object not open\n");
}

TEST_F(LoadLibrary, AFailedCloseWithoutWordsIsReportedToo) {
    available = {"x"};
    void* const handle = open("x", 0);
    close_result = 1;
    problem = nullptr;
    const ErrorText errors;
    close_library(handle);
    EXPECT_EQ(errors.str(), "dlclose failed: \n");
}

TEST_F(LoadLibrary, AFailedCloseRemovesTheEntryAllTheSame) {
    available = {"x"};
    load("x");
    close_result = -1;
    const ErrorText errors;
    unload("x");
    unload("x");
    EXPECT_EQ(closed.size(), 1u);
}

TEST_F(LoadLibrary, UnloadAllOnAnEmptyTableDoesNothing) {
    unload_all();
    EXPECT_EQ(closed.size(), 0u);
}

TEST_F(LoadLibrary, UnloadAllClosesEveryLibraryOnce) {
    all_available = true;
    for (int i = 0; i < 200; ++i) load(std::to_string(i));
    EXPECT_EQ(opened.size(), 200u);
    unload_all();
    EXPECT_EQ(opened.size(), 0u);
    EXPECT_EQ(closed.size(), 200u);
}

TEST_F(LoadLibrary, UnloadAllClosesInTheOrderOfTheTable) {
    all_available = true;
    for (int i = 0; i < 5; ++i) load(std::to_string(i));
    Names in_order;
    Table::Iterator entry(table());
    while (++entry != nullptr) in_order.push_back(entry.entry()->_key.in());
    unload_all();
    EXPECT_EQ(closed, in_order);
}

// Three entries that belong into slot 0 lie in the slots 0, 31 and 30; when the first goes, the second
// takes its place behind a walk that has passed it.
TEST_F(LoadLibrary, UnloadAllClosesWhatMovesToThePlaceOfAClosedOne) {
    all_available = true;
    Names names;
    for (int i = 0; names.size() < 3; ++i) {
        const std::string name = std::to_string(i);
        const CORBA_String_var file(("lib" + name + "_r.so").c_str());
        if (table().findIndexOf(file) == 0) names.push_back(name);
    }
    for (const std::string& name : names) load(name);
    EXPECT_EQ(opened.size(), 3u);
    unload_all();
    EXPECT_EQ(opened.size(), 0u);
    EXPECT_EQ(closed.size(), 3u);
}

TEST_F(LoadLibrary, UnloadAllThatRunsOutOfMemoryCanBeRepeated) {
    all_available = true;
    for (int i = 0; i < 5; ++i) load(std::to_string(i));
    AllocationPlan::fail(AllocationPlan::calls() + 3);
    EXPECT_THROW(unload_all(), std::bad_alloc);
    EXPECT_EQ(closed.size(), 2u);
    unload_all();
    EXPECT_EQ(closed.size(), 5u);
    EXPECT_EQ(opened.size(), 0u);
}

TEST_F(LoadLibrary, UnloadAllEmptiesTheTableEvenWhenCloseFails) {
    all_available = true;
    for (int i = 0; i < 5; ++i) load(std::to_string(i));
    close_result = -1;
    const ErrorText errors;
    unload_all();
    unload_all();
    EXPECT_EQ(closed.size(), 5u);
}

}  // namespace
