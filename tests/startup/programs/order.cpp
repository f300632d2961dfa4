// Writes down what the library does while it is loaded and unloaded.
//
//   "built NAME"        the destruction of an object was registered, right after its construction
//   "locked NAME"       a process-wide lock was taken before main
//   "threads N"         threads of the process when main begins
//   "destroyed NAME"    an object was destroyed at exit
//
// NAME is the object's symbol; "iostreams" is the initialiser of the standard streams and "private"
// an object that is not exported.
//
// SPDX-License-Identifier: MIT
#include <cxxabi.h>
#include <dlfcn.h>
#include <kel/core/thread.h>
#include <kel/core/thread_local.h>
#include <pthread.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "tests/support/tasks.h"

namespace {

struct Registered {
    void (*destroy)(void*);
    void* object;
};

// Static data: written before the initialisers of this program run.
Registered registered[200];
int registered_count = 0;
const void* locked[200];
int locked_count = 0;
bool in_main = false;

template <class Function>
Function* next(const char* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

bool is_the_librarys(const void* dso_handle) {
    Dl_info where;
    return dladdr(dso_handle, &where) != 0 && std::strstr(where.dli_fname, "libkel.so") != nullptr;
}

void print(const char* what, const Registered& r) {
    Dl_info function, object;
    const char* name = "private";
    char* readable = nullptr;
    if (dladdr(reinterpret_cast<void*>(r.destroy), &function) != 0 && function.dli_sname != nullptr &&
        std::strncmp(function.dli_sname, "_ZNSt8ios_base4InitD", 20) == 0) {
        name = "iostreams";
    } else if (dladdr(r.object, &object) != 0 && object.dli_saddr == r.object) {
        readable = abi::__cxa_demangle(object.dli_sname, nullptr, nullptr, nullptr);
        name = readable != nullptr ? readable : object.dli_sname;
    }
    std::printf("%s %s\n", what, name);
    std::fflush(stdout);
    std::free(readable);
}

void destroy_and_print(void* entry) {
    const Registered& r = *static_cast<Registered*>(entry);
    print("destroyed", r);
    r.destroy(r.object);
}

template <class Lock>
void print_if_locked(const Lock& lock, const char* name) {
    const char* const first = reinterpret_cast<const char*>(&lock);
    for (int i = 0; i < locked_count; ++i) {
        const char* const mutex = static_cast<const char*>(locked[i]);
        if (mutex >= first && mutex < first + sizeof lock) std::printf("locked %s\n", name);
    }
}

}  // namespace

extern "C" int __cxa_atexit(void (*destroy)(void*), void* object, void* dso_handle) {
    typedef int Register(void (*)(void*), void*, void*);
    Register* const real = next<Register>("__cxa_atexit");
    if (in_main || !is_the_librarys(dso_handle)) return real(destroy, object, dso_handle);
    Registered& r = registered[registered_count++];
    r.destroy = destroy;
    r.object = object;
    return real(destroy_and_print, &r, dso_handle);
}

extern "C" int pthread_mutex_lock(pthread_mutex_t* mutex) {
    static int (*real)(pthread_mutex_t*) = nullptr;
    if (real == nullptr) real = next<int(pthread_mutex_t*)>("pthread_mutex_lock");
    if (!in_main && locked_count < 200) locked[locked_count++] = mutex;
    return real(mutex);
}

int main() {
    in_main = true;
    for (int i = 0; i < registered_count; ++i) print("built", registered[i]);
    print_if_locked(KELThread::_mutex, "KELThread::_mutex");
    print_if_locked(KELThreadLocal::_mutex, "KELThreadLocal::_mutex");
    std::printf("threads %d\n", kel::test::task_count());
    return 0;
}
