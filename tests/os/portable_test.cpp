// KELPortable without time and network: process, errors, files, PATH and the cached host entry.
//
// SPDX-License-Identifier: MIT
#include <gmock/gmock.h>
#include <kel/containers/strings.h>
#include <kel/os/base_util.h>
#include <kel/os/portable.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <set>
#include <string>
#include <type_traits>
#include <vector>

#include "tests/os/fake_resolver.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

using namespace kel::test;
using ::testing::ElementsAre;

namespace {

class Limits : public FaultTest {};
class PortableVersion : public FaultTest {};
class Kill : public FaultTest {};
class ErrorText : public FaultTest {};
class FileExists : public FaultTest {};
class CachedHostEntry : public FaultTest {};
class PortableProperty : public FaultTest {};

// --- Process and system -----------------------------------------------------------------------

TEST(PortableProcess, HasTheIdOfTheProcess) {
    EXPECT_EQ(KELPortable::process_id(), ::getpid());
    EXPECT_EQ(KELPortable::process_id(), BaseUtil::getpid());
}

TEST_F(Limits, MaxFdsIsTheSystemsLimit) {
    seams::sysconf.script([](int name) -> long { return name == _SC_OPEN_MAX ? 77 : 0; });
    Armed armed;
    EXPECT_EQ(KELPortable::max_fds(), 77);
}

TEST_F(Limits, OnlyTheLastDescriptorReachesTheLimit) {
    seams::sysconf.script([](int) -> long { return 77; });
    Armed armed;
    EXPECT_TRUE(KELPortable::max_fd_reached(76));
    EXPECT_FALSE(KELPortable::max_fd_reached(75));
    EXPECT_FALSE(KELPortable::max_fd_reached(77));
    EXPECT_FALSE(KELPortable::max_fd_reached(78));
    EXPECT_FALSE(KELPortable::max_fd_reached(-1));
}

bool version_from(const char* release, KELSysVersion& version) {
    seams::uname.script([release](utsname* system) {
        *system = utsname();
        std::strcpy(system->release, release);
        return 0;
    });
    Armed armed;
    return KELPortable::get_sysversion(version);
}

TEST(PortableVersionRecord, IsTwoUnsigned16BitFields) {
    EXPECT_EQ(sizeof(KELSysVersion), 4u);
    EXPECT_EQ(offsetof(KELSysVersion, major), 0u);
    EXPECT_EQ(offsetof(KELSysVersion, minor), 2u);
    EXPECT_TRUE((std::is_same<decltype(KELSysVersion::major), std::uint16_t>::value));
    EXPECT_TRUE((std::is_same<decltype(KELSysVersion::minor), std::uint16_t>::value));
}

TEST_F(PortableVersion, IsTheLow16BitsOfEachPart) {
    KELSysVersion version = {9, 9};
    EXPECT_TRUE(version_from(" 65538.131075.1", version));
    EXPECT_EQ(version.major, 2);
    EXPECT_EQ(version.minor, 3);
}

TEST_F(PortableVersion, IsThereForAReleaseThatBeginsWithADigit) {
    KELSysVersion version = {9, 9};
    EXPECT_TRUE(version_from("2.6.32-5-686", version));
}

TEST_F(PortableVersion, IsFalseAndUntouchedWhenTheSystemFails) {
    const Outcome outcome = in_child([] {
        seams::uname.fail(1, EFAULT);
        KELSysVersion version = {9, 8};
        Armed armed;
        const bool told = KELPortable::get_sysversion(version);
        _exit(!told && version.major == 9 && version.minor == 8 ? 7 : 8);
    });
    EXPECT_EQ(outcome.exit_code, 7);
    EXPECT_EQ(outcome.err, "Could not obtain OS version information\n");
}

TEST_F(PortableVersion, IsFalseAndUntouchedWithoutMemory) {
    KELSysVersion version = {9, 8};
    AllocationPlan::fail(1);
    EXPECT_FALSE(version_from("-12.34.5", version));
    EXPECT_EQ(version.major, 9);
    EXPECT_EQ(version.minor, 8);
}

TEST_F(PortableVersion, LeavesNoRecordBehind) {
    KELSysVersion version;
    version_from("6.1.0", version);
    const long before = AllocationPlan::live_blocks();
    {
        Armed armed;
        KELPortable::get_sysversion(version);
    }
    EXPECT_EQ(AllocationPlan::live_blocks(), before);
}

TEST_F(Kill, SendsTheKillSignalOnce) {
    seams::kill.script([](pid_t pid, int signal) {
        EXPECT_EQ(pid, 4711);
        EXPECT_EQ(signal, 9);
        return 0;
    });
    Armed armed;
    KELPortable::vkill(4711);
    EXPECT_EQ(seams::kill.calls(), 1);
    EXPECT_EQ(seams::perror.calls(), 0);
}

TEST_F(Kill, PrintsAFailureBehindItsOwnText) {
    const Outcome outcome = in_child([] {
        seams::kill.fail(1, EPERM);
        Armed armed;
        KELPortable::vkill(4711);
    });
    EXPECT_EQ(outcome.err, "vkill: : Operation not permitted\n");
    EXPECT_EQ(outcome.exit_code, 0);
}

TEST_F(Kill, TakesNumbersThatNameGroupsAsTheyAre) {
    std::vector<pid_t> asked;
    seams::kill.script([&](pid_t pid, int) {
        asked.push_back(pid);
        return 0;
    });
    Armed armed;
    KELPortable::vkill(0);
    KELPortable::vkill(-5);
    EXPECT_THAT(asked, ElementsAre(0, -5));
}

#if defined(__x86_64__)  // elsewhere every number fits a process id
TEST_F(Kill, OfANumberThatIsNoProcessIdKillsNobody) {
    std::string text;
    seams::perror.script([&](const char* heading) { text = std::string(heading) + std::strerror(errno); });
    Armed armed;
    KELPortable::vkill(static_cast<long>(0x100000000LL));
    EXPECT_EQ(seams::kill.calls(), 0);
    EXPECT_EQ(text, "vkill: No such process");
}
#endif

// --- Errors and texts -------------------------------------------------------------------------

TEST(ErrorNumber, IsTheThreadsErrno) {
    errno = EDOM;
    EXPECT_EQ(KELPortable::vGetErrorNo(), EDOM);
}

TEST_F(ErrorText, IsACopyThatTheCallerFrees) {
    errno = ENOENT;
    char* const first = KELPortable::_get_error_str();
    errno = EDOM;
    char* const second = KELPortable::_get_error_str();
    EXPECT_EQ(first, std::string(std::strerror(ENOENT)));
    EXPECT_EQ(second, std::string(std::strerror(EDOM)));
    CORBA::string_free(first);
    CORBA::string_free(second);
}

TEST_F(ErrorText, IsNullWithoutMemory) {
    AllocationPlan::fail(1);
    Armed armed;
    errno = ENOENT;
    EXPECT_EQ(KELPortable::_get_error_str(), nullptr);
    EXPECT_EQ(AllocationPlan::calls(), 1);
}

TEST(Texts, AreComparedWithoutRegardToCase) {
    EXPECT_EQ(KELPortable::vstricmp("Vesta", "vESTA"), 0);
    EXPECT_LT(KELPortable::vstricmp("juno", "VESTA"), 0);
    EXPECT_GT(KELPortable::vstricmp("VESTA", "juno"), 0);
}

TEST_F(PortableProperty, IsThatOfBaseUtil) {
    char value[] = "value";
    seams::getenv.script([&](const char* name) {
        EXPECT_STREQ(name, "KEL_TEST_PROPERTY");
        return value;
    });
    Armed armed;
    EXPECT_EQ(KELPortable::get_property("KEL_TEST_PROPERTY"), value);
}

TEST_F(PortableProperty, OfAnUnsetNameIsNull) {
    ::unsetenv("KEL_TEST_PROPERTY");
    EXPECT_EQ(KELPortable::get_property("KEL_TEST_PROPERTY"), nullptr);
}

// --- Files ------------------------------------------------------------------------------------

TEST_F(FileExists, WhenTheSystemCanTellItsState) {
    seams::stat64.script([](const char* path, struct stat64*) {
        errno = EACCES;
        return std::strcmp(path, "here") == 0 ? 0 : -1;
    });
    Armed armed;
    EXPECT_TRUE(KELPortable::vFileExists("here"));
    EXPECT_FALSE(KELPortable::vFileExists("there"));
    EXPECT_EQ(seams::stat64.calls(), 2);
}

TEST_F(FileExists, ForFoldersToo) {
    EXPECT_TRUE(KELPortable::vFileExists("/"));
    EXPECT_FALSE(KELPortable::vFileExists("/no/such/file"));
}

// Only the files that a test names exist, and PATH is what it says.
class Whence : public FaultTest {
protected:
    void SetUp() override {
        FaultTest::SetUp();
        seams::stat64.script([this](const char* file, struct stat64*) {
            asked.push_back(file);
            return existing.count(file) != 0 ? 0 : -1;
        });
        seams::getenv.script([this](const char* name) {
            EXPECT_STREQ(name, "PATH");
            return path_is_set ? &path[0] : nullptr;
        });
    }

    // Checks also that the search frees what it allocates.
    bool search(const char* name) {
        std::strcpy(out, "what was there before");
        asked.reserve(16);
        const long blocks = AllocationPlan::live_blocks();
        Armed armed;
        const bool found = KELPortable::vwhence(name, out);
        EXPECT_EQ(AllocationPlan::live_blocks(), blocks);
        return found;
    }

    char out[256];
    std::set<std::string> existing;
    std::string path = "/bin: /usr/bin;/sbin";
    bool path_is_set = true;
    std::vector<std::string> asked;
};

TEST_F(Whence, ANameThatExistsIsReturnedWithoutPath) {
    existing = {"tool", "/bin/tool"};
    EXPECT_TRUE(search("tool"));
    EXPECT_STREQ(out, "tool");
    EXPECT_EQ(seams::getenv.calls(), 0);
    EXPECT_THAT(asked, ElementsAre("tool"));
}

TEST_F(Whence, ColonBlankAndSemicolonSeparateFolders) {
    EXPECT_FALSE(search("tool"));
    EXPECT_THAT(asked, ElementsAre("tool", "/bin/tool", "/usr/bin/tool", "/sbin/tool"));
}

TEST_F(Whence, ALongFolderIsWrittenWhole) {
    const std::string folder = "/" + std::string(5000, 'x');
    path = "/bin:" + folder;
    existing = {folder + "/tool"};
    std::vector<char> result(folder.size() + 6);
    bool found = false;
    {
        Armed armed;
        found = KELPortable::vwhence("tool", result.data());
    }
    EXPECT_TRUE(found);
    EXPECT_EQ(result.data(), folder + "/tool");
}

TEST_F(Whence, StopsAtTheFirstFolderThatHasTheName) {
    existing = {"/usr/bin/tool", "/sbin/tool"};
    EXPECT_TRUE(search("tool"));
    EXPECT_STREQ(out, "/usr/bin/tool");
    EXPECT_THAT(asked, ElementsAre("tool", "/bin/tool", "/usr/bin/tool"));
}

TEST_F(Whence, ANameThatIsNowhereGivesAnEmptyText) {
    EXPECT_FALSE(search("tool"));
    EXPECT_STREQ(out, "");
}

TEST_F(Whence, WithoutPathANameThatIsNotHereGivesAnEmptyText) {
    path_is_set = false;
    EXPECT_FALSE(search("tool"));
    EXPECT_STREQ(out, "");
    EXPECT_THAT(asked, ElementsAre("tool"));
}

TEST_F(Whence, WithAnEmptyPathANameThatIsNotHereGivesAnEmptyText) {
    path = "::";
    EXPECT_FALSE(search("tool"));
    EXPECT_STREQ(out, "");
    EXPECT_THAT(asked, ElementsAre("tool"));
}

TEST_F(Whence, WithoutMemoryFindsNothingInPathAndThrowsNothing) {
    existing = {"/bin/tool"};
    for (int allocation = 1; allocation <= 2; ++allocation) {
        AllocationPlan::fail(AllocationPlan::calls() + allocation);
        EXPECT_FALSE(search("tool"));
        EXPECT_STREQ(out, "");
    }
    EXPECT_TRUE(search("tool"));
}

TEST_F(Whence, LeavesPathAsItWas) {
    search("tool");
    EXPECT_EQ(path, "/bin: /usr/bin;/sbin");
}

TEST_F(Whence, TheResultMayTakeThePlaceOfTheName) {
    existing = {"/sbin/tool"};
    char place[64] = "tool";
    Armed armed;
    EXPECT_TRUE(KELPortable::vwhence(place, place));
    EXPECT_STREQ(place, "/sbin/tool");
    EXPECT_TRUE(KELPortable::vwhence(place, place));
    EXPECT_STREQ(place, "/sbin/tool");
}

// --- Cached host entry ------------------------------------------------------------------------

TEST_F(CachedHostEntry, IsTheEntryOfTheName) {
    FakeResolver resolver({}, "192.0.2.9");
    Armed armed;
    const hostent* const entry = KELPortable::gethostbyname("somewhere");
    ASSERT_NE(entry, nullptr);
    EXPECT_EQ(std::memcmp(entry->h_addr_list[0], "\xc0\x00\x02\x09", 4), 0);
    EXPECT_THAT(resolver.names, ElementsAre("somewhere"));
}

TEST_F(CachedHostEntry, IsAskedForUntilTheResolverDecides) {
    FakeResolver resolver(std::deque<int>(100, TRY_AGAIN), "192.0.2.9");
    Armed armed;
    EXPECT_NE(KELPortable::gethostbyname("somewhere"), nullptr);
    EXPECT_EQ(resolver.names.size(), 101u);
}

TEST_F(CachedHostEntry, IsNullAtOnceForAnyOtherCode) {
    for (const int code : {HOST_NOT_FOUND, NO_RECOVERY, NO_DATA, NETDB_INTERNAL}) {
        FakeResolver resolver({code}, "");
        Armed armed;
        EXPECT_EQ(KELPortable::gethostbyname("nowhere"), nullptr);
        EXPECT_EQ(resolver.names.size(), 1u);
    }
}

TEST_F(CachedHostEntry, IsOverwrittenByTheNextCall) {
    FakeResolver first({}, "192.0.2.9");
    const hostent* before;
    {
        Armed armed;
        before = KELPortable::gethostbyname("one");
    }
    FakeResolver second({}, "192.0.2.10");
    Armed armed;
    EXPECT_EQ(KELPortable::gethostbyname("two"), before);
    EXPECT_EQ(std::memcmp(before->h_addr_list[0], "\xc0\x00\x02\x0a", 4), 0);
}

TEST_F(CachedHostEntry, IsNotAskedForAgainBecauseOfAnEarlierCode) {
    int asked = 0;
    seams::gethostbyname_r.script(
        [&](const char*, hostent* entry, char* buffer, size_t, hostent** found, int* error) {
            ++asked;
            if (asked == 1) return answer_code(TRY_AGAIN, found, error);
            if (asked == 2) return answer_address("192.0.2.9", entry, buffer, found);
            return ERANGE;  // and no code
        });
    Armed armed;
    EXPECT_NE(KELPortable::gethostbyname("somewhere"), nullptr);
    EXPECT_EQ(KELPortable::gethostbyname("somewhere"), nullptr);
    EXPECT_EQ(asked, 3);
}

TEST_F(CachedHostEntry, TakesNoLock) {
    FakeResolver resolver({}, "192.0.2.9");
    Armed armed;
    KELPortable::gethostbyname("somewhere");
    EXPECT_EQ(seams::pthread_mutex_lock.calls(), 0);
}

}  // namespace
