// Has the libraries that it is linked with, opens those that it is told to and leaves them open.
//
//   host LIBRARY...    prints "main" in between
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <unistd.h>

#include <cstdio>

int main(int, char** argv) {
    while (const char* const library = *++argv) {
        if (dlopen(library, RTLD_NOW | RTLD_GLOBAL) != nullptr) continue;
        std::fprintf(stderr, "%s\n", dlerror());
        return 1;
    }
    return write(1, "main\n", 5) == 5 ? 0 : 1;
}
