// Ends while the library is still in use.
//
//   exit late       uses every shared part once more after the exit-time destructors of the library
//   exit threads    main returns while sixteen threads use the library
//
// SPDX-License-Identifier: MIT
#include <cstdlib>
#include <cstring>

#include "tests/startup/programs/use.h"

using namespace kel::test;

namespace {

bool late = false;

// Standard streams may be gone by now: this goes to the system at once.
void say(const char* what) {
    if (::write(1, what, std::strlen(what)) < 0 || ::write(1, "\n", 1) < 0) ::_exit(1);
}

void after_the_destructors(int, void*) {
    if (!late) return;
    if (CORBA_Exception::Description::desc("IDL:omg.org/CORBA/UNKNOWN:1.0") == nullptr)
        say("nothing registered");
    use_named_locks();
    say("named locks");
    use_pooled_mutexes();
    say("pooled mutexes");
    use_counters();
    say("counters");
    use_services();
    say("services");
    use_threads();
    say("threads");
    raise_and_catch();
    say("exceptions");
}

// Registered before any library is initialised and for none of them, this runs after everything
// that belongs to one.
void register_first(int, char**, char**) { ::on_exit(after_the_destructors, nullptr); }

__attribute__((section(".preinit_array"), used)) void (*const before_all)(int, char**,
                                                                          char**) = register_first;

}  // namespace

int main(int, char** argv) {
    if (std::strcmp(argv[1], "late") == 0) {
        late = true;
        use_everything();
    } else {
        start_sixteen();
    }
    return 0;
}
