// Time, the process, files and the system's settings.
//
// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/os/base_util.h>
#include <kel/os/portable.h>
#include <sys/utsname.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <vector>

#include "tests/faults/matrix/scenario.h"
#include "tests/os/fake_resolver.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

int errno_of(int rc) { return rc < 0 ? errno : 0; }

// --- time --------------------------------------------------------------------------------------------

class TimeOfDay : public Scenario {
    void prepare() override {
        seams::gettimeofday.script([](timeval* tv, void*) {
            *tv = {12, 34};
            return 0;
        });
    }
    void act() override {
        timeval now = {};
        const int rc = KELPortable::gettimeofday(now);
        const int error = errno_of(rc);
        gives("%d, error %d, %d s", rc, error, static_cast<int>(now.tv_sec));
    }
};
KEL_SCENARIO(TimeOfDay).giving("0, error 0, 12 s");

class SleepOfMilliseconds : public Scenario {
    void prepare() override {
        seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval*) { return 0; });
    }
    void act() override {
        const int rc = KELPortable::sleep(1500);
        const int error = errno_of(rc);
        gives("%d, error %d", rc, error);
    }
};
KEL_SCENARIO(SleepOfMilliseconds).giving("0, error 0");

class SleepOfSeconds : public Scenario {
    void prepare() override {
        seams::sleep.script([](unsigned) { return 0u; });
    }
    void act() override { gives("%u s left", KELPortable::vsleep(7)); }
};
KEL_SCENARIO(SleepOfSeconds).giving("0 s left");

// The system writes into its time-out, the caller's stays.
class SelectThatKeepsTheTimeOut : public Scenario {
    void prepare() override {
        seams::select.script([](int, fd_set*, fd_set*, fd_set*, timeval* tv) {
            *tv = {};
            return 0;
        });
    }
    void act() override {
        timeval limit = {7, 0};
        const int rc = wrapped_select(0, nullptr, nullptr, nullptr, &limit);
        gives("%d, %d s", rc, static_cast<int>(limit.tv_sec));
    }
};
KEL_SCENARIO(SelectThatKeepsTheTimeOut).giving("0, 7 s");

// --- the process and the system ----------------------------------------------------------------------

class MostDescriptors : public Scenario {
    void prepare() override {
        seams::sysconf.script([](int) { return 1024l; });
    }
    void act() override { gives("%d", KELPortable::max_fds()); }
};
KEL_SCENARIO(MostDescriptors).giving("1024");

class LastDescriptor : public Scenario {
    void prepare() override {
        seams::sysconf.script([](int) { return 1024l; });
    }
    void act() override { gives("%d", KELPortable::max_fd_reached(1023)); }
};
KEL_SCENARIO(LastDescriptor).giving("1");

int answer_uname(utsname* system) {
    std::strcpy(system->release, " 3.14.15");
    return 0;
}

class SystemVersion : public Scenario {
    void prepare() override { seams::uname.script(answer_uname); }
    void act() override {
        const std::unique_ptr<BaseUtil::SysVersion> version(BaseUtil::get_sysversion());
        gives("%s", version != nullptr ? "a record" : "null");
    }
};
KEL_SCENARIO(SystemVersion).giving("a record");

class SystemVersionOfPortable : public Scenario {
    void prepare() override { seams::uname.script(answer_uname); }
    void act() override {
        KELSysVersion version = {8, 9};
        const bool known = KELPortable::get_sysversion(version);
        gives("%d, %s", known, version.major == 8 && version.minor == 9 ? "untouched" : "written");
    }
};
KEL_SCENARIO(SystemVersionOfPortable).giving("1, written");

class Kill : public Scenario {
    void prepare() override {
        seams::kill.script([](pid_t, int) { return 0; });
    }
    void act() override { KELPortable::vkill(4711); }
};
KEL_SCENARIO(Kill);

class Property : public Scenario {
    void prepare() override {
        seams::getenv.script([](const char*) {
            static char value[] = "a value";
            return value;
        });
    }
    void act() override {
        const char* const value = KELPortable::get_property("KEL_NOBODY_SETS_THIS");
        gives("%s", value != nullptr ? value : "null");
    }
};
KEL_SCENARIO(Property).giving("a value");

class ErrorText : public Scenario {
    void act() override {
        errno = ENOENT;
        const CORBA_String_var text(KELPortable::_get_error_str());
        gives("%s", text.in() != nullptr ? text.in() : "null");
    }
};
KEL_SCENARIO(ErrorText).giving("No such file or directory");

class MemoryOfTheProcess : public Scenario {
    void act() override {
        int size = 0;
        int resident = 0;
        BaseUtil::GetProcessMemory(size, resident);
        gives("%s", size > 0 && resident > 0 ? "some" : size == 0 && resident == 0 ? "zeros" : "one");
    }
};
KEL_SCENARIO(MemoryOfTheProcess).giving("some");

class UserName : public Scenario {
    void prepare() override {
        seams::getlogin_r.script([](char* name, size_t) {
            std::strcpy(name, "somebody");
            return 0;
        });
    }
    void act() override { gives("%s", BaseUtil::user_name()); }
};
KEL_SCENARIO(UserName).giving("somebody").in_a_fresh_process();

// --- files -------------------------------------------------------------------------------------------

// Says that the files of a list exist and no other.
class Files : public Scenario {
    void prepare() override {
        seams::stat64.script([this](const char* path, struct stat64*) {
            for (const char* file : there()) {
                if (std::strcmp(file, path) == 0) return 0;
            }
            errno = ENOENT;
            return -1;
        });
        seams::getenv.script([](const char*) {
            static char path[] = "/a:/b";
            return path;
        });
    }
    virtual std::vector<const char*> there() const = 0;

protected:
    void look_for_the_program() {
        char found[64] = "untouched";
        const bool rc = KELPortable::vwhence("prog", found);
        gives("%d <%s>", rc, found);
    }
};

class FileExists : public Files {
    std::vector<const char*> there() const override { return {"/a/prog"}; }
    void act() override { gives("%d", KELPortable::vFileExists("/a/prog")); }
};
KEL_SCENARIO(FileExists).giving("1");

class WhenceInThisFolder : public Files {
    std::vector<const char*> there() const override { return {"prog", "/a/prog"}; }
    void act() override { look_for_the_program(); }
};
KEL_SCENARIO(WhenceInThisFolder).giving("1 <prog>");

class WhenceOnThePath : public Files {
    std::vector<const char*> there() const override { return {"/b/prog"}; }
    void act() override { look_for_the_program(); }
};
KEL_SCENARIO(WhenceOnThePath).giving("1 </b/prog>");

// --- host entries ------------------------------------------------------------------------------------

class HostEntries : public Scenario {
    void prepare() override {
        seams::gethostbyname_r.script([](const char*, hostent* entry, char* buffer, size_t, hostent** found,
                                         int*) { return answer_address("10.1.1.1", entry, buffer, found); });
        seams::gethostbyaddr_r.script([](const void*, socklen_t, int, hostent* entry, char* buffer, size_t,
                                         hostent** found,
                                         int*) { return answer_address("10.1.1.1", entry, buffer, found); });
    }

protected:
    vhostname _record = {};
};

class SharedHostEntry : public HostEntries {
    void act() override { gives("%s", KELPortable::gethostbyname("one") != nullptr ? "found" : "null"); }
};
KEL_SCENARIO(SharedHostEntry).giving("found");

class HostEntryByName : public HostEntries {
    void act() override {
        gives("%s", BaseUtil::vgethostbyname_r("one", &_record) != nullptr ? "found" : "null");
    }
};
KEL_SCENARIO(HostEntryByName).giving("found");

class HostEntryByAddress : public HostEntries {
    void act() override {
        gives("%s", BaseUtil::vgethostbyaddr_r("\x0a\x01\x01\x01", 4, AF_INET, &_record) != nullptr ? "found"
                                                                                                    : "null");
    }
};
KEL_SCENARIO(HostEntryByAddress).giving("found");

}  // namespace
