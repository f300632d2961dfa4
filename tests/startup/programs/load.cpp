// Opens the library at run time.
//
//   load LIBRARY    prints "threads N" before and after opening it, closes it, and "resident" when it
//                   is still there
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>

#include <iostream>

#include "tests/support/tasks.h"

int main(int, char** argv) {
    std::cout << "threads " << kel::test::task_count() << std::endl;
    void* const library = dlopen(argv[1], RTLD_NOW);
    if (library == nullptr) {
        std::cerr << dlerror() << std::endl;
        return 1;
    }
    std::cout << "threads " << kel::test::task_count() << std::endl;
    dlclose(library);
    if (dlopen(argv[1], RTLD_NOW | RTLD_NOLOAD) != nullptr) std::cout << "resident" << std::endl;
    return 0;
}
