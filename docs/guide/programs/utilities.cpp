// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/os/base_util.h>
#include <kel/os/portable.h>

#include <cerrno>
#include <iostream>

int main() {
    // Time: milliseconds and timevals, and what lies between two of them.
    timeval begin = {100, 900000}, end = {102, 100000};
    const timeval passed = KELPortable::elapsed(begin, end);
    std::cout << KELPortable::convert(passed) << " ms\n";
    std::cout << (KELPortable::compare_time(begin, end) < 0 ? "earlier" : "?") << "\n";
    KELPortable::sleep(10);  // milliseconds

    // Files and programs.
    std::cout << (KELPortable::vFileExists("/") ? "there" : "missing") << "\n";
    char name[4096] = "a-program-that-nobody-has";
    std::cout << (KELPortable::vwhence(name, name) ? name : "not in PATH") << "\n";

    // Texts.
    std::cout << (KELPortable::vstricmp("Vesta", "VESTA") == 0 ? "the same" : "?") << "\n";
    char folders[] = "/bin:/usr/bin";
    char* rest = 0;
    for (char* folder = BaseUtil::strtok_r(folders, ":", &rest); folder != 0;
         folder = BaseUtil::strtok_r(0, ":", &rest)) {
        std::cout << folder << "\n";
    }

    // The process and the system.
    BaseUtil::SysVersion* const version = BaseUtil::get_sysversion();
    std::cout << (version != 0 ? "the system tells its version" : "it tells none") << "\n";
    delete version;
    std::cout << (BaseUtil::GetProperty("NOT_SET_ANYWHERE") == 0 ? "not set" : "set") << "\n";
    std::cout << (KELPortable::process_id() == BaseUtil::getpid() ? "one process" : "?") << "\n";
    errno = ENOENT;
    const CORBA_String_var problem(KELPortable::_get_error_str());  // the caller's to free
    std::cout << problem << "\n";
}
