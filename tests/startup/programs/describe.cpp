// Shows where the library's exception descriptions are, or constructs some more of them.
//
//   describe                  does nothing
//   describe addresses        "name address" on standard error, for each in the order of construction
//   describe later set        sets DEBUG_STATIC and constructs one
//   describe later unset      unsets DEBUG_STATIC and constructs some; addresses on standard error
//
// SPDX-License-Identifier: MIT
#include <kel/exceptions/standard.h>
#include <kel/services/load_library.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

typedef CORBA_Exception::Description Description;

void show(const Description& d) { std::fprintf(stderr, "%s %p\n", d.name(), static_cast<const void*>(&d)); }

void show_all() {
#define KEL_STANDARD_EXCEPTION(X) show(CORBA_##X::_description);
#include <kel/exceptions/standard.inc>
#undef KEL_STANDARD_EXCEPTION
    show(CORBA_Exception::_description);
    show(CORBA_SystemException::_description);
    show(CORBA_UserException::_description);
    show(KELRemarshal::_description);
    show(KELLoadLibrary::LoadError::_description);
}

void construct_when_set() {
    ::setenv("DEBUG_STATIC", "1", 1);
    const Description late("Late", "IDL:test/Late:1.0", nullptr, nullptr, nullptr);
}

void construct_when_unset() {
    ::unsetenv("DEBUG_STATIC");
    const Description base("Base", "IDL:test/Base:1.0", nullptr, nullptr, nullptr);
    const Description derived("Derived", "IDL:test/Derived:1.0", nullptr, &base, nullptr);
    const Description nameless(nullptr, "IDL:test/Nameless:1.0", nullptr, nullptr, nullptr);
    const Description of_nameless("OfNameless", "IDL:test/OfNameless:1.0", nullptr, &nameless, nullptr);
    const Description twin("Twin", "IDL:test/Base:1.0", nullptr, nullptr, nullptr);
    const Description* const all[] = {&base, &derived, &nameless, &of_nameless, &twin};
    for (const Description* d : all) {
        std::fprintf(stderr, "%s %p\n", d->name() != nullptr ? d->name() : "-", static_cast<const void*>(d));
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && std::strcmp(argv[1], "addresses") == 0) show_all();
    if (argc > 2 && std::strcmp(argv[2], "set") == 0) construct_when_set();
    if (argc > 2 && std::strcmp(argv[2], "unset") == 0) construct_when_unset();
    return 0;
}
