// Opens and closes a library that defines an exception, again and again.
//
//   churn PLUGIN N    after N times: "registered N", "gone N" and "heap +B", the bytes allocated since
//                     the first hundred of them
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <kel/exceptions/exception.h>
#include <malloc.h>

#include <cstdio>
#include <cstdlib>

namespace {

bool is_registered() { return CORBA_Exception::Description::desc("IDL:test/PluginError:1.0") != nullptr; }

long allocated() { return static_cast<long>(mallinfo2().uordblks); }

}  // namespace

int main(int, char** argv) {
    const int rounds = std::atoi(argv[2]);
    int registered = 0;
    int gone = 0;
    long before = 0;
    for (int i = 0; i < rounds; ++i) {
        if (i == 100) before = allocated();
        void* const plugin = dlopen(argv[1], RTLD_NOW);
        registered += is_registered();
        if (plugin == nullptr || dlclose(plugin) != 0) std::fprintf(stderr, "%s\n", dlerror());
        gone += !is_registered();
    }
    const long more = allocated() - before;
    std::printf("registered %d\ngone %d\nheap %+ld\n", registered, gone, more);
    return 0;
}
