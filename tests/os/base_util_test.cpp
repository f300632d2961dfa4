// BaseUtil: look-ups, system version, user name, tokenizer, memory and environment.
//
// SPDX-License-Identifier: MIT
#include <kel/os/base_util.h>
#include <unistd.h>

#include <climits>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <memory>
#include <string>

#include "tests/os/fake_resolver.h"
#include "tests/os/fresh_process.h"
#include "tests/support/child.h"
#include "tests/support/fault.h"

using namespace kel::test;

namespace {

class HostByName : public FaultTest {};
class HostByAddress : public FaultTest {};
class SystemVersion : public FaultTest {};
class UserName : public FaultTest {};
class ProcessMemory : public FaultTest {};
class Property : public FaultTest {};

TEST(HostRecord, HoldsEntryCodeResultAndBufferInThisOrder) {
    EXPECT_EQ(offsetof(vhostname, _hostent), 0u);
    EXPECT_EQ(offsetof(vhostname, _h_errno), sizeof(hostent));
    EXPECT_GT(offsetof(vhostname, _result), offsetof(vhostname, _h_errno));
    EXPECT_EQ(offsetof(vhostname, _buffer), offsetof(vhostname, _result) + sizeof(hostent*));
    EXPECT_EQ(sizeof(vhostname::_buffer), 1024u);
    EXPECT_TRUE((std::is_same<decltype(vhostname::_h_errno), std::int32_t>::value));
}

TEST_F(HostByName, HandsThePartsOfTheRecordToTheSystem) {
    vhostname record;
    seams::gethostbyname_r.script(
        [&](const char* name, hostent* entry, char* buffer, size_t size, hostent** found, int* error) {
            EXPECT_STREQ(name, "somewhere");
            EXPECT_EQ(entry, &record._hostent);
            EXPECT_EQ(buffer, record._buffer);
            EXPECT_EQ(size, 1024u);
            EXPECT_EQ(found, &record._result);
            EXPECT_EQ(error, &record._h_errno);
            return answer_address("192.0.2.1", entry, buffer, found);
        });
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyname_r("somewhere", &record), &record._hostent);
    EXPECT_EQ(seams::gethostbyname_r.calls(), 1);
}

TEST_F(HostByName, ClearsTheResultBeforeItAsks) {
    vhostname record;
    record._result = &record._hostent;
    seams::gethostbyname_r.script([](const char*, hostent*, char*, size_t, hostent** found, int*) {
        EXPECT_EQ(*found, nullptr);
        return 0;
    });
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyname_r("somewhere", &record), nullptr);
}

TEST_F(HostByName, IsNullWhenTheSystemFailsThoughItLeftAResult) {
    seams::gethostbyname_r.script([](const char*, hostent* entry, char*, size_t, hostent** found, int*) {
        *found = entry;
        return ERANGE;
    });
    vhostname record;
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyname_r("somewhere", &record), nullptr);
}

TEST_F(HostByName, IsNullWithTheResolversCodeWhenNothingIsFound) {
    FakeResolver resolver({HOST_NOT_FOUND}, "");
    vhostname record;
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyname_r("nowhere", &record), nullptr);
    EXPECT_EQ(record._h_errno, HOST_NOT_FOUND);
    EXPECT_EQ(record._result, nullptr);
}

TEST_F(HostByName, DoesNotAskTwice) {
    FakeResolver resolver({TRY_AGAIN}, "192.0.2.1");
    vhostname record;
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyname_r("somewhere", &record), nullptr);
    EXPECT_EQ(resolver.names.size(), 1u);
}

TEST_F(HostByAddress, HandsAddressAndRecordToTheSystem) {
    const char address[] = {127, 0, 0, 1};
    vhostname record;
    record._result = &record._hostent;
    seams::gethostbyaddr_r.script([&](const void* asked, socklen_t length, int type, hostent* entry,
                                      char* buffer, size_t size, hostent** found, int* error) {
        EXPECT_EQ(asked, address);
        EXPECT_EQ(length, 4u);
        EXPECT_EQ(type, AF_INET);
        EXPECT_EQ(entry, &record._hostent);
        EXPECT_EQ(buffer, record._buffer);
        EXPECT_EQ(size, 1024u);
        EXPECT_EQ(found, &record._result);
        EXPECT_EQ(*found, nullptr);
        EXPECT_EQ(error, &record._h_errno);
        *found = entry;
        return 0;
    });
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyaddr_r(address, 4, AF_INET, &record), &record._hostent);
    EXPECT_EQ(seams::gethostbyaddr_r.calls(), 1);
}

TEST_F(HostByAddress, ACodeOfZeroGivesTheEntryWithoutAResult) {
    seams::gethostbyaddr_r.script(
        [](const void*, socklen_t, int, hostent*, char*, size_t, hostent**, int*) { return 0; });
    vhostname record;
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyaddr_r("abcd", 4, AF_INET, &record), &record._hostent);
    EXPECT_EQ(record._result, nullptr);
}

TEST_F(HostByAddress, IsNullWhenTheSystemFails) {
    seams::gethostbyaddr_r.fail(1, ERANGE);
    vhostname record;
    Armed armed;
    EXPECT_EQ(BaseUtil::vgethostbyaddr_r("abcd", 4, AF_INET, &record), nullptr);
}

// --- System version ---------------------------------------------------------------------------

using Version = std::unique_ptr<BaseUtil::SysVersion>;

Version version_of(const char* release) {
    seams::uname.script([release](utsname* system) {
        *system = utsname();
        std::strcpy(system->release, release);
        return 0;
    });
    Armed armed;
    return Version(BaseUtil::get_sysversion());
}

void expect_version(const char* release, int major_part, int minor_part) {
    SCOPED_TRACE(release);
    const Version version = version_of(release);
    ASSERT_NE(version, nullptr);
    EXPECT_EQ(version->major, major_part);
    EXPECT_EQ(version->minor, minor_part);
}

TEST_F(SystemVersion, IsNullWithAMessageWhenTheSystemFails) {
    const Outcome outcome = in_child([] {
        seams::uname.fail(1, EFAULT);
        Armed armed;
        std::cout << (BaseUtil::get_sysversion() == nullptr ? "null" : "record");
    });
    EXPECT_EQ(outcome.out, "null");
    EXPECT_EQ(outcome.err, "Could not obtain OS version information\n");
}

// What a field holds that is not written.
int fresh() {
    int field;
    std::memset(&field, AllocationPlan::fresh_byte, sizeof field);
    return field;
}

TEST_F(SystemVersion, AReleaseThatBeginsWithADigitFillsNothing) {
    expect_version("2.6.32-5-686", fresh(), fresh());
    expect_version("6.1.0", fresh(), fresh());
    expect_version("10.20.30", fresh(), fresh());
}

TEST_F(SystemVersion, AReleaseWithFewerThanTwoDotsGivesAnEmptyRecord) {
    expect_version("6.18", 0, 0);
    expect_version("6", 0, 0);
    expect_version("", 0, 0);
    expect_version(".", 0, 0);
}

TEST_F(SystemVersion, IsReadFromTheDigitsBeforeTheLastDotButOne) {
    expect_version(" 2.6.32", 2, 6);
    expect_version("-12.34.5", 12, 34);
    expect_version("-x12.34.5", 12, 34);
    expect_version("-1.23.45.6", 23, 45);
}

TEST_F(SystemVersion, StopsAtACharacterThatIsNotGreaterThanTheFirst) {
    expect_version("v6.1.0", fresh(), fresh());
    expect_version("..1.0", fresh(), fresh());
}

TEST_F(SystemVersion, ComparesTheCharactersAsSignedBytes) {
    expect_version(
        "\xff"
        "5.4.0",
        5, 4);
}

TEST_F(SystemVersion, LeavesTheMinorPartAloneWhenOnlyTheMajorOneCanBeRead) {
    expect_version(" 7..x", 7, fresh());
}

TEST_F(SystemVersion, IsNullWithoutMemoryAndThrowsNothing) {
    AllocationPlan::fail(1);
    EXPECT_EQ(version_of("-12.34.5"), nullptr);
    EXPECT_EQ(AllocationPlan::calls(), 1);
}

TEST_F(SystemVersion, IsATwoIntegerRecord) {
    EXPECT_EQ(sizeof(BaseUtil::SysVersion), 2 * sizeof(int));
    EXPECT_EQ(offsetof(BaseUtil::SysVersion, major), 0u);
}

TEST_F(SystemVersion, OfTheRunningSystemIsARecord) {
    const Version version(BaseUtil::get_sysversion());
    EXPECT_NE(version, nullptr);
}

// --- User name --------------------------------------------------------------------------------

void log_in_as(const char* name) {
    seams::getlogin_r.script([name](char* buffer, size_t size) {
        std::cout << size << ' ';
        std::strcpy(buffer, name);
        return 0;
    });
}

TEST_F(UserName, IsTheLoginNameReadIntoAHundredBytes) {
    EXPECT_EQ(said([] {
                  log_in_as("juno");
                  std::cout << BaseUtil::user_name();
              }),
              "100 juno");
}

TEST_F(UserName, IsUnixUserWithoutALoginName) {
    EXPECT_EQ(said([] {
                  seams::getlogin_r.fail(1, ENXIO);
                  std::cout << BaseUtil::user_name();
              }),
              "Unix User");
}

TEST_F(UserName, StaysTheSameForEver) {
    EXPECT_EQ(said([] {
                  seams::getlogin_r.fail(1, ENXIO);
                  const char* const first = BaseUtil::user_name();
                  log_in_as("juno");
                  std::cout << BaseUtil::user_name() << (BaseUtil::user_name() == first) << ' '
                            << seams::getlogin_r.calls();
              }),
              "Unix User1 1");
}

TEST_F(UserName, IsACopyOnTheHeapThatIsMadeOnce) {
    EXPECT_EQ(said([] {
                  log_in_as("juno");
                  const long before = AllocationPlan::live_blocks();
                  BaseUtil::user_name();
                  BaseUtil::user_name();
                  std::cout << AllocationPlan::live_blocks() - before;
              }),
              "100 1");
}

TEST_F(UserName, IsTheOneThatWasStoredFirstWhenTwoLookUpsOverlap) {
    EXPECT_EQ(said([] {
                  const char* stored_meanwhile = nullptr;
                  seams::getlogin_r.script([&](char* buffer, size_t) {
                      stored_meanwhile = BaseUtil::user_name();
                      std::strcpy(buffer, "comes too late");
                      return 0;
                  });
                  const char* const name = BaseUtil::user_name();
                  std::cout << (name == stored_meanwhile) << (BaseUtil::user_name() == stored_meanwhile);
              }),
              "11");
}

TEST_F(UserName, IsUnixUserWithoutMemoryAndStaysSo) {
    EXPECT_EQ(said([] {
                  log_in_as("juno");
                  AllocationPlan::fail(AllocationPlan::calls() + 1);
                  const char* const first = BaseUtil::user_name();
                  std::cout << first << (BaseUtil::user_name() == first);
              }),
              "100 Unix User1");
}

TEST_F(UserName, TakesNoLock) {
    EXPECT_EQ(said([] {
                  BaseUtil::user_name();
                  BaseUtil::user_name();
                  const long locks = seams::pthread_mutex_lock.calls();
                  std::cout << locks;
              }),
              "0");
}

// --- Process, texts, memory -------------------------------------------------------------------

TEST(ProcessId, IsTheSystems) { EXPECT_EQ(BaseUtil::getpid(), ::getpid()); }

TEST(Tokenizer, KeepsItsPlaceWithTheCaller) {
    char letters[] = "a,b";
    char digits[] = "1;2";
    char* letters_rest = nullptr;
    char* digits_rest = nullptr;
    EXPECT_STREQ(BaseUtil::strtok_r(letters, ",", &letters_rest), "a");
    EXPECT_STREQ(BaseUtil::strtok_r(digits, ";", &digits_rest), "1");
    EXPECT_STREQ(BaseUtil::strtok_r(nullptr, ",", &letters_rest), "b");
    EXPECT_STREQ(BaseUtil::strtok_r(nullptr, ";", &digits_rest), "2");
    EXPECT_EQ(BaseUtil::strtok_r(nullptr, ",", &letters_rest), nullptr);
}

TEST(Tokenizer, WithoutAPlaceUsesTheProcesssOne) {
    char letters[] = "a,b,c";
    EXPECT_STREQ(BaseUtil::strtok_r(letters, ",", nullptr), "a");
    EXPECT_STREQ(BaseUtil::strtok_r(nullptr, ",", nullptr), "b");
    EXPECT_STREQ(std::strtok(nullptr, ","), "c");
}

struct Memory {
    int size;
    int resident;
};

// What is read from a statm file with this text.
Memory memory_from(const std::string& text) {
    std::string contents = text;
    contents.reserve(1);  // fmemopen takes no empty buffer
    seams::fopen64.script([&](const char* path, const char* mode) {
        EXPECT_STREQ(path, "/proc/self/statm");
        EXPECT_STREQ(mode, "r");
        return fmemopen(&contents[0], contents.size(), "r");
    });
    Memory memory = {-1, -1};
    Armed armed;
    BaseUtil::GetProcessMemory(memory.size, memory.resident);
    EXPECT_EQ(seams::fopen64.calls(), 1);
    EXPECT_EQ(seams::fclose.calls(), 1);
    return memory;
}

TEST_F(ProcessMemory, CountsFourKilobytesAPage) {
    const Memory memory = memory_from("1000 250 3 4 5 6 7\n");
    EXPECT_EQ(memory.size, 4000);
    EXPECT_EQ(memory.resident, 1000);
    EXPECT_EQ(seams::sysconf.calls(), 0);
}

TEST_F(ProcessMemory, IsZeroWhenTheFileCannotBeOpened) {
    seams::fopen64.fail(1, ENOENT);
    int size = -1;
    int resident = -1;
    Armed armed;
    BaseUtil::GetProcessMemory(size, resident);
    EXPECT_EQ(size, 0);
    EXPECT_EQ(resident, 0);
    EXPECT_EQ(seams::fclose.calls(), 0);
}

TEST_F(ProcessMemory, IsZeroWhenTheFileHoldsNoNumbers) {
    const Memory memory = memory_from("none\n");
    EXPECT_EQ(memory.size, 0);
    EXPECT_EQ(memory.resident, 0);
}

TEST_F(ProcessMemory, MultipliesOnlyWhenBothFieldsWereRead) {
    const Memory memory = memory_from("1000\n");
    EXPECT_EQ(memory.size, 1000);
    EXPECT_EQ(memory.resident, 0);
}

TEST_F(ProcessMemory, WrapsForMorePagesThanItCanCount) {
    const Memory memory = memory_from("536870912 1073741825\n");
    EXPECT_EQ(memory.size, INT_MIN);
    EXPECT_EQ(memory.resident, 4);
}

TEST_F(ProcessMemory, OfThisProcessIsNotZero) {
    int size = 0;
    int resident = 0;
    BaseUtil::GetProcessMemory(size, resident);
    EXPECT_GT(resident, 0);
    EXPECT_GE(size, resident);
}

// --- Environment ------------------------------------------------------------------------------

TEST_F(Property, IsWhatTheEnvironmentHolds) {
    char value[] = "value";
    seams::getenv.script([&](const char* name) {
        EXPECT_STREQ(name, "KEL_TEST_PROPERTY");
        return value;
    });
    Armed armed;
    EXPECT_EQ(BaseUtil::GetProperty("KEL_TEST_PROPERTY"), value);
}

TEST_F(Property, OfAnUnsetNameIsNull) {
    ::unsetenv("KEL_TEST_PROPERTY");
    EXPECT_EQ(BaseUtil::GetProperty("KEL_TEST_PROPERTY"), nullptr);
}

TEST_F(Property, SetToTheEmptyTextIsAnEmptyText) {
    ::setenv("KEL_TEST_PROPERTY", "", 1);
    EXPECT_STREQ(BaseUtil::GetProperty("KEL_TEST_PROPERTY"), "");
    ::unsetenv("KEL_TEST_PROPERTY");
}

TEST_F(Property, PointsIntoTheEnvironment) {
    ::setenv("KEL_TEST_PROPERTY", "value", 1);
    EXPECT_EQ(BaseUtil::GetProperty("KEL_TEST_PROPERTY"), std::getenv("KEL_TEST_PROPERTY"));
    ::unsetenv("KEL_TEST_PROPERTY");
}

}  // namespace
