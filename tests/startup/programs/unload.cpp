// Opens and closes the library while threads are inside it.
//
//   unload LIBRARY N    N times: opens it, starts four threads, closes it while they use it and waits
//                       for them; at last closes it once more and ends with sixteen threads inside
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <pthread.h>

#include <cstdio>
#include <cstdlib>
#include <thread>
#include <vector>

namespace {

class Library {
public:
    explicit Library(const char* path) : _handle(dlopen(path, RTLD_NOW)) {
        if (_handle != nullptr) return;
        std::fprintf(stderr, "%s\n", dlerror());
        std::exit(1);
    }
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;

    void close() { dlclose(_handle); }

    template <class Function>
    Function* function(const char* name) const {
        if (void* const found = dlsym(_handle, name)) return reinterpret_cast<Function*>(found);
        std::fprintf(stderr, "no %s\n", name);
        std::exit(1);
    }

private:
    void* _handle;
};

// Functions of the library by their symbols, as this program is not linked with it.
struct Functions {
    explicit Functions(const Library& library)
        : current_environment(library.function<void*()>("_ZN5CORBA19current_environmentEv")),
          string_dup(library.function<char*(const char*)>("_ZN5CORBA10string_dupEPKc")),
          string_free(library.function<void(char*)>("_ZN5CORBA11string_freeEPc")) {}

    // The first call gives the thread an object that the library releases at the thread's end.
    void use() const {
        if (current_environment() == nullptr) std::abort();
        string_free(string_dup("text"));
    }

    void* (*current_environment)();
    char* (*string_dup)(const char*);
    void (*string_free)(char*);
};

void visit(const char* path) {
    Library library(path);
    const Functions functions(library);
    pthread_barrier_t inside, closed;
    pthread_barrier_init(&inside, nullptr, 5);
    pthread_barrier_init(&closed, nullptr, 5);
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            functions.use();
            pthread_barrier_wait(&inside);
            functions.use();
            pthread_barrier_wait(&closed);
            functions.use();
        });
    }
    pthread_barrier_wait(&inside);
    library.close();
    pthread_barrier_wait(&closed);
    for (std::thread& thread : threads) thread.join();
    pthread_barrier_destroy(&inside);
    pthread_barrier_destroy(&closed);
}

void end_with_threads_inside(const char* path) {
    Library library(path);
    static const Functions functions(library);
    static pthread_barrier_t inside;
    pthread_barrier_init(&inside, nullptr, 17);
    for (int i = 0; i < 16; ++i) {
        std::thread([] {
            functions.use();
            pthread_barrier_wait(&inside);
            for (;;) functions.use();
        }).detach();
    }
    pthread_barrier_wait(&inside);
    library.close();
}

}  // namespace

int main(int, char** argv) {
    for (int i = std::atoi(argv[2]); i > 0; --i) visit(argv[1]);
    end_with_threads_inside(argv[1]);
    return 0;
}
