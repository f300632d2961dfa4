// SPDX-License-Identifier: MIT
#include <kel/containers/strings.h>
#include <kel/containers/wstrings.h>

#include <iostream>

// An operation as stubs declare it: `name` goes out and belongs to the caller afterwards.
void ask(CORBA::String_out name) { name = "ceres"; }

// Changes the text in place, and may replace it.
void shout(char*& text) {
    CORBA::string_free(text);
    text = CORBA::string_dup("VESTA");
}

int main() {
    CORBA::String_var name = CORBA::string_dup("vesta");  // a char* is taken over
    CORBA::String_var copy = name;                        // everything else is copied
    copy[0] = 'V';
    std::cout << name << " " << copy << "\n";

    shout(name.inout());
    std::cout << name << "\n";

    ask(copy);  // what copy held is freed first
    std::cout << copy << "\n";

    char* const mine = copy._retn();  // now the caller's
    std::cout << mine << ", and the holder has " << (copy.in() ? copy.in() : "null") << "\n";
    CORBA::string_free(mine);

    std::cout << CORBA::hash("ceres") << "\n";  // the same number at every word size

    CORBA::WString_var title = CORBA::wstring_dup(L"pallas");
    title[0] = L'P';
    std::cout << (title.in()[0] == L'P' ? "wide" : "?") << "\n";
}
