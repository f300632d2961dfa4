// The order in which the library's units come to life, and go.
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <link.h>

#include <algorithm>
#include <cstring>
#include <sstream>
#include <string>
#include <vector>

#include "tests/startup/start.h"
#include "tests/startup/symbols.h"

namespace {

using kel::test::Function;
using kel::test::Outcome;
using kel::test::start;
using kel::test::Symbols;
using testing::Contains;
using testing::ElementsAreArray;
using testing::Not;

typedef std::vector<std::string> Names;

// ---- the initialisers of the built library ----

// Offsets of the initialisers within the library, as the loader runs them.
std::vector<ElfW(Addr)> initialisers() {
    std::vector<ElfW(Addr)> offsets;
    const auto collect = [](dl_phdr_info* object, std::size_t, void* result) {
        if (std::strstr(object->dlpi_name, "libkel.so") == nullptr) return 0;
        for (int i = 0; i < object->dlpi_phnum; ++i) {
            if (object->dlpi_phdr[i].p_type != PT_DYNAMIC) continue;
            const auto* entry =
                reinterpret_cast<const ElfW(Dyn)*>(object->dlpi_addr + object->dlpi_phdr[i].p_vaddr);
            const ElfW(Addr)* array = nullptr;
            std::size_t bytes = 0;
            for (; entry->d_tag != DT_NULL; ++entry) {
                if (entry->d_tag == DT_INIT_ARRAY) {
                    array = reinterpret_cast<const ElfW(Addr)*>(object->dlpi_addr + entry->d_un.d_ptr);
                }
                if (entry->d_tag == DT_INIT_ARRAYSZ) bytes = entry->d_un.d_val;
            }
            for (std::size_t n = 0; n < bytes / sizeof *array; ++n) {
                static_cast<std::vector<ElfW(Addr)>*>(result)->push_back(array[n] - object->dlpi_addr);
            }
        }
        return 1;
    };
    dl_iterate_phdr(collect, &offsets);
    return offsets;
}

TEST(StartUpOrder, InitialisersFollowTheListOfUnits) {
    ASSERT_NE(dlopen(KEL_STARTUP_LIBRARY, RTLD_NOW), nullptr);
    const Symbols symbols(KEL_STARTUP_LIBRARY);
    Names units;
    for (const ElfW(Addr) offset : initialisers()) {
        const Function f = symbols.function_at(offset);
        if (!kel::test::is_the_compilers(f)) units.push_back(f.unit);
    }
    EXPECT_THAT(units, ElementsAreArray(kel::test::initialised_units()));
}

// ---- what they build ----

class StartUp : public testing::Test {
protected:
    static void SetUpTestSuite() {
        const Outcome o = start({"order"}, {"DEBUG_STATIC"});
        std::istringstream lines(o.out);
        std::string line;
        _lines.clear();  // of an earlier round
        while (std::getline(lines, line)) _lines.push_back(line);
    }

    // What follows `verb` in the lines that begin with it, in their order.
    static Names objects(const std::string& verb) {
        Names found;
        for (const std::string& line : _lines) {
            if (line.rfind(verb + " ", 0) == 0) found.push_back(line.substr(verb.size() + 1));
        }
        return found;
    }

    // The named objects among those of `verb`, without private ones and stream initialisers.
    static Names named(const std::string& verb) {
        Names found;
        for (const std::string& name : objects(verb)) {
            if (name != "private" && name != "iostreams") found.push_back(name);
        }
        return found;
    }

    static Names _lines;
};

Names StartUp::_lines;

// The objects with a name, in the order of their construction.
Names expected_objects() {
    Names names = {"CurrentEnvironment::_mtx"};
#define KEL_STANDARD_EXCEPTION(X) names.push_back("CORBA_" #X "::_description");
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
    for (const char* name : {"CORBA_Exception::_description", "CORBA_SystemException::_description",
                             "CORBA_UserException::_description", "KELRemarshal::_description",
                             "KELLoadLibrary::LoadError::_description", "KELPortable::_mutex",
                             "KELThread::_mutex", "KELThreadLocal::_mutex"}) {
        names.push_back(name);
    }
    return names;
}

TEST_F(StartUp, BuildsItsNamedObjectsInTheOrderOfTheUnits) {
    EXPECT_THAT(named("built"), ElementsAreArray(expected_objects()));
}

TEST_F(StartUp, DestroysItsNamedObjectsInReverse) {
    Names expected = expected_objects();
    std::reverse(expected.begin(), expected.end());
    EXPECT_THAT(named("destroyed"), ElementsAreArray(expected));
}

TEST_F(StartUp, DestroysEverythingThatItRegisteredInReverse) {
    Names built = objects("built");
    std::reverse(built.begin(), built.end());
    EXPECT_EQ(objects("destroyed"), built);
}

// The thread unit and the last one: the stream initialiser comes before the two locks.
TEST_F(StartUp, ThreadUnitBuildsStreamsThenTheThreadLockThenTheThreadLocalLock) {
    Names built = objects("built");
    built.erase(std::unique(built.begin(), built.end()), built.end());
    ASSERT_GE(built.size(), 4u);
    const Names last(built.end() - 4, built.end());
    EXPECT_EQ(last, (Names{"iostreams", "KELThread::_mutex", "KELThreadLocal::_mutex", "iostreams"}));
}

// No named object comes first in its unit: there is a stream initialiser before the first of each.
TEST_F(StartUp, UnitsInitialiseTheStandardStreamsBeforeTheirOwnObjects) {
    const Names built = objects("built");
    for (const char* first :
         {"CurrentEnvironment::_mtx", "CORBA_UNKNOWN::_description", "CORBA_Exception::_description",
          "KELLoadLibrary::LoadError::_description", "KELPortable::_mutex", "KELThread::_mutex"}) {
        const auto found = std::find(built.begin(), built.end(), first);
        ASSERT_NE(found, built.end()) << first;
        ASSERT_NE(found, built.begin()) << first;
        EXPECT_EQ(*(found - 1), "iostreams") << first;
    }
}

// The units without a named object initialise the streams and nothing else.
TEST_F(StartUp, BuildsNothingInPrivate) { EXPECT_THAT(objects("built"), Not(Contains("private"))); }

TEST_F(StartUp, TakesNeitherThreadLockBeforeMain) { EXPECT_TRUE(objects("locked").empty()); }

TEST_F(StartUp, StartsNoThread) { EXPECT_EQ(objects("threads"), Names{"1"}); }

}  // namespace
