// Opens the library at run time.
//
//   load LIBRARY    prints "threads N" before and after opening it, closes it, and "resident" when it
//                   is still there
//
// SPDX-License-Identifier: MIT
#include <dirent.h>
#include <dlfcn.h>

#include <iostream>

namespace {

int count_threads() {
    int n = 0;
    DIR* const tasks = opendir("/proc/self/task");
    while (const dirent* entry = readdir(tasks)) n += entry->d_name[0] != '.';
    closedir(tasks);
    return n;
}

}  // namespace

int main(int, char** argv) {
    std::cout << "threads " << count_threads() << std::endl;
    void* const library = dlopen(argv[1], RTLD_NOW);
    if (library == nullptr) {
        std::cerr << dlerror() << std::endl;
        return 1;
    }
    std::cout << "threads " << count_threads() << std::endl;
    dlclose(library);
    if (dlopen(argv[1], RTLD_NOW | RTLD_NOLOAD) != nullptr) std::cout << "resident" << std::endl;
    return 0;
}
